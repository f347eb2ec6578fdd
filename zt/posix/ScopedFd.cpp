#include "zt/posix/ScopedFd.h"

#include <errno.h>
#include <unistd.h>

namespace zt::posix {

void ScopedFd::reset(int fd) noexcept {
  int old = std::exchange(m_fd, fd);
  if (old < 0) return;
  int saved = errno;
  close(old);
  errno = saved;
}

}  // namespace zt::posix

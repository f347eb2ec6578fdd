#include "zt/posix/ScopedFd.h"

#include <unistd.h>

#include <cerrno>

namespace zt::posix {

void ScopedFd::reset(int fd) noexcept {
  int old = std::exchange(m_fd, fd);
  if (old < 0) return;
  int saved = errno;
  close(old);
  errno = saved;
}

}  // namespace zt::posix

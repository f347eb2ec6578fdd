#include "zt/posix/ScopedFd.h"

#include <unistd.h>

#include <cerrno>

namespace zt::posix {

void ScopedFd::reset(int fd) noexcept {
  int old = std::exchange(m_fd, fd);
  if (old < 0) return;
  // Destructors run between a failed call and its report, so errno has to survive them. close() is
  // not made again after EINTR: on Linux the descriptor is gone, and its number may be another
  // file's by then.
  int saved = errno;
  close(old);
  errno = saved;
}

}  // namespace zt::posix

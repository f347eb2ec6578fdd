#include <sys/file.h>
#include <unistd.h>

#include "zt/fnd/osdep/Retry.h"
#include "zt/fnd/osdep/ScopedFd.h"

namespace zt {
namespace fnd {
namespace osdep {

void ScopedFd::reset(int fd) noexcept {
  int old = std::exchange(m_fd, fd);
  if (old < 0) return;
  int saved = errno;
  ::close(old);
  errno = saved;
}

int Flock(int fd, int operation) noexcept {
  return RetryEintr([&] { return ::flock(fd, operation); });
}

}  // namespace osdep
}  // namespace fnd
}  // namespace zt

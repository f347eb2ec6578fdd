#include "zt/fnd/osdep/ScopedFd.h"

#include <sys/file.h>

#include "zt/fnd/osdep/Retry.h"

namespace zt {
namespace fnd {
namespace osdep {

int Flock(int fd, int operation) noexcept {
  return RetryEintr([&] { return ::flock(fd, operation); });
}

}  // namespace osdep
}  // namespace fnd
}  // namespace zt

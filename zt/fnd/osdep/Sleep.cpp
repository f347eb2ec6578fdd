#include "zt/fnd/osdep/Sleep.h"

#include <cerrno>
#include <ctime>

namespace zt::fnd::osdep {

void Sleep(unsigned int ms) {
  timespec left = {static_cast<time_t>(ms / 1000), static_cast<long>(ms % 1000) * 1000000L};
  // A signal cuts a sleep short; the rest of it follows.
  while (nanosleep(&left, &left) != 0 && errno == EINTR) {
  }
}

}  // namespace zt::fnd::osdep

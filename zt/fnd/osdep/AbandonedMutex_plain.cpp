#include "zt/fnd/osdep/AbandonedMutex.h"

namespace zt::fnd::osdep {

// musl has one, and POSIX promises nothing.
bool AbandonedMutexMayGo() { return false; }

}  // namespace zt::fnd::osdep

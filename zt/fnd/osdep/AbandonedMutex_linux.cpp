#include "zt/fnd/osdep/AbandonedMutex.h"

namespace zt::fnd::osdep {

// glibc has such a list for robust mutexes alone.
bool AbandonedMutexMayGo() { return true; }

}  // namespace zt::fnd::osdep

#pragma once

namespace zt::fnd::osdep {

// Platform seam: whether the memory of a recursive mutex may be given back while a thread still owns
// it. Not where the C library has a list of what each thread owns, which leads through the mutexes.
bool AbandonedMutexMayGo();

}  // namespace zt::fnd::osdep

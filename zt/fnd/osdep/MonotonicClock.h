#pragma once

#include <cstdint>

namespace zt::fnd::osdep {

// Ticks since an arbitrary moment, never set back, and how many of them make a second.
uint64_t MonotonicTicks();
uint64_t MonotonicTicksPerSecond();

}  // namespace zt::fnd::osdep

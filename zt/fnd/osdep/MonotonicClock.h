#pragma once

#include <cstdint>

namespace zt::fnd::osdep {

// Ticks since an arbitrary moment, never set back, and how many of them make a second.
std::uint64_t MonotonicTicks();
std::uint64_t MonotonicTicksPerSecond();

}  // namespace zt::fnd::osdep

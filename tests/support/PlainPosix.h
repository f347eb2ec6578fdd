#pragma once

#include <cstdlib>

namespace vlt::test {

// Whether this is the build for a system with POSIX and no more (docs/porting.md), which cannot
// promise all that Linux can.
#ifdef VLT_PLAIN_POSIX
inline constexpr bool kPlainPosix = true;
#else
inline constexpr bool kPlainPosix = false;
#endif

// Whether the C library is glibc, which has what others on Linux lack.
#ifdef __GLIBC__
inline constexpr bool kGlibc = true;
#else
inline constexpr bool kGlibc = false;
#endif

}  // namespace vlt::test

#pragma once

namespace vlt::test {

// Whether this is the build for a system with POSIX and no more (docs/porting.md), which cannot
// promise all that Linux can.
#ifdef VLT_PLAIN_POSIX
inline constexpr bool kPlainPosix = true;
#else
inline constexpr bool kPlainPosix = false;
#endif

}  // namespace vlt::test

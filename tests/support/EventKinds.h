#pragma once

// How events of one process and of many are made: what a caller means by the two flags.
namespace vlt::test {

inline constexpr bool kManual = true, kAutomatic = false, kSet = true, kClear = false;

}  // namespace vlt::test

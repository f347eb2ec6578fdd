#pragma once

#include <chrono>

namespace vlt::test {

using Clock = std::chrono::steady_clock;

// Whole milliseconds since then, rounded down.
inline long MsSince(Clock::time_point begin) {
  using std::chrono::duration_cast, std::chrono::milliseconds;
  return static_cast<long>(duration_cast<milliseconds>(Clock::now() - begin).count());
}

}  // namespace vlt::test

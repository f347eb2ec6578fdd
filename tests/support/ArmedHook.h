#pragma once

#include <functional>

#include "source/Common/vltTestHook.h"
#include "tests/support/InChild.h"

namespace vlt::test {

// Runs expectations in a child process in which that point is armed with those faults.
// The calling test fails where ExpectInChild's does.
inline void ExpectInArmedChild(const char* point, const hook::Faults& faults,
                               const std::function<void()>& body,
                               const char* file = __builtin_FILE(), int line = __builtin_LINE()) {
  ExpectInChild(
      [&] {
        hook::Arm(point, faults);
        body();
      },
      kDeadlineMs, file, line);
}

inline constexpr hook::Faults kFailedAllocation{.simulateMemoryAllocationFailure = true};
inline constexpr hook::Faults kThrownBadAlloc{.simulateMemoryAllocationFailureAndThrow = true};

}  // namespace vlt::test

#pragma once

#include <functional>

#include "source/Common/vltTestHook.h"
#include "tests/support/InChild.h"

namespace vlt::test {

// Runs expectations in a child process in which that point is armed with those faults.
// Returns what InChild does.
inline int InArmedChild(const char* point, const hook::Faults& faults,
                        const std::function<void()>& body) {
  return InChild([&] {
    hook::Arm(point, faults);
    body();
  });
}

inline constexpr hook::Faults kFailedAllocation{.simulateMemoryAllocationFailure = true};
inline constexpr hook::Faults kThrownBadAlloc{.simulateMemoryAllocationFailureAndThrow = true};

}  // namespace vlt::test

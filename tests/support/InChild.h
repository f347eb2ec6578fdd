#pragma once

#include <gtest/gtest.h>

#include <functional>

#include "tests/support/Child.h"

// Present under AddressSanitizer only.
extern "C" int __lsan_do_recoverable_leak_check() __attribute__((weak));

namespace vlt::test {

// Runs expectations in a forked process, for what a process does only once: look up its
// installation, make its registrar. Returns 0 if all of them held and nothing leaked, 1 if not, 98
// for a leak, and Child's codes otherwise.
//
//   EXPECT_EQ(InChild([&] { EXPECT_TRUE(...); }), 0);
inline int InChild(const std::function<void()>& body, int deadlineMs = kDeadlineMs) {
  Child child([&] {
    body();
    if (testing::Test::HasFailure()) return 1;
    return __lsan_do_recoverable_leak_check && __lsan_do_recoverable_leak_check() ? 98 : 0;
  });
  return child.wait(deadlineMs);
}

}  // namespace vlt::test

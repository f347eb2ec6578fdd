#pragma once

#include <gtest/gtest.h>

#include <functional>

#include "tests/support/Child.h"

// Present under AddressSanitizer only.
extern "C" int __lsan_do_recoverable_leak_check() __attribute__((weak));

namespace vlt::test {

// Expectations of the running test that have failed so far.
inline int FailedExpectations() {
  const testing::TestResult& result =
      *testing::UnitTest::GetInstance()->current_test_info()->result();
  int failed = 0;
  for (int n = 0; n < result.total_part_count(); ++n) {
    if (result.GetTestPartResult(n).failed()) ++failed;
  }
  return failed;
}

// True if something that this process has allocated can be reached no more; AddressSanitizer knows.
inline bool Leaks() {
  return __lsan_do_recoverable_leak_check && __lsan_do_recoverable_leak_check();
}

// Runs expectations in a forked process, for what a process does only once: look up its
// installation, make its registrar. Returns 0 if all of them held and nothing leaked, 1 if not, 98
// for a leak, and Child's codes otherwise.
//
//   EXPECT_EQ(InChild([&] { EXPECT_TRUE(...); }), 0);
inline int InChild(const std::function<void()>& body, int deadlineMs = kDeadlineMs) {
  Child child([&] {
    int before = FailedExpectations();
    body();
    if (FailedExpectations() != before) return 1;
    return Leaks() ? 98 : 0;
  });
  return child.wait(deadlineMs);
}

}  // namespace vlt::test

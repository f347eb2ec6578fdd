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
// installation, make its registrar. Failures become those of the calling test. Returns 0 if all of
// them held and nothing leaked, 1 if not, 98 for a leak, and Child's codes otherwise.
inline int InChild(const std::function<void()>& body, int deadlineMs = kDeadlineMs) {
  Child child([&] {
    int before = FailedExpectations();
    body();
    if (FailedExpectations() != before) return 1;
    return Leaks() ? 98 : 0;
  });
  return child.wait(deadlineMs);
}

// The same; the calling test fails if the result is not 0.
inline void ExpectInChild(const std::function<void()>& body, int deadlineMs = kDeadlineMs,
                          const char* file = __builtin_FILE(), int line = __builtin_LINE()) {
  int code = InChild(body, deadlineMs);
  if (code != 0) ADD_FAILURE_AT(file, line) << "the child ended with " << code;
}

}  // namespace vlt::test

// A test that runs whole in a child process of its own.
//
//   TEST_IN_CHILD(vltGetRegistrar, MakesTheDatabase) { EXPECT_EQ(...); }
#define TEST_IN_CHILD(suite, name)                                          \
  static void suite##_##name##_InChild();                                   \
  TEST(suite, name) { vlt::test::ExpectInChild(suite##_##name##_InChild); } \
  static void suite##_##name##_InChild()

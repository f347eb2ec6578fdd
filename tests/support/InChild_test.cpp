#include "tests/support/InChild.h"

#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <functional>
#include <stdexcept>
#include <string>
#include <utility>

namespace vlt::test {
namespace {

using testing::TestPartResult;

bool Contains(const std::string& text, const std::string& part) {
  return text.find(part) != std::string::npos;
}

// What arrives in this process from a child that runs the body. The child is forked before failures
// are caught here: it would catch its own as well.
struct Arrived {
  explicit Arrived(const std::function<void()>& body) {
    Child child([&] {
      body();
      return 0;
    });
    testing::ScopedFakeTestPartResultReporter caught(&parts);
    code = child.wait();
  }

  const TestPartResult& at(int n) const { return parts.GetTestPartResult(n); }

  testing::TestPartResultArray parts;
  int code;
};

TEST(InChildFailures, FailuresArriveOnceWithPlaceAndTextWhateverTheResult) {
  int line = __LINE__ + 1;
  Arrived a([] { EXPECT_TRUE(false) << "this text"; });
  EXPECT_EQ(a.code, 0);
  ASSERT_EQ(a.parts.size(), 1);
  EXPECT_TRUE(a.at(0).failed());
  EXPECT_TRUE(Contains(a.at(0).message(), "this text"));
  EXPECT_TRUE(Contains(a.at(0).file_name(), "InChild_test.cpp"));
  EXPECT_EQ(a.at(0).line_number(), line);
}

TEST(InChildFailures, FailuresOfAChildsChildArriveOnce) {
  Arrived a([] { Arrived([] { EXPECT_TRUE(false); }); });
  EXPECT_EQ(a.parts.size(), 0);  // caught one process below
  Arrived b([] { InChild([] { EXPECT_TRUE(false) << "from below"; }); });
  ASSERT_EQ(b.parts.size(), 1);
  EXPECT_TRUE(Contains(b.at(0).message(), "from below"));
}

TEST(InChildFailures, ASkipArrivesAsASkip) {
  Arrived a([] { GTEST_SKIP() << "this reason"; });
  ASSERT_EQ(a.parts.size(), 1);
  EXPECT_TRUE(a.at(0).skipped());
  EXPECT_TRUE(Contains(a.at(0).message(), "this reason"));
}

TEST(InChildFailures, MoreFailuresThanThePipeHoldsDoNotBlockTheChild) {
  Arrived a([] {
    ASSERT_TRUE(freopen("/dev/null", "w", stderr));
    for (int n = 0; n < 1000; ++n) ADD_FAILURE() << std::string(1000, 'x');
  });
  EXPECT_EQ(a.code, 0);
  EXPECT_GT(a.parts.size(), 10);
}

TEST(InChildFailures, FailuresOfAKilledChildArrive) {
  testing::TestPartResultArray parts;
  Signal failed;
  {
    Child child([&] {
      ADD_FAILURE();
      failed.notify();
      Signal().await();
      return 0;
    });
    EXPECT_TRUE(failed.await());
    testing::ScopedFakeTestPartResultReporter caught(&parts);
    { Child gone = std::move(child); }
  }
  EXPECT_EQ(parts.size(), 1);
}

TEST(InChild, AnyOtherEndFailsTheTestThatExpectedIt) {
  const std::function<void()> bodies[] = {[] { abort(); }, [] { exit(0x7F); }, [] { throw 1; }};
  for (const auto& body : bodies) {
    int line = __LINE__ + 1;
    Arrived a([&] { ExpectInChild(body); });
    ASSERT_EQ(a.parts.size(), 1);
    EXPECT_TRUE(Contains(a.at(0).message(), "the child ended with "));
    EXPECT_EQ(a.at(0).line_number(), line);
  }
}

TEST(InChild, AFailureIsReportedAndIsTheResult) {
  Arrived a([] { EXPECT_EQ(InChild([] { ADD_FAILURE(); }), 1); });
  EXPECT_EQ(a.parts.size(), 1);
}

TEST(InChild, ChangesOfTheChildDoNotReachTheParent) {
  ExpectInChild([] { setenv("VLT_TEST_PROCESS", "child", 1); });
  EXPECT_FALSE(getenv("VLT_TEST_PROCESS"));
}

pid_t g_program = getpid();
TEST_IN_CHILD(InChild, AMarkedTestRunsInAChildOfTheProgram) { EXPECT_EQ(getppid(), g_program); }

}  // namespace
}  // namespace vlt::test

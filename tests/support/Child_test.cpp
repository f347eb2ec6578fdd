#include "tests/support/Child.h"

#include <gtest/gtest.h>

namespace vlt::test {
namespace {

TEST(Child, ReportsItsExitCodeOrSignal) {
  EXPECT_EQ(Child([] { return 7; }).wait(), 7);
  Signal never;
  Child waiting([&] { return never.await() ? 1 : 0; });
  EXPECT_TRUE(waiting.running());
  waiting.kill(9);
  EXPECT_EQ(waiting.wait(), 128 + 9);
}

TEST(Child, RunProgramCatchesBothOutputs) {
  auto result = RunProgram({"sh", "-c", "echo $WORD; echo err >&2; exit 3"}, {{"WORD", "out"}});
  EXPECT_EQ(result.exitCode, 3);
  EXPECT_EQ(result.out, "out\n");
  EXPECT_EQ(result.err, "err\n");
}

}  // namespace
}  // namespace vlt::test

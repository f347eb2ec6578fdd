#include "tests/support/TempDir.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "tests/support/Child.h"

namespace vlt::test {
namespace {

TEST(Support, TempDirGoesWithItsContents) {
  std::string path;
  {
    TempDir dir;
    path = dir.path();
    WriteBytes(dir.makeDir("a/b") + "/file", std::string("x\0y", 3));
    EXPECT_EQ(ReadBytes(dir / "a/b/file"), std::string("x\0y", 3));
  }
  EXPECT_FALSE(Exists(path));
}

TEST(Support, TempDirLiesInsideTheTestsOwnRoot) {
  EXPECT_EQ(TempDir().path().rfind(getenv("VLT_TEST_ROOT"), 0), 0u);
}

TEST(Support, ChildHandsOverItsExitCodeOrSignal) {
  EXPECT_EQ(Child([] { return 7; }).wait(), 7);
  Signal never;
  Child waiting([&] { return never.await() ? 1 : 0; });
  EXPECT_TRUE(waiting.running());
  waiting.kill(9);
  EXPECT_EQ(waiting.wait(), 128 + 9);
}

TEST(Support, RunProgramCatchesBothOutputs) {
  auto result = RunProgram({"sh", "-c", "echo $WORD; echo err >&2; exit 3"}, {{"WORD", "out"}});
  EXPECT_EQ(result.exitCode, 3);
  EXPECT_EQ(result.out, "out\n");
  EXPECT_EQ(result.err, "err\n");
}

TEST(Support, TheSuperusersRootDirectoryIsItsOwn) {
  if (geteuid() != 0) GTEST_SKIP() << "only the superuser gets a root directory of its own";
  ASSERT_EQ(mkdir("/Library", 0755), 0);
  WriteBytes("/Library/mark", "x");
  std::string inside = std::string(getenv("VLT_TEST_ROOT")) + "/private-root/Library/mark";
  EXPECT_EQ(ReadBytes(inside), "x");  // The same file by the machine's own path.
  std::filesystem::remove_all("/Library");
}

}  // namespace
}  // namespace vlt::test

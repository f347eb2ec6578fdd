#include "tests/support/TempDir.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <string>

namespace vlt::test {
namespace {

TEST(TempDir, IsRemovedWithItsContents) {
  std::string path;
  {
    TempDir dir;
    path = dir.path();
    WriteBytes(dir.makeDir("a/b") + "/file", std::string("x\0y", 3));
    EXPECT_EQ(ReadBytes(dir / "a/b/file"), std::string("x\0y", 3));
  }
  EXPECT_FALSE(Exists(path));
}

TEST(TempDir, LiesInsideTheTestsOwnRoot) {
  EXPECT_EQ(TempDir().path().rfind(getenv("VLT_TEST_ROOT"), 0), 0u);
}

}  // namespace
}  // namespace vlt::test

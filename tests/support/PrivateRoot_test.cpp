#include "tests/support/PrivateRoot.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "tests/support/TempDir.h"

namespace vlt::test {
namespace {

TEST(PrivateRoot, TheSuperuserHasARootDirectoryOfItsOwn) {
  if (geteuid() != 0) GTEST_SKIP() << "only the superuser gets a root directory of its own";
  ASSERT_EQ(mkdir("/Library", 0755), 0);
  WriteBytes("/Library/mark", "x");
  std::string inside = std::string(getenv("VLT_TEST_ROOT")) + "/private-root/Library/mark";
  EXPECT_EQ(ReadBytes(inside), "x");  // The same file by the machine's own path.
  std::filesystem::remove_all("/Library");
}

TEST(PrivateRoot, OneDirectoryThatIsClosedKeepsOthersOut) {
  TempDir dir;
  std::string inner = dir.makeDir("outer/inner");
  chmod(dir.path().c_str(), 0755);
  EXPECT_TRUE(AllMayEnter(inner));
  chmod((dir / "outer").c_str(), 0700);
  EXPECT_FALSE(AllMayEnter(inner));
}

}  // namespace
}  // namespace vlt::test

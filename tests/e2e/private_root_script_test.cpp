// tools/demo/private-root: a root directory for a command.
#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/TempDir.h"

namespace vlt::test {
namespace {

const std::string kScript = std::string(VLT_TEST_SOURCE) + "/tools/demo/private-root";

class PrivateRootScript : public testing::Test {
 protected:
  void SetUp() override {
    if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, who alone gets a root directory";
    if (RunProgram({"unshare", "--mount", "--propagation", "unchanged", "true"}).exitCode != 0) {
      GTEST_SKIP() << "NOT TESTED: needs the right to mount";
    }
  }

  TempDir m_place;
  const std::string m_path = m_place.path();
};

TEST_F(PrivateRootScript, TheCommandHasItsResultAndLeavesNothing) {
  EXPECT_EQ(RunProgram({kScript, m_path, "sh", "-c", "exit 7"}).exitCode, 7);
  EXPECT_TRUE(std::filesystem::is_empty(m_path));
}

TEST_F(PrivateRootScript, LibraryIsBelowThePlace) {
  ProgramResult result = RunProgram({kScript, m_path, "mkdir", "/Library"});
  EXPECT_EQ(result.exitCode, 0) << result.err;
  EXPECT_TRUE(Exists(m_place / "Library"));
}

TEST_F(PrivateRootScript, APlaceServesOneRunAtATime) {
  ProgramResult result = RunProgram({kScript, m_path, kScript, m_path, "true"});
  EXPECT_EQ(result.exitCode, 1);
  EXPECT_EQ(result.err, "private-root: " + m_path +
                            ": another run is using this place: wait for its end, or name another "
                            "one\n");
  EXPECT_EQ(RunProgram({kScript, m_path, "true"}).exitCode, 0);
}

TEST_F(PrivateRootScript, WhatTheCommandHasStartedDoesNotKeepThePlace) {
  const char* starts = "sleep 60 >/dev/null 2>&1 & echo $!";
  ProgramResult result = RunProgram({kScript, m_path, "sh", "-c", starts});
  const pid_t sleeper = atoi(result.out.c_str());
  ASSERT_GT(sleeper, 0) << result.err;
  EXPECT_EQ(RunProgram({kScript, m_path, "true"}).exitCode, 0);
  EXPECT_EQ(kill(sleeper, SIGKILL), 0);
}

TEST_F(PrivateRootScript, WhatAKilledRunHasLeftIsNotInTheWay) {
  m_place.makeDir("usr");
  ASSERT_EQ(symlink("usr/bin", (m_place / "bin").c_str()), 0);
  ProgramResult result = RunProgram({kScript, m_path, "true"});
  EXPECT_EQ(result.exitCode, 0) << result.err;
}

}  // namespace
}  // namespace vlt::test

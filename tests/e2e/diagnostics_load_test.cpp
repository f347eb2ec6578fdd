// What loading the shared library leaves and says: the log, and nothing where it cannot be had.
#include <gtest/gtest.h>
#include <sched.h>
#include <stdlib.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <regex>
#include <system_error>

#include "tests/support/EventPlace.h"
#include "tests/support/InChild.h"
#include "tests/support/PrivateRoot.h"
#include "tests/support/TempDir.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

const std::string kHost = std::string(VLT_TEST_BIN) + "/vltctl-client";
const std::string kLogs = "/Library/Logs/KOR";
const std::string kData = "/Library/Application Support/Zentrex/KOR/Data";
constexpr uid_t kNobody = 65534;

// A program that loads the library, says one line, and ends; with `env` options before it.
ProgramResult Load(const std::vector<std::string>& environment = {}) {
  std::vector<std::string> command = {"env"};
  command.insert(command.end(), environment.begin(), environment.end());
  command.insert(command.end(), {kHost, "--version"});
  return RunProgram(command);
}

void ExpectSilentLoad(const std::vector<std::string>& environment = {}) {
  ProgramResult result = Load(environment);
  EXPECT_EQ(result.exitCode, 0);
  EXPECT_TRUE(std::regex_match(result.out, std::regex("[0-9.]+\n"))) << result.out;
  EXPECT_EQ(result.err, "");
}

std::vector<std::string> NamesIn(const std::string& directory) {
  std::vector<std::string> names;
  std::error_code missing;
  for (const auto& entry : fs::directory_iterator(directory, missing)) {
    names.push_back(entry.path().filename());
  }
  return names;
}

bool BecomeNobody() { return setgid(kNobody) == 0 && setuid(kNobody) == 0; }

// "/Library" is the test's own: only then may anything be made there.
class DiagnosticsLoad : public testing::Test {
 protected:
  void SetUp() override {
    const char* root = getenv("VLT_PRIVATE_ROOT");
    if (geteuid() != 0 || !root || std::string(root) != "made") {
      GTEST_SKIP() << "NOT TESTED: needs the superuser and a root directory of its own";
    }
    ASSERT_TRUE(Exists(kHost)) << kHost;
    fs::remove_all("/Library");
  }

  static void options(const std::string& text) {
    fs::create_directories(kData);
    WriteBytes(kData + "/vldiag.ini", text);
  }
};

TEST_F(DiagnosticsLoad, WithoutOptionsThereIsADirectoryAndNoLog) {
  ExpectSilentLoad();
  EXPECT_EQ(NamesIn(kLogs), std::vector<std::string>());
  EXPECT_EQ(ModeOf(kLogs), 0777);
}

TEST_F(DiagnosticsLoad, TheFirstLineTellsOfTheLoad) {
  options("[vlt]\nSeverity = 32\nTarget = 1\n");
  ExpectSilentLoad();
  std::vector<std::string> names = NamesIn(kLogs);
  ASSERT_EQ(names.size(), 1u);
  EXPECT_TRUE(std::regex_match(names[0], std::regex("\\d{8}_\\d{6}-vlTracer-[0-9A-F]{8}\\.log")));
  EXPECT_EQ(ReadBytes(kLogs + "/" + names[0]), "  vltutils: Process attach\n");
}

TEST_F(DiagnosticsLoad, WhatASectionLacksComesFromAllComponents) {
  const std::string line = "  vltutils: Process attach\n";
  options("[vlt]\nTarget = 4\n[AllComponents]\nSeverity = 32\nTarget = 2\n");
  EXPECT_EQ(Load().err, line);
  options("[vlt]\nTarget = \n[AllComponents]\nSeverity = 32\nTarget = 2\n");
  ProgramResult result = Load();
  EXPECT_EQ(result.err, "");
  EXPECT_EQ(result.out.substr(0, line.size()), line);
  options("[vlt]\nTarget = 4\n");
  EXPECT_EQ(Load().err, "");  // 1: neither errors nor the load
  EXPECT_EQ(NamesIn(kLogs), std::vector<std::string>());
}

TEST_F(DiagnosticsLoad, ADiskThatIsShortGetsNoLog) {
  options("[vlt]\nSeverity = 32\nTarget = 5\nLowDiskThreshold = 1000000\n");
  fs::create_directories(kLogs);
  ExpectInChild([] {
    if (unshare(CLONE_NEWNS) != 0 ||
        mount("tmpfs", kLogs.c_str(), "tmpfs", 0, "size=64k,mode=777") != 0) {
      GTEST_SKIP() << "NOT TESTED: no right to mount";
    }
    ProgramResult result = Load();
    EXPECT_EQ(result.exitCode, 0);
    EXPECT_EQ(result.err, "  vltutils: Process attach\n");
    EXPECT_EQ(NamesIn(kLogs), std::vector<std::string>());
  });
}

// The log is asked for in each of the following, so that it is tried to be opened.

TEST_F(DiagnosticsLoad, AnUnwritableHomeIsNothingToSpeakOf) {
  if (!vlt::test::AllMayEnter(VLT_TEST_BIN)) {
    GTEST_SKIP() << "NOT TESTED: another user may not enter the build tree";
  }
  options("[vlt]\nSeverity = 34\nTarget = 1\n");
  TempDir home;
  chmod(home.path().c_str(), 0755);
  ExpectInChild([&] {
    ASSERT_TRUE(BecomeNobody());
    ExpectSilentLoad({"HOME=" + home.path()});
    ExpectSilentLoad({"HOME=/no/such/home"});
    ExpectSilentLoad({"HOME=relative"});
    ExpectSilentLoad({"HOME="});
    ExpectSilentLoad({"HOME=" + kHost});  // no directory at all
  });
  EXPECT_EQ(NamesIn(home.path()), std::vector<std::string>());
}

TEST_F(DiagnosticsLoad, AHomeOfAnyLengthHasTheLog) {
  if (!vlt::test::AllMayEnter(VLT_TEST_BIN)) {
    GTEST_SKIP() << "NOT TESTED: another user may not enter the build tree";
  }
  options("[vlt]\nSeverity = 32\nTarget = 1\n");
  TempDir dir;
  std::string home = dir.makeDir(std::string(200, 'h') + "/" + std::string(200, 'i'));
  chmod(dir.path().c_str(), 0755);
  chmod(home.c_str(), 0777);
  ExpectInChild([&] {
    ASSERT_TRUE(BecomeNobody());
    ExpectSilentLoad({"HOME=" + home});
  });
  EXPECT_EQ(NamesIn(home + "/Library/Logs/KOR").size(), 1u);
}

TEST_F(DiagnosticsLoad, WithoutAHomeTheLogIsInTheTemporaryPlace) {
  if (!vlt::test::AllMayEnter(VLT_TEST_BIN)) {
    GTEST_SKIP() << "NOT TESTED: another user may not enter the build tree";
  }
  options("[vlt]\nSeverity = 32\nTarget = 1\n");
  for (const char* mode : {"mode=1777", "mode=755", "ro"}) {
    int code = -1;
    Allowed allowed = RunInOwnTmp(
        mode,
        [&] {
          bool writable = std::string(mode) == "mode=1777";
          if (!Exists(kHost)) return 77;
          return InChild([&] {
            ASSERT_TRUE(BecomeNobody());
            ExpectSilentLoad({"-u", "HOME"});
            EXPECT_EQ(NamesIn("/tmp/zentrex/KOR").size(), writable ? 1u : 0u);
          });
        },
        &code);
    if (allowed == Allowed::No) GTEST_SKIP() << "NOT TESTED: no right to mount";
    EXPECT_EQ(code, 0) << mode;
  }
}

// Neither the log nor the lock of its lines can be made.
TEST_F(DiagnosticsLoad, AReadOnlySystemIsNothingToSpeakOf) {
  options("[vlt]\nSeverity = 34\nTarget = 1\n");
  ExpectInChild([] {
    if (unshare(CLONE_NEWNS) != 0 ||
        mount("/Library", "/Library", nullptr, MS_BIND, nullptr) != 0 ||
        mount(nullptr, "/Library", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr) != 0) {
      GTEST_SKIP() << "NOT TESTED: no right to mount";
    }
    EXPECT_NE(mkdir("/Library/Logs", 0777), 0);
    ExpectSilentLoad({"ZTFNDTMPSHAREDFILEDIR=/Library/shared"});
  });
  EXPECT_FALSE(Exists(kLogs));
}

TEST_F(DiagnosticsLoad, OptionsThatCannotBeReadAreNone) {
  for (const std::string& text :
       {std::string("\xFF\xFE[\0", 4), std::string("[vlt"), std::string(100000, '['),
        std::string("[vlt]\nSeverity = -1x\nTarget = 99999999999999999999\n")}) {
    options(text);
    ExpectSilentLoad();
    EXPECT_EQ(NamesIn(kLogs), std::vector<std::string>());
  }
  fs::remove(kData + "/vldiag.ini");
  fs::create_directory(kData + "/vldiag.ini");
  ExpectSilentLoad();
}

}  // namespace
}  // namespace vlt::test

#include "source/Common/Posix/vltlinuxos.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <sys/auxv.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>

#include "source/Utilities/vltutils.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "ztini/ztini.h"

namespace vlt::test {
namespace {

TEST(vltlinuxosEarlyTrace, LinesHaveTheirForm) {
  TempDir out;
  std::string expected;
  ExpectInChild([&] {
    ASSERT_TRUE(freopen((out / "text").c_str(), "w", stdout));
    vltEarlyTrace("source", 7, "text %s %d", "x", 5);
    vltEarlyTrace("source", 8, "%s", std::string(5000, 'l').c_str());
    fflush(stdout);
    char line[200];
    snprintf(line, sizeof line, "source(7) : trace %d %ld: text x 5\n", static_cast<int>(getpid()),
             static_cast<long>(pthread_self()));
    EXPECT_EQ(ReadBytes(out / "text").substr(0, strlen(line)), line);
  });
  EXPECT_NE(ReadBytes(out / "text").find("source(8) : trace"), std::string::npos);
}

// ---- Flags

unsigned Flags(const std::string& bytes) {
  Installation i;
  WriteBytes(i.root() + "/vlttrace.txt", bytes);
  TempDir out;
  ExpectInChild([&] { WriteBytes(out / "flags", std::to_string(vltGetTraceFlags())); });
  return static_cast<unsigned>(std::stoul(ReadBytes(out / "flags")));
}

TEST(vltlinuxosEarlyTrace, FlagsAreTwoNumbers) {
  EXPECT_EQ(Flags("1 2"), 33u);
  EXPECT_EQ(Flags("  3\n\t1\nmore"), 19u);
  EXPECT_EQ(Flags("2"), 2u);
  EXPECT_EQ(Flags(""), 0u);
  EXPECT_EQ(Flags("words"), 0u);
  EXPECT_EQ(Flags("1 words"), 1u);
  EXPECT_EQ(Flags("16 1"), 16u);
}

TEST_IN_CHILD(vltlinuxosEarlyTrace, FlagsAreReadOnce) {
  Installation i;
  EXPECT_EQ(vltGetTraceFlags(), 0u);
  WriteBytes(i.root() + "/vlttrace.txt", "1 2");
  EXPECT_EQ(vltGetTraceFlags(), 0u);
}

TEST(vltlinuxosEarlyTrace, APipeInTheFlagsPlaceDoesNotHoldUp) {
  Installation i;
  ASSERT_EQ(mkfifo((i.root() + "/vlttrace.txt").c_str(), 0666), 0);
  ExpectInChild([&] { EXPECT_EQ(vltGetTraceFlags(), 0u); }, 5000);
}

// ---- The log directory

TEST(vltlinuxosLogDirectory, ForOthersThanTheSuperuser) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
  TempDir home;
  chmod(home.path().c_str(), 0777);
  ExpectInChild([&] {
    ASSERT_EQ(setresuid(65534, 65534, 65534), 0);
    setenv("HOME", home.path().c_str(), 1);
    ScopedUmask mask(077);
    zt::fnd::AnsiString ini;
    zt::fnd::String directory = vlCreateLogDirIfNeeded(ini);
    std::string expected = home / "Library/Logs/KOR/";
    EXPECT_EQ(std::string(zt::fnd::AnsiString(directory).c_str()), expected);
    EXPECT_STREQ(ini.c_str(), "/Library/Application Support/Zentrex/KOR/Data/vldiag.ini");
    EXPECT_EQ(ModeOf(home / "Library/Logs/KOR"), 0777);
    EXPECT_EQ(ModeOf(home / "Library"), 0777);
    // A home that gives no directory is no failure.
    setenv("HOME", "", 1);
    vlCreateLogDirIfNeeded(ini);
    setenv("HOME", "/proc/nowhere", 1);
    EXPECT_STREQ(zt::fnd::AnsiString(vlCreateLogDirIfNeeded(ini)).c_str(),
                 "/proc/nowhere/Library/Logs/KOR/");
  });
}

TEST(vltlinuxosLogDirectory, WithoutAHomeItIsTheTemporaryOne) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
  ExpectInChild([&] {
    // The place is fixed; a user without the right to make it shows the text alone.
    ASSERT_EQ(setresuid(65534, 65534, 65534), 0);
    unsetenv("HOME");
    zt::fnd::AnsiString ini;
    bool there = Exists("/tmp/zentrex");
    EXPECT_STREQ(zt::fnd::AnsiString(vlCreateLogDirIfNeeded(ini)).c_str(), "/tmp/zentrex/KOR/");
    if (!there) std::filesystem::remove_all("/tmp/zentrex");
  });
}

TEST(vltlinuxosTracerOptions, ComeFromTheSectionThenFromAllComponentsThenFromDefaults) {
  TempDir dir;
  WriteBytes(dir / "x.ini",
             "[AllComponents]\nSeverity = 5\nTarget = 6\nLowDiskThreshold = 7\n"
             "[Own]\nSeverity = 2\nTarget = words\n[Whole]\nTarget = 8\nLowDiskThreshold = 9\n");
  auto* ini = IniNew(0);
  ASSERT_EQ(IniReadFromFile(ini, (dir / "x.ini").c_str()), 0);
  unsigned severity = 0, target = 0, threshold = 0;
  EXPECT_EQ(vlReadTracerOptions(ini, "Own", severity, target, &threshold), 7u);
  EXPECT_EQ(severity, 2u);
  EXPECT_EQ(target, 6u);
  EXPECT_EQ(threshold, 7u);
  vlReadTracerOptions(ini, "Whole", severity, target, &threshold);
  EXPECT_EQ(severity, 5u);
  EXPECT_EQ(target, 8u);
  EXPECT_EQ(threshold, 9u);
  EXPECT_EQ(vlReadTracerOptions(ini, "None", severity, target, nullptr), 6u);
  IniDispose(ini);
  auto* empty = IniNew(0);
  vlReadTracerOptions(empty, "None", severity, target, &threshold);
  EXPECT_EQ(severity, 1u);
  EXPECT_EQ(target, 1u);
  EXPECT_EQ(threshold, 0u);
  IniDispose(empty);
}

// ---- set-user-id programs

TEST(vltlinuxosLogDirectory, DISABLED_PrintsItself) {
  printf("directory=%s secure=%lu\n", zt::fnd::AnsiString(vlLogDirectory()).c_str(),
         getauxval(AT_SECURE));
}

TEST(vltlinuxosLogDirectory, HomeOfTheCallerOfASetUserIdProgramIsNotTaken) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  TempDir dir;
  const std::string program = dir / "program";
  std::filesystem::copy_file("/proc/self/exe", program);
  ASSERT_EQ(chown(program.c_str(), 65534, 65534), 0);
  ASSERT_EQ(chmod(program.c_str(), 04755), 0);
  ProgramResult result = RunProgram({program, "--gtest_also_run_disabled_tests",
                                     "--gtest_filter=vltlinuxosLogDirectory.DISABLED_PrintsItself"},
                                    {{"HOME", "/callers"}});
  if (result.out.find("secure=0") != std::string::npos) {
    GTEST_SKIP() << "NOT TESTED: programs keep their caller's rights in this file system";
  }
  EXPECT_NE(result.out.find("directory=/tmp/zentrex/KOR/ secure=1"), std::string::npos)
      << result.out << result.err;
}

}  // namespace
}  // namespace vlt::test

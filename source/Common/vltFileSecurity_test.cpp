#include "source/Common/vltFileSecurity.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>
#include <thread>

#include "tests/support/Child.h"
#include "tests/support/Installation.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"

namespace {

using namespace vlt::test;

TEST(vltFileSecurity, ChangesTheModeOfFilesAndDirectories) {
  TempDir dir;
  WriteBytes(dir / "f", "");
  EXPECT_EQ(vlrSetFileSecurity(zt::fnd::String((dir / "f").c_str()), 0640), S_OK);
  EXPECT_EQ(ModeOf(dir / "f"), 0640);
  EXPECT_EQ(vlrSetFileSecurity(zt::fnd::String((dir / "none").c_str()), 0640), E_FAIL);
}

TEST(vltFileSecurity, RecursesWithoutFollowingLinks) {
  TempDir dir;
  dir.makeDir("d/e");
  WriteBytes(dir / "d/e/f", "");
  WriteBytes(dir / "outside", "");
  ASSERT_EQ(chmod((dir / "outside").c_str(), 0600), 0);
  ASSERT_EQ(symlink((dir / "outside").c_str(), (dir / "d/link").c_str()), 0);
  zt::fnd::String path((dir / "d").c_str());
  EXPECT_EQ(vltSetFileSecurityImpl(path, 0777, false), S_OK);
  EXPECT_NE(ModeOf(dir / "d/e"), 0777);
  EXPECT_EQ(vltSetFileSecurityImpl(path, 0777, true), S_OK);
  EXPECT_EQ(ModeOf(dir / "d"), 0777);
  EXPECT_EQ(ModeOf(dir / "d/e"), 0777);
  EXPECT_EQ(ModeOf(dir / "d/e/f"), 0777);
  EXPECT_EQ(ModeOf(dir / "outside"), 0600);
}

TEST(vltFileSecurity, StopsAtTheFirstEntryThatCannotBeChanged) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root, to make files of two users";
  TempDir dir;
  ASSERT_EQ(chmod(dir.path().c_str(), 0777), 0);
  std::string tree = dir.makeDir("d");
  ASSERT_EQ(chmod(tree.c_str(), 0777), 0);
  constexpr uid_t kNobody = 65534;
  for (const char* name : {"1", "2", "3"}) WriteBytes(tree + "/" + name, "");
  ASSERT_EQ(chown((tree + "/1").c_str(), kNobody, kNobody), 0);
  ASSERT_EQ(chown((tree + "/3").c_str(), kNobody, kNobody), 0);
  ASSERT_EQ(chown(tree.c_str(), kNobody, kNobody), 0);
  Child child([&] {
    if (setresuid(kNobody, kNobody, kNobody) != 0) return 50;
    return vltSetFileSecurityImpl(zt::fnd::String(tree.c_str()), 0777, true) == E_FAIL ? 0 : 1;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_NE(ModeOf(tree + "/2"), 0777);
}

TEST(vltFileSecurity, DateStampIsTodaysLocalDate) {
  auto stamp = [] {
    char text[32];
    time_t now = time(nullptr);
    tm local;
    localtime_r(&now, &local);
    strftime(text, sizeof text, "_%m%d%Y", &local);
    return std::string(text);
  };
  std::string before = stamp(), found = zt::fnd::AnsiString(vlrGetCurrentLocalTime()).c_str();
  EXPECT_TRUE(found == before || found == stamp()) << found;  // the day may end in between
}

TEST(vltFileSecurity, SharedDirectoryIsMadeOrRaises) {
  TempDir dir;
  ASSERT_EQ(chmod(dir.path().c_str(), 0700), 0);
  ScopedUmask strict(077);
  EXPECT_EQ(vltMakeSharedDirectory(zt::fnd::String((dir / "a/b/").c_str())), S_OK);
  EXPECT_EQ(ModeOf(dir / "a/b"), 0777);
  EXPECT_EQ(ModeOf(dir / "a"), 0755);   // every user can reach what is shared
  EXPECT_EQ(ModeOf(dir.path()), 0700);  // what was there is left alone
  EXPECT_EQ(vltMakeSharedDirectory(zt::fnd::String((dir / "a/b/").c_str())), S_OK);
  WriteBytes(dir / "file", "");
  EXPECT_THROW(vltMakeSharedDirectory(zt::fnd::String((dir / "file/").c_str())),
               zt::fnd::exception::Exception);
  // Neither way leaves anything else behind.
  EXPECT_EQ(RunProgram({"ls", "-A", dir.path()}).out, "a\nfile\n");
  EXPECT_EQ(RunProgram({"ls", "-A", dir / "a"}).out, "b\n");
}

}  // namespace

#include "ztini/FileReplace.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/FailingAlloc.h"
#include "tests/support/TempDir.h"

namespace {

using vlt::test::Exists;
using vlt::test::ModeOf;
using vlt::test::ReadBytes;
using vlt::test::TempDir;
using vlt::test::WriteBytes;
using ztini::FileReplacement;
using ztini::OwnedText;

TEST(FileReplace, SiblingNames) {
  const struct {
    const char *target, *expected;
  } rows[] = {
      {"/d/a.ini", "/d/a.TMP"},       {"/d/a.TMP", "/d/a.TMP.TMP"}, {"/d/a.tmp", "/d/a.TMP"},
      {"a.ini", "a.ini.TMP"},         {"/d/a", "/d/a.TMP"},         {"/d.x/a", "/d.x/a.TMP"},
      {"/d.x/a.b.c", "/d.x/a.b.TMP"}, {"/d/a.", "/d/a.TMP"},        {"/d/.ini", "/d/.TMP"},
      {"d/a.ini", "d/a.TMP"},         {"./a.ini", "./a.TMP"},       {"a", "a.TMP"},
      {"a.TMP", "a.TMP.TMP"}};
  for (const auto& row : rows) {
    OwnedText name(ztini::SiblingTemporaryName(row.target));
    EXPECT_STREQ(name.get(), row.expected) << row.target;
  }
}

TEST(FileReplace, UniqueTemplates) {
  const struct {
    const char *target, *expected;
  } rows[] = {{"/d/a.ini", "/d/ini$$.TMPXXXXXX"},
              {"/a.ini", "/ini$$.TMPXXXXXX"},
              {"a.ini", "ini$$.TMPXXXXXX"},
              {"d.x/e/a", "d.x/e/ini$$.TMPXXXXXX"}};
  for (const auto& row : rows) {
    OwnedText name(ztini::UniqueTemporaryTemplate(row.target));
    EXPECT_STREQ(name.get(), row.expected) << row.target;
  }
}

TEST(FileReplace, WithoutACommitTheTargetIsAsBeforeAndNothingElseRemains) {
  for (int32_t options : {2, 6}) {
    TempDir dir;
    const std::string path = dir / "a.ini";
    WriteBytes(path, "old");
    {
      FileReplacement file(path.c_str(), options);
      ASSERT_EQ(file.open(), 0);
      EXPECT_EQ(file.write("new", 3), 0);
      EXPECT_EQ(ReadBytes(path), "old");
    }
    EXPECT_EQ(ReadBytes(path), "old");
    EXPECT_EQ(rmdir(dir.path().c_str()), -1);
    unlink(path.c_str());
    EXPECT_EQ(rmdir(dir.path().c_str()), 0);  // the target was all there was
  }
}

// The flags of the one open file below the directory; -1 if there is none.
int DescriptorFlagsBelow(const TempDir& dir) {
  for (int fd = 3; fd < 100; ++fd) {
    char target[4096];
    const ssize_t length =
        readlink(("/proc/self/fd/" + std::to_string(fd)).c_str(), target, sizeof target);
    if (length > 0 && std::string(target, static_cast<size_t>(length)).rfind(dir.path(), 0) == 0) {
      return fcntl(fd, F_GETFD);
    }
  }
  return -1;
}

TEST(FileReplace, TheFileIsCloseOnExec) {
  for (int32_t options : {0, 2, 6}) {
    TempDir dir;
    const std::string path = dir / "a.ini";
    FileReplacement file(path.c_str(), options);
    ASSERT_EQ(file.open(), 0);
    EXPECT_EQ(DescriptorFlagsBelow(dir), FD_CLOEXEC) << options;
  }
}

TEST(FileReplace, TheNewFileHasModeAndOwnerBeforeItIsInPlace) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  WriteBytes(path, "old");
  chmod(path.c_str(), 0604);
  const bool root = geteuid() == 0;
  struct stat before;
  if (root && chown(path.c_str(), 12345, 54321) != 0) GTEST_SKIP() << "no such owners here";
  ASSERT_EQ(stat(path.c_str(), &before), 0);
  for (int32_t options : {2, 6}) {
    FileReplacement file(path.c_str(), options);
    ASSERT_EQ(file.open(), 0);
    EXPECT_EQ(file.write("new", 3), 0);
    EXPECT_EQ(file.commit(IniDurability::None), 0);
    EXPECT_EQ(ReadBytes(path), "new");
    EXPECT_EQ(ModeOf(path), 0604);
    struct stat status;
    stat(path.c_str(), &status);
    EXPECT_EQ(status.st_uid, before.st_uid);
    EXPECT_EQ(status.st_gid, before.st_gid);
  }
}

TEST(FileReplace, AFailedRenameRemovesTheTemporary) {
  TempDir dir;
  const std::string path = dir / "a.ini", temporary = dir / "a.TMP";
  FileReplacement file(path.c_str(), 2);
  ASSERT_EQ(file.open(), 0);
  EXPECT_TRUE(Exists(temporary));
  ASSERT_EQ(mkdir(path.c_str(), 0777), 0);
  EXPECT_EQ(file.commit(IniDurability::None), kIniNotReplaceable);
  EXPECT_FALSE(Exists(temporary));
}

TEST(FileReplace, AStaleSiblingIsReplacedAndAPlantedLinkNotFollowed) {
  TempDir dir;
  const std::string path = dir / "a.ini", temporary = dir / "a.TMP", victim = dir / "victim";
  WriteBytes(temporary, "left by a writer that was killed");
  chmod(temporary.c_str(), 0);
  {
    FileReplacement file(path.c_str(), 2);
    EXPECT_EQ(file.open(), 0);
    EXPECT_EQ(ReadBytes(temporary), "");
  }
  WriteBytes(victim, "precious");
  ASSERT_EQ(symlink(victim.c_str(), temporary.c_str()), 0);
  FileReplacement file(path.c_str(), 2);
  ASSERT_EQ(file.open(), 0);
  EXPECT_EQ(file.write("new", 3), 0);
  EXPECT_EQ(file.commit(IniDurability::Synced), 0);
  EXPECT_EQ(ReadBytes(victim), "precious");
  EXPECT_EQ(ReadBytes(path), "new");
}

TEST(FileReplace, ADirectoryInTheSiblingsPlaceIsMovedAside) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  dir.makeDir("a.TMP/inside");
  {
    FileReplacement file(path.c_str(), 2);
    ASSERT_EQ(file.open(), 0);
    EXPECT_EQ(file.commit(IniDurability::Synced), 0);
  }
  EXPECT_TRUE(Exists(dir / "a.TMP.bad/inside"));
  EXPECT_TRUE(Exists(path));
}

TEST(FileReplace, AFileOfAnotherUserLosesItsSetUserIdBit) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  WriteBytes(path, "old");
  ASSERT_EQ(chmod(path.c_str(), 06755), 0);
  FileReplacement file(path.c_str(), 2);
  ASSERT_EQ(file.open(), 0);
  EXPECT_EQ(file.commit(IniDurability::None), 0);
  EXPECT_EQ(ModeOf(path), 0755);
}

TEST(FileReplace, AFailedSyncIsAFailedSave) {
  for (IniDurability durability : {IniDurability::ContentOnly, IniDurability::Synced}) {
    TempDir dir;
    const std::string path = dir / "a.ini";
    WriteBytes(path, "old");
    vlt::test::Child child([&] {
      if (!vlt::test::FailSystemCall(SYS_fsync, EIO)) return 1;
      FileReplacement file(path.c_str(), 2);
      if (file.open() != 0) return 2;
      EXPECT_EQ(file.write("new", 3), 0);
      return file.commit(durability) == kIniWriteFailed ? 0 : 3;
    });
    EXPECT_EQ(child.wait(), 0);
    EXPECT_EQ(ReadBytes(path), "old");
    EXPECT_FALSE(Exists(dir / "a.TMP"));
  }
}

TEST(FileReplace, OpenWithoutMemoryLeavesNothing) {
  for (int32_t options : {2, 6}) {
    TempDir dir;
    const std::string path = dir / "a.ini";
    {
      ztini::test::FailFromAllocation fail(1);
      FileReplacement file(path.c_str(), options);
      EXPECT_EQ(file.open(), kIniOutOfMemory);
    }
    EXPECT_EQ(rmdir(dir.path().c_str()), 0);
  }
}

}  // namespace

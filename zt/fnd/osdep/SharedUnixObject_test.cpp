#include "zt/fnd/osdep/SharedUnixObject.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <string>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/PlainPosix.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/posix/ScopedFd.h"

using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

using vlt::test::Child;
using vlt::test::ModeOf;
using vlt::test::PosixErrorOf;
using vlt::test::ReadBytes;
using vlt::test::TempDir;
using vlt::test::Wide;
using vlt::test::WriteBytes;

constexpr const char* kVariable = "ZTFNDTMPSHAREDFILEDIR";
constexpr uid_t kSomeUser = 65534, kOtherUser = 65533;

int Open(const std::string& path) {
  return ScopedFd(CreateSharedUnixFile(AnsiString(path.c_str()))).get();
}

// ---- where

TEST(SharedUnixObject, BaseIsTheAbsoluteVariableOrTheDefault) {
  std::string kept = getenv(kVariable);
  const struct {
    const char* value;
    const char* base;
  } rows[] = {{"relative/path", "/var/tmp/zentrex/shared"},
              {"", "/var/tmp/zentrex/shared"},
              {"/some/where", "/some/where"},
              {nullptr, "/var/tmp/zentrex/shared"}};
  for (const auto& row : rows) {
    if (row.value) {
      setenv(kVariable, row.value, 1);
    } else {
      unsetenv(kVariable);
    }
    EXPECT_STREQ(row.base, AnsiString(GetSharedUnixBase()).c_str());
  }
  setenv(kVariable, kept.c_str(), 1);
}

TEST(SharedUnixObject, PathIsBaseDirectoryAndNameAndTheDirectoryExists) {
  TempDir dir;
  setenv(kVariable, (dir / "base").c_str(), 1);
  EXPECT_EQ(dir / "base/things/name", BuildSharedUnixFilePath(L"things", L"name").c_str());
  EXPECT_EQ(ModeOf(dir / "base"), 0777);
  EXPECT_EQ(ModeOf(dir / "base/things"), 0777);
  EXPECT_FALSE(vlt::test::Exists(dir / "base/things/name"));
  EXPECT_EQ(dir / "base/things/n", BuildSharedUnixFilePath(L"things/", L"n").c_str());
}

// ---- directories

TEST(SharedUnixObject, ModesStandUnderEveryUmask) {
  for (mode_t mask : {077, 0, 022, 0777}) {
    TempDir dir;
    Child child([&] {
      umask(mask);
      CreateSharedUnixDir(Wide(dir / "a/b/"));
      Open(dir / "a/b/file");
      return umask(mask) == mask ? 0 : 1;  // and the umask is as it was
    });
    EXPECT_EQ(child.wait(), 0);
    EXPECT_EQ(ModeOf(dir / "a"), 0777) << mask;
    EXPECT_EQ(ModeOf(dir / "a/b"), 0777) << mask;
    EXPECT_EQ(ModeOf(dir / "a/b/file"), 0666) << mask;
  }
}

TEST(SharedUnixObject, ExistingObjectsAreOpenedToAllAtEachCall) {
  TempDir dir;
  mkdir((dir / "d").c_str(), 0700);
  WriteBytes(dir / "d/file", "kept");
  chmod((dir / "d/file").c_str(), 0600);
  CreateSharedUnixDir(Wide(dir / "d/"));
  Open(dir / "d/file");
  EXPECT_EQ(ModeOf(dir / "d"), 0777);
  EXPECT_EQ(ModeOf(dir / "d/file"), 0666);
  EXPECT_EQ(ReadBytes(dir / "d/file"), "kept");
}

TEST(SharedUnixObject, FileInTheDirectorysPlaceIsENOTDIR) {
  TempDir dir;
  WriteBytes(dir / "d", "x");
  EXPECT_EQ(PosixErrorOf([&] { CreateSharedUnixDir(Wide(dir / "d/")); }), ENOTDIR);
  EXPECT_EQ(PosixErrorOf([&] { CreateSharedUnixDir(Wide(dir / "d/sub/")); }), ENOTDIR);
  setenv(kVariable, dir.path().c_str(), 1);
  EXPECT_EQ(PosixErrorOf([] { BuildSharedUnixFilePath(L"d", L"name"); }), ENOTDIR);
  EXPECT_EQ(ReadBytes(dir / "d"), "x");
}

// The last component of such a path is not made, however often it is asked for.
TEST(SharedUnixObject, PathThatEndsInNoDirectoryIsENOTDIR) {
  TempDir dir;
  Child child([&] {
    if (PosixErrorOf([&] { CreateSharedUnixDir(Wide(dir / "a/b")); }) != ENOTDIR) return 1;
    String zero = Wide(dir / "c/d") + String(L"\0/e/", 4);
    if (PosixErrorOf([&] { CreateSharedUnixDir(zero); }) != ENOTDIR) return 2;
    setenv(kVariable, dir.path().c_str(), 1);
    String name(L"f\0g", 3);
    return PosixErrorOf([&] { BuildSharedUnixFilePath(name, L"name"); }) == ENOTDIR ? 0 : 3;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ModeOf(dir / "a"), 0777);
  EXPECT_FALSE(vlt::test::Exists(dir / "a/b"));
}

TEST(SharedUnixObject, DirectoryNeedsNoSlashAtTheEndOnceItIsThere) {
  TempDir dir;
  ASSERT_EQ(mkdir((dir / "d").c_str(), 0700), 0);
  CreateSharedUnixDir(Wide(dir / "d"));
  EXPECT_EQ(ModeOf(dir / "d"), 0777);
}

TEST(SharedUnixObject, LinkInTheDirectorysPlaceIsNotFollowed) {
  TempDir dir;
  ASSERT_EQ(mkdir((dir / "target").c_str(), 0700), 0);
  ASSERT_EQ(symlink("target", (dir / "d").c_str()), 0);
  EXPECT_EQ(PosixErrorOf([&] { CreateSharedUnixDir(Wide(dir / "d/")); }), ENOTDIR);
  EXPECT_EQ(ModeOf(dir / "target"), 0700);
}

TEST(SharedUnixObject, RefusedDirectoryIsAccessDenied) {
  EXPECT_THROW(CreateSharedUnixDir(L"/proc/no/such/"), exception::AccessDenied);
}

TEST(SharedUnixObject, SimultaneousStartsAllSucceed) {
  for (int round = 0; round < 20; ++round) {
    TempDir dir;
    vlt::test::Signal go;
    std::vector<Child> children;
    for (int i = 0; i < 6; ++i) {
      children.emplace_back([&] {
        if (!go.await()) return 1;
        CreateSharedUnixDir(Wide(dir / "a/b/c/d/"));
        Open(dir / "a/b/c/d/file");
        return 0;
      });
    }
    for (int i = 0; i < 6; ++i) go.notify();
    for (Child& child : children) EXPECT_EQ(child.wait(), 0);
    EXPECT_EQ(ModeOf(dir / "a/b/c/d"), 0777);
  }
}

TEST(SharedUnixObject, DirectoryOfAnotherUserIsUsedAsItIs) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  TempDir dir;
  chmod(dir.path().c_str(), 0755);
  ASSERT_EQ(mkdir((dir / "d").c_str(), 0755), 0);
  chmod((dir / "d").c_str(), 0755);
  ASSERT_EQ(mkdir((dir / "unreadable").c_str(), 0711), 0);
  chmod((dir / "unreadable").c_str(), 0711);
  Child child([&] {
    if (setresuid(kSomeUser, kSomeUser, kSomeUser) != 0) return 1;
    CreateSharedUnixDir(Wide(dir / "d/"));
    CreateSharedUnixDir(Wide(dir / "unreadable/"));
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ModeOf(dir / "d"), 0755);
  EXPECT_EQ(ModeOf(dir / "unreadable"), 0711);
}

TEST(SharedUnixObject, OwnDirectoryThatMayNotBeReadIsOpenedToAll) {
  if (vlt::test::kPlainPosix)
    GTEST_SKIP() << "NOT TESTED: POSIX cannot hold what the caller may not read";
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  TempDir dir;
  chmod(dir.path().c_str(), 0777);
  Child child([&] {
    if (setresuid(kSomeUser, kSomeUser, kSomeUser) != 0) return 1;
    mkdir((dir / "d").c_str(), 0300);
    CreateSharedUnixDir(Wide(dir / "d/"));
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ModeOf(dir / "d"), 0777);
}

// ---- files

TEST(SharedUnixObject, DescriptorReadsWritesAndClosesOnExec) {
  TempDir dir;
  ScopedFd fd(CreateSharedUnixFile(AnsiString((dir / "f").c_str())));
  EXPECT_EQ(O_RDWR, fcntl(fd.get(), F_GETFL) & O_ACCMODE);
  EXPECT_EQ(FD_CLOEXEC, fcntl(fd.get(), F_GETFD));
  EXPECT_EQ(write(fd.get(), "abc", 3), 3);
  Open(dir / "f");
  EXPECT_EQ(ReadBytes(dir / "f"), "abc");  // opening again cuts nothing
}

TEST(SharedUnixObject, FileOfAnotherUserIsUsedThoughItsModeCannotBeSet) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  TempDir dir;
  chmod(dir.path().c_str(), 0777);
  WriteBytes(dir / "f", "x");
  ASSERT_EQ(chown((dir / "f").c_str(), kSomeUser, kSomeUser), 0);
  ASSERT_EQ(chmod((dir / "f").c_str(), 0667), 0);
  Child child([&] {
    if (setresuid(kOtherUser, kOtherUser, kOtherUser) != 0) return 1;
    ScopedFd fd(CreateSharedUnixFile(AnsiString((dir / "f").c_str())));
    return write(fd.get(), "y", 1) == 1 ? 0 : 2;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ModeOf(dir / "f"), 0667);
  EXPECT_EQ(ReadBytes(dir / "f"), "y");
}

TEST(SharedUnixObject, RefusedFileIsTriedThreeTimes) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  TempDir dir;
  chmod(dir.path().c_str(), 0777);
  WriteBytes(dir / "f", "x");
  ASSERT_EQ(chmod((dir / "f").c_str(), 0600), 0);
  Child child([&] {
    if (setresuid(kSomeUser, kSomeUser, kSomeUser) != 0) return 1;
    int before = vlt::test::OpenDescriptors();
    auto start = std::chrono::steady_clock::now();
    if (PosixErrorOf([&] { Open(dir / "f"); }) != EACCES) return 2;
    // Two pauses of a millisecond lie between three attempts.
    if (std::chrono::steady_clock::now() - start < std::chrono::milliseconds(2)) return 3;
    return vlt::test::OpenDescriptors() == before ? 0 : 4;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(SharedUnixObject, WhatIsNoFileOfItsOwnIsRefusedOrMovedAside) {
  TempDir dir;
  dir.makeDir("directory/inside");
  ASSERT_EQ(mkfifo((dir / "fifo").c_str(), 0600), 0);
  WriteBytes(dir / "victim", "x");
  chmod((dir / "victim").c_str(), 0600);
  ASSERT_EQ(symlink("victim", (dir / "link").c_str()), 0);
  ASSERT_EQ(symlink("nowhere", (dir / "dangling").c_str()), 0);
  ASSERT_EQ(link((dir / "victim").c_str(), (dir / "hard").c_str()), 0);
  int before = vlt::test::OpenDescriptors();
  const std::pair<const char*, int> rows[] = {{"directory", EISDIR},
                                              {"fifo", ENXIO},
                                              {"link", ELOOP},
                                              {"dangling", ELOOP},
                                              {"hard", EMLINK}};
  for (const auto& [name, error] : rows) {
    EXPECT_EQ(error, PosixErrorOf([&, name = name] { Open(dir / name); })) << name;
    EXPECT_FALSE(vlt::test::Exists(dir / (std::string(name) + ".bad"))) << name;
    ScopedFd moved(CreateSharedUnixFile(AnsiString((dir / name).c_str()), InTheWay::MovedAside));
    EXPECT_EQ(ModeOf(dir / name), 0666) << name;
    EXPECT_TRUE(vlt::test::Exists(dir / (std::string(name) + ".bad"))) << name;
  }
  EXPECT_EQ(PosixErrorOf([&] { Open(dir / "missing/f"); }), ENOENT);
  EXPECT_EQ(PosixErrorOf([&] { Open(dir / std::string(256, 'x')); }), ENAMETOOLONG);
  EXPECT_EQ(before, vlt::test::OpenDescriptors());
  EXPECT_EQ(ModeOf(dir / "victim"), 0600);
  EXPECT_EQ(ModeOf(dir / "fifo.bad"), 0600);
  EXPECT_TRUE(vlt::test::Exists(dir / "directory.bad/inside"));
  EXPECT_FALSE(vlt::test::Exists(dir / "nowhere"));
}

TEST(SharedUnixObject, WhatThisUserMayNotMoveIsNamed) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  TempDir dir;
  chmod(dir.path().c_str(), 0755);
  ASSERT_EQ(mkfifo((dir / "fifo").c_str(), 0666), 0);
  Child child([&] {
    if (setresuid(kSomeUser, kSomeUser, kSomeUser) != 0) return 1;
    try {
      CreateSharedUnixFile(AnsiString((dir / "fifo").c_str()), InTheWay::MovedAside);
    } catch (const PosixError& error) {
      if (error.whatcode() != ENXIO) return 2;
      return std::string(error.what()).find(dir / "fifo") == std::string::npos ? 3 : 0;
    }
    return 4;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(SharedUnixObject, FailureToSetTheModeIsAlwaysEPERM) {
  TempDir dir;
  dir.makeDir("d");
  Child child([&] {
    if (!vlt::test::FailSystemCall(SYS_fchmod, EIO)) return 1;
    int before = vlt::test::OpenDescriptors();
    if (PosixErrorOf([&] { Open(dir / "f"); }) != EPERM) return 2;
    if (vlt::test::OpenDescriptors() != before) return 3;
    // A directory's failure keeps its own number.
    return PosixErrorOf([&] { CreateSharedUnixDir(Wide(dir / "d/")); }) == EIO ? 0 : 4;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(SharedUnixObject, RefusedModeIsAcceptedForFilesAndDirectories) {
  TempDir dir;
  dir.makeDir("d");
  Child child([&] {
    if (!vlt::test::FailSystemCall(SYS_fchmod, EPERM)) return 1;
    CreateSharedUnixDir(Wide(dir / "d/"));
    Open(dir / "d/f");
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
}

// ---- identity

TEST(SharedUnixObject, IdentityTellsWhetherThePathStillNamesTheFile) {
  TempDir dir;
  AnsiString path((dir / "f").c_str());
  FileIdentity identity;
  ScopedFd fd(CreateSharedUnixFile(path, InTheWay::Refused, &identity));
  EXPECT_TRUE(identity.isNamedBy(path));
  ASSERT_EQ(unlink(path.c_str()), 0);
  EXPECT_FALSE(identity.isNamedBy(path));
  WriteBytes(path.c_str(), "another");
  EXPECT_FALSE(identity.isNamedBy(path));
  ASSERT_EQ(unlink(path.c_str()), 0);
  ASSERT_EQ(symlink(("/proc/self/fd/" + std::to_string(fd.get())).c_str(), path.c_str()), 0);
  EXPECT_FALSE(identity.isNamedBy(path));  // a link to it is not it
  EXPECT_FALSE(identity.isNamedBy(AnsiString((dir / "no/f").c_str())));
}

}  // namespace
}  // namespace zt::fnd::osdep

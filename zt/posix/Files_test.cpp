#include "zt/posix/Files.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/TempDir.h"

namespace zt::posix {
namespace {

using vlt::test::Child;
using vlt::test::Exists;
using vlt::test::ModeOf;
using vlt::test::ReadBytes;
using vlt::test::TempDir;
using vlt::test::WriteBytes;

constexpr uid_t kUser = 12345, kOther = 12346;

#define NEEDS_ROOT()                                                              \
  if (geteuid() != 0) {                                                           \
    GTEST_SKIP() << "NOT TESTED: needs files of several users, so the superuser"; \
  }

std::string Contents(const ScopedFd& fd) {
  char text[64];
  ssize_t length = fd ? read(fd.get(), text, sizeof text) : -1;
  return length < 0 ? "(closed)" : std::string(text, static_cast<size_t>(length));
}

std::string Read(const std::string& path) { return Contents(OpenExisting(path.c_str(), O_RDONLY)); }

// A directory with "target/secret", readable by its owner only, and a link to it; both owners given.
struct LinkedPlace {
  TempDir dir;
  std::string secret = dir.makeDir("target") + "/secret";
  std::string toFile = dir / "to-file", throughDirectory = dir / "to-directory";

  LinkedPlace(uid_t linkOwner, uid_t targetOwner) {
    chmod(dir.path().c_str(), 0777);
    WriteBytes(secret, "secret");
    chmod(secret.c_str(), 0600);
    EXPECT_EQ(symlink("target/secret", toFile.c_str()), 0);
    EXPECT_EQ(symlink("target", throughDirectory.c_str()), 0);
    throughDirectory += "/secret";
    EXPECT_EQ(chown((dir / "target").c_str(), targetOwner, targetOwner), 0);
    EXPECT_EQ(chown(secret.c_str(), targetOwner, targetOwner), 0);
    EXPECT_EQ(lchown(toFile.c_str(), linkOwner, linkOwner), 0);
    EXPECT_EQ(lchown((dir / "to-directory").c_str(), linkOwner, linkOwner), 0);
  }
};

TEST(Files, LinksCountByTheirOwners) {
  NEEDS_ROOT();
  const struct {
    uid_t link, target;
    bool counts;
  } rows[] = {{0, 0, true},
              {0, kUser, true},
              {kUser, kUser, true},
              {kUser, 0, false},
              {kUser, kOther, false}};
  for (const auto& row : rows) {
    LinkedPlace place(row.link, row.target);
    for (const std::string& path : {place.toFile, place.throughDirectory}) {
      errno = 0;
      EXPECT_EQ(Read(path), row.counts ? "secret" : "(closed)") << path << row.link << row.target;
      if (!row.counts) {
        EXPECT_EQ(errno, ELOOP) << path;
      }
    }
  }
}

TEST(Files, TheCallersOwnLinksCount) {
  NEEDS_ROOT();
  LinkedPlace place(kUser, kOther);
  chmod(place.secret.c_str(), 0644);
  Child child([&] {
    if (setresuid(kUser, kUser, kUser) != 0) return 1;
    if (Read(place.toFile) != "secret") return 2;
    return Read(place.throughDirectory) == "secret" ? 0 : 3;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(Files, TheRuleHoldsWithoutTheKernelsOwnWalk) {
  NEEDS_ROOT();
  LinkedPlace good(0, kUser), bad(kUser, 0);
  Child child([&] {
    if (!vlt::test::FailSystemCall(SYS_openat2, ENOSYS)) return 1;
    if (Read(good.secret) != "secret" || Read(good.toFile) != "secret") return 2;
    if (Read(good.throughDirectory) != "secret") return 3;
    if (Read(bad.toFile) != "(closed)" || errno != ELOOP) return 4;
    return Read(bad.throughDirectory) == "(closed)" && errno == ELOOP ? 0 : 5;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(Files, ChainsAndCirclesOfLinks) {
  TempDir dir;
  WriteBytes(dir / "file", "x");
  ASSERT_EQ(symlink("file", (dir / "0").c_str()), 0);
  for (int i = 1; i < 60; ++i) {
    ASSERT_EQ(symlink(std::to_string(i - 1).c_str(), (dir / std::to_string(i)).c_str()), 0);
  }
  EXPECT_EQ(Read(dir / "30"), "x");
  EXPECT_EQ(Read(dir / "59"), "(closed)");
  EXPECT_EQ(errno, ELOOP);
  ASSERT_EQ(symlink("circle", (dir / "circle").c_str()), 0);
  EXPECT_EQ(Read(dir / "circle"), "(closed)");
  EXPECT_EQ(errno, ELOOP);
}

TEST(Files, PathsAreReadAsTheSystemReadsThem) {
  TempDir dir;
  dir.makeDir("a/b");
  WriteBytes(dir / "a/file", "x");
  ASSERT_EQ(symlink(dir.path().c_str(), (dir / "a/up").c_str()), 0);
  const struct {
    const char* path;
    int error;
  } rows[] = {{"a/file", 0},
              {"a//./b/../file", 0},
              {"a/up/a/file", 0},
              {"a/up/a/file/", ENOTDIR},
              {"a/up/a/nothing", ENOENT},
              {"a/up/a/b", EISDIR},
              {"a/file/x", ENOTDIR},
              {"", EISDIR}};
  for (const auto& row : rows) {
    errno = 0;
    std::string path = dir / row.path;
    EXPECT_EQ(OpenExisting(path.c_str(), O_RDONLY).valid(), row.error == 0) << row.path;
    if (row.error != 0) {
      EXPECT_EQ(errno, row.error) << row.path;
    }
  }
  std::string component(NAME_MAX + 1, 'n');
  EXPECT_FALSE(OpenExisting((dir / "a/up/" + component).c_str(), O_RDONLY));
  EXPECT_EQ(errno, ENAMETOOLONG);
}

TEST(Files, BelowADirectoryThatMayNotBeEnteredAllIsEACCES) {
  TempDir dir;
  chmod(dir.path().c_str(), 0777);
  const std::string closed = dir.makeDir("closed");
  WriteBytes(closed + "/file", "x");
  chmod(closed.c_str(), 0);
  Child child([&] {
    if (geteuid() == 0 && setresuid(kUser, kUser, kUser) != 0) return 1;
    if (OpenExisting((closed + "/file").c_str(), O_RDONLY) || errno != EACCES) return 2;
    return !CreateNew((closed + "/new").c_str(), O_RDWR, 0666) && errno == EACCES ? 0 : 3;
  });
  EXPECT_EQ(child.wait(), 0);
  chmod(closed.c_str(), 0700);
}

TEST(Files, AFileThatIsReplacedAllTheTimeIsOpened) {
  TempDir dir;
  const std::string file = dir / "file", other = dir / "other";
  WriteBytes(file, "x");
  vlt::test::Signal replaced;
  Child replacer([&] {
    for (bool isFirst = true;; isFirst = false) {
      ScopedFd(open(other.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0666));
      rename(other.c_str(), file.c_str());
      if (isFirst) replaced.notify();
    }
    return 0;
  });
  ASSERT_TRUE(replaced.await());
  for (int i = 0; i < 3000; ++i) {
    ASSERT_TRUE(OpenExisting(file.c_str(), O_RDWR)) << i << ": " << strerror(errno);
  }
}

TEST(Files, WhatIsNoRegularFileIsNeverOpened) {
  TempDir dir;
  ASSERT_EQ(mkfifo((dir / "fifo").c_str(), 0666), 0);
  Child child([&] {
    // Opened for reading and writing even a pipe without a partner would open at once.
    int before = vlt::test::OpenDescriptors();
    if (OpenExisting((dir / "fifo").c_str(), O_RDWR) || errno != ENXIO) return 1;
    if (OpenExisting("/dev/null", O_RDWR) || errno != ENXIO) return 2;
    if (OpenOrCreate((dir / "fifo").c_str(), O_RDWR, 0666)) return 3;
    if (OpenExisting(dir.path().c_str(), O_RDONLY) || errno != EISDIR) return 4;
    if (!OpenExisting(dir.path().c_str(), O_RDONLY, Kind::FileOrDirectory)) return 5;
    return vlt::test::OpenDescriptors() == before ? 0 : 6;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(Files, DescriptorsAreThreeOrMoreAndCloseOnExec) {
  TempDir dir;
  WriteBytes(dir / "old", "x");
  Child child([&] {
    for (int fd = 0; fd < 3; ++fd) close(fd);
    ScopedFd fds[] = {OpenExisting((dir / "old").c_str(), O_RDONLY),
                      CreateNew((dir / "new").c_str(), O_WRONLY, 0666),
                      OpenOrCreate((dir / "newer").c_str(), O_WRONLY, 0666),
                      OpenDirectory(dir.path().c_str())};
    for (const ScopedFd& fd : fds) {
      if (fd.get() < 3) return 1;
      if (fcntl(fd.get(), F_GETFD) != FD_CLOEXEC) return 2;
    }
    for (int fd = 0; fd < 3; ++fd) {
      if (fcntl(fd, F_GETFD) != -1) return 3;
    }
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(Files, NothingIsMadeWhereADanglingLinkLeads) {
  TempDir dir;
  ASSERT_EQ(symlink("nowhere", (dir / "link").c_str()), 0);
  EXPECT_FALSE(CreateNew((dir / "link").c_str(), O_WRONLY, 0666));
  EXPECT_EQ(errno, EEXIST);
  EXPECT_FALSE(OpenOrCreate((dir / "link").c_str(), O_WRONLY, 0666));
  EXPECT_EQ(errno, ELOOP);
  EXPECT_FALSE(Exists(dir / "nowhere"));
}

TEST(Files, EntriesAreThoseOfTheDirectoryThatWasLookedUp) {
  NEEDS_ROOT();
  LinkedPlace place(kUser, 0);
  std::string inside = place.throughDirectory;
  EXPECT_EQ(Unlink(inside.c_str()), -1);
  EXPECT_EQ(errno, ELOOP);
  EXPECT_EQ(Rename(inside.c_str(), (place.dir / "stolen").c_str()), -1);
  EXPECT_EQ(Link(inside.c_str(), (place.dir / "second").c_str()), -1);
  EXPECT_EQ(SetSharedMode(inside.c_str(), 0777), -1);
  EXPECT_FALSE(CreateNew((inside + ".new").c_str(), O_WRONLY, 0666));
  EXPECT_EQ(ReadBytes(place.secret), "secret");
  EXPECT_EQ(ModeOf(place.secret), 0600);
  EXPECT_EQ(SetSharedMode(place.toFile.c_str(), 0777), 0);  // the link is left alone
  EXPECT_EQ(ModeOf(place.secret), 0600);
}

TEST(Files, ModesOfFilesWithTwoNamesOrOfOthersStay) {
  NEEDS_ROOT();
  TempDir dir;
  WriteBytes(dir / "linked", "x");
  WriteBytes(dir / "foreign", "x");
  WriteBytes(dir / "own", "x");
  for (const char* name : {"linked", "foreign", "own"}) chmod((dir / name).c_str(), 0600);
  ASSERT_EQ(link((dir / "linked").c_str(), (dir / "second").c_str()), 0);
  ASSERT_EQ(chown((dir / "foreign").c_str(), kUser, kUser), 0);
  EXPECT_EQ(SetSharedMode((dir / "linked").c_str(), 0777), -1);
  EXPECT_EQ(errno, EMLINK);
  EXPECT_EQ(SetSharedMode((dir / "foreign").c_str(), 0777), -1);
  EXPECT_EQ(errno, EPERM);
  EXPECT_EQ(SetSharedMode((dir / "own").c_str(), 0777), 0);
  EXPECT_EQ(ModeOf(dir / "linked"), 0600);
  EXPECT_EQ(ModeOf(dir / "foreign"), 0600);
  EXPECT_EQ(ModeOf(dir / "own"), 0777);
}

TEST(Files, MoveAsideReplacesNothing) {
  TempDir dir;
  for (const char* bytes : {"first", "second", "third"}) {
    WriteBytes(dir / "f", bytes);
    EXPECT_EQ(MoveAside((dir / "f").c_str()), 0);
  }
  EXPECT_EQ(ReadBytes(dir / "f.bad"), "first");
  EXPECT_EQ(ReadBytes(dir / "f.1.bad"), "second");
  EXPECT_EQ(ReadBytes(dir / "f.2.bad"), "third");
  EXPECT_EQ(MoveAside((dir / "f").c_str()), -1);
  EXPECT_EQ(errno, ENOENT);
}

TEST(Files, MoveAsideTakesAStamp) {
  TempDir dir;
  for (const char* bytes : {"first", "second"}) {
    WriteBytes(dir / "f", bytes);
    EXPECT_EQ(MoveAside((dir / "f").c_str(), "_11222026"), 0);
  }
  EXPECT_EQ(ReadBytes(dir / "f_11222026.bad"), "first");
  EXPECT_EQ(ReadBytes(dir / "f_11222026.1.bad"), "second");
}

TEST(Files, LinksInTheLastPlaceAreRefusedOnRequest) {
  TempDir dir;
  WriteBytes(dir / "f", "x");
  ASSERT_EQ(symlink("f", (dir / "link").c_str()), 0);
  EXPECT_EQ(Contents(OpenExisting((dir / "link").c_str(), O_RDONLY)), "x");
  EXPECT_FALSE(OpenExisting((dir / "link").c_str(), O_RDONLY, Kind::File, LastLink::Refused));
  EXPECT_EQ(errno, ELOOP);
  EXPECT_EQ(Contents(OpenExisting((dir / "f").c_str(), O_RDONLY, Kind::File, LastLink::Refused)),
            "x");
  EXPECT_FALSE(OpenOrCreate((dir / "link").c_str(), O_RDONLY, 0600, LastLink::Refused));
  EXPECT_EQ(errno, ELOOP);
}

TEST(Files, AnEntryThatIsALinkIsLookedUpItself) {
  TempDir dir;
  dir.makeDir("d");
  ASSERT_EQ(symlink("d", (dir / "link").c_str()), 0);
  ScopedFd directory = OpenDirectory(LookUp(dir.path().c_str()).fd.get());
  ASSERT_TRUE(directory);
  Found link = LookUpEntry(directory.get(), "link");
  struct stat info = {};
  ASSERT_TRUE(link.examine(&info));
  EXPECT_TRUE(S_ISLNK(info.st_mode));
  EXPECT_FALSE(LookUpEntry(directory.get(), "link", O_DIRECTORY));
  EXPECT_EQ(errno, ENOTDIR);
  EXPECT_TRUE(LookUpEntry(directory.get(), "d", O_DIRECTORY));
}

TEST(Files, MakeRoomRemovesFilesAndMovesDirectoriesAside) {
  TempDir dir;
  WriteBytes(dir / "f", "x");
  EXPECT_EQ(MakeRoom((dir / "f").c_str()), 0);
  EXPECT_FALSE(Exists(dir / "f"));
  EXPECT_EQ(MakeRoom((dir / "f").c_str()), 0);
  dir.makeDir("f/inside");
  EXPECT_EQ(MakeRoom((dir / "f").c_str()), 0);
  EXPECT_TRUE(Exists(dir / "f.bad/inside"));
}

TEST(Files, WritesGoOnAfterShortOnes) {
  TempDir dir;
  int ends[2];
  ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
  ScopedFd out(ends[0]), in(ends[1]);
  const std::string data(300000, 'x');  // more than a pipe holds
  Child child([&] { return WriteAll(in.get(), data.data(), data.size()) ? 0 : 1; });
  in.reset();
  size_t total = 0;
  char block[4096];
  for (ssize_t got; (got = read(out.get(), block, sizeof block)) > 0;) {
    total += static_cast<size_t>(got);
  }
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(total, data.size());
}

TEST(Files, FlockFailsWithErrnoWhileAnotherHasTheLock) {
  TempDir dir;
  ScopedFd a = OpenOrCreate((dir / "f").c_str(), O_RDWR, 0600);
  ScopedFd b = OpenOrCreate((dir / "f").c_str(), O_RDWR, 0600);
  ASSERT_EQ(Flock(a.get(), LOCK_EX), 0);
  EXPECT_EQ(Flock(b.get(), LOCK_EX | LOCK_NB), -1);
  EXPECT_EQ(errno, EWOULDBLOCK);
  EXPECT_EQ(Flock(a.get(), LOCK_UN), 0);
  EXPECT_EQ(Flock(b.get(), LOCK_EX | LOCK_NB), 0);
}

TEST(Files, SyncReportsRealFailuresOnly) {
  TempDir dir;
  WriteBytes(dir / "f", "x");
  const struct {
    int error;
    bool done;
  } rows[] = {{EINVAL, true}, {ENOSYS, true}, {EROFS, true}, {EIO, false}, {ENOSPC, false}};
  for (const auto& row : rows) {
    Child child([&] {
      if (!vlt::test::FailSystemCall(SYS_fsync, row.error)) return 1;
      ScopedFd fd = OpenExisting((dir / "f").c_str(), O_RDONLY);
      if (Sync(fd.get()) != row.done) return 2;
      if (SyncDirectoryOf((dir / "f").c_str()) != row.done) return 3;
      return SyncDirectory(dir.path().c_str()) == row.done ? 0 : 4;
    });
    EXPECT_EQ(child.wait(), 0) << row.error;
  }
  EXPECT_FALSE(SyncDirectory((dir / "missing").c_str()));
}

}  // namespace
}  // namespace zt::posix

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/EventPlace.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/path.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::Exists;
using vlt::test::ModeOf;
using vlt::test::PosixErrorOf;
using vlt::test::ReadBytes;
using vlt::test::TempDir;
using vlt::test::Wide;
using vlt::test::WriteBytes;

ino_t InodeOf(const std::string& path) {
  struct stat info = {};
  stat(path.c_str(), &info);
  return info.st_ino;
}

TEST(pathTree, RemoveDirForceTakesHiddenEntriesAndLinksButNotTheirTargets) {
  TempDir dir;
  WriteBytes(dir.makeDir("keep") + "/file", "kept");
  std::string top = dir.makeDir("top");
  WriteBytes(dir.makeDir("top/sub/.deep") + "/f", "x");
  WriteBytes(top + "/.hidden", "x");
  ASSERT_EQ(symlink("../keep", (top + "/link").c_str()), 0);
  ASSERT_EQ(symlink("nowhere", (top + "/dangling").c_str()), 0);
  ASSERT_EQ(mkfifo((top + "/fifo").c_str(), 0600), 0);
  path::RemoveDirForce(Wide(top).c_str());
  EXPECT_FALSE(Exists(top));
  EXPECT_EQ(ReadBytes(dir / "keep/file"), "kept");
}

TEST(pathTree, RemoveDirForceOfALinkRemovesTheLinkOnlyWithOrWithoutSlash) {
  TempDir dir;
  WriteBytes(dir.makeDir("target") + "/file", "kept");
  for (const char* name : {"link", "link/", "link//"}) {
    ASSERT_EQ(symlink("target", (dir / "link").c_str()), 0);
    path::RemoveDirForce(Wide(dir / name).c_str());
    EXPECT_FALSE(Exists(dir / "link")) << name;
    EXPECT_EQ(ReadBytes(dir / "target/file"), "kept") << name;
  }
  path::RemoveDirForce(Wide(dir / "target/").c_str());
  EXPECT_FALSE(Exists(dir / "target"));
}

TEST(pathTree, RemoveDirForceOfWhatIsNoDirectory) {
  TempDir dir;
  WriteBytes(dir / "file", "x");
  EXPECT_THROW(path::RemoveDirForce(Wide(dir / "missing").c_str()),
               exception::NonexistentException);
  EXPECT_THROW(path::RemoveDirForce(Wide(dir / "file").c_str()), exception::NonexistentException);
  EXPECT_THROW(path::RemoveDirForce(L"relative"), exception::NonexistentException);
  EXPECT_THROW(path::RemoveDirForce(nullptr), exception::NonexistentException);
}

TEST(pathTree, RenameReplacesTheTarget) {
  TempDir dir;
  WriteBytes(dir / "from", "new");
  WriteBytes(dir / "to", "old");
  ino_t inode = InodeOf(dir / "from");
  path::RenameFile(Wide(dir / "from"), Wide(dir / "to"));
  EXPECT_EQ(ReadBytes(dir / "to"), "new");
  EXPECT_EQ(inode, InodeOf(dir / "to"));
  EXPECT_FALSE(Exists(dir / "from"));
}

TEST(pathTree, RenameToANameOfOtherCaseDoesNothing) {
  TempDir dir;
  WriteBytes(dir / "File", "x");
  path::RenameFile(Wide(dir / "File"), Wide(dir / "FILE"));
  EXPECT_TRUE(Exists(dir / "File"));
  EXPECT_FALSE(Exists(dir / "FILE"));
  path::RenameFile(Wide(dir / "missing"), Wide(dir / "MISSING"));
}

TEST(pathTree, RenameFailures) {
  TempDir dir;
  WriteBytes(dir / "file", "x");
  EXPECT_THROW(path::RenameFile(L"a", Wide(dir / "b")), exception::InvalidArgument);
  EXPECT_THROW(path::RenameFile(Wide(dir / "file"), L"b"), exception::InvalidArgument);
  EXPECT_EQ(PosixErrorOf([&] { path::RenameFile(Wide(dir / "no"), Wide(dir / "x")); }), ENOENT);
  dir.makeDir("d");
  EXPECT_EQ(PosixErrorOf([&] { path::RenameFile(Wide(dir / "file"), Wide(dir / "d")); }), EISDIR);
  EXPECT_EQ(ReadBytes(dir / "file"), "x");
}

constexpr const char* kOneFileSystem =
    "NOT TESTED: no second file system to write to on this machine";

// A directory of another file system than the temporary one, if this machine has one to write to.
class OtherFileSystem {
 public:
  explicit OtherFileSystem(const std::string& here) {
    struct stat mine = {}, other = {};
    stat(here.c_str(), &mine);
    for (const char* candidate : {"/dev/shm", "/run/shm", "/tmp", "/var/tmp", "/run"}) {
      if (stat(candidate, &other) != 0 || other.st_dev == mine.st_dev) continue;
      std::string name = std::string(candidate) + "/vlt.XXXXXX";
      if (mkdtemp(name.data())) {
        m_path = name;
        return;
      }
    }
  }
  ~OtherFileSystem() {
    if (!m_path.empty()) std::filesystem::remove_all(m_path);
  }
  const std::string& path() const { return m_path; }

 private:
  std::string m_path;
};

TEST(pathTree, RenameBetweenFileSystemsCopiesAndRemoves) {
  TempDir dir;
  OtherFileSystem other(dir.path());
  if (other.path().empty()) GTEST_SKIP() << kOneFileSystem;
  std::string bytes(100000, 'b');
  WriteBytes(dir / "from", bytes);
  WriteBytes(other.path() + "/to", "old and to be replaced");
  path::RenameFile(Wide(dir / "from"), Wide(other.path() + "/to"));
  EXPECT_EQ(bytes, ReadBytes(other.path() + "/to"));
  EXPECT_EQ(ModeOf(other.path() + "/to"), 0600);
  EXPECT_FALSE(Exists(dir / "from"));
}

TEST(pathTree, RenameOfADirectoryBetweenFileSystemsFailsToRead) {
  TempDir dir;
  OtherFileSystem other(dir.path());
  if (other.path().empty()) GTEST_SKIP() << kOneFileSystem;
  dir.makeDir("d");
  EXPECT_THROW(path::RenameFile(Wide(dir / "d"), Wide(other.path() + "/d")),
               exception::FileReadFailed);
  EXPECT_TRUE(Exists(dir / "d"));
}

TEST(pathTree, RenameThatCannotRemoveTheSourceTakesTheCopyBack) {
  TempDir dir;
  OtherFileSystem other(dir.path());
  if (other.path().empty()) GTEST_SKIP() << kOneFileSystem;
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  WriteBytes(dir.makeDir("ro") + "/from", "x");
  chmod((dir / "ro/from").c_str(), 0644);
  chmod((dir / "ro").c_str(), 0755);
  chmod(dir.path().c_str(), 0755);
  chmod(other.path().c_str(), 0777);
  vlt::test::Child child([&] {
    if (setresuid(65534, 65534, 65534) != 0) return 1;
    int error =
        PosixErrorOf([&] { path::RenameFile(Wide(dir / "ro/from"), Wide(other.path() + "/to")); });
    return error == EACCES ? 0 : 2;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_TRUE(Exists(dir / "ro/from"));
  EXPECT_FALSE(Exists(other.path() + "/to"));
}

TEST(pathTree, RenameBetweenFileSystemsKeepsTheSourceUntilTheCopyIsOnTheDisk) {
  TempDir dir;
  OtherFileSystem other(dir.path());
  if (other.path().empty()) GTEST_SKIP() << kOneFileSystem;
  WriteBytes(dir / "from", "bytes");
  vlt::test::Child child([&] {
    if (!vlt::test::FailSystemCall(SYS_fsync, EIO)) return 1;
    auto rename = [&] { path::RenameFile(Wide(dir / "from"), Wide(other.path() + "/to")); };
    return PosixErrorOf(rename) == EIO ? 0 : 2;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ReadBytes(dir / "from"), "bytes");
  EXPECT_FALSE(Exists(other.path() + "/to"));
}

TEST(pathTree, RenameToAFileSystemWithoutFsyncMovesTheFile) {
  TempDir dir;
  OtherFileSystem other(dir.path());
  if (other.path().empty()) GTEST_SKIP() << kOneFileSystem;
  WriteBytes(dir / "from", "bytes");
  vlt::test::Child child([&] {
    if (!vlt::test::FailSystemCall(SYS_fsync, EINVAL)) return 1;
    path::RenameFile(Wide(dir / "from"), Wide(other.path() + "/to"));
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_FALSE(Exists(dir / "from"));
  EXPECT_EQ(ReadBytes(other.path() + "/to"), "bytes");
}

TEST(pathTree, RenameOfALinkOntoItsTargetInAnotherFileSystemKeepsTheBytes) {
  TempDir dir;
  OtherFileSystem other(dir.path());
  if (other.path().empty()) GTEST_SKIP() << kOneFileSystem;
  std::string target = other.path() + "/target";
  WriteBytes(target, "kept");
  ASSERT_EQ(symlink(target.c_str(), (dir / "link").c_str()), 0);
  path::RenameFile(Wide(dir / "link"), Wide(target));
  EXPECT_EQ(ReadBytes(target), "kept");
  EXPECT_FALSE(Exists(dir / "link"));
  // The other way round the link is replaced by the bytes.
  ASSERT_EQ(symlink(target.c_str(), (dir / "link").c_str()), 0);
  path::RenameFile(Wide(target), Wide(dir / "link"));
  EXPECT_FALSE(path::IsSymLink(Wide(dir / "link").c_str()));
  EXPECT_EQ(ReadBytes(dir / "link"), "kept");
  EXPECT_FALSE(Exists(target));
}

// The system calls two mounts of one directory two file systems.
TEST(pathTree, RenameOfAFileOntoItselfThroughAnotherMountKeepsIt) {
  int code = -1;
  auto allowed = vlt::test::RunInOwnTmp(
      "size=4m",
      [] {
        const std::string one = "/tmp/one", two = "/tmp/two";
        mkdir(one.c_str(), 0777);
        mkdir(two.c_str(), 0777);
        if (mount(one.c_str(), two.c_str(), nullptr, MS_BIND, nullptr) != 0) return 1;
        WriteBytes(one + "/file", "kept");
        if (link((one + "/file").c_str(), (one + "/hard").c_str()) != 0) return 2;
        if (rename((one + "/file").c_str(), (two + "/file").c_str()) == 0) return 3;
        if (errno != EXDEV) return 4;
        path::RenameFile(Wide(one + "/file"), Wide(two + "/file"));
        path::RenameFile(Wide(one + "/file"), Wide(two + "/hard"));
        if (ReadBytes(one + "/file") != "kept" || ReadBytes(two + "/hard") != "kept") return 5;
        path::RenameFile(Wide(one + "/file"), Wide(two + "/moved"));
        return ReadBytes(one + "/moved") == "kept" && !Exists(one + "/file") ? 0 : 6;
      },
      &code);
  if (allowed == vlt::test::Allowed::No) GTEST_SKIP() << "NOT TESTED: no right to mount";
  EXPECT_EQ(code, 0);
}

TEST(pathTree, CpFileCopiesBytesIntoAPrivateFile) {
  TempDir dir;
  std::string bytes;
  for (int i = 0; i < 100001; ++i) bytes += static_cast<char>(i * 7);
  WriteBytes(dir / "from", bytes);
  chmod((dir / "from").c_str(), 0644);
  path::CpFile(Wide(dir / "from"), Wide(dir / "to"), false);
  EXPECT_EQ(bytes, ReadBytes(dir / "to"));
  EXPECT_EQ(ModeOf(dir / "to"), 0600);
  WriteBytes(dir / "empty", "");
  path::CpFile(Wide(dir / "empty"), Wide(dir / "to2"), true);
  EXPECT_EQ(ReadBytes(dir / "to2"), "");
}

TEST(pathTree, CpFileOverwritesOnlyWhenTold) {
  TempDir dir;
  WriteBytes(dir / "from", "new");
  WriteBytes(dir / "to", "old, and longer");
  chmod((dir / "to").c_str(), 0640);
  EXPECT_THROW(path::CpFile(Wide(dir / "from"), Wide(dir / "to"), false),
               exception::FileAlreadyExists);
  // The check for an existing target comes before the one for the same file.
  EXPECT_THROW(path::CpFile(Wide(dir / "to"), Wide(dir / "to"), false),
               exception::FileAlreadyExists);
  EXPECT_EQ(ReadBytes(dir / "to"), "old, and longer");
  path::CpFile(Wide(dir / "from"), Wide(dir / "to"), true);
  EXPECT_EQ(ReadBytes(dir / "to"), "new");
  EXPECT_EQ(ModeOf(dir / "to"), 0640);
}

TEST(pathTree, CpFileOntoItselfUnderAnyNameKeepsTheBytes) {
  TempDir dir;
  WriteBytes(dir / "File", "kept");
  ASSERT_EQ(link((dir / "File").c_str(), (dir / "hard").c_str()), 0);
  ASSERT_EQ(symlink("File", (dir / "soft").c_str()), 0);
  for (const char* name : {"File", "FILE", "./File", "hard", "soft"}) {
    path::CpFile(Wide(dir / "File"), Wide(dir / name), true);
    EXPECT_EQ(ReadBytes(dir / "File"), "kept") << name;
  }
  EXPECT_FALSE(Exists(dir / "FILE"));
}

TEST(pathTree, CpFileFailures) {
  TempDir dir;
  WriteBytes(dir / "file", "x");
  dir.makeDir("d");
  auto copy = [&](const char* from, const char* to) {
    path::CpFile(Wide(dir / from), Wide(dir / to), true);
  };
  EXPECT_THROW(path::CpFile(L"file", Wide(dir / "x"), true), exception::InvalidArgument);
  EXPECT_THROW(path::CpFile(Wide(dir / "file"), L"x", true), exception::InvalidArgument);
  EXPECT_EQ(PosixErrorOf([&] { copy("missing", "file"); }), ENOENT);
  EXPECT_EQ(ReadBytes(dir / "file"), "x");  // not truncated for a source that is not there
  EXPECT_EQ(PosixErrorOf([&] { copy("file", "d"); }), EISDIR);
  EXPECT_EQ(PosixErrorOf([&] { path::CpFile(Wide(dir / "file"), Wide(dir / "d"), false); }),
            EISDIR);
  EXPECT_THROW(copy("d", "y"), exception::FileReadFailed);
  EXPECT_EQ(PosixErrorOf([&] { copy("file", "no/y"); }), ENOENT);
}

TEST(pathTree, CpFileNeverWaitsForAPipe) {
  TempDir dir;
  WriteBytes(dir / "file", "x");
  ASSERT_EQ(mkfifo((dir / "fifo").c_str(), 0600), 0);
  EXPECT_THROW(path::CpFile(Wide(dir / "fifo"), Wide(dir / "to"), true), exception::FileReadFailed);
  EXPECT_THROW(path::CpFile(Wide(dir / "file"), Wide(dir / "fifo"), true),
               exception::FileWriteFailed);
  EXPECT_FALSE(Exists(dir / "to"));
}

TEST(pathTree, CpFileThatCannotWriteAllFails) {
  TempDir dir;
  WriteBytes(dir / "file", std::string(100000, 'x'));
  vlt::test::Child child([&] {
    signal(SIGXFSZ, SIG_IGN);
    rlimit limit = {50000, 50000};
    setrlimit(RLIMIT_FSIZE, &limit);
    int before = vlt::test::OpenDescriptors();
    try {
      path::CpFile(Wide(dir / "file"), Wide(dir / "to"), false);
    } catch (const exception::FileWriteFailed&) {
      return vlt::test::OpenDescriptors() == before ? 0 : 1;
    }
    return 2;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_THROW(path::CpFile(Wide(dir / "file"), L"/dev/full", true), exception::FileWriteFailed);
}

TEST(pathTree, CpDirCopiesATreeWithoutHiddenEntries) {
  TempDir dir;
  WriteBytes(dir.makeDir("from") + "/a", "A");
  WriteBytes(dir.makeDir("from/sub/deep") + "/b", "B");
  dir.makeDir("from/empty");
  WriteBytes(dir / "from/.hidden", "h");
  ASSERT_EQ(symlink("sub", (dir / "from/link").c_str()), 0);
  WriteBytes(dir.makeDir("to") + "/a", "old");
  path::CpDir(Wide(dir / "from"), Wide(dir / "to"));
  EXPECT_EQ(ReadBytes(dir / "to/a"), "A");
  EXPECT_EQ(ReadBytes(dir / "to/sub/deep/b"), "B");
  EXPECT_EQ(ReadBytes(dir / "to/link/deep/b"), "B");  // links are followed
  EXPECT_TRUE(path::IsDirectory(Wide(dir / "to/empty").c_str()));
  EXPECT_FALSE(Exists(dir / "to/.hidden"));
  path::CpDir(Wide(dir / "from/"), Wide(dir / "new/one/"));
  EXPECT_EQ(ReadBytes(dir / "new/one/a"), "A");
  EXPECT_EQ(ModeOf(dir / "new/one"), 0700);
}

TEST(pathTree, CpDirFailures) {
  TempDir dir;
  WriteBytes(dir.makeDir("from") + "/a", "A");
  EXPECT_THROW(path::CpDir(L"from", Wide(dir / "to/")), exception::InvalidArgument);
  EXPECT_THROW(path::CpDir(Wide(dir / "from"), L"to"), exception::InvalidArgument);
  EXPECT_THROW(path::CpDir(Wide(dir / "missing"), Wide(dir / "to/")),
               exception::NonexistentException);
  EXPECT_FALSE(Exists(dir / "to"));
  // Without a slash at the end only the directory above is made.
  EXPECT_EQ(PosixErrorOf([&] { path::CpDir(Wide(dir / "from"), Wide(dir / "x/to")); }), ENOENT);
  EXPECT_TRUE(Exists(dir / "x"));
}

TEST(pathTree, CpDirThroughALoopOfLinksEnds) {
  TempDir dir;
  dir.makeDir("from/sub");
  // Two loops in one directory would be walked some 2^40 times.
  ASSERT_EQ(symlink("..", (dir / "from/sub/up").c_str()), 0);
  ASSERT_EQ(symlink(".", (dir / "from/sub/self").c_str()), 0);
  EXPECT_EQ(PosixErrorOf([&] { path::CpDir(Wide(dir / "from"), Wide(dir / "to/")); }), ELOOP);
}

TEST(pathTree, CpDirIntoItselfDoesNotCopyTheCopy) {
  TempDir dir;
  WriteBytes(dir.makeDir("from") + "/a", "A");
  dir.makeDir("from/to");
  path::CpDir(Wide(dir / "from"), Wide(dir / "from/to"));
  EXPECT_EQ(ReadBytes(dir / "from/to/a"), "A");
  EXPECT_FALSE(Exists(dir / "from/to/to"));
}

}  // namespace
}  // namespace zt::fnd::osdep

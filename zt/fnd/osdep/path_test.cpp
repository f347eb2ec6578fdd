#include "zt/fnd/osdep/path.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <set>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::Exists;
using vlt::test::ModeOf;
using vlt::test::PosixErrorOf;
using vlt::test::TempDir;
using vlt::test::Wide;

std::string Narrow(const String& text) { return AnsiString(text).c_str(); }

template <class Call>
std::string AccessDeniedTextOf(Call call) {
  try {
    call();
  } catch (const exception::AccessDenied& e) {
    return e.what();
  }
  return "";
}

// ---- text

TEST(path, SymLinksAreSupported) { EXPECT_TRUE(path::PlatformSupportsSymLinks()); }

TEST(path, AbsoluteIsWhatStartsWithASlash) {
  EXPECT_TRUE(path::IsPathAbsolute(L"/"));
  EXPECT_TRUE(path::IsAbs(L"//x"));
  EXPECT_FALSE(path::IsPathAbsolute(L""));
  EXPECT_FALSE(path::IsPathAbsolute(L"a/b"));
  EXPECT_FALSE(path::IsAbs(L"~/x"));
  EXPECT_FALSE(path::IsPathAbsolute(nullptr));
}

TEST(path, DirName) {
  const char* rows[][2] = {{"/a/b", "/a"},  {"/a/b/", "/a/b"}, {"a", ""},          {"/a", "/"},
                           {"//a", "//"},   {"/", "/"},        {"a/b", "a"},       {"", ""},
                           {"///", "///"},  {"a/", "a"},       {"a//b", "a"},      {"a//", "a"},
                           {"/a//b", "/a"}, {"//a//", "//a"},  {"/a/b/c", "/a/b"}, {"/a//", "/a"}};
  for (const auto& row : rows) EXPECT_EQ(row[1], Narrow(path::DirName(Wide(row[0])))) << row[0];
}

TEST(path, BaseName) {
  const char* rows[][2] = {{"/a/b", "b"}, {"/a/b/", ""}, {"a", "a"},
                           {"", ""},      {"/", ""},     {"/a", "a"}};
  for (const auto& row : rows) EXPECT_EQ(row[1], Narrow(path::BaseName(Wide(row[0])))) << row[0];
}

TEST(path, Join) {
  const char* rows[][3] = {{"a", "/b", "/b"}, {"", "b", "b"},   {"a/", "b", "a/b"},
                           {"a", "b", "a/b"}, {"a", "", "a/"},  {"", "", ""},
                           {"/", "b", "/b"},  {"a/", "", "a/"}, {"a//", "b", "a//b"}};
  for (const auto& row : rows) {
    EXPECT_EQ(row[2], Narrow(path::Join(Wide(row[0]), Wide(row[1]))));
    EXPECT_STREQ(row[2], path::Join(AnsiString(row[0]), AnsiString(row[1])).c_str());
  }
}

TEST(path, MakePathEndInSlash) {
  String text(L"/a");
  path::MakePathEndInSlash(text);
  EXPECT_EQ(Narrow(text), "/a/");
  path::MakePathEndInSlash(text);
  EXPECT_EQ(Narrow(text), "/a/");
  String empty;
  EXPECT_THROW(path::MakePathEndInSlash(empty), exception::InvalidArgument);
  EXPECT_TRUE(empty.empty());
}

TEST(path, NormalizePath) {
  const char* rows[][2] = {{"a/b", ""},          {"", ""},
                           {"./a", ""},          {"/a/b/../c", "/a/c"},
                           {"/..", ""},          {"/a/.../b", ""},
                           {"/a//b", "/a//b"},   {"/a/b/", "/a/b/"},
                           {"/a//./b", "/a//b"}, {"/a/../..", ""},
                           {"/a/./b/", "/a/b/"}, {"/.", "/"},
                           {"/./", "/"},         {"/a/..", "/"},
                           {"/a/../", "/"},      {"/a/b/../../c", "/c"},
                           {"/a//../b", "/a/b"}, {"/a.b/c", "/a.b/c"},
                           {"/a/..b", "/a/..b"}, {"/a/....", "/a/...."},
                           {"/../a", ""},        {"/a/b/c/../../d/./e/", "/a/d/e/"},
                           {"//./a", "//a"},     {"/...", ""},
                           {"/a/.../..", ""},    {"/", "/"}};
  for (const auto& row : rows) {
    EXPECT_EQ(row[1], Narrow(path::NormalizePath(Wide(row[0])))) << row[0];
  }
}

TEST(path, NormalizeOfALongPathTakesLittleTime) {
  String text;
  for (int i = 0; i < 200000; ++i) text += L"/a/./b/..";
  String result = path::NormalizePath(text);
  EXPECT_EQ(result.length(), 400000u);
}

// ---- the working directory and temporary names

TEST(path, WorkingDirectory) {
  TempDir dir;
  String before = path::GetCWD();
  String left = path::SetCWD(Wide(dir.path()));
  EXPECT_EQ(before.exactCompare(left), 0);
  char real[4096];
  ASSERT_NE(realpath(dir.path().c_str(), real), nullptr);
  EXPECT_EQ(real, Narrow(path::GetCWD()));
  EXPECT_EQ(real, Narrow(path::AbsPath(L".")));
  EXPECT_EQ(std::string(real) + "/x/y", Narrow(path::AbsPath(L"x/y")));
  EXPECT_EQ(Narrow(path::AbsPath(L"/abs")), "/abs");
  // A relative directory exists below the working directory, and still is none.
  mkdir((dir / "relative").c_str(), 0700);
  EXPECT_FALSE(path::IsDirectory(L"relative"));
  EXPECT_EQ(PosixErrorOf([&] { path::SetCWD(Wide(dir / "missing")); }), ENOENT);
  EXPECT_EQ(real, Narrow(path::GetCWD()));
  path::SetCWD(before);
}

TEST(path, WorkingDirectoryThatIsGoneIsAnError) {
  TempDir dir;
  std::string gone = dir.makeDir("gone");
  vlt::test::Child child([&] {
    if (chdir(gone.c_str()) != 0 || rmdir(gone.c_str()) != 0) return 1;
    return PosixErrorOf([] { path::GetCWD(); }) == ENOENT ? 0 : 2;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(path, TempDirNameIsTheEnvironmentsOrTheDefault) {
  std::string kept = getenv("TMPDIR");
  setenv("TMPDIR", "/some/where", 1);
  EXPECT_EQ(Narrow(path::TempDirName()), "/some/where");
  setenv("TMPDIR", "", 1);
  EXPECT_EQ(Narrow(path::TempDirName()), "");
  unsetenv("TMPDIR");
  EXPECT_EQ(Narrow(path::TempDirName()), "/var/tmp/");
  setenv("TMPDIR", kept.c_str(), 1);
}

TEST(path, TempFileNameIsFreeAndNothingIsMade) {
  TempDir dir;
  std::string kept = getenv("TMPDIR");
  setenv("TMPDIR", dir.path().c_str(), 1);
  std::string name = Narrow(path::TempFileName(L"pre", String()));
  EXPECT_EQ(name.find(dir / "pre"), 0u) << name;
  EXPECT_FALSE(Exists(name));
  EXPECT_THROW(path::TempFileName(String(), String()), exception::InvalidArgument);
  EXPECT_THROW(path::TempFileName(L"p", L"relative"), exception::InvalidArgument);
  EXPECT_THROW(path::TempFileName(L"p", Wide(dir / "missing")), exception::NonexistentException);
  setenv("TMPDIR", "", 1);
  EXPECT_THROW(path::TempFileName(L"p", String()), exception::InvalidArgument);
  // Without the variable the directory given counts.
  unsetenv("TMPDIR");
  name = Narrow(path::TempFileName(L"pre", Wide(dir.path())));
  EXPECT_EQ(name.find(dir / "pre"), 0u) << name;
  setenv("TMPDIR", kept.c_str(), 1);
}

TEST(path, TempFileNameIsDirectoryFiveCharactersAndSixAtRandom) {
  TempDir dir;
  std::string kept = getenv("TMPDIR");
  setenv("TMPDIR", (dir.path() + "//").c_str(), 1);
  std::set<std::string> names;
  for (int i = 0; i < 100; ++i) {
    std::string name = Narrow(path::TempFileName(L"prefix", L"/"));  // the variable goes first
    EXPECT_EQ(name.substr(0, name.size() - 6), dir / "prefi") << name;
    EXPECT_EQ(
        name.find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789",
                               name.size() - 6),
        std::string::npos)
        << name;
    names.insert(name);
  }
  EXPECT_EQ(names.size(), 100u);
  setenv("TMPDIR", kept.c_str(), 1);
}

// ---- asking

TEST(path, IsDirectoryAndIsSymLinkNeverThrow) {
  TempDir dir;
  vlt::test::WriteBytes(dir / "file", "x");
  ASSERT_EQ(symlink(dir.path().c_str(), (dir / "link").c_str()), 0);
  ASSERT_EQ(symlink("nowhere", (dir / "dangling").c_str()), 0);
  EXPECT_TRUE(path::IsDirectory(Wide(dir.path()).c_str()));
  EXPECT_TRUE(path::IsDirectory(Wide(dir / "link").c_str()));
  for (const char* no : {"file", "file/x", "dangling", "missing"}) {
    EXPECT_FALSE(path::IsDirectory(Wide(dir / no).c_str())) << no;
  }
  EXPECT_TRUE(path::IsSymLink(Wide(dir / "link").c_str()));
  EXPECT_TRUE(path::IsSymLink(Wide(dir / "dangling").c_str()));
  for (const char* no : {"file", "file/x", "missing", "link/"}) {
    EXPECT_FALSE(path::IsSymLink(Wide(dir / no).c_str())) << no;
  }
  EXPECT_FALSE(path::IsDirectory(nullptr));
  EXPECT_FALSE(path::IsSymLink(nullptr));
  EXPECT_FALSE(path::IsDirectory(L""));
  String longName(5000, L'x');
  EXPECT_FALSE(path::IsDirectory((String(L"/") + longName).c_str()));
}

TEST(path, DoesFileExistIsTrueForRegularFilesOnly) {
  TempDir dir;
  vlt::test::WriteBytes(dir / "file", "x");
  ASSERT_EQ(symlink("file", (dir / "link").c_str()), 0);
  ASSERT_EQ(symlink("nowhere", (dir / "dangling").c_str()), 0);
  ASSERT_EQ(mkfifo((dir / "fifo").c_str(), 0600), 0);
  EXPECT_TRUE(path::DoesFileExist(Wide(dir / "file")));
  EXPECT_TRUE(path::DoesFileExist(Wide(dir / "link")));
  for (const std::string& no : {dir.path(), dir / "dangling", dir / "fifo", dir / "missing"}) {
    EXPECT_FALSE(path::DoesFileExist(Wide(no))) << no;
  }
  EXPECT_THROW(path::DoesFileExist(L"file"), exception::InvalidArgument);
  EXPECT_THROW(path::DoesFileExist(String()), exception::InvalidArgument);
  EXPECT_EQ(PosixErrorOf([&] { path::DoesFileExist(Wide(dir / "file/x")); }), ENOTDIR);
  EXPECT_EQ(PosixErrorOf([&] { path::DoesFileExist(Wide(dir / std::string(300, 'x'))); }),
            ENAMETOOLONG);
}

// ---- making directories

TEST(path, CreateDirMakesTheDirectoriesOfAFilesPath) {
  TempDir dir;
  path::CreateDir(Wide(dir / "a/b/c").c_str());
  EXPECT_EQ(ModeOf(dir / "a"), 0700);
  EXPECT_EQ(ModeOf(dir / "a/b"), 0700);
  EXPECT_FALSE(Exists(dir / "a/b/c"));
  path::CreateDir(Wide(dir / "a/b/c/").c_str());
  EXPECT_EQ(ModeOf(dir / "a/b/c"), 0700);
}

TEST(path, CreateDirOnAnExistingDirectoryChangesNothing) {
  TempDir dir;
  ASSERT_EQ(mkdir((dir / "x").c_str(), 0711), 0);
  ASSERT_EQ(chmod((dir / "x").c_str(), 0711), 0);
  path::CreateDir(Wide(dir / "x/").c_str());
  path::CreateDir(Wide(dir / "x/").c_str(), 0777);
  EXPECT_EQ(ModeOf(dir / "x"), 0711);
  path::CreateDir(L"/x");
  EXPECT_FALSE(Exists("/x"));
}

TEST(path, CreateDirWithAModeWinsAgainstTheUmask) {
  TempDir dir;
  vlt::test::Child child([&] {
    umask(0077);
    path::CreateDir(Wide(dir / "a//b/c/").c_str(), 0777);
    path::CreateDir(Wide(dir / "plain/x/").c_str());
    umask(0700);
    path::CreateDir(Wide(dir / "odd/").c_str(), 0x10000 + 01750);
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  for (const char* name : {"a", "a/b", "a/b/c"}) EXPECT_EQ(ModeOf(dir / name), 0777) << name;
  EXPECT_EQ(ModeOf(dir / "plain"), 0700);
  EXPECT_EQ(ModeOf(dir / "plain/x"), 0700);
  EXPECT_EQ(ModeOf(dir / "odd"), 01750);  // 16 bits of the mode count
}

TEST(path, CreateDirWithoutAModeObeysTheUmask) {
  TempDir dir;
  vlt::test::Child child([&] {
    umask(0300);
    path::CreateDir(Wide(dir / "a/").c_str());
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(ModeOf(dir / "a"), 0400);
}

TEST(path, CreateDirDemandsAnAbsolutePath) {
  EXPECT_THROW(path::CreateDir(L"a/b/"), exception::InvalidArgument);
  EXPECT_THROW(path::CreateDir(L""), exception::InvalidArgument);
  EXPECT_THROW(path::CreateDir(nullptr), exception::InvalidArgument);
  EXPECT_THROW(path::CreateDir(nullptr, 0777), exception::InvalidArgument);
}

TEST(path, CreateDirThroughAFileIsRefusedByTheFailingPart) {
  TempDir dir;
  vlt::test::WriteBytes(dir / "file", "x");
  ASSERT_EQ(symlink("nowhere", (dir / "dangling").c_str()), 0);
  EXPECT_THROW(path::CreateDir(Wide(dir / "file/").c_str()), exception::ObjectAlreadyExists);
  EXPECT_THROW(path::CreateDir(Wide(dir / "file/x/").c_str()), exception::ObjectAlreadyExists);
  EXPECT_THROW(path::CreateDir(Wide(dir / "dangling/").c_str()), exception::ObjectAlreadyExists);
  EXPECT_EQ(vlt::test::ReadBytes(dir / "file"), "x");
  std::string longName(300, 'x');
  EXPECT_EQ("Access denied: " + (dir / "a/" + longName), AccessDeniedTextOf([&] {
              path::CreateDir(Wide(dir / "a/" + longName + "/y/").c_str());
            }));
  EXPECT_TRUE(Exists(dir / "a"));  // made before the failing one
  EXPECT_EQ(AccessDeniedTextOf([] {
              path::CreateDir(L"/proc/nothing/here/");  // ENOENT is nothing special
            }),
            "Access denied: /proc/nothing");
}

TEST(path, CreateDirWhoseModeCannotBeSetTakesTheDirectoryAway) {
  TempDir dir;
  vlt::test::Child child([&] {
    if (!vlt::test::FailSystemCall(SYS_fchmod, EIO)) return 1;
    std::string text =
        AccessDeniedTextOf([&] { path::CreateDir(Wide(dir / "a/b/").c_str(), 0777); });
    return text == "Access denied: " + (dir / "a") ? 0 : 2;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_FALSE(Exists(dir / "a"));
}

// ---- removing

TEST(path, RemoveFile) {
  TempDir dir;
  vlt::test::WriteBytes(dir / "file", "x");
  path::RemoveFile(Wide(dir / "file"));
  EXPECT_FALSE(Exists(dir / "file"));
  EXPECT_EQ(PosixErrorOf([&] { path::RemoveFile(Wide(dir / "file").c_str()); }), ENOENT);
  EXPECT_THROW(path::RemoveFile(L"file"), exception::InvalidArgument);
  EXPECT_THROW(path::RemoveFile(static_cast<const wchar_t*>(nullptr)), exception::InvalidArgument);
  ASSERT_EQ(symlink(dir.path().c_str(), (dir / "link").c_str()), 0);
  path::RemoveFile(Wide(dir / "link"));
  EXPECT_FALSE(Exists(dir / "link"));
}

TEST(path, RemoveDir) {
  TempDir dir;
  vlt::test::WriteBytes(dir.makeDir("full") + "/file", "x");
  dir.makeDir("empty");
  ASSERT_EQ(symlink("full", (dir / "link").c_str()), 0);
  path::RemoveDir(Wide(dir / "empty").c_str());
  EXPECT_FALSE(Exists(dir / "empty"));
  EXPECT_EQ("Access denied: " + (dir / "full"),
            AccessDeniedTextOf([&] { path::RemoveDir(Wide(dir / "full").c_str()); }));
  path::RemoveDir(Wide(dir / "link").c_str());
  EXPECT_FALSE(Exists(dir / "link"));
  EXPECT_TRUE(Exists(dir / "full/file"));
  for (const std::string& no : {dir / "missing", dir / "full/file", std::string("relative")}) {
    EXPECT_THROW(path::RemoveDir(Wide(no).c_str()), exception::NonexistentException) << no;
  }
  EXPECT_THROW(path::RemoveDir(nullptr), exception::NonexistentException);
}

// ---- links

TEST(path, CreateAndResolveSymLink) {
  TempDir dir;
  path::CreateSymLink(Wide(dir / "link"), L"some/../target");
  EXPECT_EQ(Narrow(path::ResolveSymLink(Wide(dir / "link"))), "some/../target");
  EXPECT_EQ(PosixErrorOf([&] { path::CreateSymLink(Wide(dir / "link"), L"other"); }), EEXIST);
  EXPECT_EQ(Narrow(path::ResolveSymLink(Wide(dir / "link"))), "some/../target");
  vlt::test::WriteBytes(dir / "file", "x");
  EXPECT_THROW(path::ResolveSymLink(Wide(dir / "file")), exception::InvalidArgument);
  EXPECT_THROW(path::ResolveSymLink(Wide(dir / "missing")), exception::InvalidArgument);
  EXPECT_THROW(path::ResolveSymLink(L"link"), exception::InvalidArgument);
  // Links of the process file system have no length.
  EXPECT_EQ(PosixErrorOf([] { path::ResolveSymLink(L"/proc/self/exe"); }), EINVAL);
}

}  // namespace
}  // namespace zt::fnd::osdep

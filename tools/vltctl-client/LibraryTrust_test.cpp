#include "tools/vltctl-client/LibraryTrust.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "tests/support/TempDir.h"

namespace vltctl {
namespace {

namespace fs = std::filesystem;
using vlt::test::TempDir;
using vlt::test::WriteBytes;

constexpr uid_t kOne = 65534, kTwo = 65533;
using Users = std::set<uid_t>;

// <dir>/a/b/file, all of it root's alone.
class LibraryTrust : public testing::Test {
 protected:
  void SetUp() override {
    if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to give files to other users";
    m_dir.makeDir("a/b");
    WriteBytes(file(), "x");
    chmod(file().c_str(), 0644);
    for (const char* name : {"", "/a", "/a/b"}) chmod((m_dir.path() + name).c_str(), 0755);
  }
  std::string at(const std::string& name) const { return m_dir / name; }
  std::string file() const { return at("a/b/file"); }
  static void give(const std::string& path, uid_t user) {
    ASSERT_EQ(lchown(path.c_str(), user, 0), 0);
  }
  static void expectUsers(const std::string& path, const Users& users) {
    Controllers found = ControllersOf(path);
    EXPECT_EQ(found.users, users) << path;
    EXPECT_EQ(found.shared, "") << found.reason;
  }
  static void expectShared(const std::string& path, const std::string& place,
                           const std::string& reason) {
    Controllers found = ControllersOf(path);
    EXPECT_EQ(found.shared, place) << path;
    EXPECT_EQ(found.reason, reason) << path;
  }

  TempDir m_dir;
};

TEST_F(LibraryTrust, RootsOwnPathHasNoOtherControllers) {
  expectUsers(file(), {});
  expectUsers(at("a/./b//../b/file"), {});
}

TEST_F(LibraryTrust, OwnersOfTheFileAndOfEachDirectoryCount) {
  give(file(), kOne);
  expectUsers(file(), {kOne});
  give(at("a"), kTwo);
  expectUsers(file(), {kOne, kTwo});
  expectUsers(at("a/b/../b/file"), {kOne, kTwo});
}

TEST_F(LibraryTrust, WritableForOthersIsShared) {
  chmod(file().c_str(), 0666);
  expectShared(file(), file(), "every user can change it");
  chmod(file().c_str(), 0664);
  expectUsers(file(), {});  // root's group
  ASSERT_EQ(chown(file().c_str(), 0, kOne), 0);
  expectShared(file(), file(), "group 65534 can change it");
  chmod(file().c_str(), 0644);
  chmod(at("a").c_str(), 0777);
  expectShared(file(), at("a"), "every user can change it");
}

TEST_F(LibraryTrust, InAStickyDirectoryTheEntrysOwnerCounts) {
  chmod(at("a/b").c_str(), 01777);
  expectUsers(file(), {});
  give(file(), kOne);
  expectUsers(file(), {kOne});
  expectShared(at("a/b/missing"), at("a/b"), "every user can change it");
}

TEST_F(LibraryTrust, LinksAreFollowedAndTheirPlacesCount) {
  m_dir.makeDir("c");
  give(at("c"), kOne);
  fs::create_symlink("../a/b", at("c/relative"));
  fs::create_symlink(at("a"), at("c/absolute"));
  expectUsers(at("c/relative/file"), {kOne});
  expectUsers(at("c/absolute/b/file"), {kOne});
  fs::create_symlink("../../c", at("a/b/out"));
  WriteBytes(at("c/file"), "x");
  expectUsers(at("a/b/out/file"), {kOne});
  chmod(at("a/b").c_str(), 01777);
  give(at("a/b/out"), kTwo);
  expectUsers(at("a/b/out/file"), {kOne, kTwo});
}

TEST_F(LibraryTrust, WhatIsMissingIsTheDirectorysOwners) {
  expectUsers(at("a/missing/more"), {});
  expectUsers(file() + "/below", {});
  expectUsers(at("a/" + std::string(300, 'x')), {});
  fs::create_symlink("circle", at("a/circle"));
  expectUsers(at("a/circle"), {});
  give(at("a"), kOne);
  expectUsers(at("a/missing/more"), {kOne});
}

TEST_F(LibraryTrust, ARelativePathIsShared) {
  expectShared("a/b/file", "a/b/file", "it is no absolute path");
}

// The loader tries others beside a name without a dot.
TEST_F(LibraryTrust, WhatTheLoaderTriesInItsPlaceCounts) {
  for (const char* other : {"libfile.so", "file.framework/libfile.so", "file.framework/file.so",
                            "file.bundle/file", "file.bundle/libfile.so"}) {
    std::string path = at(std::string("a/b/") + other);
    fs::create_directories(fs::path(path).parent_path());
    WriteBytes(path, "x");
    give(path, kOne);
    EXPECT_EQ(ControllersOf(file()).users, Users{}) << other;
    EXPECT_EQ(ControllersOfLibrary(file()).users, Users{kOne}) << other;
    fs::remove(path);
  }
  WriteBytes(at("a/b/file.so"), "x");
  WriteBytes(at("a/b/libfile.so.so"), "x");
  give(at("a/b/libfile.so.so"), kOne);
  EXPECT_EQ(ControllersOfLibrary(at("a/b/file.so")).users, Users{});
}

}  // namespace
}  // namespace vltctl

// The component check by the superuser: code that other users can put in place never runs with the
// superuser's rights.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <linux/capability.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "tests/e2e/CheckTree.h"
#include "tests/support/InChild.h"

namespace vlt::test {
namespace {

constexpr uid_t kNobody = 65534, kOther = 65533;

// A library whose constructor writes down who it runs as: the user ids, the group ids, the number of
// groups, whether it can become root again, and how many descriptors beyond the check's own are open.
const std::string kWitness = R"(
#include <fcntl.h>
#include <stdio.h>
#include <unistd.h>
__attribute__((constructor)) void start() {
  FILE* out = fopen("WITNESS", "w");
  if (!out) return;
  int open = 0;
  for (int fd = 4; fd < 1024; ++fd) open += fd != fileno(out) && fcntl(fd, F_GETFD) >= 0;
  fprintf(out, "%d %d %d %d %d", getuid(), geteuid(), getgid(), getegid(), getgroups(0, 0));
  fprintf(out, " back %d open %d tty %d", setuid(0), open, isatty(0));
  fclose(out);
}
)";

class CheckRoot : public testing::Test {
 protected:
  void SetUp() override {
    if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, whose check it is";
    // Every user may reach the libraries, and only root may change them.
    std::string own = std::filesystem::path(m_experts.root()).parent_path();
    RunProgram({"chmod", "-R", "a+rX", getenv("VLT_TEST_ROOT")});
    RunProgram({"chmod", "-R", "go-w", own});
    chmod(m_out.path().c_str(), 0777);
  }

  std::string witness() const { return m_out / "witness"; }
  // Registers and builds the library; its file.
  std::string build() {
    std::string source = kWitness, file = m_experts.add(1, "expert");
    source.replace(source.find("WITNESS"), 7, witness());
    Build(file, source + kGoodEntry);
    chmod(file.c_str(), 0755);
    return file;
  }
  std::string witnessed() const { return Exists(witness()) ? ReadBytes(witness()) : "not loaded"; }
  void expectRefused(const std::string& note) {
    Found found = Check(1);
    EXPECT_EQ(found.exitCode, kNotFound);
    EXPECT_FALSE(found.sound);
    EXPECT_EQ(found.code, "refused");
    ASSERT_EQ(found.messages.size(), 1u);
    EXPECT_NE(found.messages[0].find(note), std::string::npos) << found.messages[0];
    EXPECT_EQ(found.messages[0].find("not loaded"), 0u) << found.messages[0];
    EXPECT_EQ(witnessed(), "not loaded");
  }

  Experts m_experts;
  TempDir m_out;
};

TEST_F(CheckRoot, RootsOwnLibraryIsLoadedAsRoot) {
  build();
  Found found = Check(1);
  EXPECT_TRUE(found.sound);
  EXPECT_EQ(found.notes, Messages{});
  EXPECT_EQ(witnessed().substr(0, 8), "0 0 0 0 ");
}

TEST_F(CheckRoot, AnotherUsersLibraryIsLoadedAsThatUser) {
  ASSERT_EQ(chown(build().c_str(), kNobody, 0), 0);
  Found found = Check(1);
  EXPECT_EQ(found.exitCode, kGood);
  EXPECT_TRUE(found.sound);
  EXPECT_EQ(found.messages, Messages{});
  EXPECT_EQ(found.notes, Messages{});
  EXPECT_EQ(witnessed(), "65534 65534 65534 65534 0 back -1 open 0 tty 0");
}

TEST_F(CheckRoot, ALibraryInAnotherUsersDirectoryIsLoadedAsThatUser) {
  build();
  ASSERT_EQ(chown(m_experts.root().c_str(), kNobody, kNobody), 0);
  EXPECT_TRUE(Check(1).sound);
  EXPECT_EQ(witnessed().substr(0, 12), "65534 65534 ");
}

// Problems of such a library are reported as those of any other.
TEST_F(CheckRoot, AnotherUsersLibraryThatDoesHarm) {
  std::string file = m_experts.add(1, "harm");
  Build(file, AtLoad("abort();"));
  ASSERT_EQ(chown(file.c_str(), kNobody, 0), 0);
  EXPECT_EQ(Check(1).messages, Messages{"the process that loaded the library died: Aborted"});
  Build(file, "extern \"C\" int vltCreateObjectExpertToo() { return 0; }\n");
  EXPECT_EQ(Check(1).messages, Messages{file + " does not export \"vltCreateObjectExpert\""});
}

TEST_F(CheckRoot, ALibraryThatManyCanChangeIsRefused) {
  std::string file = build();
  chmod(file.c_str(), 0777);
  expectRefused("\"" + file + "\": every user can change it; check it as an ordinary user");
  chmod(file.c_str(), 0755);
  chmod(m_experts.root().c_str(), 0777);
  expectRefused("\"" + m_experts.root() + "\": every user can change it");
  chmod(m_experts.root().c_str(), 0755);
  ASSERT_EQ(chown(m_experts.root().c_str(), kOther, 0), 0);
  ASSERT_EQ(chown(file.c_str(), kNobody, 0), 0);
  expectRefused("users 65533, 65534 can each change it or a directory on its path");
}

TEST_F(CheckRoot, WithoutTheRightToBecomeTheUserItIsRefused) {
  ASSERT_EQ(chown(build().c_str(), kNobody, 0), 0);
  ExpectInChild([&] {
    ASSERT_EQ(prctl(PR_CAPBSET_DROP, CAP_SETUID, 0, 0, 0), 0);
    expectRefused("root cannot become user 65534, who can change it: the user");
  });
}

// The library's check takes a relative path for missing; the loader must not look for it after all.
TEST_F(CheckRoot, ARelativePathIsNotLoadedFromThePresentDirectory) {
  std::string file = build();
  ASSERT_EQ(chown(file.c_str(), kNobody, 0), 0);
  m_experts.add(GText(2), "relative", "./expert.so");
  ASSERT_EQ(chdir(m_experts.root().c_str()), 0);
  Found found = Check(2);
  EXPECT_FALSE(found.sound);
  EXPECT_EQ(witnessed(), "not loaded");
}

// Its damage may be in the way that it talks back.
TEST_F(CheckRoot, ALibraryThatFloodsThePipeIsStopped) {
  std::string file = m_experts.add(1, "flood");
  Build(file, AtLoad("char text[4096] = {}; for (int fd = 3; fd < 64; ++fd) "
                     "while (write(fd, text, sizeof text) > 0) {}"));
  ASSERT_EQ(chown(file.c_str(), kNobody, 0), 0);
  Found found = Check(1);
  EXPECT_FALSE(found.sound);
  EXPECT_EQ(found.messages,
            Messages{"the library wrote more than 1 MiB into the check's pipe; its process was "
                     "killed"});
}

}  // namespace
}  // namespace vlt::test

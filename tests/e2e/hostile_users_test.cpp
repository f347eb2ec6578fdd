// What users can do to one another through an installation that all of them may change.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>

#include "tests/e2e/HostileInstallation.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr uid_t kNobody = 65534;

class HostileUsers : public testing::Test {
 protected:
  void SetUp() override {
    if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
    chmod(fs::path(b.root()).parent_path().c_str(), 0755);
    chmod(getenv("ZTFNDTMPSHAREDFILEDIR"), 0777);
  }

  static void ExpectStartAsNobody(const std::string& expected,
                                  const std::function<void(IvltRegistrar&)>& body = {}) {
    ExpectInChild([&] {
      ASSERT_EQ(setresgid(kNobody, kNobody, kNobody), 0);
      ASSERT_EQ(setresuid(kNobody, kNobody, kNobody), 0);
      IvltRegistrar* r = nullptr;
      EXPECT_EQ(GetRegistrar(&r), expected);
      if (r && body) body(*r);
      if (r) r->Release();
    });
  }

  HostileInstallation b;
};

TEST_F(HostileUsers, AnUnreadableRegistrationFileIsSkippedAndNotLost) {
  chmod(b.root().c_str(), 0777);
  std::string file = b.plant(Component("Hidden", 1));
  chmod(file.c_str(), 0);
  ExpectStartAsNobody("ok", [](IvltRegistrar& r) {
    EXPECT_EQ(Find(r, G(kGood)), S_OK);
    EXPECT_EQ(Find(r, G(1)), E_INVALIDARG);
  });
  EXPECT_TRUE(Exists(file));
  ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); });
}

// It is no business of that user's, and what was registered from it stays.
TEST_F(HostileUsers, ABundleThatIsClosedToAUserIsSkippedForThatUser) {
  chmod(b.root().c_str(), 0777);
  b.plant(Component("Closed", 1));
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); });
  chmod((b.root() + "/Experts/Hostile.vle").c_str(), 0700);
  ExpectStartAsNobody("ok", [](IvltRegistrar& r) {
    EXPECT_EQ(Find(r, G(kGood)), S_OK);
    EXPECT_EQ(Find(r, G(1)), S_OK);
  });
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); });
  ExpectWhole(b);
}

// A client without any rights still reads what another user's process has registered.
TEST_F(HostileUsers, WithoutRightsTheDatabaseIsReadAndNothingIsChanged) {
  ExpectStart("ok");
  std::string before = ReadBytes(b.database());
  Installation::touch(b.root() + "/Data Dictionaries/Good.framework/Resources/Info.vlr", 1);
  // The directory allows no temporary file beside the database.
  ExpectStartAsNobody("ok", [](IvltRegistrar& r) {
    EXPECT_EQ(Find(r, G(kGood)), S_OK);
    EXPECT_LT(r.SetSchemaVersion(7), 0);
  });
  EXPECT_EQ(ReadBytes(b.database()), before);
  ExpectWhole(b);
}

TEST_F(HostileUsers, UsersTakeTurnsWithOneDatabase) {
  chmod(b.root().c_str(), 0777);
  for (int turn = 0; turn < 2; ++turn) {
    ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(r.SetSchemaVersion(7), S_OK); });
    ExpectStartAsNobody("ok", [](IvltRegistrar& r) { EXPECT_EQ(r.SetSchemaVersion(8), S_OK); });
  }
  EXPECT_EQ(ModeOf(b.database()), 0777);
  ExpectWhole(b);
}

// What another user's killed process leaves beside the database is in no other process's way.
TEST_F(HostileUsers, LeftoversOfAnotherUserDoNotStopASave) {
  chmod(b.root().c_str(), 0777);
  ExpectStart("ok");
  for (const char* name : {"/vlt.TMP", "/vlt.vl5.TMP"}) {
    WriteBytes(b.root() + name, "left over");
    chmod((b.root() + name).c_str(), 0600);
  }
  unlink(b.sidecar().c_str());
  ExpectStartAsNobody("ok", [](IvltRegistrar& r) { EXPECT_EQ(r.SetSchemaVersion(8), S_OK); });
  ExpectWhole(b);
}

// A link planted where everybody may write must not make a root process open foreign files up.
TEST_F(HostileUsers, ModesAreNotChangedThroughPlantedLinks) {
  TempDir secrets;
  WriteBytes(secrets / "secret", "[KORComponents]\n");
  chmod((secrets / "secret").c_str(), 0600);
  fs::create_directories(b.root() + "/Experts/planted.vle/Resources");
  fs::create_symlink(secrets / "secret", b.root() + "/Experts/planted.vle/Resources/Info.vlr");
  b.expectGood();
  EXPECT_EQ(ModeOf(secrets / "secret"), 0600);
}

}  // namespace
}  // namespace vlt::test

// Two users of the machine, one of them the superuser, who write the jar in turn: whoever came before,
// and whatever a killed writer left, the next one can save, and everything stays open to all.
#include <grp.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "tests/e2e/Start.h"
#include "tests/support/Rendezvous.h"

namespace vlt::test {
namespace {

constexpr uid_t kRoot = 0, kNobody = 65534;

int Rounds() { return FullSize() ? 500 : 40; }

// For a child, for good.
bool Become(uid_t user) {
  return user == kRoot || (setgroups(0, nullptr) == 0 && setresgid(user, user, user) == 0 &&
                           setresuid(user, user, user) == 0);
}

class RendezvousUsers : public testing::Test {
 protected:
  void SetUp() override {
    if (geteuid() != 0) {
      printf("NOT TESTED: two users; only the superuser can become another one\n");
      GTEST_SKIP() << "not the superuser";
    }
    // The way to the installation and to this process's preference is open, as it is on a machine.
    for (std::filesystem::path p = place.root(); p != "/" && p != getenv("VLT_TEST_ROOT");
         p = p.parent_path()) {
      std::filesystem::permissions(p, std::filesystem::perms(0755));
    }
    // The locks' directory is made by whoever comes first, in a place like /tmp.
    std::string shared = getenv("ZTFNDTMPSHAREDFILEDIR");
    std::filesystem::permissions(shared, std::filesystem::perms(01777));
    setenv("ZTFNDTMPSHAREDFILEDIR", (shared + "/locks").c_str(), 1);
  }

  // 0 if the user, with a mask that keeps everything to himself, could do it.
  static int as(uid_t user, const std::function<bool()>& body) {
    return Child([&] {
             if (!Become(user)) return 2;
             umask(077);
             return body() ? 0 : 1;
           })
        .wait();
  }

  void expectOpenToAll() const {
    EXPECT_EQ(ModeOf(place.data()), 0777);
    for (const std::string& file : {place.jar(), place.jarSidecar()}) {
      EXPECT_EQ(ModeOf(file), 0777) << file;
    }
    EXPECT_EQ(Hex(ReadBytes(place.jarSidecar())), Md5Sum(place.jar()));
  }

  // Whole saves of each kind by both users, from a state that `begin` makes before each.
  void alternate(const char* what, const std::function<void(uid_t next)>& begin) {
    int saves = 0, failures = 0;
    for (int round = 0; round < Rounds(); ++round) {
      for (uid_t user : {kRoot, kNobody}) {
        begin(user);
        int failed = as(user, [&] {
          HRESULT result = E_FAIL;
          return vltAddSvrProcessIDToJar(user == kRoot ? L"Root" : L"Nobody", round) == S_OK &&
                 vltSetServerCookie(round) == S_OK &&
                 AskForEndpoint(&result) == std::to_string(61901 + saves % 200) && result == S_OK;
        });
        ++saves;
        failures += failed != 0;
        ASSERT_EQ(failed, 0) << what << ", save " << saves << " by user " << user;
        expectOpenToAll();
      }
    }
    Notes last = NotesIn(place.jar());
    std::string round = std::to_string(Rounds() - 1);
    EXPECT_EQ(last["Root/ServerProcessID"], round);
    EXPECT_EQ(last["Nobody/ServerProcessID"], round);
    EXPECT_EQ(last["CookieSection/LastServerCookie"], round);
    EXPECT_EQ(FilesSetAside(place.root()), 0);
    printf("%s: %d turns of root and %u with three saves each, %d failures\n", what, saves, kNobody,
           failures);
  }

  // The superuser begins everything, the data directory included.
  void firstSave() {
    place.prepare(Before::NoDirectory);
    EXPECT_EQ(as(kRoot, [] { return vltAddSvrProcessIDToJar(L"First", 1) == S_OK; }), 0);
    expectOpenToAll();
  }

  static uid_t other(uid_t user) { return user == kRoot ? kNobody : kRoot; }

  RendezvousPlace place;
};

TEST_F(RendezvousUsers, SaveInTurn) {
  firstSave();
  alternate("in turn", [](uid_t) {});
}

TEST_F(RendezvousUsers, SaveWhereTheOtherWasKilledInTheMiddle) {
  firstSave();
  alternate("over leftovers", [&](uid_t next) {
    // Of a save of the other user: his temporary files, closed to all others, and no sidecar yet.
    std::filesystem::remove(place.jarSidecar());
    EXPECT_EQ(as(other(next),
                 [&] {
                   for (const char* name : {"/vltjar.TMP", "/vltjar.vl5.TMP"}) {
                     WriteBytes(place.data() + name, "[half");
                     if (ModeOf(place.data() + name) != 0600) return false;
                   }
                   return true;
                 }),
              0);
  });
  EXPECT_FALSE(Exists(place.data() + "/vltjar.TMP"));
  EXPECT_FALSE(Exists(place.data() + "/vltjar.vl5.TMP"));
}

TEST_F(RendezvousUsers, SaveWhoeverBeganTheFiles) {
  place.prepare(Before::NoFiles);
  EXPECT_EQ(as(kNobody, [] { return vltSetServerCookie(1) == S_OK; }), 0);
  expectOpenToAll();
  alternate("begun by the other", [](uid_t) {});
}

}  // namespace
}  // namespace vlt::test

// A process killed at every single system call of a save, by strace's injection. Whatever the
// moment, the next start opens the database with the old or the new contents, nothing is lost and
// nothing set aside.
#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>

#include "tests/e2e/Start.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/Tracing.h"

namespace vlt::test {
namespace {

constexpr char kBegin[] = "/vlt-save-begins";
constexpr char kEnd[] = "/vlt-save-ends";
constexpr unsigned kDefaultCacheSize = 33554432;
// A sanitizer sees nothing in a process that is killed, and makes each one slow: every seventh call
// will do there.
constexpr size_t kCallsPerKill = kCanLimitMemory ? 1 : 7;
constexpr char kSaveVariable[] = "VLT_E2E_SAVE";

// This program is also the client that is killed: with the variable set it makes the one save that
// is asked for, between two calls that mark it in a trace, and ends.
int SaveOnce(const char* what) {
  IvltRegistrar* registrar = nullptr;
  if (GetRegistrar(&registrar) != "ok") return 1;
  auto size = static_cast<unsigned>(strtoul(what, nullptr, 10));
  access(kBegin, F_OK);
  HRESULT result = SetCacheSize(*registrar, size);
  access(kEnd, F_OK);
  return result == S_OK ? 0 : 3;
}

__attribute__((constructor)) void ActAsClient() {
  if (const char* what = getenv(kSaveVariable)) _exit(SaveOnce(what));
}

// Exit codes of the start that follows a kill.
enum After { kOld = 10, kNew = 11, kLost = 12, kRefused = 13 };

void Count(Tally* tally, int code, const Installation& i, const Call& call) {
  ++tally->kills;
  if (code == kOld) ++tally->old;
  if (code == kNew) ++tally->fresh;
  if (code == kLost) ++tally->lost;
  if (code != kOld && code != kNew && code != kLost) ++tally->refused;
  int setAside = FilesSetAside(i.root());
  tally->setAside += setAside;
  EXPECT_TRUE((code == kOld || code == kNew) && setAside == 0)
      << "killed at " << call.text << ": the next start ends with " << code;
}

class RegistrarKill : public testing::Test {
 protected:
  void SetUp() override {
    std::string missing = Tracing::Missing();
    if (!missing.empty()) {
      printf("NOT TESTED: kills during a save; %s\n", missing.c_str());
      GTEST_SKIP() << missing;
    }
  }
};

// What a client put there beforehand, and must find again.
constexpr wchar_t kRegistered[] = L"Registered by a client";

void RegisterOne(IvltRegistrar& r) {
  Offered d(vltComponentDataDictionary, kRegistered, G(77), L"/x/y.framework", L"rc");
  EXPECT_EQ(r.RegisterComponent(&d.value), S_OK);
}

bool HasAll(IvltRegistrar& r, const std::vector<GUID>& all) {
  for (const GUID& id : all) {
    if (Find(r, id) != S_OK) return false;
  }
  return true;
}

// A start after a kill: old or new value, and all components.
int StartAfter(unsigned oldSize, unsigned newSize, const std::vector<GUID>& all) {
  return Child([&] {
           IvltRegistrar* r = nullptr;
           if (GetRegistrar(&r) != "ok") return static_cast<int>(kRefused);
           unsigned size = CacheSize(*r);
           if (!HasAll(*r, all)) return static_cast<int>(kLost);
           if (size == newSize) return static_cast<int>(kNew);
           return static_cast<int>(size == oldSize ? kOld : kLost);
         })
      .wait();
}

Tracing SavingClient(unsigned size) {
  return Tracing({std::filesystem::read_symlink("/proc/self/exe")},
                 {{kSaveVariable, std::to_string(size)}});
}

void SetUpSaving(Installation& i) {
  i.addDictionary("Core", "Core", GText(1), 7, "co");
  i.addObjectExpert("Tank", "Tank", GText(2), "{" + GText(2) + "}:1:{" + GText(9) + "}");
  ExpectStart([](IvltRegistrar& r) { RegisterOne(r); });
  ExpectStart("ok");
}

TEST_F(RegistrarKill, AtEveryCallOfASaveThatAClientAskedFor) {
  Installation i;
  SetUpSaving(i);
  const std::vector<GUID> all = {kVltdd, G(1), G(2), G(77)};
  std::vector<Call> calls = SavingClient(1).record(kBegin, kEnd);
  ASSERT_GT(calls.size(), 15u);
  Tally tally;
  unsigned present = 1;
  for (const Call& call : calls) {
    unsigned wanted = present + 1;
    ASSERT_EQ(SavingClient(wanted).killAt(call), 128 + SIGKILL) << call.text;
    int code = StartAfter(present, wanted, all);
    Count(&tally, code, i, call);
    if (code == kNew) present = wanted;
  }
  tally.print("client's save");
  tally.expectNoLoss();
  EXPECT_GT(tally.old, 0);
  EXPECT_GT(tally.fresh, 0);
  ExpectWhole(i);
}

// Whole starts of the command-line client, each from the same state: from the first check of the
// sidecar to the last call that has to do with the installation.
void KillStarts(const char* what, const Installation& i, const std::vector<GUID>& all,
                size_t atLeast, const std::function<void()>& prepare,
                const std::function<void()>& check) {
  // The client by itself: the command inspects the database before it becomes the client.
  Tracing start({std::string(VLT_TEST_BIN) + "/vltctl-client", "list", "--live"}, {});
  // The first run of all makes the directories of the locks and the log, which later ones find: calls
  // are found again by their number.
  EXPECT_EQ(start.runOnce(), 0);
  prepare();
  std::vector<Call> calls = start.record("vlt.vl5", i.root());
  ASSERT_GT(calls.size(), atLeast);
  Tally tally;
  for (size_t n = 0; n < calls.size(); n += kCallsPerKill) {
    const Call& call = calls[n];
    prepare();
    ASSERT_EQ(start.killAt(call), 128 + SIGKILL) << call.text;
    Count(&tally, StartAfter(kDefaultCacheSize, kDefaultCacheSize, all), i, call);
    check();
  }
  tally.print(what);
  tally.expectNoLoss();
  ExpectWhole(i);
}

TEST_F(RegistrarKill, AtEveryCallOfAFirstStart) {
  Installation i;
  i.addDictionary("Core", "Core", GText(1), 7, "co");
  i.addObjectExpert("Tank", "Tank", GText(2));
  auto prepare = [&] {
    for (const char* name : {"/vlt.vlr", "/vlt.vl5", "/vlt.TMP", "/vlt.vl5.TMP", "/Data"}) {
      std::filesystem::remove(i.root() + name);
    }
  };
  KillStarts("first start", i, {kVltdd, G(1), G(2)}, 100, prepare, [] {});
}

// The save that finds no sidecar writes the mark first.
TEST_F(RegistrarKill, AtEveryCallOfAStartWithoutASidecar) {
  Installation i;
  SetUpSaving(i);
  KillStarts(
      "start without a sidecar", i, {kVltdd, G(1), G(2), G(77)}, 30,
      [&] { std::filesystem::remove(i.sidecar()); }, [] {});
}

// What the changed file brought before is erased, merged again and saved.
TEST_F(RegistrarKill, AtEveryCallOfAStartThatMerges) {
  Installation i;
  i.addObjectExpert("Tank", "Tank", GText(2), "{" + GText(2) + "}:1:{" + GText(9) + "}");
  std::string file = i.addDictionary("Core", "Core", GText(1), 7, "co");
  ExpectStart([](IvltRegistrar& r) { RegisterOne(r); });
  time_t time = Installation::kInstalled;
  KillStarts(
      "start that merges", i, {kVltdd, G(1), G(2), G(77)}, 50,
      [&] { Installation::touch(file, ++time); },
      [&] {
        EXPECT_EQ(DatabaseText(i.database()).quoted("Registration", file),
                  Installation::stamp(time));
      });
}

}  // namespace
}  // namespace vlt::test

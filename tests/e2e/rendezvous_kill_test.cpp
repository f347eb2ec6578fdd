// A process killed at every single system call of each call that writes the jar or a settings file, by
// strace's injection. Whatever the moment, the next process finds the old or the new notes, nothing is
// lost and nothing set aside, and it can write in its turn.
#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>

#include "tests/e2e/Start.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/Rendezvous.h"

namespace vlt::test {
namespace {

__attribute__((constructor)) void ActAsClient() { ActAsRendezvousClient(); }

// A sanitizer sees nothing in a process that is killed, and makes each one slow.
size_t CallsPerKill() { return FullSize() ? 1 : kCanLimitMemory ? 17 : 61; }

// The notes that may be in the jar after the call was killed.
struct Expected {
  Notes old, fresh;
};

Expected Expect(const WritingCall& call, Before before, const Notes& old) {
  Expected expected = {old, old};
  if (call.item) expected.fresh[call.item] = JarIsThere(before) ? call.value : call.valueInEmpty;
  return expected;
}

// The cookie as the next process finds it, or makes it.
std::string CookieIn(const Notes& notes) {
  auto found = notes.find("CookieSection/LastServerCookie");
  return found == notes.end() ? "0" : found->second;
}

// Exit codes of the reader.
enum After { kRead = 10, kUnopenable, kOtherCookie };

// The next process: opens both files, reads the cookie, and writes a note.
int ReadAndWriteAfter(const std::string& cookie) {
  return Child([&] {
           int found = 9;
           try {
             if (AskForCookie(&found) != S_OK) return static_cast<int>(kUnopenable);
             if (found != atoi(cookie.c_str())) return static_cast<int>(kOtherCookie);
             return vltAddSvrProcessIDToJar(L"Reader", 5) == S_OK ? static_cast<int>(kRead)
                                                                  : static_cast<int>(kUnopenable);
           } catch (...) {
             return static_cast<int>(kUnopenable);
           }
         })
      .wait();
}

class RendezvousKill : public testing::Test {
 protected:
  void SetUp() override {
    std::string missing = Tracing::Missing();
    if (!missing.empty()) {
      printf("NOT TESTED: kills during a call; %s\n", missing.c_str());
      GTEST_SKIP() << missing;
    }
  }

  std::string locks() const { return place.work() + "/locks"; }

  // The files that no call of the rendezvous changes once they are there.
  void expectSettingsKept(const Call& at) const {
    for (const std::string& file : {place.settings(), place.workSettings()}) {
      std::string bytes = Exists(file) ? ReadBytes(file) : "";
      bool kept = bytes == m_settings;
      if (!kept) ++tally.lost;
      EXPECT_TRUE(kept) << file << " after a kill at " << at.text;
    }
  }

  void check(const Expected& expected, const Call& at) const {
    ++tally.kills;
    Notes found = NotesIn(place.jar());
    tally.fresh += found == expected.fresh && expected.fresh != expected.old;
    tally.old += found == expected.old;
    bool lost = found != expected.old && found != expected.fresh;
    tally.lost += lost;
    expectSettingsKept(at);
    int code = ReadAndWriteAfter(CookieIn(found));
    tally.refused += code != kRead;
    // What the reader adds, and nothing else.
    found["CookieSection/LastServerCookie"] = CookieIn(found);
    found["Reader/ServerProcessID"] = "5";
    bool changed = NotesIn(place.jar()) != found;
    tally.lost += changed;
    int setAside = FilesSetAside(place.root());
    tally.setAside += setAside;
    EXPECT_TRUE(!lost && !changed && code == kRead && setAside == 0)
        << "killed at " << at.text << ": the next process ends with " << code;
    EXPECT_EQ(Hex(ReadBytes(place.jarSidecar())), Md5Sum(place.jar())) << at.text;
    for (const std::string& path : {place.data(), place.jar(), place.jarSidecar()}) {
      EXPECT_EQ(ModeOf(path), 0777) << path << " after a kill at " << at.text;
    }
  }

  // A jar with a short sidecar is set aside whole, by the killed process or by the next one, and once.
  void checkGivenUp(const Expected& expected, const Call& at) const {
    ++tally.kills;
    expectSettingsKept(at);
    bool byTheNext = Exists(place.jar()) && ReadBytes(place.jar()) == RendezvousPlace::kJar;
    Notes found = byTheNext ? Notes() : NotesIn(place.jar());
    tally.old += found == expected.old;
    tally.fresh += found == expected.fresh && expected.fresh != expected.old;
    int code = ReadAndWriteAfter(CookieIn(found));
    tally.refused += code != kRead;
    found["CookieSection/LastServerCookie"] = CookieIn(found);
    found["Reader/ServerProcessID"] = "5";
    std::string bad = place.bad(place.jar());
    bool kept = !bad.empty() && ReadBytes(bad) == RendezvousPlace::kJar &&
                FilesSetAside(place.root()) == 1 && NotesIn(place.jar()) == found;
    tally.lost += !kept;
    EXPECT_TRUE(kept && code == kRead) << at.text << ": the next process ends with " << code;
  }

  void killEach(size_t number, Before before) {
    const WritingCall& call = WritingCalls()[number];
    Tracing client = RendezvousClient(number, place, library);
    // Once unrecorded: the first one makes the places of the locks.
    place.prepare(before);
    EXPECT_EQ(client.runOnce(), kDone) << call.name;
    place.prepare(before);
    Expected expected = Expect(call, before, NotesIn(place.jar()));
    if (before == Before::ShortJarSidecar) expected = Expect(call, before, {});
    m_settings = Exists(place.settings()) ? ReadBytes(place.settings()) : "";
    std::vector<Call> calls = client.record(kClientBegins, kClientEnds);
    EXPECT_EQ(NotesIn(place.jar()), expected.fresh) << call.name;
    ASSERT_GT(calls.size(), 8u);
    m_points += calls.size();
    for (const Call& at : calls) {
      if (m_turn++ % CallsPerKill() != 0) continue;
      place.prepare(before);
      ASSERT_EQ(client.killAt(at), 128 + SIGKILL) << at.text;
      before == Before::ShortJarSidecar ? checkGivenUp(expected, at) : check(expected, at);
    }
  }

  void run(Before before) {
    // Where nothing was before, there is no place for the locks either.
    if (before == Before::NoDirectory) setenv("ZTFNDTMPSHAREDFILEDIR", locks().c_str(), 1);
    for (size_t number = 0; number < WritingCalls().size(); ++number) {
      const WritingCall& call = WritingCalls()[number];
      if (before == Before::NoDirectory && !call.makesDirectory) continue;
      if (before == Before::ShortJarSidecar && !call.item) continue;
      killEach(number, before);
      if (HasFatalFailure()) return;
    }
    printf("%zu points; ", m_points);
    tally.print(NameOf(before));
    tally.expectNoLoss();
    if (CallsPerKill() > 20) return;  // A few kills need not meet both.
    EXPECT_GT(tally.old, 0);
    EXPECT_GT(tally.fresh, 0);
  }

  RendezvousPlace place;
  IdentityLibrary library;
  mutable Tally tally;

 private:
  std::string m_settings;
  size_t m_points = 0, m_turn = 0;
};

TEST_F(RendezvousKill, AtEveryCallWithSidecars) { run(Before::Sealed); }
TEST_F(RendezvousKill, AtEveryCallWithoutSidecars) { run(Before::NoSidecars); }
TEST_F(RendezvousKill, AtEveryCallOverFilesEditedByHand) { run(Before::Stale); }
TEST_F(RendezvousKill, AtEveryCallThatGivesTheJarUp) { run(Before::ShortJarSidecar); }
TEST_F(RendezvousKill, AtEveryCallThatBeginsTheFiles) { run(Before::NoFiles); }
TEST_F(RendezvousKill, AtEveryCallThatMakesTheDirectory) { run(Before::NoDirectory); }

}  // namespace
}  // namespace vlt::test

// Every system call that each writing call of the rendezvous makes about files fails once, with each
// of five errors, by strace's injection. The call returns a result or throws what callers know, leaves no
// descriptor open and does not hang; the next process finds the old or the new notes, and the new ones
// if the call had said that it was done.
#include <gtest/gtest.h>

#include <algorithm>
#include <set>

#include "tests/e2e/Start.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/Rendezvous.h"

namespace vlt::test {
namespace {

__attribute__((constructor)) void ActAsClient() { ActAsRendezvousClient(); }

constexpr const char* kErrors[] = {"EIO", "ENOSPC", "EACCES", "EMFILE", "EROFS"};

// Among all the other tests of a run the disk alone may take seconds.
int LongestMs() { return FullSize() && kCanLimitMemory ? 5000 : 20000; }

size_t CallsPerFault() { return FullSize() ? 1 : kCanLimitMemory ? 67 : 331; }

// What has to do with no file, and the check that marks the begin and the end. A sanitizer tests addresses
// by writing from them into a pipe, not equally often in each run, and ends the process where that
// fails: there no write can be told from its own by its number.
bool IsAboutFiles(const Call& call) {
  static const std::set<std::string> others = {
      "getpid",        "gettid",    "getuid",          "geteuid",        "getgid",  "getegid",
      "uname",         "prlimit64", "ugetrlimit",      "rt_sigprocmask", "sysinfo", "rt_sigaction",
      "clock_gettime", "getrandom", "clock_gettime64", "pipe",           "pipe2"};
  return others.count(call.name) == 0 && call.text.find("/vlt-call-") == std::string::npos &&
         (kCanLimitMemory || call.name != "write");
}

bool IsRead(const Call& call) {
  static const std::set<std::string> names = {"read", "pread64", "lseek", "_llseek"};
  return names.count(call.name) != 0;
}

bool Mentions(const Call& call, const std::string& text) {
  return call.text.find(text) != std::string::npos;
}

class RendezvousFault : public testing::Test {
 protected:
  void SetUp() override {
    std::string missing = Tracing::Missing();
    if (!missing.empty()) {
      printf("NOT TESTED: failing system calls; %s\n", missing.c_str());
      GTEST_SKIP() << missing;
    }
  }

  // Where the installation cannot be found out, or its data directory not be seen, there is nothing to
  // write, and some calls take that as done.
  bool hidesTheDirectory(const Call& at) const {
    return Mentions(at, "com.zentrex.kor.ini") || Mentions(at, "\"" + place.data() + "\"") ||
           Mentions(at, "\"" + place.data() + "/\"") || Mentions(at, "/.config") ||
           Mentions(at, "libZT-RPC");
  }

  void checkOutcome(int code, const Call& at, const std::string& what) {
    ASSERT_GE(code, 0) << what << ": it hangs";
    int outcome = code % 10, left = code / 10;
    m_done += outcome == kDone;
    m_failed += outcome == kFailed;
    m_threw += outcome == kThrew;
    EXPECT_LE(outcome, kThrew) << what;
    // An injected failure of close leaves the descriptor open, which the kernel never does.
    EXPECT_EQ(left, at.name == "close" ? std::min(left, 1) : 0) << what << ": descriptors left";
  }

  // Notes that cannot be read are set aside as they are, and only those.
  void checkSetAside(const Call& at, const WritingCall& call, Before before,
                     const std::string& what) {
    ++m_setAside;
    EXPECT_EQ(FilesSetAside(place.root()), 1) << what;
    EXPECT_TRUE(IsRead(at)) << what;
    for (const auto& [file, bytes] :
         {std::pair{place.jar(), RendezvousPlace::kJar},
          std::pair{place.settings(), RendezvousPlace::kSettings},
          std::pair{place.workSettings(), RendezvousPlace::kSettings}}) {
      std::string bad = place.bad(file);
      if (bad.empty()) continue;
      EXPECT_TRUE(Mentions(at, file.substr(0, file.rfind('.')))) << what;
      EXPECT_EQ(ReadBytes(bad), JarIsThere(before) ? bytes : "") << what;
    }
    if (place.bad(place.jar()).empty()) return;
    Notes found = NotesIn(place.jar()), fresh;
    if (call.item) fresh[call.item] = call.valueInEmpty;
    EXPECT_TRUE(found.empty() || found == fresh) << what;
  }

  void check(const WritingCall& call, Before before, const Call& at, int code,
             const std::string& what) {
    if (FilesSetAside(place.root()) != 0) {
      checkSetAside(at, call, before, what);
    } else {
      Notes old = JarIsThere(before) ? m_jar : Notes(), fresh = old, found = NotesIn(place.jar());
      if (call.item) fresh[call.item] = JarIsThere(before) ? call.value : call.valueInEmpty;
      bool reported = code % 10 != kDone || !call.tellsOfTheJar || hidesTheDirectory(at);
      bool good = found == fresh || (found == old && reported);
      m_lost += !good;
      m_quiet += found == old && found != fresh && code % 10 == kDone;
      EXPECT_TRUE(good) << what << " ended with " << code;
      for (const std::string& file : {place.settings(), place.workSettings()}) {
        EXPECT_EQ(Exists(file) ? ReadBytes(file) : "",
                  JarIsThere(before) ? RendezvousPlace::kSettings : "")
            << what;
      }
    }
    EXPECT_EQ(Child([] {
                int cookie = 0;
                return AskForCookie(&cookie) == S_OK && vltSetServerCookie(1) == S_OK ? 0 : 1;
              }).wait(),
              0)
        << what << ": the next process fails";
  }

  void failEach(size_t number, Before before) {
    const WritingCall& call = WritingCalls()[number];
    Tracing client = RendezvousClient(number, place, library);
    place.prepare(before);
    m_jar = NotesIn(place.jar());
    EXPECT_EQ(client.runOnce(), kDone) << call.name;
    place.prepare(before);
    std::vector<Call> calls = client.record(kClientBegins, kClientEnds);
    std::erase_if(calls, [](const Call& at) { return !IsAboutFiles(at); });
    ASSERT_GT(calls.size(), 8u);
    m_points += calls.size();
    for (const Call& at : calls) {
      for (const char* error : kErrors) {
        if (m_turn++ % CallsPerFault() != 0) continue;
        place.prepare(before);
        ++m_runs;
        int code = client.failAt(at, error, LongestMs());
        std::string what = std::string(call.name) + ", " + error + " at " + at.text;
        checkOutcome(code, at, what);
        if (code >= 0) check(call, before, at, code, what);
      }
    }
  }

  void run(Before before) {
    for (size_t number = 0; number < WritingCalls().size(); ++number) {
      failEach(number, before);
      if (HasFatalFailure()) return;
    }
    printf(
        "%s: %zu points, %zu failing calls; %zu times done, %zu a negative result, %zu an "
        "exception; "
        "%zu files set aside unread, %zu times done without a write, %zu notes lost\n",
        NameOf(before), m_points, m_runs, m_done, m_failed, m_threw, m_setAside, m_quiet, m_lost);
    if (CallsPerFault() > 100) return;  // A few failures need not show in a result.
    EXPECT_GT(m_failed + m_threw, 0u);
    EXPECT_GT(m_done, 0u);
  }

  RendezvousPlace place;
  IdentityLibrary library;

 private:
  Notes m_jar;
  size_t m_points = 0, m_turn = 0, m_runs = 0, m_done = 0, m_failed = 0, m_threw = 0;
  size_t m_setAside = 0, m_quiet = 0, m_lost = 0;
};

TEST_F(RendezvousFault, OfEveryCallWithSidecars) { run(Before::Sealed); }
TEST_F(RendezvousFault, OfEveryCallThatBeginsTheFiles) { run(Before::NoFiles); }

}  // namespace
}  // namespace vlt::test

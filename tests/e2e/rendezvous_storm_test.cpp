// Processes that write the jar all at once and are killed at random moments. After every batch of kills
// the jar opens, holds values that a writer wrote, and has everything that was acknowledged.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <random>
#include <thread>

#include "tests/e2e/Start.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/Rendezvous.h"

namespace vlt::test {
namespace {

using Clock = std::chrono::steady_clock;

constexpr int kWriters = 4;
constexpr int kFirstPort = 61901, kPorts = 200;
constexpr unsigned kShortestUs = 5000, kLongestUs = 400000;
constexpr unsigned kSeed = 20261121;
// Cookies tell who wrote them: this much times the writer, and his count.
constexpr int kCookiesOfAWriter = 100000000;

int Kills() { return FullSize() ? 10000 : kCanLimitMemory ? 1000 : 80; }

// What a writer does in turn, and has been acknowledged.
enum Kind { kProcessId, kCookie, kEndpoint, kKinds };
struct Acknowledgement {
  Kind kind;
  int value;
};

// Of one writer, over all of his lives.
struct Written {
  int count = 0;  // last value that may have been written
  std::array<int, kKinds> acknowledged = {};
  int endpoints = 0;
};

std::wstring SectionOf(int writer) { return L"Writer " + std::to_wstring(writer); }

bool WriteOne(int writer, Kind kind, int value) {
  HRESULT result = E_FAIL;
  if (kind == kProcessId) result = vltAddSvrProcessIDToJar(SectionOf(writer).c_str(), value);
  if (kind == kCookie) result = vltSetServerCookie(writer * kCookiesOfAWriter + value);
  if (kind == kEndpoint) AskForEndpoint(&result);
  return result == S_OK;
}

// Memory that survives the writer and says how far he is; the pipe says what was acknowledged.
struct Shared {
  volatile int begun[kWriters];
};

class Pipe {
 public:
  Pipe() { EXPECT_EQ(pipe2(m_fds, O_CLOEXEC | O_NONBLOCK), 0); }
  ~Pipe() {
    close(m_fds[0]);
    close(m_fds[1]);
  }
  Pipe(const Pipe&) = delete;
  Pipe& operator=(const Pipe&) = delete;
  bool send(const Acknowledgement& one) const { return write(m_fds[1], &one, sizeof one) > 0; }
  bool receive(Acknowledgement* one) const { return read(m_fds[0], one, sizeof *one) > 0; }

 private:
  int m_fds[2];
};

class RendezvousStorm : public testing::Test {
 protected:
  RendezvousStorm()
      : shared(static_cast<Shared*>(mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE,
                                         MAP_SHARED | MAP_ANONYMOUS, -1, 0))) {}
  ~RendezvousStorm() override { munmap(shared, sizeof(Shared)); }

  // One life: until he is killed.
  int live(int writer, unsigned seed, int count) {
    std::minstd_rand random(seed);
    for (;;) {
      auto kind = static_cast<Kind>(random() % kKinds);
      shared->begun[writer] = ++count;
      if (!WriteOne(writer, kind, count)) return 1;
      if (!pipes[writer].send({kind, count})) return 2;
    }
  }

  // Starts all writers and kills each at a moment of his own.
  void batch() {
    std::vector<std::pair<Clock::time_point, int>> order;
    std::vector<Child> children;
    for (int w = 0; w < kWriters; ++w) {
      unsigned seed = static_cast<unsigned>(random());
      int count = written[w].count;
      children.emplace_back([this, w, seed, count] { return live(w, seed, count); });
      order.push_back({Clock::now() + std::chrono::microseconds(random() % longestLifeUs), w});
    }
    std::sort(order.begin(), order.end());
    for (const auto& [moment, w] : order) {
      std::this_thread::sleep_until(moment);
      children[static_cast<size_t>(w)].kill(SIGKILL);
    }
    for (Child& child : children) ASSERT_EQ(child.wait(), 128 + SIGKILL);
    tally.kills += kWriters;
    for (int w = 0; w < kWriters; ++w) takeAcknowledgements(w);
  }

  void takeAcknowledgements(int w) {
    Acknowledgement one;
    while (pipes[w].receive(&one)) {
      written[w].acknowledged[one.kind] = one.value;
      written[w].count = one.value;
      written[w].endpoints += one.kind == kEndpoint;
      ++acknowledged;
    }
    // Begun when he was killed: may be there or not.
    inFlight[w] = shared->begun[w] > written[w].count;
    written[w].count = std::max(written[w].count, static_cast<int>(shared->begun[w]));
  }

  // So that about every second life brings a write to its end, however fast the disk is.
  void adaptLives() {
    const bool tooShort = acknowledged < tally.kills / 2;
    longestLifeUs = std::clamp(tooShort ? longestLifeUs / 10 * 11 : longestLifeUs / 10 * 9,
                               kShortestUs, kLongestUs);
  }

  // Either the last acknowledged value or the one that was begun.
  void expectValue(const char* what, int w, Kind kind, int found) {
    bool good =
        found == written[w].acknowledged[kind] || (inFlight[w] && found == written[w].count);
    tally.lost += !good;
    EXPECT_TRUE(good) << what << " of writer " << w << ": " << found << "; acknowledged "
                      << written[w].acknowledged[kind] << ", begun " << written[w].count;
    if (good) written[w].acknowledged[kind] = found;
  }

  void expectCookie(int cookie) {
    if (cookie == 0) {
      for (int w = 0; w < kWriters; ++w) expectValue("cookie", w, kCookie, 0);
      return;
    }
    int w = cookie / kCookiesOfAWriter;
    ASSERT_TRUE(w >= 0 && w < kWriters) << cookie;
    expectValue("cookie", w, kCookie, cookie % kCookiesOfAWriter);
  }

  // Each acknowledged request moved the counter on by one, and each that was under way perhaps.
  void expectCounter(int next) {
    int told = 0, perhaps = 0;
    for (int w = 0; w < kWriters; ++w) {
      told += std::exchange(written[w].endpoints, 0);
      perhaps += inFlight[w];
    }
    ASSERT_LT(told + perhaps, kPorts) << "the batches are too long to count";
    int moved = (next - counter + kPorts) % kPorts;
    bool good = next >= kFirstPort && next < kFirstPort + kPorts && moved >= told &&
                moved <= told + perhaps;
    tally.lost += !good;
    EXPECT_TRUE(good) << "from " << counter << " to " << next << " with " << told
                      << " requests done and " << perhaps << " under way";
    counter = next;
  }

  static int number(const Notes& notes, const std::string& item, int fallback) {
    auto found = notes.find(item);
    return found == notes.end() ? fallback : atoi(found->second.c_str());
  }

  // What a process that comes next reads.
  void expectOpens(int cookie) {
    int code = Child([cookie] {
                 int found = -1;
                 return AskForCookie(&found) == S_OK && found == cookie ? 0 : 1;
               }).wait();
    tally.refused += code != 0;
    EXPECT_EQ(code, 0);
  }

  void check() {
    Notes notes = NotesIn(place.jar());
    int cookie = number(notes, "CookieSection/LastServerCookie", 0);
    for (int w = 0; w < kWriters; ++w) {
      std::string item = "Writer " + std::to_string(w) + "/ServerProcessID";
      expectValue("process id", w, kProcessId, number(notes, item, 0));
    }
    expectCookie(cookie);
    expectCounter(number(notes, "OfflineStorageSection/NextEndpt", kFirstPort));
    expectOpens(cookie);
    tally.setAside += FilesSetAside(place.root());
  }

  RendezvousPlace place;
  Shared* shared;
  Pipe pipes[kWriters];
  Written written[kWriters];
  bool inFlight[kWriters] = {};
  int counter = kFirstPort;
  int acknowledged = 0;
  unsigned longestLifeUs = 20000;
  std::mt19937 random{kSeed};
  Tally tally;
};

TEST_F(RendezvousStorm, NothingAcknowledgedIsLostWhenWritersAreKilled) {
  place.prepare(Before::NoFiles);
  auto begin = Clock::now();
  for (int n = 0; tally.kills < Kills() && !HasFailure(); ++n) {
    // Now and then the next writer has to begin a sidecar.
    if (n % 10 == 9) std::filesystem::remove(place.jarSidecar());
    batch();
    check();
    adaptLives();
  }
  printf(
      "storm, seed %u: %d kills in %.1f s, %d writes acknowledged; %d values lost, %d files set "
      "aside, "
      "%d opens refused\n",
      kSeed, tally.kills, std::chrono::duration<double>(Clock::now() - begin).count(), acknowledged,
      tally.lost, tally.setAside, tally.refused);
  EXPECT_EQ(tally.lost + tally.setAside + tally.refused, 0);
  EXPECT_GT(acknowledged, tally.kills / 10);
}

}  // namespace
}  // namespace vlt::test

// Many processes and threads ask for offline endpoints at once: no request is lost, none is answered
// twice within a round of the circle, and the counter in the jar is exact.
#include <gtest/gtest.h>
#include <sys/mman.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "tests/e2e/Start.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/Rendezvous.h"

namespace vlt::test {
namespace {

constexpr int kFirstPort = 61901, kPorts = 200;
constexpr int kLongestMs = 1200000;

// How often each port was assigned, by all processes.
struct Handed {
  std::atomic<int> times[kPorts];
  std::atomic<int> wrong;
};

class RendezvousCount : public testing::Test {
 protected:
  RendezvousCount()
      : handed(static_cast<Handed*>(mmap(nullptr, sizeof(Handed), PROT_READ | PROT_WRITE,
                                         MAP_SHARED | MAP_ANONYMOUS, -1, 0))) {}
  ~RendezvousCount() override { munmap(handed, sizeof(Handed)); }

  void ask(int requests) {
    for (int i = 0; i < requests; ++i) {
      HRESULT result = E_FAIL;
      std::string endpoint = AskForEndpoint(&result, L"a storage without an entry");
      int port = atoi(endpoint.c_str()) - kFirstPort;
      bool good = result == S_OK && port >= 0 && port < kPorts &&
                  endpoint == std::to_string(kFirstPort + port);
      good ? ++handed->times[port] : ++handed->wrong;
    }
  }

  int askInThreads(int threads, int requests) {
    std::vector<std::thread> all;
    for (int t = 0; t < threads; ++t) all.emplace_back([&] { ask(requests); });
    for (auto& thread : all) thread.join();
    return 0;
  }

  void run(const char* what, int processes, int threads, int requests) {
    place.prepare(Before::NoFiles);
    auto begin = std::chrono::steady_clock::now();
    std::vector<Child> children;
    for (int p = 0; p < processes; ++p) {
      children.emplace_back([&] { return askInThreads(threads, requests); });
    }
    for (Child& child : children) EXPECT_EQ(child.wait(kLongestMs), 0);
    std::chrono::duration<double> took = std::chrono::steady_clock::now() - begin;
    const int total = processes * threads * requests;
    int answered = 0, uneven = 0;
    for (int port = 0; port < kPorts; ++port) {
      // The ports after the last full round were assigned once less.
      int expected = total / kPorts + (port < total % kPorts ? 1 : 0);
      answered += handed->times[port];
      uneven += handed->times[port] != expected;
    }
    printf("%s: %d requests in %.1f s, %d answers, %d wrong answers, %d ports assigned unevenly\n",
           what, total, took.count(), answered, handed->wrong.load(), uneven);
    EXPECT_EQ(handed->wrong, 0);
    EXPECT_EQ(answered, total);
    EXPECT_EQ(uneven, 0);
    Notes expected = {
        {"OfflineStorageSection/NextEndpt", std::to_string(kFirstPort + total % kPorts)}};
    EXPECT_EQ(NotesIn(place.jar()), expected);
    EXPECT_EQ(Hex(ReadBytes(place.jarSidecar())), Md5Sum(place.jar()));
    EXPECT_EQ(FilesSetAside(place.root()), 0);
  }

  RendezvousPlace place;
  Handed* handed;
};

TEST_F(RendezvousCount, NoRequestOfManyProcessesIsLost) {
  if (FullSize()) return run("8 processes", 8, 1, 10000);
  run("4 processes", 4, 1, kCanLimitMemory ? 503 : 103);
}

TEST_F(RendezvousCount, NoRequestOfManyThreadsIsLost) {
  if (FullSize()) return run("2 processes of 4 threads", 2, 4, 10000);
  run("2 processes of 4 threads", 2, 4, kCanLimitMemory ? 127 : 27);
}

}  // namespace
}  // namespace vlt::test

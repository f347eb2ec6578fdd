#include "tests/support/ForkStorm.h"

#include <poll.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/TempDir.h"
#include "tests/support/Tracing.h"

namespace vlt::test {
namespace {

using Clock = std::chrono::steady_clock;

constexpr auto kInterval = std::chrono::seconds(5);
constexpr auto kLongest = std::chrono::seconds(60);
constexpr int kFull = 2000;
constexpr int kEnoughHung = 3;

// A process as the kernel reports it, with the processor time it has had in nanoseconds. It is the
// same text as long as the process does nothing.
std::string WhatItDid(pid_t pid) {
  std::string place = "/proc/" + std::to_string(pid);
  return ReadBytes(place + "/stat") + ReadBytes(place + "/schedstat");
}

// Not one that waits for a processor or a disk, which are slow on a busy machine.
bool Sleeps(const std::string& whatItDid) {
  size_t state = whatItDid.rfind(") ");  // after the name, which is in parentheses
  return state != std::string::npos && whatItDid[state + 2] == 'S';
}

// The exit code, or -1 for a child that is hung: it sleeps, and did nothing for a whole interval,
// or it runs beyond any measure.
int EndOf(pid_t pid) {
  int status = 0;
  const auto last = Clock::now() + kLongest;
  std::string before;
  for (auto next = Clock::now() + kInterval; waitpid(pid, &status, WNOHANG) != pid;) {
    if (Clock::now() >= last) return -1;
    if (Clock::now() >= next) {
      std::string now = WhatItDid(pid);
      if (now == before && Sleeps(now)) return -1;
      before = now;
      next = Clock::now() + kInterval;
    }
    poll(nullptr, 0, 1);
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

// Not Child, which uses the standard streams.
void ForkOne(const std::function<bool()>& once, ForkStorm* storm) {
  pid_t parent = getpid();
  pid_t pid = fork();
  if (pid == 0) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) _exit(98);
    try {
      _exit(once() ? 0 : 1);
    } catch (...) {
      _exit(2);
    }
  }
  ++storm->children;
  int end = pid < 0 ? 97 : EndOf(pid);
  if (end == -1) {
    ++storm->hung;
    kill(pid, SIGKILL);
    waitpid(pid, nullptr, 0);
  } else if (end != 0) {
    ++storm->failed;
  }
}

}  // namespace

ForkStorm RunForkStorm(const std::function<void()>& busy, const std::function<bool()>& once,
                       int budgetMs) {
  std::atomic<bool> stop{false};
  std::vector<std::thread> threads;
  for (int t = 0; t < 2; ++t) {
    threads.emplace_back([&] {
      while (!stop) busy();
    });
  }
  ForkStorm storm;
  const auto end = Clock::now() + std::chrono::milliseconds(budgetMs);
  while (storm.hung < kEnoughHung && storm.children < kFull && (FullSize() || Clock::now() < end)) {
    ForkOne(once, &storm);
  }
  stop = true;
  for (auto& thread : threads) thread.join();
  return storm;
}

std::ostream& operator<<(std::ostream& out, const ForkStorm& storm) {
  return out << storm.children << " children, " << storm.hung << " hung, " << storm.failed
             << " failed";
}

}  // namespace vlt::test

#include "tests/support/ForkStorm.h"

#include <poll.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <thread>
#include <vector>

#include "tests/support/Tracing.h"

namespace vlt::test {
namespace {

using Clock = std::chrono::steady_clock;

constexpr auto kLimit = std::chrono::seconds(5);
constexpr int kFull = 2000;
constexpr int kEnoughHung = 3;

int EndOf(pid_t pid) {
  int status = 0;
  for (auto end = Clock::now() + kLimit; waitpid(pid, &status, WNOHANG) != pid;) {
    if (Clock::now() >= end) return -1;
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

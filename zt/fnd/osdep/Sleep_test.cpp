#include "zt/fnd/osdep/Sleep.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <signal.h>

#include <atomic>
#include <chrono>

#include "tests/support/ThreadState.h"

namespace zt::fnd::osdep {
namespace {

using Clock = std::chrono::steady_clock;

TEST(Sleep, SleepsItsTime) {
  auto start = Clock::now();
  Sleep(20);
  EXPECT_GE(Clock::now() - start, std::chrono::milliseconds(20));
  Sleep(0);
}

std::atomic<int> g_signals{0};

TEST(Sleep, SignalDoesNotCutItShort) {
  struct sigaction action = {}, before = {};
  action.sa_handler = [](int) { ++g_signals; };
  sigaction(SIGUSR1, &action, &before);  // without SA_RESTART
  Clock::duration slept{};
  vlt::test::WatchedThread sleeper([&] {
    auto start = Clock::now();
    Sleep(150);
    slept = Clock::now() - start;
  });
  while (sleeper.fallsAsleep()) pthread_kill(sleeper.handle(), SIGUSR1);
  sleeper.join();
  sigaction(SIGUSR1, &before, nullptr);
  EXPECT_GE(slept, std::chrono::milliseconds(150));
  EXPECT_GT(g_signals, 1);
}

}  // namespace
}  // namespace zt::fnd::osdep

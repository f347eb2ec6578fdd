#include "zt/fnd/osdep/Sleep.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <signal.h>

#include <atomic>
#include <chrono>
#include <thread>

namespace zt::fnd::osdep {
namespace {

using Clock = std::chrono::steady_clock;

TEST(ThreadSleep, SleepsItsTime) {
  auto start = Clock::now();
  Sleep(20);
  EXPECT_GE(Clock::now() - start, std::chrono::milliseconds(20));
  Sleep(0);
}

std::atomic<int> g_signals{0};

TEST(ThreadSleep, SignalDoesNotCutItShort) {
  struct sigaction action = {}, before = {};
  action.sa_handler = [](int) { ++g_signals; };
  sigaction(SIGUSR1, &action, &before);  // without SA_RESTART
  std::atomic<bool> asleep{false}, done{false};
  Clock::duration slept{};
  std::thread sleeper([&] {
    asleep = true;
    auto start = Clock::now();
    Sleep(150);
    slept = Clock::now() - start;
    done = true;
  });
  while (!asleep) std::this_thread::yield();
  while (!done) {
    pthread_kill(sleeper.native_handle(), SIGUSR1);
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  }
  sleeper.join();
  sigaction(SIGUSR1, &before, nullptr);
  EXPECT_GE(slept, std::chrono::milliseconds(150));
  EXPECT_GT(g_signals, 1);
}

}  // namespace
}  // namespace zt::fnd::osdep

#include "zt/fnd/osdep/ForkSafeMutex.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <future>
#include <memory>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/Sanitizer.h"
#include "zt/fnd/osdep/LeakedInstance.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::Child;

constexpr int kRank = 1;

// A thread that holds a mutex until the object goes.
class Holder {
 public:
  explicit Holder(ForkSafeMutex& mutex)
      : m_thread([this, &mutex] {
          mutex.lock();
          m_held.set_value();
          m_end.get_future().wait();
          mutex.unlock();
        }) {
    m_held.get_future().wait();
  }
  ~Holder() {
    m_end.set_value();
    m_thread.join();
  }

 private:
  std::promise<void> m_held, m_end;
  std::thread m_thread;
};

bool FreeForOthers(ForkSafeMutex& mutex) {
  return std::async(std::launch::async,
                    [&] {
                      if (!mutex.try_lock()) return false;
                      mutex.unlock();
                      return true;
                    })
      .get();
}

TEST(ForkSafeMutex, IsRecursiveInAThread) {
  ForkSafeMutex mutex(AtFork::Wait, kRank);
  mutex.lock();
  mutex.lock();
  EXPECT_TRUE(mutex.try_lock());
  for (int holds = 3; holds > 0; --holds) {
    EXPECT_FALSE(FreeForOthers(mutex)) << holds;
    mutex.unlock();
  }
  EXPECT_TRUE(FreeForOthers(mutex));
  EXPECT_FALSE(mutex.takeInterrupted());
}

TEST(ForkSafeMutex, ThreadsExcludeEachOther) {
  ForkSafeMutex mutex(AtFork::Renew, kRank);
  int count = 0;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 5000; ++i) {
        ForkSafeHold hold(mutex);
        ++count;
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(20000, count);
}

TEST(ForkSafeMutex, ChildOfAForkInsideAHoldHoldsIt) {
  for (AtFork atFork : {AtFork::Wait, AtFork::Renew}) {
    ForkSafeMutex mutex(atFork, kRank);
    mutex.lock();
    mutex.lock();
    Child child([&] {
      if (FreeForOthers(mutex)) return 1;
      mutex.unlock();
      if (FreeForOthers(mutex)) return 2;
      mutex.unlock();
      if (!FreeForOthers(mutex)) return 3;
      return mutex.takeInterrupted() ? 4 : 0;
    });
    EXPECT_EQ(0, child.wait());
    EXPECT_FALSE(FreeForOthers(mutex));
    mutex.unlock();
    mutex.unlock();
    EXPECT_TRUE(FreeForOthers(mutex));
  }
}

TEST(ForkSafeMutex, RenewedOneIsFreeAndInterruptedInTheChildOnly) {
  ForkSafeMutex mutex(AtFork::Renew, kRank);
  {
    Holder holder(mutex);
    Child child([&] {
      mutex.lock();
      if (!mutex.takeInterrupted()) return 1;
      if (mutex.takeInterrupted()) return 2;
      mutex.unlock();
      return FreeForOthers(mutex) ? 0 : 3;
    });
    EXPECT_EQ(0, child.wait());
    EXPECT_FALSE(mutex.try_lock());
    EXPECT_FALSE(mutex.takeInterrupted());
  }
  EXPECT_TRUE(FreeForOthers(mutex));
}

// A second for each of them would be twenty.
TEST(ForkSafeMutex, ForkDoesNotWaitLongerThanASecondInAll) {
  constexpr int kMutexes = 20;
  std::vector<std::unique_ptr<ForkSafeMutex>> mutexes;
  std::vector<std::unique_ptr<Holder>> holders;
  for (int n = 0; n < kMutexes; ++n) {
    mutexes.push_back(std::make_unique<ForkSafeMutex>(AtFork::Wait, kRank + n));
    holders.push_back(std::make_unique<Holder>(*mutexes.back()));
  }
  auto begin = std::chrono::steady_clock::now();
  Child child([&] {
    for (auto& mutex : mutexes) {
      mutex->lock();
      EXPECT_TRUE(mutex->takeInterrupted());
    }
    return 0;
  });
  auto taken = std::chrono::steady_clock::now() - begin;
  EXPECT_EQ(0, child.wait());
  EXPECT_GE(taken, std::chrono::milliseconds(900));
  EXPECT_LT(taken, std::chrono::seconds(15));
}

// What the mutex guards is two numbers that are equal whenever it is free.
// Forks a child that returns 0, or 1 where it found a change interrupted. On a busy machine a thread
// may be kept from going on for longer than the second that a fork waits; only then may the child
// find that.
void ExpectWholeUnlessAfterTheSecond(const std::function<int()>& body, int round) {
  const auto before = std::chrono::steady_clock::now();
  Child child(body);
  const auto taken = std::chrono::steady_clock::now() - before;
  const int result = child.wait();
  const bool isAfterItsSecond = result == 1 && taken >= std::chrono::milliseconds(900);
  EXPECT_TRUE(result == 0 || isAfterItsSecond) << round << ": " << result;
}

TEST(ForkSafeMutex, ChildNeverSeesAHalfChangeOfAWaitedOne) {
  ForkSafeMutex mutex(AtFork::Wait, kRank);
  volatile int first = 0, second = 0;
  std::atomic<bool> stop{false};
  std::thread changer([&] {
    while (!stop) {
      ForkSafeHold hold(mutex);
      first = first + 1;
      for (int i = 0; i < 1000; ++i) second = second + 0;
      second = first;
    }
  });
  for (int i = 0; i < 100; ++i) {
    ExpectWholeUnlessAfterTheSecond(
        [&] {
          ForkSafeHold hold(mutex);
          if (mutex.takeInterrupted()) return 1;
          return first == second ? 0 : 2;
        },
        i);
  }
  stop = true;
  changer.join();
}

// Nobody waits a second where the threads take two in the other order than that of the ranks.
TEST(ForkSafeMutex, ForkGivesWayToAHolderWhoWaitsForWhatItHasTaken) {
  ForkSafeMutex low(AtFork::Wait, kRank), high(AtFork::Wait, kRank + 1);
  std::atomic<bool> stop{false};
  std::thread taker([&] {
    while (!stop) {
      ForkSafeHold first(high);
      std::this_thread::sleep_for(std::chrono::microseconds(100));
      ForkSafeHold second(low);
    }
  });
  auto begin = std::chrono::steady_clock::now();
  for (int i = 0; i < 20; ++i) {
    ExpectWholeUnlessAfterTheSecond(
        [&] {
          ForkSafeHold first(high);
          ForkSafeHold second(low);
          return high.takeInterrupted() || low.takeInterrupted() ? 1 : 0;
        },
        i);
  }
  EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(15));
  stop = true;
  taker.join();
}

// Threads take both in the order of the ranks, whichever was made first.
TEST(ForkSafeMutex, ForksOfSeveralThreadsWaitInTheOrderOfTheRanks) {
  ForkSafeMutex inner(AtFork::Wait, kRank + 1), outer(AtFork::Wait, kRank);
  std::atomic<bool> stop{false};
  std::vector<std::thread> threads;
  for (int t = 0; t < 3; ++t) {
    threads.emplace_back([&] {
      while (!stop) {
        ForkSafeHold first(outer);
        ForkSafeHold second(inner);
      }
    });
  }
  auto begin = std::chrono::steady_clock::now();
  std::vector<std::thread> forkers;
  for (int t = 0; t < 2; ++t) {
    forkers.emplace_back([&] {
      for (int i = 0; i < 30; ++i) {
        Child child([&] {
          ForkSafeHold first(outer);
          ForkSafeHold second(inner);
          return outer.takeInterrupted() || inner.takeInterrupted() ? 1 : 0;
        });
        EXPECT_EQ(0, child.wait()) << i;
      }
    });
  }
  for (auto& thread : forkers) thread.join();
  stop = true;
  for (auto& thread : threads) thread.join();
  EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(60));
}

TEST(ForkSafeMutex, MayBeMadeAndDestroyedWhileOthersFork) {
  if (!vlt::test::kCanForkWhileThreadsAllocate) {
    GTEST_SKIP() << "the sanitizer's allocator is not fork-safe";
  }
  std::atomic<bool> stop{false};
  std::thread maker([&] {
    while (!stop) {
      auto mutex = std::make_unique<ForkSafeMutex>(AtFork::Wait, kRank);
      ForkSafeHold hold(*mutex);
    }
  });
  for (int i = 0; i < 50; ++i) {
    Child child([] {
      ForkSafeMutex mutex(AtFork::Wait, kRank);
      ForkSafeHold hold(mutex);
      return 0;
    });
    EXPECT_EQ(0, child.wait()) << i;
  }
  stop = true;
  maker.join();
}

TEST(ForkSafeMutex, GrandchildFindsItFreeToo) {
  ForkSafeMutex mutex(AtFork::Renew, kRank);
  Holder holder(mutex);
  Child child([&] {
    Child grandchild([&] {
      mutex.lock();
      return mutex.takeInterrupted() ? 0 : 1;
    });
    return grandchild.wait();
  });
  EXPECT_EQ(0, child.wait());
}

struct Counted {
  static inline std::atomic<int> alive{0};
  Counted() {
    ++alive;
    std::this_thread::yield();
  }
  ~Counted() { --alive; }
};

TEST(ForkSafeMutexLeakedInstance, ThreadsThatComeFirstAtOnceGetOneObject) {
  std::atomic<Counted*> seen{nullptr};
  std::atomic<int> others{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < 8; ++t) {
    threads.emplace_back([&] {
      Counted* mine = &LeakedInstance<Counted>();
      Counted* none = nullptr;
      if (!seen.compare_exchange_strong(none, mine) && none != mine) ++others;
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(0, others);
  EXPECT_EQ(1, Counted::alive);
}

}  // namespace
}  // namespace zt::fnd::osdep

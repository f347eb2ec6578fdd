#include "source/Common/ZtUtils/General/ztSync.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/ipc.h>
#include <sys/sem.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <ctime>
#include <future>
#include <limits>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/Elapsed.h"
#include "tests/support/EventPlace.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "tests/support/ThreadState.h"

namespace Toolyard {
namespace {

using vlt::test::BlockedIn;
using vlt::test::Child;
using vlt::test::Clock;
using vlt::test::EventPlace;
using vlt::test::Eventually;
using vlt::test::Keeper;
using vlt::test::MsSince;
using vlt::test::PosixErrorOf;
using vlt::test::WatchedThread;
using zt::fnd::String;

// A process that waits in the kernel for the lock of a file.
bool WaitsForFile(const Child& child) { return BlockedIn(child.pid(), SYS_flock); }

struct Described : CztSyncObject {
  int locks = 0;
  bool Lock(int) override { return ++locks > 0; }
  bool Unlock() override { return --locks == 0; }
  bool pumps() const { return m_pumpMsgs; }
};

TEST(ztSync, BaseKeepsThePumpFlagWhichBeginsFalse) {
  Described object;
  EXPECT_FALSE(object.pumps());
  object.SetPumpMsgs(true);
  EXPECT_TRUE(object.pumps());
}

TEST(ztSync, LocksAndUnlocksThroughTheBase) {
  Described object;
  CztSyncObject& lock = object;
  EXPECT_TRUE(lock.Lock(-1));
  EXPECT_EQ(object.locks, 1);
  EXPECT_TRUE(lock.Unlock());
  EXPECT_EQ(object.locks, 0);
}

// ---- CztCS

TEST(ztSyncCS, IsRecursiveAndExcludesOtherThreads) {
  CztCS section;
  EXPECT_TRUE(section.Lock(0));
  EXPECT_TRUE(section.Lock(-1));
  std::atomic<bool> entered{false};
  WatchedThread other([&] {
    EXPECT_TRUE(section.Lock(0));  // the timeout is ignored
    entered = true;
    section.Unlock();
  });
  EXPECT_TRUE(section.Unlock());
  EXPECT_TRUE(other.blocksInLock());
  EXPECT_FALSE(entered);
  EXPECT_TRUE(section.Unlock());
  other.join();
  EXPECT_TRUE(entered);
}

// ---- CztMutex

TEST(ztSyncMutex, NullAndEmptyNamesAreOneAcrossProcesses) {
  EventPlace place;
  CztMutex null(nullptr, false), named(L"UNNAMED_MUTEX", false);
  null.Lock(-1);
  Child other([] {
    CztMutex empty(L"", false);
    empty.Lock(-1);
    return 0;
  });
  ASSERT_TRUE(Eventually([&] { return WaitsForFile(other); }));
  null.Unlock();
  EXPECT_EQ(other.wait(), 0);
  named.Lock(-1);
  Child another([] {
    CztMutex mutex(nullptr, true);
    return 0;
  });
  ASSERT_TRUE(Eventually([&] { return WaitsForFile(another); }));
  named.Unlock();
  EXPECT_EQ(another.wait(), 0);
}

TEST(ztSyncMutex, LockOfZeroBlocks) {
  EventPlace place;
  CztMutex mutex(L"name", true);
  Child other([] { return CztMutex(L"name", false).Lock(0) ? 0 : 1; });
  ASSERT_TRUE(Eventually([&] { return WaitsForFile(other); }));
  EXPECT_TRUE(mutex.Unlock());
  EXPECT_EQ(other.wait(), 0);
}

TEST(ztSyncMutex, InitiallyOwnedAndRecursive) {
  EventPlace place;
  CztMutex mutex(true, L"name", true);
  EXPECT_TRUE(mutex.Lock(5));
  EXPECT_TRUE(mutex.Unlock());
  Child other([] { return CztMutex(L"name", true).Unlock() ? 0 : 1; });
  ASSERT_TRUE(Eventually([&] { return WaitsForFile(other); }));
  EXPECT_TRUE(mutex.Unlock());
  EXPECT_EQ(other.wait(), 0);
}

TEST(ztSyncMutex, FailureOfThePrimitivePassesThrough) {
  EventPlace place;
  const std::string name(256, 'n');
  EXPECT_EQ(PosixErrorOf([&] { CztMutex m(String(name.c_str()).c_str(), true); }), ENAMETOOLONG);
}

// ---- CztEvent

TEST(ztSyncEvent, LockOfAnUnsetEventIsTrueAfterItsTime) {
  CztEvent event("name", false, true);
  auto begin = Clock::now();
  EXPECT_TRUE(event.Lock(100));
  EXPECT_GE(MsSince(begin), 99);
  EXPECT_TRUE(event.Lock(0));
}

TEST(ztSyncEvent, InitialStateComesBeforeManualReset) {
  auto begin = Clock::now();
  CztEvent set("name", true, true);
  EXPECT_TRUE(set.Lock(20000));
  EXPECT_TRUE(set.Lock(20000));  // manual: stays set
  CztEvent automatic(true, "name", true, false);
  EXPECT_TRUE(automatic.Lock(20000));
  EXPECT_LT(MsSince(begin), 15000);
  begin = Clock::now();
  EXPECT_TRUE(automatic.Lock(50));  // was cleared by the first
  EXPECT_GE(MsSince(begin), 49);
}

TEST(ztSyncEvent, UnlockSetsAndEndsAWaitWithoutLimit) {
  CztEvent event(nullptr, false, false);
  std::atomic<bool> released{false};
  WatchedThread waiter([&] {
    EXPECT_TRUE(event.Lock(-1));
    released = true;
  });
  EXPECT_TRUE(waiter.blocksInLock());
  EXPECT_FALSE(released);
  EXPECT_TRUE(event.Unlock());
  waiter.join();
}

TEST(ztSyncEvent, OtherNegativeTimeoutsAreLongOnes) {
  CztEvent event("name", false, false);
  std::atomic<bool> released{false};
  WatchedThread waiter([&] {
    EXPECT_TRUE(event.Lock(-2));
    EXPECT_TRUE(event.Lock(std::numeric_limits<int>::min()));
    released = true;
  });
  EXPECT_TRUE(waiter.blocksInLock());
  EXPECT_FALSE(released);
  event.Unlock();
  while (!released) {
    event.Unlock();
    std::this_thread::yield();
  }
  waiter.join();
}

// ---- CztSemaphore

TEST(ztSyncSemaphore, ReleaseClampsToTheMaximumAndTellsTheOldCount) {
  CztSemaphore semaphore(L"name", 2, 1);
  EXPECT_EQ(semaphore.Release(5), 1);
  EXPECT_EQ(semaphore.Release(0), 2);
  EXPECT_EQ(semaphore.Release(std::numeric_limits<int>::max()), 2);
  EXPECT_EQ(semaphore.Release(1), 2);
}

TEST(ztSyncSemaphore, FullFromTheBeginDoesNotWait) {
  CztSemaphore semaphore(L"name", 2, 2);
  auto begin = Clock::now();
  EXPECT_TRUE(semaphore.Lock(20000));
  EXPECT_TRUE(semaphore.Lock(-1));
  EXPECT_LT(MsSince(begin), 15000);
  EXPECT_EQ(semaphore.Release(0), 0);
}

TEST(ztSyncSemaphore, TimeoutLimitsEachWaitAndNotTheCall) {
  CztSemaphore semaphore(nullptr, 1, 0);
  std::atomic<bool> got{false};
  WatchedThread waiter([&] {
    EXPECT_TRUE(semaphore.Lock(10));
    got = true;
  });
  // Time is the subject here: several times that of one wait.
  std::this_thread::sleep_for(std::chrono::milliseconds(50));
  EXPECT_TRUE(waiter.blocksInLock());
  EXPECT_FALSE(got);
  EXPECT_TRUE(semaphore.Unlock());
  waiter.join();
  EXPECT_EQ(semaphore.Release(0), 0);
}

// A wait of no time at all, again and again, would keep a processor busy.
TEST(ztSyncSemaphore, TimeoutOfNothingSleepsUntilThereIsAUnit) {
  CztSemaphore semaphore(nullptr, 1, 0);
  WatchedThread waiter([&] { EXPECT_TRUE(semaphore.Lock(0)); });
  EXPECT_TRUE(waiter.blocksInLock());
  EXPECT_TRUE(semaphore.Unlock());
  waiter.join();
  EXPECT_EQ(semaphore.Release(0), 0);
}

TEST(ztSyncSemaphore, ReleaseWakesAsManyAsThereAreUnits) {
  CztSemaphore semaphore(L"name", 10, 0);
  std::atomic<int> got{0};
  std::vector<std::unique_ptr<WatchedThread>> waiters;
  for (int i = 0; i < 4; ++i) {
    waiters.push_back(std::make_unique<WatchedThread>([&] {
      semaphore.Lock(-1);
      ++got;
    }));
    EXPECT_TRUE(waiters.back()->blocksInLock());
  }
  EXPECT_EQ(semaphore.Release(3), 0);
  auto running = [&] {
    return std::count_if(waiters.begin(), waiters.end(),
                         [](auto& waiter) { return !waiter->done(); });
  };
  EXPECT_TRUE(Eventually([&] { return running() == 1; }));
  EXPECT_EQ(got, 3);
  for (auto& waiter : waiters) EXPECT_TRUE(waiter->done() || waiter->blocksInLock());
  EXPECT_EQ(semaphore.Release(1), 0);
  for (auto& waiter : waiters) waiter->join();
  EXPECT_EQ(got, 4);
  EXPECT_EQ(semaphore.Release(0), 0);
}

// A set event with nothing to take would keep the waiter awake.
TEST(ztSyncSemaphore, ReleaseOfNothingLeavesWaitersAsleep) {
  CztSemaphore semaphore(L"name", 10, 0);
  std::promise<clockid_t> clock;
  std::thread waiter([&] {
    clockid_t id;
    pthread_getcpuclockid(pthread_self(), &id);
    clock.set_value(id);
    semaphore.Lock(-1);
  });
  clockid_t id = clock.get_future().get();
  EXPECT_EQ(semaphore.Release(0), 0);
  // Time is the subject here: how much of the processor's the waiter uses of it.
  std::this_thread::sleep_for(std::chrono::milliseconds(200));
  timespec used;
  clock_gettime(id, &used);
  EXPECT_LT(used.tv_sec * 1000 + used.tv_nsec / 1000000, 50);
  semaphore.Release(1);
  waiter.join();
}

TEST(ztSyncSemaphore, NegativeReleasesAreDebts) {
  CztSemaphore semaphore(L"name", 5, 1);
  EXPECT_EQ(semaphore.Release(-3), 1);
  EXPECT_EQ(semaphore.Release(std::numeric_limits<int>::min()), -2);
  EXPECT_EQ(std::numeric_limits<int>::min(), semaphore.Release(std::numeric_limits<int>::max()));
  EXPECT_EQ(semaphore.Release(2), -1);
  EXPECT_TRUE(semaphore.Lock(-1));
  EXPECT_EQ(semaphore.Release(0), 0);
}

TEST(ztSyncSemaphore, UnitsAreNeitherLostNorMade) {
  CztSemaphore semaphore(L"name", 3, 3);
  std::atomic<int> inside{0}, most{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < 6; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 300; ++i) {
        semaphore.Lock(-1);
        int now = ++inside;
        for (int seen = most; now > seen && !most.compare_exchange_weak(seen, now);) {
        }
        std::this_thread::yield();
        --inside;
        semaphore.Unlock();
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_LE(most, 3);
  EXPECT_EQ(semaphore.Release(0), 3);
}

// ---- CztStatefulMutex

using zt::fnd::osdep::NamedEvent;

TEST(ztSyncStatefulMutex, OthersSeeInTheEventWhetherItIsHeld) {
  EventPlace place;
  CztStatefulMutex mutex(L"name");
  Keeper observer([] { return std::make_unique<NamedEvent>(L"name-event", true, false); });
  ASSERT_TRUE(observer.good());
  NamedEvent event(L"name-event", true, true);  // joins; its initial state is ignored
  EXPECT_FALSE(event.checkOnly());
  EXPECT_TRUE(mutex.Lock(-1));
  EXPECT_TRUE(event.checkOnly());
  EXPECT_TRUE(event.check());  // manual: looking changes nothing
  EXPECT_TRUE(mutex.Unlock());
  EXPECT_FALSE(event.checkOnly());
}

TEST(ztSyncStatefulMutex, NamesOfItsParts) {
  EventPlace place;
  CztStatefulMutex mutex(L"name");
  EXPECT_EQ((std::vector<std::string>{"name-event", "sem_1"}), place.files());
  EXPECT_TRUE(
      vlt::test::Exists(std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex/name-mutex"));
}

TEST(ztSyncStatefulMutex, LockWithoutStateLeavesTheEventAlone) {
  EventPlace place;
  CztStatefulMutex mutex(L"name");
  NamedEvent event(L"name-event", true, false);
  EXPECT_TRUE(mutex.LockAndSetState(false, 1));
  EXPECT_FALSE(event.checkOnly());
  Child other([] { return CztStatefulMutex(L"name").LockAndSetState(true, 0) ? 1 : 0; });
  EXPECT_EQ(other.wait(), 0);
  EXPECT_FALSE(event.checkOnly());
  event.set();
  EXPECT_TRUE(mutex.UnlockAndResetState(false));
  EXPECT_TRUE(event.checkOnly());
}

TEST(ztSyncStatefulMutex, WaitOfZeroTries) {
  EventPlace place;
  CztStatefulMutex mutex(L"name");
  EXPECT_TRUE(mutex.LockAndSetState(true, 0));
  Child other([] {
    CztStatefulMutex mine(L"name");
    if (mine.LockAndSetState(true, 0)) return 1;
    return mine.Lock(0) ? 2 : 0;
  });
  EXPECT_EQ(other.wait(), 0);
  EXPECT_TRUE(mutex.Unlock());
  Child next([] { return CztStatefulMutex(L"name").Lock(0) ? 0 : 1; });
  EXPECT_EQ(next.wait(), 0);
}

TEST(ztSyncStatefulMutex, AnyOtherWaitIsWithoutLimit) {
  EventPlace place;
  CztStatefulMutex mutex(L"name");
  mutex.Lock(-1);
  Child other([] { return CztStatefulMutex(L"name").Lock(1) ? 0 : 1; });
  ASSERT_TRUE(Eventually([&] { return WaitsForFile(other); }));  // the kernel knows of no time
  EXPECT_TRUE(other.running());
  mutex.Unlock();
  EXPECT_EQ(other.wait(), 0);
}

TEST(ztSyncStatefulMutex, HolderThatDiesLeavesTheLockFreeAndTheEventSet) {
  EventPlace place;
  NamedEvent event(L"name-event", true, false);
  Keeper holder([] {
    auto mutex = std::make_unique<CztStatefulMutex>(L"name");
    mutex->Lock(-1);
    return mutex;
  });
  ASSERT_TRUE(holder.good());
  EXPECT_TRUE(event.checkOnly());
  holder.kill();
  EXPECT_TRUE(event.checkOnly());
  CztStatefulMutex mutex(L"name");
  EXPECT_TRUE(mutex.Lock(0));
  EXPECT_TRUE(mutex.Unlock());
  EXPECT_FALSE(event.checkOnly());
}

TEST(ztSyncStatefulMutex, EventThatFailsLeavesNoLockBehind) {
  EventPlace place;
  CztStatefulMutex mutex(L"name");
  auto freeElsewhere = [] {
    return Child([] {
             CztMutex other(L"name-mutex", false);
             alarm(5);
             return other.Lock(0) ? 0 : 1;
           }).wait() == 0;
  };
  mutex.LockAndSetState(true, 1);
  ASSERT_EQ(semctl(place.setOf(1), 0, IPC_RMID), 0);
  EXPECT_EQ(PosixErrorOf([&] { mutex.UnlockAndResetState(true); }), EINVAL);
  EXPECT_TRUE(freeElsewhere());
  EXPECT_EQ(PosixErrorOf([&] { mutex.LockAndSetState(true, 1); }), EINVAL);
  EXPECT_TRUE(freeElsewhere());
  EXPECT_EQ(PosixErrorOf([&] { mutex.LockAndSetState(true, 0); }), EINVAL);
  EXPECT_TRUE(freeElsewhere());
  EXPECT_TRUE(mutex.LockAndSetState(false, 1));
  EXPECT_TRUE(mutex.UnlockAndResetState(false));
}

TEST(ztSyncStatefulMutex, ConstructorThatFailsCleansUp) {
  EventPlace place;
  { CztStatefulMutex mutex(L"warm up"); }
  int descriptors = vlt::test::OpenDescriptors();
  // The mutex can be made, the event not: its name is one of the other kind.
  NamedEvent taken(L"name-event", false, false);
  int with = vlt::test::OpenDescriptors();
  EXPECT_EQ(PosixErrorOf([] { CztStatefulMutex mutex(L"name"); }), EINVAL);
  EXPECT_EQ(with, vlt::test::OpenDescriptors());
  EXPECT_GT(with, descriptors);
}

}  // namespace
}  // namespace Toolyard

#include "zt/fnd/osdep/NamedEvent.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/ipc.h>
#include <sys/sem.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdlib>
#include <iterator>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/CaughtSleeps.h"
#include "tests/support/Child.h"
#include "tests/support/Elapsed.h"
#include "tests/support/EventKinds.h"
#include "tests/support/EventPlace.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/ThreadState.h"
#include "zt/fnd/String.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::BlockedIn;
using vlt::test::Child;
using vlt::test::Clock;
using vlt::test::EventPlace;
using vlt::test::Eventually;
using vlt::test::kAutomatic;
using vlt::test::kClear;
using vlt::test::kManual;
using vlt::test::kSet;
using vlt::test::MsSince;
using vlt::test::PosixErrorOf;
using vlt::test::Sleeps;

constexpr unsigned kNoLimit = 0xFFFFFFFFu;

// The ways into the kernel of a wait; which ones there are depends on the word size.
constexpr long kWaitCalls[] = {
#if defined(SYS_ipc)
    SYS_ipc,
#endif
#if defined(SYS_semop)
    SYS_semop,
#endif
#if defined(SYS_semtimedop)
    SYS_semtimedop,
#endif
#if defined(SYS_semtimedop_time64)
    SYS_semtimedop_time64,
#endif
};

bool Waiting(pid_t pid) {
  return std::any_of(std::begin(kWaitCalls), std::end(kWaitCalls),
                     [pid](long number) { return BlockedIn(pid, number); });
}

// A process that waits for the event without limit and ends with 0 when it was released.
Child Waiter(bool manual) {
  return Child([manual] {
    NamedEvent event(L"name", manual, kClear);
    event.wait();
    return 0;
  });
}

TEST(NamedEvent, InitialStates) {
  EventPlace place;
  for (bool manual : {kManual, kAutomatic}) {
    for (bool initial : {kSet, kClear}) {
      NamedEvent event(L"name", manual, initial);
      EXPECT_EQ(initial, event.checkOnly()) << manual;
      EXPECT_EQ(initial, event.check()) << manual;
      EXPECT_EQ(initial && manual, event.check()) << manual;
    }
  }
}

TEST(NamedEvent, SemaphoreValuesByKindAndState) {
  EventPlace place;
  NamedEvent manual(L"manual", kManual, kSet), automatic(L"auto", kAutomatic, kSet);
  int set = place.setOf(1);
  EXPECT_EQ(EventPlace::ValueOf(set, 0), 0);
  EXPECT_EQ(EventPlace::ValueOf(set, 1), 1);
  manual.reset();
  automatic.reset();
  EXPECT_EQ(EventPlace::ValueOf(set, 0), 1);
  EXPECT_EQ(EventPlace::ValueOf(set, 1), 0);
  manual.set();
  automatic.set();
  EXPECT_EQ(EventPlace::ValueOf(set, 0), 0);
  EXPECT_EQ(EventPlace::ValueOf(set, 1), 1);
}

TEST(NamedEvent, ManualSetReleasesAllWaitersInAllProcessesAndStays) {
  EventPlace place;
  NamedEvent event(L"name", kManual, kClear);
  std::vector<Child> waiters;
  for (int i = 0; i < 3; ++i) waiters.push_back(Waiter(kManual));
  std::atomic<bool> released{false};
  std::thread thread([&] {
    event.wait();
    released = true;
  });
  for (Child& waiter : waiters) ASSERT_TRUE(Eventually([&] { return Waiting(waiter.pid()); }));
  EXPECT_FALSE(released);
  event.set();
  for (Child& waiter : waiters) EXPECT_EQ(waiter.wait(), 0);
  thread.join();
  EXPECT_TRUE(event.check());
  EXPECT_TRUE(event.check());
  event.reset();
  EXPECT_FALSE(event.check());
  EXPECT_FALSE(event.checkOnly());
}

TEST(NamedEvent, AutomaticSetReleasesOneOfThreeWaiters) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kClear);
  std::vector<Child> waiters;
  for (int i = 0; i < 3; ++i) waiters.push_back(Waiter(kAutomatic));
  for (Child& waiter : waiters) ASSERT_TRUE(Eventually([&] { return Waiting(waiter.pid()); }));
  auto waiting = [&] {
    int count = 0;
    for (Child& waiter : waiters) count += waiter.running();
    return count;
  };
  for (int left : {2, 1, 0}) {
    event.set();
    ASSERT_TRUE(Eventually([&] { return waiting() == left; }));
    EXPECT_FALSE(event.checkOnly());
    for (Child& waiter : waiters) {  // and no second one
      EXPECT_TRUE(Eventually([&] { return !waiter.running() || Waiting(waiter.pid()); }));
    }
    EXPECT_EQ(left, waiting());
  }
  for (Child& waiter : waiters) EXPECT_EQ(waiter.wait(), 0);
}

TEST(NamedEvent, CheckConsumesAnAutomaticEvent) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kSet);
  EXPECT_TRUE(event.check());
  EXPECT_FALSE(event.checkOnly());
  EXPECT_FALSE(event.check());
}

TEST(NamedEvent, CheckOnlyConsumesNothing) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kSet);
  EXPECT_TRUE(event.checkOnly());
  EXPECT_TRUE(event.checkOnly());
  EXPECT_TRUE(event.check());
}

TEST(NamedEvent, WaitOfZeroIsCheck) {
  EventPlace place;
  NamedEvent automatic(L"auto", kAutomatic, kSet), manual(L"manual", kManual, kSet);
  EXPECT_TRUE(automatic.wait(0));
  EXPECT_FALSE(automatic.wait(0));
  EXPECT_TRUE(manual.wait(0));
  EXPECT_TRUE(manual.wait(0));
  manual.reset();
  EXPECT_FALSE(manual.wait(0));
}

TEST(NamedEvent, TimedWaitThatEndsInVainTakesItsTime) {
  EventPlace place;
  for (bool manual : {kManual, kAutomatic}) {
    NamedEvent event(L"name", manual, kClear);
    for (unsigned ms : {1u, 49u, 50u, 120u}) {
      auto begin = Clock::now();
      EXPECT_FALSE(event.wait(ms));
      EXPECT_GE(MsSince(begin), static_cast<long>(ms));
    }
  }
}

TEST(NamedEvent, TimedWaitSleeps50MsAndThenTheRest) {
  EventPlace place;
  auto sleepsOf = [](unsigned ms, std::vector<long long> expected) {
    return Child([=] {
             NamedEvent event(L"name", kAutomatic, kClear);
             if (!vlt::test::CatchSleeps()) return 1;
             if (event.wait(ms)) return 2;
             return vlt::test::CaughtSleeps() == expected ? 0 : 3;
           })
        .wait();
  };
  EXPECT_EQ(sleepsOf(120, {50, 50, 20}), 0);
  EXPECT_EQ(sleepsOf(50, {50, 0}), 0);
  EXPECT_EQ(sleepsOf(49, {49}), 0);
  EXPECT_EQ(sleepsOf(1, {1}), 0);
  EXPECT_EQ(sleepsOf(0, {}), 0);
}

TEST(NamedEvent, TimedWaitSeesASignal) {
  EventPlace place;
  for (bool manual : {kManual, kAutomatic}) {
    NamedEvent event(L"name", manual, kClear);
    std::thread setter([&, waiter = gettid()] {
      EXPECT_TRUE(Eventually([&] { return Sleeps(waiter); }));
      event.set();
    });
    EXPECT_TRUE(event.wait(20000));
    setter.join();
    EXPECT_EQ(manual, event.checkOnly());
  }
}

// A look can fall into the pulse, if the sleep ends just then, but not each time.
TEST(NamedEvent, PulseBetweenTwoLooksGoesUnseen) {
  EventPlace place;
  NamedEvent event(L"name", kManual, kClear);
  int unseen = 0;
  for (int i = 0; i < 3; ++i) {
    std::thread pulser([&, waiter = gettid()] {
      EXPECT_TRUE(Eventually([&] { return Sleeps(waiter); }));
      event.set();
      event.reset();
    });
    unseen += !event.wait(120);
    pulser.join();
  }
  EXPECT_GT(unseen, 0);
}

TEST(NamedEvent, PulseReleasesThoseWhoWaitWithoutLimit) {
  EventPlace place;
  NamedEvent event(L"name", kManual, kClear);
  Child waiter = Waiter(kManual);
  ASSERT_TRUE(Eventually([&] { return Waiting(waiter.pid()); }));
  event.set();
  event.reset();
  EXPECT_EQ(waiter.wait(), 0);
}

TEST(NamedEvent, WaitOfAllOnesHasNoLimit) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kClear);
  Child waiter([] { return NamedEvent(L"name", kAutomatic, kClear).wait(kNoLimit) ? 0 : 1; });
  ASSERT_TRUE(Eventually([&] { return Waiting(waiter.pid()); }));  // in the kernel, not polling
  event.set();
  EXPECT_EQ(waiter.wait(), 0);
  EXPECT_FALSE(event.checkOnly());
}

TEST(NamedEvent, SetsDoNotAddUp) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kClear);
  event.set();
  event.set();
  event.wait();
  EXPECT_FALSE(event.check());
  NamedEvent manual(L"manual", kManual, kClear);
  manual.reset();
  manual.reset();
  manual.set();
  EXPECT_TRUE(manual.check());
}

TEST(NamedEvent, ResetIfAutoLeavesAManualEvent) {
  EventPlace place;
  NamedEvent manual(L"manual", kManual, kSet), automatic(L"auto", kAutomatic, kSet);
  manual.resetIfAuto();
  automatic.resetIfAuto();
  EXPECT_TRUE(manual.checkOnly());
  EXPECT_FALSE(automatic.checkOnly());
}

TEST(NamedEvent, KilledWaiterChangesNothingForTheOthers) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kClear);
  Child killed = Waiter(kAutomatic);
  ASSERT_TRUE(Eventually([&] { return Waiting(killed.pid()); }));
  Child other = Waiter(kAutomatic);
  ASSERT_TRUE(Eventually([&] { return Waiting(other.pid()); }));
  killed.kill(SIGKILL);
  killed.wait();
  EXPECT_TRUE(other.running());
  event.set();
  EXPECT_EQ(other.wait(), 0);
  EXPECT_FALSE(event.checkOnly());
}

TEST(NamedEvent, SignalTakenByAProcessThatDiesStaysTaken) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kSet);
  Child taker([] {
    NamedEvent mine(L"name", kAutomatic, kClear);
    mine.wait();
    raise(SIGKILL);
    return 0;
  });
  EXPECT_EQ(128 + SIGKILL, taker.wait());
  EXPECT_FALSE(event.checkOnly());
}

TEST(NamedEvent, SignalSentBeforeAnyWaiterIsKept) {
  EventPlace place;
  for (bool manual : {kManual, kAutomatic}) {
    NamedEvent event(L"name", manual, kClear);
    event.set();
    Child waiter = Waiter(manual);
    EXPECT_EQ(waiter.wait(), 0);
    EXPECT_EQ(manual, event.checkOnly());
  }
}

TEST(NamedEvent, SignalHandlersDoNotEndAWait) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kClear);
  Child waiter([] {
    static volatile sig_atomic_t signals;
    struct sigaction action = {};
    action.sa_handler = [](int) { signals = signals + 1; };
    sigaction(SIGUSR1, &action, nullptr);
    NamedEvent mine(L"name", kAutomatic, kClear);
    mine.wait();
    // The thread sanitizer lets a handler run only once the call is over.
    return Eventually([] { return signals > 0; }) ? 0 : 1;
  });
  for (int i = 0; i < 5; ++i) {
    ASSERT_TRUE(Eventually([&] { return Waiting(waiter.pid()); }));
    waiter.kill(SIGUSR1);
  }
  EXPECT_TRUE(waiter.running());
  event.set();
  EXPECT_EQ(waiter.wait(), 0);
}

// ---- a set that was removed under the event

TEST(NamedEvent, RemovalUnderAWaiterAndLaterCallsAreErrors) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kClear), manual(L"manual", kManual, kClear);
  auto waiter = [](const wchar_t* name, bool kind) {
    return Child([=] {
      NamedEvent mine(name, kind, kClear);
      return PosixErrorOf([&] { mine.wait(); });
    });
  };
  Child first = waiter(L"name", kAutomatic), second = waiter(L"manual", kManual);
  ASSERT_TRUE(Eventually([&] { return Waiting(first.pid()) && Waiting(second.pid()); }));
  ASSERT_EQ(semctl(place.setOf(1), 0, IPC_RMID), 0);
  EXPECT_EQ(first.wait(), EIDRM);
  EXPECT_EQ(second.wait(), EIDRM);
  EXPECT_EQ(PosixErrorOf([&] { event.wait(); }), EINVAL);
  EXPECT_EQ(PosixErrorOf([&] { event.wait(10); }), EINVAL);
  EXPECT_EQ(PosixErrorOf([&] { event.wait(0); }), EINVAL);
  EXPECT_EQ(PosixErrorOf([&] { event.check(); }), EINVAL);
  EXPECT_EQ(PosixErrorOf([&] { event.checkOnly(); }), EINVAL);
  EXPECT_EQ(PosixErrorOf([&] { event.set(); }), EINVAL);
  EXPECT_EQ(PosixErrorOf([&] { event.reset(); }), EINVAL);
  EXPECT_EQ(PosixErrorOf([&] { event.resetIfAuto(); }), EINVAL);
  EXPECT_EQ(PosixErrorOf([&] { manual.resetIfAuto(); }), -1);  // does nothing
}

TEST(NamedEvent, ErrorsHaveTheCodeOfTheFamily) {
  EventPlace place;
  NamedEvent event(L"name", kAutomatic, kClear);
  semctl(place.setOf(1), 0, IPC_RMID);
  try {
    event.check();
    FAIL();
  } catch (const OSException& e) {
    EXPECT_EQ(e.getErrorCode(), 42u);
    EXPECT_EQ(static_cast<unsigned>(EINVAL), e.whatcode());
  }
}

// ---- threads

TEST(NamedEvent, EveryThreadMayUseAnyObject) {
  EventPlace place;
  NamedEvent ping(L"ping", kAutomatic, kClear), pong(L"pong", kAutomatic, kClear);
  constexpr int kRounds = 2000;
  std::thread other([&] {
    NamedEvent mine(L"ping", kAutomatic, kSet);
    for (int i = 0; i < kRounds; ++i) {
      mine.wait();
      pong.set();
    }
  });
  for (int i = 0; i < kRounds; ++i) {
    ping.set();
    pong.wait();
  }
  other.join();
  EXPECT_FALSE(ping.checkOnly());
  EXPECT_FALSE(pong.checkOnly());
}

// Each round opens and closes its event again while the other side does the same.
TEST(NamedEvent, PingPongBetweenProcessesLosesNothing) {
  EventPlace place;
  constexpr int kRounds = 500;
  NamedEvent ping(L"ping", kAutomatic, kClear), pong(L"pong", kAutomatic, kClear);
  Child other([] {
    for (int i = 0; i < kRounds; ++i) {
      NamedEvent(L"ping", kAutomatic, kClear).wait();
      NamedEvent(L"pong", kAutomatic, kClear).set();
    }
    return 0;
  });
  for (int i = 0; i < kRounds; ++i) {
    ping.set();
    pong.wait();
  }
  EXPECT_EQ(other.wait(), 0);
}

TEST(NamedEvent, ThreadsOpenAndCloseOneNameAtOnce) {
  EventPlace place;
  std::vector<std::thread> threads;
  std::atomic<int> bad{0};
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 150; ++i) {
        NamedEvent event(L"name", kManual, kClear);
        event.set();
        if (!event.checkOnly()) ++bad;
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(bad, 0);
  EXPECT_EQ(std::vector<std::string>(), place.files());
}

}  // namespace
}  // namespace zt::fnd::osdep

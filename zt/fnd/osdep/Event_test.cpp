#include "zt/fnd/osdep/Event.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <climits>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/Elapsed.h"
#include "tests/support/EventKinds.h"
#include "zt/fnd/Exception.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::Clock;
using vlt::test::kAutomatic;
using vlt::test::kClear;
using vlt::test::kManual;
using vlt::test::kSet;
using vlt::test::MsSince;

TEST(Event, StartsAsTold) {
  EXPECT_TRUE(Event(kManual, kSet).check());
  EXPECT_FALSE(Event(kManual, kClear).check());
  EXPECT_TRUE(Event(kAutomatic, kSet).check());
  EXPECT_FALSE(Event(kAutomatic, kClear).check());
}

TEST(Event, AutomaticSetTwiceReleasesOneWait) {
  Event event(kAutomatic, kClear);
  event.set();
  event.set();
  event.wait();
  EXPECT_FALSE(event.check());
}

TEST(Event, WaitOfZeroOnASetManualEventLeavesItSet) {
  Event event(kManual, kSet);
  EXPECT_TRUE(event.wait(0));
  EXPECT_TRUE(event.wait(0));
  event.wait();
  EXPECT_TRUE(event.wait(10));
  EXPECT_TRUE(event.check());
}

TEST(Event, WaitOfZeroIsACheck) {
  Event event(kAutomatic, kSet);
  EXPECT_TRUE(event.wait(0));
  EXPECT_FALSE(event.wait(0));
}

TEST(Event, TimedWaitOnAnUnsetEventEndsAfterItsTime) {
  for (bool manual : {kManual, kAutomatic}) {
    Event event(manual, kClear);
    auto start = Clock::now();
    EXPECT_FALSE(event.wait(10));
    EXPECT_GE(MsSince(start), 9);
    EXPECT_LT(MsSince(start), 15000);
  }
}

TEST(Event, TimedWaitThatIsSetConsumesAnAutomaticEvent) {
  Event event(kAutomatic, kSet);
  EXPECT_TRUE(event.wait(10000));
  EXPECT_FALSE(event.check());
}

TEST(Event, ResetAndResetIfAuto) {
  Event manual(kManual, kSet), automatic(kAutomatic, kSet);
  manual.resetIfAuto();
  EXPECT_TRUE(manual.check());
  manual.reset();
  EXPECT_FALSE(manual.check());
  automatic.resetIfAuto();
  EXPECT_FALSE(automatic.check());
}

TEST(Event, ManualSetReleasesAllWaitersAutomaticOne) {
  for (bool manual : {kManual, kAutomatic}) {
    Event event(manual, kClear);
    std::atomic<int> released{0};
    std::vector<std::thread> waiters;
    for (int i = 0; i < 3; ++i) {
      waiters.emplace_back([&] {
        event.wait();
        ++released;
      });
    }
    event.set();
    int first = manual ? 3 : 1;
    EXPECT_TRUE(vlt::test::Eventually([&] { return released == first; }));
    if (!manual) {
      EXPECT_FALSE(event.check());
      EXPECT_EQ(released, 1);
      for (int i = 2; i <= 3; ++i) {
        event.set();
        EXPECT_TRUE(vlt::test::Eventually([&] { return released == i; }));
      }
    }
    for (auto& waiter : waiters) waiter.join();
  }
}

TEST(Event, WaitWithoutLimitReturnsTrue) {
  Event event(kAutomatic, kClear);
  bool result = false;
  std::thread waiter([&] { result = event.wait(0xFFFFFFFFu); });
  event.set();
  waiter.join();
  EXPECT_TRUE(result);
}

TEST(Event, SetDuringATimedWaitEndsIt) {
  Event event(kManual, kClear);
  auto start = Clock::now();
  std::thread setter([&] { event.set(); });
  EXPECT_TRUE(event.wait(60000));
  EXPECT_LT(MsSince(start), 30000);
  setter.join();
}

TEST(EventPump, WaitsAsAnEventDoesWhateverTheFlag) {
  for (bool pump : {true, false}) {
    PumpEvent event(kAutomatic, kSet, pump);
    event.wait(pump);
    EXPECT_FALSE(event.wait(0ul, pump));
    event.set();
    EXPECT_TRUE(event.wait(10ul, !pump));
    EXPECT_FALSE(event.check());
  }
}

TEST(EventPump, TimeAboveThirtyTwoBitsIsOutOfRange) {
  PumpEvent event(kManual, kSet, true);
  EXPECT_TRUE(event.wait(0xFFFFFFFFul, true));
  if constexpr (sizeof(unsigned long) > 4) {
    EXPECT_THROW(event.wait(ULONG_MAX, true), exception::OutOfRange);
    EXPECT_THROW(event.wait(0xFFFFFFFFul + 1, false), exception::OutOfRange);
    EXPECT_TRUE(event.check());
  }
}

}  // namespace
}  // namespace zt::fnd::osdep

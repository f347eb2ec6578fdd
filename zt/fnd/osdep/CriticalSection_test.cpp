#include "zt/fnd/osdep/CriticalSection.h"

#include <gtest/gtest.h>

#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "zt/fnd/osdep/Hold.h"

namespace zt::fnd::osdep {
namespace {

// Asks from another thread.
bool OthersMayEnter(const UnixCriticalSection& section) {
  bool entered = false;
  std::thread([&] {
    entered = section.tryEnter();
    if (entered) section.leave();
  }).join();
  return entered;
}

TEST(CriticalSection, EnteredTwiceIsFreeAfterTwoLeaves) {
  UnixCriticalSection section;
  section.enter();
  section.enter();
  EXPECT_FALSE(OthersMayEnter(section));
  section.leave();
  EXPECT_FALSE(OthersMayEnter(section));
  section.leave();
  EXPECT_TRUE(OthersMayEnter(section));
}

TEST(CriticalSection, LeaveByAStrangerChangesNothing) {
  UnixCriticalSection section;
  section.leave();  // no thread owns it
  section.enter();
  std::thread([&] {
    section.leave();
    section.leave();
  }).join();
  EXPECT_TRUE(section.inOwningThread());
  EXPECT_FALSE(OthersMayEnter(section));
  section.leave();
  section.leave();  // no longer the owner
  EXPECT_TRUE(OthersMayEnter(section));
}

TEST(CriticalSection, TryEnterCountsAsAnEntry) {
  UnixCriticalSection section;
  EXPECT_TRUE(section.tryEnter());
  EXPECT_TRUE(section.tryEnter());
  section.leave();
  EXPECT_FALSE(OthersMayEnter(section));
  section.leave();
  EXPECT_TRUE(OthersMayEnter(section));
}

TEST(CriticalSection, OwnerIsTheThreadInside) {
  UnixCriticalSection section;
  EXPECT_FALSE(section.inOwningThread());
  section.enter();
  EXPECT_TRUE(section.inOwningThread());
  bool elsewhere = true;
  std::thread([&] { elsewhere = section.inOwningThread(); }).join();
  EXPECT_FALSE(elsewhere);
  section.leave();
  EXPECT_FALSE(section.inOwningThread());
}

TEST(CriticalSection, EnterWaitsForTheOwner) {
  CriticalSection section;
  std::atomic<bool> inside{false};
  section.enter();
  std::thread waiter([&] {
    section.enter();
    inside = true;
    section.leave();
  });
  EXPECT_FALSE(inside);
  section.leave();
  waiter.join();
  EXPECT_TRUE(inside);
}

TEST(CriticalSection, GuardedCountIsExact) {
  CriticalSection section;
  int count = 0;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 10000; ++i) {
        Hold hold(section);
        ++count;
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(count, 40000);
}

TEST(CriticalSection, OwnedSectionMayBeDestroyed) {
  auto* section = new UnixCriticalSection;
  std::thread([&] { section->enter(); }).join();
  delete section;
}

// What the system knows of the section that is gone must not be found where new blocks are.
TEST(CriticalSection, TheOwnerOfADestroyedSectionGoesOn) {
  UnixCriticalSection other;
  std::vector<std::string> blocks;
  // ThreadSanitizer counts 64 held sections at most.
  for (int round = 0; round < 40; ++round) {
    auto* section = new UnixCriticalSection;
    section->enter();
    delete section;
    for (size_t size = 40; size <= 120; size += 16) blocks.emplace_back(size, 'x');
    other.enter();
    other.leave();
  }
  for (const std::string& block : blocks) ASSERT_EQ(block, std::string(block.size(), 'x'));
}

}  // namespace
}  // namespace zt::fnd::osdep

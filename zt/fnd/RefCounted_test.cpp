#include "zt/fnd/RefCounted.h"

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <thread>
#include <vector>

#include "tests/support/ThreadState.h"
#include "zt/fnd/osdep/Hold.h"

namespace zt::fnd {
namespace {

using vlt::test::WatchedThread;

struct Thing : RefCountedThreadSafePolicy {
  static inline int alive = 0;
  Thing() { ++alive; }
  ~Thing() override { --alive; }
};

TEST(RefCounted, ObjectGoesWithItsLastReference) {
  {
    RefPtr<Thing> a(new Thing);
    RefPtr<Thing> b(a), c;
    c = b;
    a = nullptr;
    b = RefPtr<Thing>();
    EXPECT_EQ(Thing::alive, 1);
    RefPtr<Thing>& self = c;
    c = self;
    EXPECT_EQ(Thing::alive, 1);
  }
  EXPECT_EQ(Thing::alive, 0);
}

TEST(RefCounted, DetachedReferenceIsNotReleased) {
  Thing* raw = RefPtr<Thing>(new Thing).detach();
  EXPECT_EQ(Thing::alive, 1);
  raw->release();
  EXPECT_EQ(Thing::alive, 0);
}

struct PlainThing : RefCountedThreadUnsafePolicy {
  static inline int alive = 0;
  PlainThing() { ++alive; }
  ~PlainThing() override { --alive; }
};

TEST(RefCounted, PlainCountWorksTheSameInOneThread) {
  {
    RefPtr<PlainThing> a(new PlainThing), b(a);
    a = nullptr;
    EXPECT_EQ(PlainThing::alive, 1);
  }
  EXPECT_EQ(PlainThing::alive, 0);
}

struct SectionThing : RefCountedCriticalSectionPolicy {
  const osdep::CriticalSection& section;
  std::unique_ptr<WatchedThread>& probe;
  std::atomic<bool>& entered;
  bool& enteredWhileGoing;
  SectionThing(const osdep::CriticalSection& s, std::unique_ptr<WatchedThread>& p,
               std::atomic<bool>& e, bool& w)
      : RefCountedCriticalSectionPolicy(&s),
        section(s),
        probe(p),
        entered(e),
        enteredWhileGoing(w) {}
  ~SectionThing() override {
    probe = std::make_unique<WatchedThread>([&s = section, &e = entered] {
      osdep::Hold hold(s);
      e = true;
    });
    EXPECT_TRUE(probe->blocksInLock());
    enteredWhileGoing = entered;
  }
};

TEST(RefCounted, SectionCountedObjectGoesInsideItsSection) {
  osdep::CriticalSection section;
  std::unique_ptr<WatchedThread> probe;
  std::atomic<bool> entered = false;
  bool enteredWhileGoing = true;
  {
    RefPtr<SectionThing> a(new SectionThing(section, probe, entered, enteredWhileGoing)), b(a);
    a = nullptr;
    EXPECT_FALSE(probe);
  }
  ASSERT_TRUE(probe);
  probe->join();
  EXPECT_TRUE(entered);
  EXPECT_FALSE(enteredWhileGoing);
}

TEST(RefCounted, SectionCountIsExactAcrossThreads) {
  osdep::CriticalSection section;
  struct Counted : RefCountedCriticalSectionPolicy {
    int* alive;
    Counted(const osdep::CriticalSection* s, int* a)
        : RefCountedCriticalSectionPolicy(s), alive(a) {
      ++*alive;
    }
    ~Counted() override { --*alive; }
  };
  int alive = 0;
  RefPtr<Counted> shared(new Counted(&section, &alive));
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 2000; ++i) RefPtr<Counted> mine(shared.get());
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(alive, 1);
  shared = nullptr;
  EXPECT_EQ(alive, 0);
}

}  // namespace
}  // namespace zt::fnd

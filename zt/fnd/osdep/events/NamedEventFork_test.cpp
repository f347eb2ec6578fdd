// Named events and fork(): children that inherit, and openings that a fork cuts in two.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/EventKinds.h"
#include "tests/support/EventPlace.h"
#include "tests/support/InheritingChild.h"
#include "tests/support/MutexPlace.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/Sanitizer.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/Mutex.h"
#include "zt/fnd/osdep/NamedEvent.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::BlockedIn;
using vlt::test::Child;
using vlt::test::EventPlace;
using vlt::test::Eventually;
using vlt::test::Exists;
using vlt::test::FileIsFree;
using vlt::test::InheritingChild;
using vlt::test::InheritingProgram;
using vlt::test::kAutomatic;
using vlt::test::kCanForkWhileThreadsAllocate;
using vlt::test::kClear;
using vlt::test::kManual;
using vlt::test::kSet;
using vlt::test::OpenDescriptors;
using vlt::test::Wide;
using Names = std::vector<std::string>;

constexpr const wchar_t* kStateFileMutex = L"zt_fnd_osdep_NamedEvent_StateFileMutex";

auto Open(const std::string& name, bool manual = kManual, bool initial = kClear) {
  return std::make_unique<NamedEvent>(Wide(name), manual, initial);
}

TEST(NamedEventFork, ChildUsesTheInheritedObject) {
  EventPlace place;
  auto event = Open("name", kAutomatic);
  Child child([&] {
    event->set();
    return event->check() ? 0 : 1;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_FALSE(event->checkOnly());
}

TEST(NamedEventFork, ChildThatDestroysTakesNothingFromTheParent) {
  EventPlace place;
  auto event = Open("name", kManual, kSet), second = Open("name"), other = Open("other");
  std::string state = vlt::test::ReadBytes(place.file("sem_1"));
  Child child([&] {
    int before = OpenDescriptors();
    event.reset();
    if (OpenDescriptors() != before) return 1;  // the second object still has the file
    second.reset();
    if (OpenDescriptors() != before - 1) return 2;
    other.reset();
    return OpenDescriptors() == before - 3 ? 0 : 3;  // with the set's file
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ((Names{"name", "other", "sem_1"}), place.files());
  EXPECT_EQ(state, vlt::test::ReadBytes(place.file("sem_1")));
  EXPECT_FALSE(FileIsFree(place.file("name")));
  EXPECT_FALSE(FileIsFree(place.file("sem_1")));
  EXPECT_TRUE(event->checkOnly());
}

TEST(NamedEventFork, ChildOpensTheNameItInherited) {
  EventPlace place;
  auto event = Open("name", kManual, kSet);
  Child child([&] {
    auto mine = Open("name", kManual, kClear);
    if (!mine->checkOnly()) return 1;
    event.reset();
    mine->reset();
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_FALSE(event->checkOnly());
  EXPECT_EQ((Names{"name", "sem_1"}), place.files());
}

TEST(NamedEventFork, ChildOpensOtherNamesInTheParentsSet) {
  EventPlace place;
  auto event = Open("name");
  Child child([&] {
    auto mine = Open("mine");
    return place.slotOf("mine") == EventPlace::Slot{1, 1} ? 0 : 1;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ((Names{"name", "sem_1"}), place.files());
}

TEST(NamedEventFork, InheritedEventOutlivesAKilledParent) {
  EventPlace place;
  vlt::test::Signal ready, go, done;
  Child parent([&] {
    auto event = Open("name", kManual);
    if (fork() == 0) {
      ready.notify();
      go.await();
      event->set();
      done.notify();
      go.await();
      _exit(0);
    }
    for (;;) pause();
    return 0;
  });
  ASSERT_TRUE(ready.await());
  parent.kill(SIGKILL);
  parent.wait();
  auto event = Open("name", kManual, kClear);  // joins the one that the child still uses
  EXPECT_FALSE(event->checkOnly());
  go.notify();
  ASSERT_TRUE(done.await());
  EXPECT_TRUE(event->checkOnly());
  go.notify();
}

TEST(NamedEventFork, ParentClosesWhileAChildLives) {
  EventPlace place;
  auto event = Open("name");
  vlt::test::Signal go;
  Child child([&] {
    go.await();
    event.reset();
    return 0;
  });
  event.reset();
  EXPECT_EQ(Names(), place.files());
  event = Open("name", kManual, kSet);  // the next life of the name
  go.notify();
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ((Names{"name", "sem_1"}), place.files());
  EXPECT_FALSE(FileIsFree(place.file("name")));
  EXPECT_TRUE(event->checkOnly());
}

TEST(NamedEventFork, ProgramStartedByExecHoldsNothing) {
  EventPlace place;
  InheritingProgram program;
  Child holder([&] {
    auto event = Open("name");
    program.fork();
    for (;;) pause();
    return 0;
  });
  ASSERT_TRUE(program.await());
  holder.kill(SIGKILL);
  holder.wait();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  EXPECT_TRUE(FileIsFree(place.file("sem_1")));
  EXPECT_TRUE(program.end());
}

// A thread is in the middle of an opening, with the event's file locked for itself alone, when
// another thread forks; then the process is killed, while the child lives on.
TEST(NamedEventFork, OpeningCutOffByForkAndKillBlocksNobody) {
  EventPlace place;
  Mutex stateFiles{String(kStateFileMutex)};
  InheritingChild heir;
  stateFiles.lock();
  Child parent([&] {
    std::thread opener([] { Open("name"); });
    if (!Eventually(
            [&] { return Exists(place.file("name")) && !FileIsFree(place.file("name")); })) {
      return 1;
    }
    heir.fork();
    opener.join();
    return 0;
  });
  ASSERT_TRUE(heir.await());
  parent.kill(SIGKILL);
  parent.wait();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  stateFiles.unlock();
  Child next([] { return Open("name", kManual, kSet)->check() ? 0 : 1; });
  EXPECT_EQ(next.wait(), 0);
  EXPECT_EQ(Names(), place.files());
  heir.end();
}

TEST(NamedEventFork, ForkWhileAnotherThreadIsInsideLeavesAUsableChild) {
  EventPlace place;
  auto event = Open("name");
  Mutex stateFiles{String(kStateFileMutex)};
  stateFiles.lock();  // by another object, so openings wait inside the section
  std::thread opener([] { Open("other"); });
  ASSERT_TRUE(Eventually([&] { return Exists(place.file("other")); }));
  Child child([&] {
    event->set();
    event.reset();  // does not enter the parent's section
    auto mine = Open("mine");
    return mine->check() ? 1 : 0;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(child.pid(), SYS_flock); }));
  stateFiles.unlock();
  opener.join();
  EXPECT_EQ(child.wait(), 0);
  EXPECT_TRUE(event->checkOnly());
}

TEST(NamedEventFork, ForksDuringHeavyUseLeaveUsableChildren) {
  if (!kCanForkWhileThreadsAllocate) GTEST_SKIP() << "the sanitizer's allocator is not fork-safe";
  EventPlace place;
  auto shared = Open("shared", kManual, kSet);
  std::atomic<bool> stop{false};
  std::vector<std::thread> threads;
  for (int t = 0; t < 2; ++t) {
    threads.emplace_back([&, t] {
      while (!stop) Open("own" + std::to_string(t))->set();
    });
  }
  for (int i = 0; i < 20; ++i) {
    Child child([&] {
      if (!shared->check()) return 1;
      shared.reset();
      auto mine = Open("own0"), other = Open("other");
      other->set();
      return other->check() ? 0 : 2;
    });
    EXPECT_EQ(child.wait(), 0) << i;
  }
  stop = true;
  for (auto& thread : threads) thread.join();
  shared.reset();
  // What a child that ended without closing has left.
  Open("own0");
  Open("other");
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventFork, ThreadsOfAChildDestroyInheritedObjectsAtOnce) {
  EventPlace place;
  std::vector<std::unique_ptr<NamedEvent>> events;
  for (int i = 0; i < 64; ++i) events.push_back(Open("e" + std::to_string(i % 8)));
  Child child([&] {
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
      threads.emplace_back([&, t] {
        for (int i = t; i < 64; i += 4) events[static_cast<size_t>(i)].reset();
      });
    }
    for (auto& thread : threads) thread.join();
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(place.files().size(), 9u);
  events.clear();
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventFork, GrandchildStartsFreshToo) {
  EventPlace place;
  auto event = Open("name", kManual, kSet);
  Child child([&] {
    auto mine = Open("name");
    Child grandchild([&] {
      event.reset();
      mine.reset();
      return Open("name")->checkOnly() ? 0 : 1;
    });
    return grandchild.wait();
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_TRUE(event->checkOnly());
  event.reset();
  Open("name");
  EXPECT_EQ(Names(), place.files());
}

}  // namespace
}  // namespace zt::fnd::osdep

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <future>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/InheritingChild.h"
#include "tests/support/MutexPlace.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/Sanitizer.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/Mutex.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::BlockedIn;
using vlt::test::Child;
using vlt::test::Eventually;
using vlt::test::FileIsFree;
using vlt::test::InheritingChild;
using vlt::test::InheritingProgram;
using vlt::test::kCanForkWhileThreadsAllocate;
using vlt::test::MutexPlace;
using vlt::test::Wide;

TEST(MutexFork, ChildHoldsNothingAndFreesNothing) {
  MutexPlace place;
  Mutex mutex(L"name");
  mutex.lock();
  Child child([&] {
    mutex.unlock();
    if (FileIsFree(place.file("name"))) return 1;
    if (mutex.tryLock()) return 2;
    mutex.unlock();
    return FileIsFree(place.file("name")) ? 3 : 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_FALSE(FileIsFree(place.file("name")));
  mutex.unlock();
  EXPECT_TRUE(FileIsFree(place.file("name")));
}

TEST(MutexFork, InheritedObjectMayBeDestroyedWhileTheParentHolds) {
  MutexPlace place;
  auto mutex = std::make_unique<Mutex>(Wide("name"));
  mutex->lock();
  for (bool useFirst : {false, true}) {
    Child child([&] {
      if (useFirst && mutex->tryLock()) return 1;
      mutex.reset();
      return FileIsFree(place.file("name")) ? 2 : 0;
    });
    EXPECT_EQ(child.wait(), 0);
    EXPECT_FALSE(FileIsFree(place.file("name")));
  }
}

TEST(MutexFork, ChildWaitsForTheParentAndThenHolds) {
  MutexPlace place;
  Mutex mutex(L"name");
  mutex.lock();
  Child child([&] {
    mutex.lock();
    if (FileIsFree(place.file("name"))) return 1;
    mutex.lock();
    mutex.unlock();
    if (FileIsFree(place.file("name"))) return 2;
    mutex.unlock();
    return FileIsFree(place.file("name")) ? 0 : 3;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(child.pid(), SYS_flock); }));
  mutex.unlock();
  EXPECT_EQ(child.wait(), 0);
}

TEST(MutexFork, ForkWhileAnotherThreadHoldsLeavesAUsableChild) {
  MutexPlace place;
  Mutex mutex(L"name");
  std::promise<void> locked, finish;
  std::thread holder([&] {
    mutex.lock();
    locked.set_value();
    finish.get_future().wait();
    mutex.unlock();
  });
  locked.get_future().wait();
  Child child([&] {
    if (mutex.tryLock()) return 1;  // the parent's thread holds the file
    Mutex other(L"other");
    other.lock();
    other.unlock();
    mutex.lock();  // until that thread has finished
    mutex.unlock();
    return 0;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(child.pid(), SYS_flock); }));
  finish.set_value();
  holder.join();
  EXPECT_EQ(child.wait(), 0);
}

TEST(MutexFork, ForksDuringHeavyUseLeaveUsableChildren) {
  if (!kCanForkWhileThreadsAllocate) GTEST_SKIP() << "the sanitizer's allocator is not fork-safe";
  MutexPlace place;
  Mutex shared(L"shared");
  std::atomic<bool> stop{false};
  std::vector<std::thread> threads;
  for (int t = 0; t < 2; ++t) {
    threads.emplace_back([&, t] {
      while (!stop) {
        Mutex mutex(Wide("own" + std::to_string(t)));
        mutex.lock();
        shared.lock();
        shared.unlock();
        mutex.unlock();
      }
    });
  }
  for (int i = 0; i < 30; ++i) {
    Child child([&] {
      shared.lock();
      shared.unlock();
      Mutex mutex(L"own0");
      mutex.lock();
      mutex.unlock();
      return 0;
    });
    EXPECT_EQ(child.wait(), 0) << i;
  }
  stop = true;
  for (auto& thread : threads) thread.join();
}

TEST(MutexFork, ThreadsOfAChildRenewAnInheritedObjectOnce) {
  MutexPlace place;
  Mutex mutex(L"name");
  Child child([&] {
    int count = 0;
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
      threads.emplace_back([&] {
        for (int i = 0; i < 200; ++i) {
          mutex.lock();
          ++count;
          mutex.unlock();
        }
      });
    }
    for (auto& thread : threads) thread.join();
    return count == 800 ? 0 : 1;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(MutexFork, GrandchildRenewsAgain) {
  MutexPlace place;
  Mutex mutex(L"name");
  Child child([&] {
    mutex.lock();
    Child grandchild([&] { return mutex.tryLock() ? 1 : 0; });
    int code = grandchild.wait();
    mutex.unlock();
    return code;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(MutexFork, LockOfAKilledParentDoesNotLiveOnInTheChild) {
  MutexPlace place;
  InheritingChild heir;
  Child holder([&] {
    Mutex mutex(L"name"), other(L"other");
    mutex.lock();
    heir.fork();
    for (;;) pause();
    return 0;
  });
  ASSERT_TRUE(heir.await());
  EXPECT_FALSE(FileIsFree(place.file("name")));
  holder.kill(SIGKILL);
  holder.wait();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  heir.end();
}

TEST(MutexFork, ChildDoesNotCloseADescriptorThatIsNoLongerTheMutexs) {
  MutexPlace place;
  auto used = std::make_unique<Mutex>(Wide("used"));
  auto unused = std::make_unique<Mutex>(Wide("unused"));
  Child child([&] {
    // The numbers that the parent's files had go to these.
    int first = ::open("/dev/null", O_RDONLY | O_CLOEXEC);
    int second = ::open("/dev/null", O_RDONLY | O_CLOEXEC);
    used->lock();
    used.reset();
    unused.reset();
    return fcntl(first, F_GETFD) != -1 && fcntl(second, F_GETFD) != -1 ? 0 : 1;
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(MutexFork, ReopenedFileIsNotKeptByAChildEither) {
  MutexPlace place;
  InheritingChild heir;
  Child holder([&] {
    Mutex mutex(L"name");
    unlink(place.file("name").c_str());
    mutex.lock();
    heir.fork();
    for (;;) pause();
    return 0;
  });
  ASSERT_TRUE(heir.await());
  EXPECT_FALSE(FileIsFree(place.file("name")));
  holder.kill(SIGKILL);
  holder.wait();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  heir.end();
}

TEST(MutexFork, ProgramStartedByExecKeepsNoLock) {
  MutexPlace place;
  InheritingProgram program;
  Child holder([&] {
    Mutex mutex(L"name");
    mutex.lock();
    program.fork();
    for (;;) pause();
    return 0;
  });
  ASSERT_TRUE(program.await());
  EXPECT_FALSE(FileIsFree(place.file("name")));
  holder.kill(SIGKILL);
  holder.wait();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  EXPECT_TRUE(program.end());  // it has lived until now
}

}  // namespace
}  // namespace zt::fnd::osdep

// Mutexes whose file, descriptor or memory another process takes away.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <memory>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/MutexPlace.h"
#include "tests/support/PlainPosix.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/ReusedDescriptor.h"
#include "tests/support/Sanitizer.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/Mutex.h"
#include "zt/posix/ScopedFd.h"

using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

using vlt::test::Child;
using vlt::test::DescriptorOf;
using vlt::test::FileIsFree;
using vlt::test::MutexPlace;
using vlt::test::PosixErrorOf;
using vlt::test::ReusedDescriptor;
using vlt::test::Signal;
using vlt::test::WriteBytes;

// ---- the directory

// The first to fail must not keep the old file locked: the second would wait for it indefinitely.
TEST(MutexHostile, FileInTheDirectorysPlaceFailsForEachProcess) {
  MutexPlace place;
  Signal ready, go, failed, end;
  auto locks = [&] {
    Mutex mutex(L"name");
    ready.notify();
    go.await();
    int error = PosixErrorOf([&] { mutex.lock(); });
    failed.notify();
    end.await();  // with the descriptor of the old file still open
    return error == ENOTDIR ? 0 : 1;
  };
  Child first(locks), second(locks);
  ASSERT_TRUE(ready.await() && ready.await());
  std::filesystem::remove_all(place.dir / "mutex");
  WriteBytes(place.dir / "mutex", "in the way");
  for (int i = 0; i < 2; ++i) {
    go.notify();
    ASSERT_TRUE(failed.await()) << i;
  }
  end.notify();
  end.notify();
  EXPECT_EQ(first.wait(), 0);
  EXPECT_EQ(second.wait(), 0);
}

// ---- the descriptor

TEST(MutexHostile, ForkLeavesAnothersDescriptorOfTheSameNumberAlone) {
  MutexPlace place;
  Mutex mutex(L"name");
  int ends[2];
  ASSERT_EQ(pipe2(ends, O_CLOEXEC), 0);
  ScopedFd out(ends[0]);
  int number = DescriptorOf(place.file("name"));
  ASSERT_EQ(number, dup2(ends[1], number));
  ::close(ends[1]);
  Child child([&] { return write(number, "x", 1) == 1 ? 0 : 1; });
  EXPECT_EQ(child.wait(), 0);
  ::close(number);
}

TEST(MutexHostile, ExcludesOthersAlsoAfterTheHostHasTakenItsDescriptor) {
  MutexPlace place;
  auto mutex = std::make_unique<Mutex>(L"name");
  ReusedDescriptor hosts(place.dir / "hosts", DescriptorOf(place.file("name")));
  mutex->lock();
  EXPECT_FALSE(FileIsFree(place.file("name")));
  EXPECT_TRUE(hosts.free());
  mutex->unlock();
  EXPECT_TRUE(FileIsFree(place.file("name")));
  mutex.reset();
  EXPECT_TRUE(hosts.isOpen());
}

TEST(MutexHostile, TryLockReplacesAClosedDescriptor) {
  MutexPlace place;
  Mutex mutex(L"name");
  ::close(DescriptorOf(place.file("name")));
  EXPECT_TRUE(mutex.tryLock());
  EXPECT_FALSE(FileIsFree(place.file("name")));
  mutex.unlock();
  EXPECT_TRUE(FileIsFree(place.file("name")));
}

TEST(MutexHostile, NeitherUnlockNorDestructionTouchesTheHostsFile) {
  MutexPlace place;
  auto mutex = std::make_unique<Mutex>(L"name");
  mutex->lock();
  ReusedDescriptor hosts(place.dir / "hosts", DescriptorOf(place.file("name")));
  ASSERT_TRUE(hosts.lock());
  mutex->unlock();
  EXPECT_FALSE(hosts.free());
  mutex.reset();
  EXPECT_FALSE(hosts.free());
  EXPECT_TRUE(hosts.isOpen());
}

// The number that one object lost goes to another of the same name: the same file, but not its own.
TEST(MutexHostile, DescriptorsNumberOfASiblingIsNotTakenForItsOwn) {
  if (vlt::test::kPlainPosix)
    GTEST_SKIP() << "NOT TESTED: an opening takes other numbers by the way";
  MutexPlace place;
  Mutex first(L"name");
  int lost = DescriptorOf(place.file("name"));
  ::close(lost);
  Mutex second(L"name");
  ASSERT_EQ(lost, DescriptorOf(place.file("name")));
  EXPECT_TRUE(second.tryLock());
  EXPECT_FALSE(first.tryLock());  // of another owner of the file
  EXPECT_FALSE(FileIsFree(place.file("name")));
  second.unlock();
  EXPECT_TRUE(first.tryLock());
  first.unlock();
}

// ---- memory

enum Result { kDone = 0, kFalse = 1, kUntouched, kThrew, kNotAgain };

// tryLock with the n-th allocation, from 0, failing. Afterwards, with memory, it must work.
Result TryLockWithout(long n, const Mutex& mutex) {
  using namespace vlt::test::heap;
  bool taken = false;
  Outcome outcome = Attempt([&] { return (taken = mutex.tryLock()) ? 0 : -1; }, n, false);
  if (outcome == kBadAlloc) return kThrew;
  if (!taken && !mutex.tryLock()) return kNotAgain;
  mutex.unlock();
  if (outcome == kNoFailure) return n == 0 ? kUntouched : kDone;
  return kFalse;
}

TEST(MutexHostile, TryLockThatMakesItsFileAnewWithoutMemoryIsFalse) {
  if (!vlt::test::kCanLimitMemory) GTEST_SKIP() << "NOT TESTED: the sanitizer owns the heap";
  MutexPlace place;
  Mutex mutex(L"name");
  Child child([&] {
    mutex.lock();  // this process's own from here on
    mutex.unlock();
    int result = kFalse;
    for (long n = 0; result == kFalse && n < 1000; ++n) {
      std::filesystem::remove_all(place.dir / "mutex");
      result = TryLockWithout(n, mutex);
    }
    return result;
  });
  EXPECT_EQ(child.wait(), kDone);
}

TEST(MutexHostile, TryLockOfAForkedChildWithoutMemoryIsFalse) {
  if (!vlt::test::kCanLimitMemory) GTEST_SKIP() << "NOT TESTED: the sanitizer owns the heap";
  MutexPlace place;
  Mutex mutex(L"name");
  int result = kFalse;
  for (long n = 0; result == kFalse && n < 1000; ++n) {
    Child child([&] { return TryLockWithout(n, mutex); });
    result = child.wait();
  }
  EXPECT_EQ(result, kDone);
}

}  // namespace
}  // namespace zt::fnd::osdep

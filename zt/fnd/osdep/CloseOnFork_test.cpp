#include "zt/fnd/osdep/CloseOnFork.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/file.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/InChild.h"
#include "tests/support/PlainPosix.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/ReusedDescriptor.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"
#include "zt/posix/Files.h"

using zt::posix::Flock;
using zt::posix::ScopedFd;

namespace zt::fnd::osdep {
namespace {

using vlt::test::Child;
using vlt::test::Eventually;
using vlt::test::IsOpen;
using vlt::test::PosixErrorOf;
using vlt::test::ReusedDescriptor;
using vlt::test::TempDir;

AnsiString Path(const TempDir& dir, const char* name) { return AnsiString((dir / name).c_str()); }

TEST(CloseOnFork, ChildHasTheDescriptorClosedAndTheParentKeepsItsLock) {
  TempDir dir;
  CloseOnForkFd fd = CloseOnForkFd::OpenShared(Path(dir, "file"));
  const int number = fd.get();
  ASSERT_EQ(0, Flock(number, LOCK_EX));
  Child child([&] { return IsOpen(number) || fd.get() != -1 ? 1 : 0; });
  EXPECT_EQ(0, child.wait());
  EXPECT_TRUE(IsOpen(number));
  EXPECT_EQ(number, fd.get());
  ScopedFd other(::open((dir / "file").c_str(), O_RDWR | O_CLOEXEC));
  EXPECT_NE(0, Flock(other.get(), LOCK_EX | LOCK_NB));
}

TEST(CloseOnFork, LockOfAKilledParentDoesNotOutliveItInTheChild) {
  TempDir dir;
  vlt::test::Signal ready, end;
  Child parent([&] {
    CloseOnForkFd fd = CloseOnForkFd::OpenShared(Path(dir, "file"));
    Flock(fd.get(), LOCK_EX);
    if (fork() == 0) {
      ready.notify();
      end.await();
      _exit(0);
    }
    for (;;) pause();
    return 0;
  });
  ASSERT_TRUE(ready.await());
  parent.kill(SIGKILL);
  parent.wait();
  ScopedFd other(::open((dir / "file").c_str(), O_RDWR | O_CLOEXEC));
  EXPECT_EQ(0, Flock(other.get(), LOCK_EX | LOCK_NB));
  end.notify();
}

TEST(CloseOnFork, UnmarkedAndRemarkedDescriptors) {
  TempDir dir;
  CloseOnForkFd fd = CloseOnForkFd::OpenShared(Path(dir, "file"));
  const int number = fd.get();
  fd.keepOnFork(true);
  Child keeps([&] {
    if (!IsOpen(number) || fd.get() != number) return 1;
    fd.reset();
    return IsOpen(number) ? 2 : 0;
  });
  EXPECT_EQ(0, keeps.wait());
  fd.keepOnFork(false);
  Child closes([&] { return IsOpen(number) ? 1 : 0; });
  EXPECT_EQ(0, closes.wait());
}

// In a process of its own, where no other object's number is free after a fork.
TEST_IN_CHILD(CloseOnFork, GrandchildDoesNotCloseTheNumberAgain) {
  TempDir dir;
  CloseOnForkFd fd = CloseOnForkFd::OpenShared(Path(dir, "file"));
  const int number = fd.get();
  Child child([&] {
    ScopedFd reused(fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, number));
    if (reused.get() != number) return 1;
    Child grandchild([&] { return IsOpen(reused.get()) ? 0 : 2; });
    int code = grandchild.wait();
    fd.reset();  // nor does the object
    return code == 0 && !IsOpen(reused.get()) ? 3 : code;
  });
  EXPECT_EQ(0, child.wait());
}

// Daemons close all descriptors they find, and open others.
TEST(CloseOnFork, NumberThatTheHostHasTakenIsTheHosts) {
  TempDir dir;
  CloseOnForkFd fd = CloseOnForkFd::OpenShared(Path(dir, "file"));
  CloseOnForkFd kept = CloseOnForkFd::OpenShared(Path(dir, "kept"));
  kept.keepOnFork(true);
  ReusedDescriptor one(dir / "one", fd.get()), two(dir / "two", kept.get());
  EXPECT_EQ(-1, fd.get());
  EXPECT_EQ(-1, kept.get());
  EXPECT_TRUE(fd.valid());
  Child child([&] {
    kept.reset();
    return one.isOpen() && two.isOpen() ? 0 : 1;
  });
  EXPECT_EQ(0, child.wait());
  errno = EDOM;
  fd.reset();
  kept.reset();
  EXPECT_EQ(EDOM, errno);
  EXPECT_TRUE(one.isOpen() && two.isOpen());
}

TEST(CloseOnFork, NumberThatAnotherObjectHasGotIsTheOthers) {
  if (vlt::test::kPlainPosix)
    GTEST_SKIP() << "NOT TESTED: an opening takes other numbers by the way";
  TempDir dir;
  CloseOnForkFd first = CloseOnForkFd::OpenShared(Path(dir, "file"));
  const int number = first.get();
  ::close(number);
  CloseOnForkFd second = CloseOnForkFd::OpenShared(Path(dir, "file"));
  ASSERT_EQ(number, second.get());
  EXPECT_EQ(-1, first.get());
  first.keepOnFork(true);
  first.reset();
  EXPECT_EQ(number, second.get());
  Child child([&] { return IsOpen(number) ? 1 : 0; });
  EXPECT_EQ(0, child.wait());
}

TEST(CloseOnFork, FailedOpenMarksNothing) {
  TempDir dir;
  int before = vlt::test::OpenDescriptors();
  EXPECT_EQ(EISDIR,
            PosixErrorOf([&] { CloseOnForkFd::OpenShared(AnsiString(dir.path().c_str())); }));
  EXPECT_EQ(before, vlt::test::OpenDescriptors());
  CloseOnForkFd none;
  none.keepOnFork(true);
  none.reset();
}

// Whatever the moment of the fork: no child keeps a lock that its parent's thread had.
TEST(CloseOnFork, ForksAtAnyMomentLeaveNoLockBehind) {
  TempDir dir;
  // Made once: a thread that allocates may leave a child the heap of a sanitizer locked.
  const AnsiString path = Path(dir, "file");
  std::atomic<bool> stop{false};
  std::atomic<int> turns{0};
  std::thread opener([&] {
    while (!stop) {
      CloseOnForkFd fd = CloseOnForkFd::OpenShared(path);
      Flock(fd.get(), LOCK_EX | LOCK_NB);  // a child has the last one until its handlers have run
      fd.reset();                          // with its lock, which any copy would prolong
      ++turns;
    }
  });
  vlt::test::Signal end;
  std::vector<Child> alive;
  alive.reserve(100);
  for (int seen = 0; alive.size() < 100; seen = turns) {
    // On a busy machine all forks may otherwise come before the opener's first turn.
    if (!Eventually([&] { return turns > seen; })) break;
    alive.emplace_back([&] {
      end.await();
      return 0;
    });
  }
  stop = true;
  opener.join();
  EXPECT_EQ(100u, alive.size());
  ScopedFd other(::open((dir / "file").c_str(), O_RDWR | O_CLOEXEC));
  // Well before the children end by themselves.
  EXPECT_TRUE(Eventually([&] { return Flock(other.get(), LOCK_EX | LOCK_NB) == 0; },
                         vlt::test::kDeadlineMs / 3));
  for (size_t i = 0; i < alive.size(); ++i) end.notify();
  for (Child& child : alive) EXPECT_EQ(0, child.wait());
}

}  // namespace
}  // namespace zt::fnd::osdep

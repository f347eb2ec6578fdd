#include "zt/fnd/osdep/CloseOnFork.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/file.h>
#include <unistd.h>

#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/ScopedFd.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::Child;
using vlt::test::PosixErrorOf;
using vlt::test::TempDir;

AnsiString Path(const TempDir& dir, const char* name) { return AnsiString((dir / name).c_str()); }

bool IsOpen(int fd) { return fcntl(fd, F_GETFD) != -1; }

TEST(ForkClose, ChildHasTheDescriptorClosedAndTheParentKeepsItsLock) {
  TempDir dir;
  CloseOnForkFd fd = CloseOnForkFd::OpenShared(Path(dir, "file"));
  ASSERT_EQ(0, Flock(fd.get(), LOCK_EX));
  Child child([&] { return IsOpen(fd.get()) ? 1 : 0; });
  EXPECT_EQ(0, child.wait());
  EXPECT_TRUE(IsOpen(fd.get()));
  ScopedFd other(::open((dir / "file").c_str(), O_RDWR | O_CLOEXEC));
  EXPECT_NE(0, Flock(other.get(), LOCK_EX | LOCK_NB));
}

TEST(ForkClose, LockOfAKilledParentDoesNotOutliveItInTheChild) {
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

TEST(ForkClose, UnmarkedAndRemarkedDescriptors) {
  TempDir dir;
  CloseOnForkFd fd = CloseOnForkFd::OpenShared(Path(dir, "file"));
  fd.keepOnFork(true);
  Child keeps([&] {
    int number = fd.get();
    if (!IsOpen(number)) return 1;
    fd.reset();
    return IsOpen(number) ? 2 : 0;
  });
  EXPECT_EQ(0, keeps.wait());
  fd.keepOnFork(false);
  Child closes([&] { return IsOpen(fd.get()) ? 1 : 0; });
  EXPECT_EQ(0, closes.wait());
}

TEST(ForkClose, GrandchildDoesNotCloseTheNumberAgain) {
  TempDir dir;
  CloseOnForkFd fd = CloseOnForkFd::OpenShared(Path(dir, "file"));
  Child child([&] {
    ScopedFd reused(::open("/dev/null", O_RDONLY | O_CLOEXEC));
    if (reused.get() != fd.get()) return 1;
    Child grandchild([&] { return IsOpen(reused.get()) ? 0 : 2; });
    int code = grandchild.wait();
    fd.reset();  // nor does the object
    return code == 0 && !IsOpen(reused.get()) ? 3 : code;
  });
  EXPECT_EQ(0, child.wait());
}

TEST(ForkClose, FailedOpenMarksNothing) {
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
TEST(ForkClose, ForksAtAnyMomentLeaveNoLockBehind) {
  TempDir dir;
  std::atomic<bool> stop{false};
  std::thread opener([&] {
    while (!stop) {
      CloseOnForkFd fd = CloseOnForkFd::OpenShared(Path(dir, "file"));
      Flock(fd.get(), LOCK_EX);
      fd.keepOnFork(true);  // a child of this moment shares an open file that is unlocked next
      Flock(fd.get(), LOCK_UN);
    }
  });
  vlt::test::Signal end;
  std::vector<Child> alive;
  alive.reserve(100);
  for (int i = 0; i < 100; ++i) {
    alive.emplace_back([&] {
      end.await();
      return 0;
    });
  }
  stop = true;
  opener.join();
  ScopedFd other(::open((dir / "file").c_str(), O_RDWR | O_CLOEXEC));
  EXPECT_EQ(0, Flock(other.get(), LOCK_EX | LOCK_NB));
  for (int i = 0; i < 100; ++i) end.notify();
  for (Child& child : alive) EXPECT_EQ(0, child.wait());
}

}  // namespace
}  // namespace zt::fnd::osdep

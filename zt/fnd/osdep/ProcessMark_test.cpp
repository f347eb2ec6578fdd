#include "zt/fnd/osdep/ProcessMark.h"

#include <gtest/gtest.h>
#include <sched.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <functional>
#include <memory>

#include "tests/support/Child.h"
#include "tests/support/MutexPlace.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/Mutex.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::Child;
using vlt::test::FileIsFree;
using vlt::test::MutexPlace;

TEST(ProcessMark, IsCurrentInItsProcessOnly) {
  ProcessMark none, mark = ProcessMark::Current();
  EXPECT_FALSE(none.isCurrent());
  EXPECT_TRUE(mark.isCurrent());
  EXPECT_TRUE(ProcessMark(mark).isCurrent());
  Child child([&] {
    if (mark.isCurrent() || none.isCurrent()) return 1;
    mark = ProcessMark::Current();
    if (!mark.isCurrent()) return 2;
    Child grandchild([&] { return mark.isCurrent() ? 1 : 0; });
    return grandchild.wait() == 0 && mark.isCurrent() ? 0 : 3;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_TRUE(mark.isCurrent());
}

TEST(ProcessMark, IsNotCurrentInAChildMadeWithoutTheHandlersOfFork) {
  ProcessMark mark = ProcessMark::Current();
  pid_t pid = _Fork();
  if (pid == 0) _exit(mark.isCurrent() ? 1 : 0);
  ASSERT_GT(pid, 0);
  int status = -1;
  ASSERT_EQ(pid, waitpid(pid, &status, 0));
  EXPECT_EQ(status, 0);
}

// ---- children with the process id of their parent

constexpr int kNotAllowed = 77;

// Runs the body in the first process of a name space of its own, whose id is 1. It dies with its
// parent, which knows it by another id; the deadline is that of the Child around it.
int RunAsFirst(const std::function<int()>& body) {
  if (unshare(CLONE_NEWPID) != 0) return kNotAllowed;
  pid_t first = fork();
  if (first < 0) return kNotAllowed;
  if (first == 0) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    _exit(getpid() == 1 ? body() : kNotAllowed);
  }
  int status = 0;
  while (waitpid(first, &status, 0) < 0 && errno == EINTR) {
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

TEST(ProcessMark, IsNotCurrentInAChildThatHasTheSameProcessId) {
  Child child([] {
    return RunAsFirst([] {
      ProcessMark mark = ProcessMark::Current();
      return RunAsFirst([&] { return mark.isCurrent() ? 1 : 0; });
    });
  });
  int code = child.wait();
  if (code == kNotAllowed) GTEST_SKIP() << "NOT TESTED: no right to make name spaces";
  EXPECT_EQ(code, 0);
}

TEST(ProcessMark, MutexOfAParentWithTheSameProcessIdIsNotHeldByTheChild) {
  MutexPlace place;
  Child child([&] {
    return RunAsFirst([&] {
      auto mutex = std::make_unique<Mutex>(L"name");
      mutex->lock();
      int code = RunAsFirst([&] {
        if (mutex->tryLock()) return 1;
        mutex->unlock();  // of what the parent holds
        mutex.reset();
        return FileIsFree(place.file("name")) ? 2 : 0;
      });
      return code != 0 ? code : FileIsFree(place.file("name")) ? 3 : 0;
    });
  });
  int code = child.wait();
  if (code == kNotAllowed) GTEST_SKIP() << "NOT TESTED: no right to make name spaces";
  EXPECT_EQ(code, 0);
}

}  // namespace
}  // namespace zt::fnd::osdep

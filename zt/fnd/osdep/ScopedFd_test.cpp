#include "zt/fnd/osdep/ScopedFd.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <unistd.h>

#include <cerrno>

#include "tests/support/HostsFile.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/osdep/Retry.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::IsOpen;

int OpenNull() { return ::open("/dev/null", O_RDONLY | O_CLOEXEC); }

TEST(FileScopedFd, ClosesOnceAndKeepsErrno) {
  int fd = OpenNull();
  errno = EDOM;
  {
    ScopedFd owner(fd);
    EXPECT_TRUE(owner.valid());
    EXPECT_EQ(fd, owner.get());
  }
  EXPECT_EQ(EDOM, errno);
  EXPECT_FALSE(IsOpen(fd));
}

TEST(FileScopedFd, MovesAndReleases) {
  int fd = OpenNull();
  ScopedFd first(fd);
  ScopedFd second(std::move(first));
  EXPECT_FALSE(first.valid());
  ScopedFd third;
  third = std::move(second);
  EXPECT_TRUE(IsOpen(fd));
  EXPECT_EQ(fd, third.release());
  EXPECT_FALSE(third.valid());
  third.reset(fd);
  third.reset();
  EXPECT_FALSE(IsOpen(fd));
}

TEST(FileFlock, FailsWithErrnoWhileAnotherHasTheLock) {
  vlt::test::TempDir dir;
  auto open = [&] { return ::open((dir / "f").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600); };
  ScopedFd a(open()), b(open());
  ASSERT_EQ(0, Flock(a.get(), LOCK_EX));
  EXPECT_EQ(-1, Flock(b.get(), LOCK_EX | LOCK_NB));
  EXPECT_EQ(EWOULDBLOCK, errno);
  EXPECT_EQ(0, Flock(a.get(), LOCK_UN));
  EXPECT_EQ(0, Flock(b.get(), LOCK_EX | LOCK_NB));
}

TEST(FileRetry, RepeatsInterruptedCallsOnly) {
  int calls = 0;
  EXPECT_EQ(7, RetryEintr([&] {
              errno = EINTR;
              return ++calls < 4 ? -1 : 7;
            }));
  EXPECT_EQ(4, calls);
  calls = 0;
  EXPECT_EQ(-1, RetryEintr([&] {
    ++calls;
    errno = EACCES;
    return -1;
  }));
  EXPECT_EQ(1, calls);
  EXPECT_EQ(EACCES, errno);
}

}  // namespace
}  // namespace zt::fnd::osdep

#include "zt/posix/ScopedFd.h"

#include <fcntl.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <utility>

#include "tests/support/ReusedDescriptor.h"
#include "zt/posix/Retry.h"

namespace zt::posix {
namespace {

using vlt::test::IsOpen;

int OpenNull() { return open("/dev/null", O_RDONLY | O_CLOEXEC); }

TEST(ScopedFd, ClosesOnceAndKeepsErrno) {
  int fd = OpenNull();
  errno = EDOM;
  {
    ScopedFd owner(fd);
    EXPECT_TRUE(owner.valid());
    EXPECT_EQ(owner.get(), fd);
  }
  EXPECT_EQ(errno, EDOM);
  EXPECT_FALSE(IsOpen(fd));
}

TEST(ScopedFd, MovesAndReleases) {
  int fd = OpenNull();
  ScopedFd first(fd);
  ScopedFd second(std::move(first));
  EXPECT_FALSE(first.valid());
  ScopedFd third;
  third = std::move(second);
  EXPECT_TRUE(IsOpen(fd));
  EXPECT_EQ(third.release(), fd);
  EXPECT_FALSE(third.valid());
  third.reset(fd);
  third.reset();
  EXPECT_FALSE(IsOpen(fd));
}

TEST(ScopedFd, AnObjectThatIsMovedToItselfKeepsItsDescriptor) {
  ScopedFd fd(OpenNull());
  int number = fd.get();
  ScopedFd& same = fd;
  fd = std::move(same);
  EXPECT_EQ(fd.get(), number);
  EXPECT_TRUE(IsOpen(number));
}

TEST(ScopedFdRetry, RepeatsInterruptedCallsOnly) {
  int calls = 0;
  EXPECT_EQ(RetryEintr([&] {
              errno = EINTR;
              return ++calls < 4 ? -1 : 7;
            }),
            7);
  EXPECT_EQ(calls, 4);
  calls = 0;
  EXPECT_EQ(RetryEintr([&] {
              ++calls;
              errno = EACCES;
              return -1;
            }),
            -1);
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(errno, EACCES);
}

}  // namespace
}  // namespace zt::posix

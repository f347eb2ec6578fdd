#include "zt/posix/ScopedFd.h"

#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>

#include <utility>

#include "zt/posix/Retry.h"

namespace zt::posix {
namespace {

TEST(PosixScopedFd, AnObjectThatIsMovedToItselfKeepsItsDescriptor) {
  ScopedFd fd(open("/dev/null", O_RDONLY | O_CLOEXEC));
  int number = fd.get();
  ScopedFd& same = fd;
  fd = std::move(same);
  EXPECT_EQ(fd.get(), number);
  EXPECT_NE(fcntl(number, F_GETFD), -1);
}

TEST(PosixRetry, GoesOnAfterInterruptionsOnly) {
  int calls = 0;
  EXPECT_EQ(RetryEintr([&] {
              errno = EINTR;
              return ++calls < 4 ? -1 : 7;
            }),
            7);
  EXPECT_EQ(calls, 4);
}

}  // namespace
}  // namespace zt::posix

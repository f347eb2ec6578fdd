// File systems that have no fsync: it answers EINVAL there. That counts as done.
#include <errno.h>
#include <gtest/gtest.h>
#include <sys/syscall.h>

#include <string>

#include "tests/support/Child.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/Rendezvous.h"

namespace vlt::test {
namespace {

// The code of a process in which fsync fails with the error: 0 if the cookie was set, 1 for E_FAIL.
int SetCookieWhereSyncFailsWith(int error) {
  return Child([&] {
           if (!FailSystemCall(SYS_fsync, error)) return 2;
           HRESULT result = vltSetServerCookie(42);
           return result == S_OK ? 0 : result == E_FAIL ? 1 : 3;
         })
      .wait();
}

TEST(WithoutFsync, ACookieIsSetAndItsFileSealed) {
  RendezvousPlace place;
  place.prepare(Before::NoFiles);
  EXPECT_EQ(SetCookieWhereSyncFailsWith(EINVAL), 0);
  EXPECT_EQ(NotesIn(place.jar())["CookieSection/LastServerCookie"], "42");
  EXPECT_EQ(Hex(ReadBytes(place.jarSidecar())), Md5Sum(place.jar()));
}

// The error of a disk is none of a file system: the test above would pass without any fsync.
TEST(WithoutFsync, ADiskThatFailsIsReported) {
  RendezvousPlace place;
  place.prepare(Before::NoFiles);
  EXPECT_EQ(SetCookieWhereSyncFailsWith(EIO), 1);
}

}  // namespace
}  // namespace vlt::test

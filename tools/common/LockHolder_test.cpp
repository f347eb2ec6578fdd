#include "tools/common/LockHolder.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "tests/support/Child.h"
#include "tests/support/TempDir.h"

namespace vltctl {
namespace {

using vlt::test::Child;
using vlt::test::Signal;

TEST(LockHolder, IsTheProcessThatTookTheLock) {
  vlt::test::TempDir dir;
  const std::string file = dir / "lock";
  vlt::test::WriteBytes(file, "");
  EXPECT_TRUE(LockTable().holders(file).empty());
  Signal held, release;
  Child holder([&] {
    int fd = open(file.c_str(), O_RDWR);
    flock(fd, LOCK_EX);
    held.notify();
    release.await();
    return 0;
  });
  ASSERT_TRUE(held.await());
  auto holders = LockTable().holders(file);
  ASSERT_EQ(holders.size(), 1u);
  EXPECT_EQ(holders[0].pid, holder.pid());
  EXPECT_EQ(holders[0].command, "tools_tests");
  EXPECT_EQ(HeldBy(holders), "held by tools_tests (pid " + std::to_string(holder.pid()) + ")");
  // Who has it open, or waits for it, does not hold it.
  Child waiter([&] {
    int fd = open(file.c_str(), O_RDWR);
    flock(fd, LOCK_EX);
    return 0;
  });
  ASSERT_TRUE(vlt::test::Eventually([&] { return vlt::test::BlockedIn(waiter.pid(), SYS_flock); }));
  EXPECT_EQ(LockTable().holders(file).size(), 1u);
  release.notify();
  EXPECT_EQ(holder.wait(), 0);
  EXPECT_EQ(waiter.wait(), 0);
  EXPECT_TRUE(LockTable().holders(file).empty());
}

TEST(LockHolder, WhatIsNotThereOrNotLockedHasNone) {
  vlt::test::TempDir dir;
  EXPECT_TRUE(LockTable().holders(dir / "none").empty());
  EXPECT_TRUE(LockTable().holders(dir.path()).empty());
  EXPECT_EQ(HeldBy({}), "held by another process");
  EXPECT_EQ(HeldBy({{7, ""}, {8, "x"}}), "held by process 7, x (pid 8)");
}

}  // namespace
}  // namespace vltctl

#include "zt/fnd/osdep/FileTime.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <string>

#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::TempDir;
using vlt::test::Wide;

void SetTime(const std::string& path, time_t seconds, long nanoseconds) {
  timespec times[2] = {{seconds, nanoseconds}, {seconds, nanoseconds}};
  ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
}

TEST(FileTime, UnixTimeCountsFrom1904) {
  EXPECT_EQ(Time_TtoAbsTime(0).getSeconds(), 2082844800);
  EXPECT_EQ(Time_TtoAbsTime(0).toTime_T(false), 0);
  EXPECT_EQ(Time_TtoAbsTime(-5).toTime_T(false), -5);
}

TEST(FileTime, LastWriteIsInWholeSeconds) {
  TempDir dir;
  vlt::test::WriteBytes(dir / "f", "x");
  SetTime(dir / "f", 1000000000, 999999999);
  AbsTime time = GetFileLastWriteTime(Wide(dir / "f"));
  EXPECT_EQ(time.toTime_T(false), 1000000000);
  EXPECT_EQ(time.toTime_T(true), 1000000000);
  EXPECT_EQ(time.getFraction(), 0.0);
  EXPECT_TRUE(time == Time_TtoAbsTime(1000000000));
}

TEST(FileTime, LinksAreFollowedAndDirectoriesHaveATime) {
  TempDir dir;
  vlt::test::WriteBytes(dir / "f", "x");
  SetTime(dir / "f", 12345, 0);
  ASSERT_EQ(symlink("f", (dir / "link").c_str()), 0);
  EXPECT_EQ(GetFileLastWriteTime(Wide(dir / "link")).toTime_T(false), 12345);
  SetTime(dir.path(), 54321, 0);
  EXPECT_EQ(GetFileLastWriteTime(Wide(dir.path())).toTime_T(false), 54321);
}

TEST(FileTime, WhatCannotBeAskedHasTheMinimum) {
  TempDir dir;
  vlt::test::WriteBytes(dir / "f", "x");
  EXPECT_TRUE(GetFileLastWriteTime(Wide(dir / "missing")) == AbsTime::min);
  EXPECT_TRUE(GetFileLastWriteTime(Wide(dir / "f/x")) == AbsTime::min);
  EXPECT_TRUE(GetFileLastWriteTime(String()) == AbsTime::min);
}

}  // namespace
}  // namespace zt::fnd::osdep

#include "zt/fnd/osdep/ThreadID.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <string>
#include <thread>

#include "zt/fnd/String.h"

namespace zt::fnd::osdep {
namespace {

TEST(ThreadID, IsTheCallingThread) {
  ThreadID mine;
  EXPECT_TRUE(mine.isCurrentThread());
  EXPECT_TRUE(mine == ThreadID::getCallingID());
  std::thread([&] {
    EXPECT_FALSE(mine.isCurrentThread());
    EXPECT_FALSE(mine == ThreadID());
    EXPECT_TRUE(ThreadID::getCallingID().isCurrentThread());
  }).join();
}

TEST(ThreadID, DisplaysInCapitalHexadecimal) {
  char expected[40];
  snprintf(expected, sizeof expected, "%lX", static_cast<unsigned long>(pthread_self()));
  AnsiString shown(ThreadID().getDisplayStringHex());
  EXPECT_EQ(std::string(expected), shown.c_str());
}

}  // namespace
}  // namespace zt::fnd::osdep

#include "zt/fnd/osdep/AtomicInt.h"

#include <gtest/gtest.h>

#include <climits>
#include <thread>
#include <vector>

namespace zt::fnd::osdep {
namespace {

TEST(AtomicInt, StepsReturnTheNewValue) {
  AtomicInt n(5);
  EXPECT_EQ(n.getCount(), 5);
  EXPECT_EQ(n.increment(), 6);
  EXPECT_EQ(n.decrement(), 5);
  EXPECT_EQ(n.getCount(), 5);
}

TEST(AtomicInt, CompareExchangeReturnsTheOldValueEitherWay) {
  AtomicInt n(5);
  EXPECT_EQ(n.compareExchange(4, 9), 5);
  EXPECT_EQ(n.getCount(), 5);
  EXPECT_EQ(n.compareExchange(5, 9), 5);
  EXPECT_EQ(n.getCount(), 9);
}

TEST(AtomicInt, ReplaceStoresAndTheOtherReturnsTheOldValue) {
  AtomicInt n(1);
  n.replace(2);
  EXPECT_EQ(n.replaceAndReturn(3), 2);
  EXPECT_EQ(n.getCount(), 3);
}

TEST(AtomicInt, Comparisons) {
  AtomicInt n(3);
  EXPECT_TRUE(n == 3);
  EXPECT_FALSE(n == 4);
  EXPECT_TRUE(n != 4);
  EXPECT_FALSE(n != 3);
  EXPECT_TRUE(n > 2);
  EXPECT_FALSE(n > 3);
  EXPECT_TRUE(n >= 3);
  EXPECT_FALSE(n >= 4);
}

TEST(AtomicInt, WrapsAtBothEnds) {
  AtomicInt n(INT_MAX);
  EXPECT_EQ(n.increment(), INT_MIN);
  EXPECT_EQ(n.decrement(), INT_MAX);
}

TEST(AtomicInt, ThreadsLoseNoStep) {
  AtomicInt n(0);
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 5000; ++i) n.increment();
      for (int i = 0; i < 2000; ++i) n.decrement();
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(n.getCount(), 12000);
}

}  // namespace
}  // namespace zt::fnd::osdep

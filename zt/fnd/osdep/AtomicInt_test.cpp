#include "zt/fnd/osdep/AtomicInt.h"

#include <gtest/gtest.h>

#include <climits>
#include <thread>
#include <vector>

namespace zt::fnd::osdep {
namespace {

TEST(AtomicInt, StepsReturnTheNewValue) {
  AtomicInt n(5);
  EXPECT_EQ(5, n.getCount());
  EXPECT_EQ(6, n.increment());
  EXPECT_EQ(5, n.decrement());
  EXPECT_EQ(5, n.getCount());
}

TEST(AtomicInt, CompareExchangeReturnsTheOldValueEitherWay) {
  AtomicInt n(5);
  EXPECT_EQ(5, n.compareExchange(4, 9));
  EXPECT_EQ(5, n.getCount());
  EXPECT_EQ(5, n.compareExchange(5, 9));
  EXPECT_EQ(9, n.getCount());
}

TEST(AtomicInt, ReplaceStoresAndTheOtherReturnsTheOldValue) {
  AtomicInt n(1);
  n.replace(2);
  EXPECT_EQ(2, n.replaceAndReturn(3));
  EXPECT_EQ(3, n.getCount());
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
  EXPECT_EQ(INT_MIN, n.increment());
  EXPECT_EQ(INT_MAX, n.decrement());
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
  EXPECT_EQ(12000, n.getCount());
}

}  // namespace
}  // namespace zt::fnd::osdep

#include "zt/fnd/osdep/CallQPC.h"

#include <gtest/gtest.h>

#include "zt/fnd/osdep/MonotonicClock.h"
#include "zt/fnd/osdep/Sleep.h"

namespace zt::fnd::osdep {
namespace {

TEST(CallQPC, UnitIsTheTickLengthInNanoseconds) {
  CallQPC clock;
  const uint64_t ticks = 12345678901ull;  // 12.345678901 seconds
  ASSERT_EQ(MonotonicTicksPerSecond(), 1000000000u);
  const struct {
    unsigned int unit;
    uint64_t count;
  } rows[] = {{100, 123456789}, {1000, 12345678}, {1000000, 12345},
              {1000000000, 12}, {1, ticks},       {3, 4115226296ull},  // factor 333333333
              {1000000001, 0},  {0xFFFFFFFFu, 0}, {0, 0}};
  for (const auto& row : rows) EXPECT_EQ(row.count, clock.convert(ticks, row.unit)) << row.unit;
}

TEST(CallQPC, LargeReadingsDoNotOverflow) {
  CallQPC clock;
  const uint64_t all = ~uint64_t(0);
  EXPECT_EQ(all, clock.convert(all, 1));
  EXPECT_EQ(all / 1000, clock.convert(all, 1000));
  EXPECT_EQ(all / 1000000000, clock.convert(all, 1000000000));
}

TEST(CallQPC, ReadingsGoUpWithTime) {
  CallQPC clock;
  uint64_t before = clock.hires(1000000);
  Sleep(30);
  uint64_t passed = clock.hires(1000000) - before;
  EXPECT_GE(passed, 29u);
  EXPECT_LT(passed, 10000u);
}

}  // namespace
}  // namespace zt::fnd::osdep

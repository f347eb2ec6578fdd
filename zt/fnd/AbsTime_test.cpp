#include "zt/fnd/AbsTime.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

using namespace zt::fnd;
using namespace nZTSS100;
using V = tSSTimeValue;
using Fixed = V::tValue;

namespace {

constexpr int64_t kMost = std::numeric_limits<int64_t>::max();
constexpr int64_t kLeast = std::numeric_limits<int64_t>::min();

AbsTime Unix(double seconds) { return AbsTime(2082844800.0, seconds); }

const Fixed kWholeMax(0x7FFFFFFF, 0xFFFFFFFF, 0, 0), kWholeMin(0x80000000, 0, 0, 0);

double Rounded(V::tRoundMethod method, double number) {
  Fixed value(number);
  int32_t status = 0;
  V::_RoundAndCheckFit(method, kWholeMax, kWholeMin, value, &status);
  EXPECT_EQ(status, 0);
  EXPECT_EQ(value.fractionBits(), 0u);
  return static_cast<double>(value);
}

double Corrected(V::tUnitConversion conversion, uint32_t unit, double number, int32_t* status) {
  Fixed value(number);
  V::_CorrectUnits(conversion, static_cast<tTimeUnit>(unit), value, status);
  return static_cast<double>(value);
}

}  // namespace

TEST(AbsTime, LimitsAndSize) {
  static_assert(AbsTime::size == 16 && sizeof(AbsTime) == 16);
  EXPECT_EQ(Fixed(0x7FFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF), AbsTime::max.value());
  EXPECT_EQ(Fixed(0x80000000, 0, 0, 0), AbsTime::min.value());
  EXPECT_LT(AbsTime::min, AbsTime::max);
  EXPECT_EQ(AbsTime().getSeconds(), 0);
}

TEST(AbsTime, UnixZeroCountsFrom1904) {
  EXPECT_EQ(2082844800, Unix(0).getSeconds());
  EXPECT_EQ(2082844800, Unix(0).value().integerPart());
  EXPECT_EQ(0, Unix(0).toTime_T(false));
}

TEST(AbsTime, UnixTimeTruncatesOrRounds) {
  const struct {
    double unixTime;
    int64_t truncated, rounded;
  } table[] = {{1.25, 1, 1},
               {1.75, 1, 2},
               {1.5, 1, 2},
               {2.5, 2, 2},
               {0.5, 0, 0},
               {-1.5, -1, -2},
               {-2.5, -2, -2},
               {-0.5, 0, 0},
               {-0.75, 0, -1},
               {3, 3, 3},
               {-2082844801.5, -2082844801, -2082844802}};
  for (const auto& row : table) {
    EXPECT_EQ(row.truncated, Unix(row.unixTime).toTime_T(false)) << row.unixTime;
    EXPECT_EQ(row.rounded, Unix(row.unixTime).toTime_T(true)) << row.unixTime;
  }
}

TEST(AbsTime, TicksCountFrom1601) {
  EXPECT_EQ(116444736000000000, Unix(0).toLKTIME(false));
  EXPECT_EQ(116444736000000000 + 15000000, Unix(1.5).toLKTIME(true));
  EXPECT_EQ(AbsTime(-9561628800.0, 0).toLKTIME(true), 0);
  EXPECT_EQ(AbsTime().toLKTIME(false), 95616288000000000);
  EXPECT_EQ(AbsTime(-9561628801.0, 0).toLKTIME(false), -10000000);
  // 0.3 ticks and 0.5 ticks, counted in 2^-64 seconds.
  const AbsTime third(Fixed(3) / Fixed(100000000));
  EXPECT_EQ(third.toLKTIME(true), 95616288000000000);
  EXPECT_EQ(AbsTime(Fixed(7) / Fixed(100000000)).toLKTIME(true), 95616288000000001);
  EXPECT_EQ(AbsTime(Fixed(7) / Fixed(100000000)).toLKTIME(false), 95616288000000000);
}

// A hair after a whole second is truncated to it: both ways of counting give the same.
TEST(AbsTime, WholeSecondsCountAsTheirNeighbours) {
  const Fixed hair = Fixed(1) / Fixed(1000000000);
  for (int64_t seconds : {INT64_C(0), INT64_C(1), INT64_C(2082844800), INT64_C(3878000000),
                          INT64_C(899999999999), INT64_C(900000000000), INT64_C(900000000001),
                          INT64_C(912775574885), INT64_C(912775574886), INT64_C(1000000000001)}) {
    const Fixed whole(static_cast<long long>(seconds));
    for (bool round : {false, true}) {
      EXPECT_EQ(AbsTime(whole).toLKTIME(round), AbsTime(whole + hair).toLKTIME(false)) << seconds;
    }
  }
  // Below 1601 truncation goes up to the second.
  for (int64_t seconds : {INT64_C(-9561628801), INT64_C(-899999999999), INT64_C(-900000000001),
                          INT64_C(-931898832486), INT64_C(-1000000000001)}) {
    const Fixed whole(static_cast<long long>(seconds));
    for (bool round : {false, true}) {
      EXPECT_EQ(AbsTime(whole).toLKTIME(round), AbsTime(whole - hair).toLKTIME(false)) << seconds;
    }
  }
}

TEST(AbsTime, WhatDoesNotFitEndsAtTheLimits) {
  EXPECT_EQ(kLeast, AbsTime::min.toTime_T(true));
  EXPECT_EQ(kLeast, AbsTime::min.toTime_T(false));
  EXPECT_EQ(kMost - 2082844800 + 1, AbsTime::max.toTime_T(true));
  EXPECT_EQ(kLeast, AbsTime::min.toLKTIME(false));
  EXPECT_EQ(kMost, AbsTime::max.toLKTIME(true));
  EXPECT_EQ(kMost, AbsTime(1e12, 0).toLKTIME(true)) << "the product changes its sign";
  EXPECT_EQ(kLeast, AbsTime(-1e12, 0).toLKTIME(true));
}

// Products that pass the range more than once come back with the sign that they should have.
TEST(AbsTime, FarTimesEndAtTheLimitsOfTicks) {
  for (double seconds : {1.9e12, 2e12, 1e13, 1e15, 1e17, 9e18}) {
    for (bool round : {false, true}) {
      EXPECT_EQ(AbsTime(seconds, 0).toLKTIME(round), kMost) << seconds;
      EXPECT_EQ(AbsTime(-seconds, 0).toLKTIME(round), kLeast) << seconds;
      EXPECT_EQ(static_cast<int64_t>(seconds) - 2082844800, AbsTime(seconds, 0).toTime_T(round));
    }
  }
}

TEST(AbsTime, TicksAroundTheLimit) {
  // The last tick of 64 bits is 922337203685.4775807 seconds away from 1601, which is in 1904:
  const auto after = [](int64_t seconds, int ticks) {
    return AbsTime(Fixed(seconds) + Fixed(ticks) / Fixed(10000000));
  };
  EXPECT_EQ(kMost - 1, after(912775574885, 4775806).toLKTIME(true));
  EXPECT_EQ(after(912775574885, 4775807).toLKTIME(true), kMost);
  EXPECT_EQ(after(912775574885, 4775808).toLKTIME(true), kMost);
  EXPECT_EQ(after(912775574886, 0).toLKTIME(false), kMost);
  EXPECT_EQ(after(912775574887, 0).toLKTIME(false), kMost);
  EXPECT_EQ(kLeast + 1, after(-931898832485, -4775807).toLKTIME(true));
  EXPECT_EQ(after(-931898832485, -4775808).toLKTIME(true), kLeast);
  EXPECT_EQ(after(-931898832485, -4775809).toLKTIME(true), kLeast);
  EXPECT_EQ(after(-931898832486, 0).toLKTIME(false), kLeast);
  EXPECT_EQ(after(-931898832487, 0).toLKTIME(false), kLeast);
}

TEST(AbsTime, SecondsTruncateTowardZero) {
  EXPECT_EQ(1, AbsTime(1, 0.75).getSeconds());
  EXPECT_EQ(-1, AbsTime(-1.25, 0).getSeconds());
  EXPECT_EQ(0, AbsTime(-0.75, 0).getSeconds());
  EXPECT_EQ(kLeast, AbsTime::min.getSeconds());
  EXPECT_EQ(kMost, AbsTime::max.getSeconds()) << "the carry does not wrap";
}

TEST(AbsTime, FractionThatShowsAsOneCarriesOver) {
  const AbsTime almost(Fixed(0, 4, 0xFFFFFFFF, 0xFFFFFFFF));
  EXPECT_EQ(almost.getSeconds(), 5);
  EXPECT_EQ(almost.getFraction(), 0.0);
  AbsTime negative(-Fixed(0, 4, 0xFFFFFFFF, 0xFFFFFFFF));
  EXPECT_EQ(negative.getSeconds(), -5);
  const AbsTime below(Fixed(1) - Fixed(std::ldexp(1.0, -51)));
  EXPECT_EQ(below.getSeconds(), 0) << "two steps below 1.0";
  EXPECT_EQ(1 - std::ldexp(1.0, -51), below.getFraction());
  const AbsTime edge(Fixed(1) - Fixed(std::ldexp(1.0, -52)));
  EXPECT_EQ(edge.getSeconds(), 1) << "one step below counts as 1.0";
  EXPECT_EQ(edge.getFraction(), 0.0);
}

TEST(AbsTime, FractionIsTheBitsBehindThePoint) {
  EXPECT_EQ(0.25, AbsTime(7, 0.25).getFraction());
  EXPECT_EQ(0.75, AbsTime(-1.25, 0).getFraction()) << "counted from the second below";
  EXPECT_EQ(0.0, AbsTime::min.getFraction());
  EXPECT_EQ(0.0, AbsTime::max.getFraction());
}

TEST(AbsTime, RangesCountTheirEnds) {
  const AbsTime t1(1.0, 0), t2(2.0, 0), t3(3.0, 0), t4(4.0, 0);
  EXPECT_TRUE(AbsTime::doRangesIntersect(t1, t2, t2, t3));
  EXPECT_TRUE(AbsTime::doRangesIntersect(t2, t3, t1, t2));
  EXPECT_TRUE(AbsTime::doRangesIntersect(t1, t4, t2, t3));
  EXPECT_FALSE(AbsTime::doRangesIntersect(t1, t2, t3, t4));
  EXPECT_FALSE(AbsTime::doRangesIntersect(t3, t4, t1, t2));
  EXPECT_TRUE(AbsTime::isSubRange(t1, t2, t1, t2));
  EXPECT_TRUE(AbsTime::isSubRange(t2, t3, t1, t4));
  EXPECT_FALSE(AbsTime::isSubRange(t1, t3, t2, t4));
  EXPECT_FALSE(AbsTime::isSubRange(t2, t4, t1, t3));
}

TEST(AbsTimeValue, UnitsMultiplyOrDivide) {
  const struct {
    uint32_t unit;
    double value, inSeconds;
  } table[] = {{0x36CAD7B7, 25e17, 2.5}, {0x36CAD7BA, 25e14, 2.5}, {0x36CAD7BD, 25e11, 2.5},
               {0x36CAD7C0, 25e8, 2.5},  {0x36CAD7C2, 25e6, 2.5},  {0x36CAD7C3, 25e5, 2.5},
               {0x36CAD7C6, 2500, 2.5},  {0x36CAD7C9, 2.5, 2.5},   {0x36CAD7CB, 2.5, 150},
               {0x36CAD7CD, 2.5, 9000},  {0x36CAD7CF, 2.5, 216000}};
  for (const auto& row : table) {
    int32_t status = 0;
    EXPECT_EQ(row.inSeconds, Corrected(V::kToSeconds, row.unit, row.value, &status));
    EXPECT_EQ(row.value, Corrected(V::kFromSeconds, row.unit, row.inSeconds, &status));
    EXPECT_EQ(-row.inSeconds, Corrected(V::kToSeconds, row.unit, -row.value, &status));
    EXPECT_EQ(status, 0);
  }
}

TEST(AbsTimeValue, UnknownUnitKeepsTheValue) {
  std::int32_t status = 0;
  EXPECT_EQ(2.5, Corrected(V::kToSeconds, 0x36CAD7B8, 2.5, &status));
  EXPECT_EQ(-50003, status);
}

TEST(AbsTimeValue, SignChangeOfAProductIsTheOverflow) {
  std::int32_t status = 0;
  Corrected(V::kFromSeconds, kTimeUnitTicks, 1e12, &status);
  EXPECT_EQ(status, -50175);
  status = 0;
  Corrected(V::kToSeconds, kTimeUnitTicks, 9e18, &status);
  EXPECT_EQ(status, 0);
}

TEST(AbsTimeValue, FirstErrorStaysAndDoesNotStopTheWork) {
  std::int32_t status = -7;
  EXPECT_EQ(60, Corrected(V::kToSeconds, kTimeUnitMinute, 1, &status));
  EXPECT_EQ(-7, status);
  Corrected(V::kToSeconds, 1, 1, &status);
  EXPECT_EQ(status, -7);
  Corrected(V::kToSeconds, 1, 1, nullptr);
  Fixed value(9.5);
  V::_RoundAndCheckFit(V::kRoundTowardZero, Fixed(5), Fixed(0), value, &status);
  EXPECT_EQ(status, -7);
  EXPECT_EQ(Fixed(9), value);
}

TEST(AbsTimeValue, RoundsByTable) {
  const struct {
    double value, nearest, zero, up, down;
  } table[] = {{1.25, 1, 1, 2, 1},     {1.5, 2, 1, 2, 1},       {2.5, 2, 2, 3, 2},
               {1.75, 2, 1, 2, 1},     {-1.25, -1, -1, -1, -2}, {-1.5, -2, -1, -1, -2},
               {-2.5, -2, -2, -2, -3}, {-1.75, -2, -1, -1, -2}, {4, 4, 4, 4, 4},
               {-4, -4, -4, -4, -4},   {0, 0, 0, 0, 0},         {0.5, 0, 0, 1, 0},
               {-0.5, 0, 0, 0, -1}};
  for (const auto& row : table) {
    EXPECT_EQ(row.nearest, Rounded(V::kRoundNearest, row.value)) << row.value;
    EXPECT_EQ(row.zero, Rounded(V::kRoundTowardZero, row.value)) << row.value;
    EXPECT_EQ(row.up, Rounded(V::kRoundUp, row.value)) << row.value;
    EXPECT_EQ(row.down, Rounded(V::kRoundDown, row.value)) << row.value;
  }
}

TEST(AbsTimeValue, ResultsOutsideTheBoundsDoNotFit) {
  const struct {
    double value;
    int32_t status;
  } table[] = {{10, 0}, {10.25, 0}, {10.75, -50175}, {11, -50175}, {-5, 0}, {-5.75, -50175}};
  for (const auto& row : table) {
    Fixed value(row.value);
    int32_t status = 0;
    V::_RoundAndCheckFit(V::kRoundNearest, Fixed(10), Fixed(-5), value, &status);
    EXPECT_EQ(row.status, status) << row.value;
  }
  Fixed value(0x7FFFFFFF, 0xFFFFFFFF, 0x80000000, 0);
  int32_t status = 0;
  V::_RoundAndCheckFit(V::kRoundNearest, kWholeMax, kWholeMin, value, &status);
  EXPECT_EQ(status, -50175) << "rounding passes the largest number";
}

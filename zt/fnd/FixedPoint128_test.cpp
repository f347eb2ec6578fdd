#include "zt/fnd/FixedPoint128.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

using Fixed = nZTSS100::tFixedPoint128<64, true>;

namespace {

constexpr uint32_t kOnes = 0xFFFFFFFF;

void ExpectWords(const Fixed& value, uint32_t w3, uint32_t w2, uint32_t w1, uint32_t w0) {
  uint32_t a, b, c, d;
  value.Get(a, b, c, d);
  EXPECT_EQ(w3, a);
  EXPECT_EQ(w2, b);
  EXPECT_EQ(w1, c);
  EXPECT_EQ(w0, d);
}

double D(const Fixed& value) { return static_cast<double>(value); }

}  // namespace

TEST(FixedPoint128, WordsStandFromTheMostSignificantDown) {
  static_assert(sizeof(Fixed) == 16);
  ExpectWords(Fixed(1, 2, 3, 4), 1, 2, 3, 4);
  ExpectWords(Fixed(), 0, 0, 0, 0);
}

TEST(FixedPoint128, IntegersBecomeTheIntegerPart) {
  ExpectWords(Fixed(5), 0, 5, 0, 0);
  ExpectWords(Fixed(-1), kOnes, kOnes, 0, 0);
  ExpectWords(Fixed(4000000000u), 0, 4000000000u, 0, 0);
  ExpectWords(Fixed(-2L), kOnes, kOnes - 1, 0, 0);
  ExpectWords(Fixed(7UL), 0, 7, 0, 0);
  ExpectWords(Fixed(9561628800LL), 2, 971694208, 0, 0);
}

TEST(FixedPoint128, DoublesKeepTheirFraction) {
  ExpectWords(Fixed(1.5), 0, 1, 0x80000000, 0);
  ExpectWords(Fixed(-1.25), kOnes, kOnes - 1, 0xC0000000, 0);
  ExpectWords(Fixed(0.75), 0, 0, 0xC0000000, 0);
  ExpectWords(Fixed(1.0, 0.5), 0, 1, 0x80000000, 0);
  ExpectWords(Fixed(4294967296.0, 0.25), 1, 0, 0x40000000, 0);
  ExpectWords(Fixed(std::ldexp(1.0, -64)), 0, 0, 0, 1);
  ExpectWords(Fixed(std::ldexp(1.0, -65)), 0, 0, 0, 0);
  ExpectWords(Fixed(-std::ldexp(1.0, -65)), 0, 0, 0, 0);
}

TEST(FixedPoint128, DoublesBeyondTheRangeAreClamped) {
  const double huge = std::numeric_limits<double>::infinity();
  ExpectWords(Fixed(1e30), 0x7FFFFFFF, kOnes, kOnes, kOnes);
  ExpectWords(Fixed(-huge), 0x80000000, 0, 0, 0);
  ExpectWords(Fixed(std::nan("")), 0, 0, 0, 0);
  ExpectWords(Fixed(huge, 1.0), 0x7FFFFFFF, kOnes, kOnes, kOnes);
  ExpectWords(Fixed(-huge, -1.0), 0x80000000, 0, 0, 0);
}

TEST(FixedPoint128, BackToFloatingPoint) {
  for (const double value : {0.0, 1.5, -1.25, 1e9 + 0.125, -9e18, 0.1, -0.1}) {
    EXPECT_NEAR(value, D(Fixed(value)), std::ldexp(1.0, -63));
    EXPECT_NEAR(value, static_cast<double>(static_cast<long double>(Fixed(value))),
                std::ldexp(1.0, -63));
  }
  EXPECT_EQ(D(Fixed(0x80000000, 0, 0, 0)), -9223372036854775808.0);
}

TEST(FixedPoint128, SumsCarryAndBorrow) {
  Fixed value(0, 1, kOnes, kOnes);
  value += Fixed(0, 0, 0, 1);
  ExpectWords(value, 0, 2, 0, 0);
  value -= Fixed(0, 0, 0, 1);
  ExpectWords(value, 0, 1, kOnes, kOnes);
  ExpectWords(Fixed(3) - Fixed(5), kOnes, kOnes - 1, 0, 0);
  ExpectWords(Fixed(0x7FFFFFFF, kOnes, 0, 0) + Fixed(1), 0x80000000, 0, 0, 0);
}

TEST(FixedPoint128, NegateInvertIncrement) {
  Fixed value(1.5);
  value.Negate();
  EXPECT_EQ(Fixed(-1.5), value);
  EXPECT_EQ(Fixed(1.5), -value);
  value = Fixed(0, 0, 0, 0);
  value.Invert();
  ExpectWords(value, kOnes, kOnes, kOnes, kOnes);
  value.IncrementLSB();
  EXPECT_TRUE(!value);
  value = Fixed(7);
  EXPECT_FALSE(!value);
  value.Zero();
  EXPECT_TRUE(!value);
}

TEST(FixedPoint128, ProductsTruncateTowardZero) {
  EXPECT_EQ(Fixed(6), Fixed(2) * Fixed(3));
  EXPECT_EQ(Fixed(-3.75), Fixed(1.5) * Fixed(-2.5));
  EXPECT_EQ(Fixed(3.75), Fixed(-1.5) * Fixed(-2.5));
  EXPECT_EQ(Fixed(0), Fixed(0, 0, 0, 1) * Fixed(0.5));
  EXPECT_EQ(Fixed(0), Fixed(kOnes, kOnes, kOnes, kOnes) * Fixed(0.5));
  ExpectWords(Fixed(0, kOnes, kOnes, kOnes) * Fixed(0x10000), 0xFFFF, kOnes, kOnes, 0xFFFF0000);
  Fixed wrapped(0x40000000, 0, 0, 0);
  wrapped *= Fixed(2);
  EXPECT_TRUE(wrapped.IsNegative());
}

TEST(FixedPoint128, QuotientsTruncateTowardZero) {
  EXPECT_EQ(Fixed(2), Fixed(6) / Fixed(3));
  EXPECT_EQ(Fixed(-1.5), Fixed(3) / Fixed(-2));
  ExpectWords(Fixed(1) / Fixed(3), 0, 0, 0x55555555, 0x55555555);
  ExpectWords(Fixed(-1) / Fixed(3), kOnes, kOnes, 0xAAAAAAAA, 0xAAAAAAAB);
  ExpectWords(Fixed(0x12345678, 0x9ABCDEF0, 0, 0) / Fixed(0x10000), 0x1234, 0x56789ABC, 0xDEF00000,
              0);
  EXPECT_EQ(Fixed(4), Fixed(1) / Fixed(0.25)) << "a divisor with a fraction";
  EXPECT_EQ(Fixed(2.5), Fixed(5000000000LL) / Fixed(2000000000));
  EXPECT_EQ(Fixed(2.5), Fixed(2500000000000000000LL) / Fixed(1000000000000000000LL));
  EXPECT_EQ(Fixed(1), Fixed(0x80000000, 0, 0, 0) / Fixed(0x80000000, 0, 0, 0));
  EXPECT_EQ(Fixed(-9000000000000000000LL), Fixed(-4500000000000000000LL) / Fixed(0.5));
}

TEST(FixedPoint128, DivisionByZeroGivesTheLimits) {
  ExpectWords(Fixed(1) / Fixed(0), 0x7FFFFFFF, kOnes, kOnes, kOnes);
  ExpectWords(Fixed(-1) / Fixed(0), 0x80000000, 0, 0, 0);
}

TEST(FixedPoint128, BothDivisionsAgree) {
  // A divisor of one word, and the same times 2^40 on both sides, which takes the long way.
  const Fixed scale(1LL << 40);
  for (const int divisor : {1, 3, 7, 1000, 86400}) {
    const Fixed value(0, 12345, 0x9ABCDEF0, 0x12345678);
    Fixed a = value, b = value * scale;
    a /= Fixed(divisor);
    b /= Fixed(divisor) * scale;
    EXPECT_EQ(a, b) << divisor;
  }
}

TEST(FixedPoint128, ComparesAsSigned) {
  const Fixed table[] = {Fixed(0x80000000, 0, 0, 0), Fixed(-1.5), Fixed(-1), Fixed(-0.5), Fixed(0),
                         Fixed(0, 0, 0, 1),          Fixed(0.5),  Fixed(1),  Fixed(1.5)};
  for (const Fixed& a : table) {
    for (const Fixed& b : table) {
      EXPECT_EQ(&a < &b, a < b);
      EXPECT_EQ(&a <= &b, a <= b);
      EXPECT_EQ(&a > &b, a > b);
      EXPECT_EQ(&a >= &b, a >= b);
      EXPECT_EQ(&a == &b, a == b);
      EXPECT_EQ(&a != &b, a != b);
    }
  }
}

TEST(FixedPoint128, OddAndNegative) {
  EXPECT_TRUE(Fixed(1.5).IsOdd());
  EXPECT_FALSE(Fixed(2.5).IsOdd());
  EXPECT_TRUE(Fixed(-1).IsNegative());
  EXPECT_FALSE(Fixed(0).IsNegative());
}

TEST(FixedPoint128, ShiftsMoveTheFillIn) {
  Fixed value(1, 2, 3, 4);
  value.LeftShift(32, false);
  ExpectWords(value, 2, 3, 4, 0);
  value.LeftShift(1, true);
  ExpectWords(value, 4, 6, 8, 1);
  value.RightShift(1, false);
  ExpectWords(value, 2, 3, 4, 0);
  value.RightShift(96, true);
  ExpectWords(value, kOnes, kOnes, kOnes, 2);
  value.LeftShift(200, true);
  ExpectWords(value, kOnes, kOnes, kOnes, kOnes);
  value.RightShift(128, false);
  ExpectWords(value, 0, 0, 0, 0);
  value = Fixed(1, 2, 3, 4);
  value.LeftShift(0, true);
  value.RightShift(0, true);
  ExpectWords(value, 1, 2, 3, 4);
  value.LeftShift(64, false);
  ExpectWords(value, 3, 4, 0, 0);
}

TEST(FixedPoint128, And) {
  Fixed value(0xF0F0F0F0, 0xFF, 0xFF, 0xFF);
  value &= Fixed(kOnes, 0x0F, 0xF0, 0);
  ExpectWords(value, 0xF0F0F0F0, 0x0F, 0xF0, 0);
  ExpectWords(Fixed(1.5) & Fixed(0, 0, kOnes, kOnes), 0, 0, 0x80000000, 0);
}

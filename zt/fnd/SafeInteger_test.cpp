#include "zt/fnd/SafeInteger.h"

#include <gtest/gtest.h>

#include <cstdint>

namespace zt::fnd {
namespace {

using Size = SafeInteger<unsigned int>;
constexpr unsigned int kMax = 0xFFFFFFFFu;

TEST(SafeInteger, AddStopsAtThirtyTwoBits) {
  EXPECT_EQ(kMax, Size::Add(kMax, 0));
  EXPECT_EQ(kMax, Size::Add(kMax - 1, 1));
  EXPECT_THROW(Size::Add(kMax, 1), exception::OutOfRange);
  EXPECT_THROW(Size::Add(kMax, kMax), exception::OutOfRange);
  EXPECT_EQ(Size(1) + Size(kMax - 1), kMax);
  EXPECT_THROW(Size(1) + Size(kMax), exception::OutOfRange);
}

TEST(SafeInteger, MultiplyStopsAtThirtyTwoBits) {
  EXPECT_EQ(0u, Size::Multiply(0, kMax));
  EXPECT_EQ(0xFFFFFFFCu, Size::Multiply(0x3FFFFFFFu, 4));
  EXPECT_THROW(Size::Multiply(0x40000000u, 4), exception::OutOfRange);
  EXPECT_THROW(Size::Multiply(0x10000u, 0x10000u), exception::OutOfRange);
  EXPECT_EQ(Size(0xFFFF) * Size(0xFFFF), 0xFFFE0001u);
  EXPECT_THROW(Size(3) * Size(0x55555556u), exception::OutOfRange);
}

TEST(SafeInteger, FailedArithmeticLeavesTheOperand) {
  Size n(kMax);
  EXPECT_THROW(n += 1, exception::OutOfRange);
  EXPECT_THROW(n *= 2, exception::OutOfRange);
  EXPECT_EQ(n.get(), kMax);
  n = 7;
  n += 1;
  n *= 3;
  EXPECT_EQ(n.get(), 24u);
}

TEST(SafeInteger, DoublingReportsTheTopBitByTheFlag) {
  EXPECT_EQ(0x80000000u, Size::k_HIGH_BIT);
  bool overflow = true;
  Size n(0x7FFFFFFFu);
  EXPECT_EQ(n.multiplyByTwoNoThrow(overflow).get(), 0xFFFFFFFEu);
  EXPECT_FALSE(overflow);
  Size top(0x80000001u);
  EXPECT_EQ(top.multiplyByTwoNoThrow(overflow).get(), 0x80000001u);
  EXPECT_TRUE(overflow);
}

TEST(SafeInteger, WidthIsThatOfTheType) {
  EXPECT_EQ(0x8000u, SafeInteger<std::uint16_t>::k_HIGH_BIT);
  EXPECT_THROW(SafeInteger<std::uint16_t>::Add(0xFFFF, 1), exception::OutOfRange);
  EXPECT_EQ(0x100000000u, SafeInteger<std::uint64_t>::Add(kMax, 1));
}

}  // namespace
}  // namespace zt::fnd

#include "zt/fnd/NumericCast.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstdint>

namespace zt::fnd {
namespace {

TEST(NumericCast, UnsignedLongAboveThirtyTwoBitsIsOutOfRange) {
  typedef _NumericCast<unsigned int, unsigned long> Cast;
  EXPECT_EQ(0xFFFFFFFFu, Cast::convert(0xFFFFFFFFul));
  EXPECT_EQ(0u, Cast::convert(0));
  // Where the platform's long has 32 bits no such value exists; the wider type stands in.
  EXPECT_THROW((_NumericCast<unsigned int, unsigned long long>::convert(0x100000000ull)),
               exception::OutOfRange);
  if constexpr (sizeof(unsigned long) > 4) {
    EXPECT_THROW(Cast::convert(static_cast<unsigned long>(0x100000000ull)), exception::OutOfRange);
    EXPECT_THROW(Cast::convert(ULONG_MAX), exception::OutOfRange);
  }
}

TEST(NumericCast, NegativeForUnsignedIsOutOfRange) {
  EXPECT_THROW((_NumericCast<unsigned int, long>::convert(-1)), exception::OutOfRange);
  EXPECT_THROW((_NumericCast<unsigned int, int>::convert(INT_MIN)), exception::OutOfRange);
  EXPECT_EQ((_NumericCast<unsigned int, long>::convert(5)), 5u);
}

TEST(NumericCast, SignedTargetsHaveBothLimits) {
  EXPECT_EQ(INT_MAX, NumericCast<int>(0x7FFFFFFFu));
  EXPECT_THROW(NumericCast<int>(0x80000000u), exception::OutOfRange);
  EXPECT_EQ(NumericCast<int>(int64_t(INT_MIN)), INT_MIN);
  EXPECT_THROW(NumericCast<int>(int64_t(INT_MIN) - 1), exception::OutOfRange);
}

}  // namespace
}  // namespace zt::fnd

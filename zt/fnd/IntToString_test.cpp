#include "zt/fnd/IntToString.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <limits>
#include <string>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/ThreadID.h"

using namespace zt::fnd;

namespace {

std::wstring Std(const String& s) { return std::wstring(s.begin(), s.end()); }

}  // namespace

TEST(IntToString, PrintsInCapitalsWithoutPadding) {
  EXPECT_EQ(L"FF", Std(UInt32ToString(255, 16)));
  EXPECT_EQ(L"0", Std(UIntToString(0, 10)));
  EXPECT_EQ(L"0", Std(Int8ToString(0, 2)));
  EXPECT_EQ(L"255", Std(UInt8ToString(255, 10)));
  EXPECT_EQ(L"ZZ", Std(UInt16ToString(36 * 36 - 1, 36)));
  EXPECT_EQ(L"12345", Std(Int32ToString(12345, 10)));
  EXPECT_EQ(L"11111111111111111111111111111111", Std(UInt32ToString(0xFFFFFFFF, 2)));
  EXPECT_EQ(std::wstring(64, L'1'), Std(Int64ToString(-1, 2)));
}

TEST(IntToString, NegativeValuesInBaseTen) {
  EXPECT_EQ(L"-5", Std(Int32ToString(-5, 10)));
  EXPECT_EQ(L"-128", Std(Int8ToString(-128, 10)));
  EXPECT_EQ(L"-32768", Std(Int16ToString(-32768, 10)));
  EXPECT_EQ(L"-2147483648", Std(Int32ToString(std::numeric_limits<int>::min(), 10)));
  EXPECT_EQ(L"-9223372036854775808", Std(Int64ToString(std::numeric_limits<int64_t>::min(), 10)));
  EXPECT_EQ(L"-7", Std(IntToString(-7, 10)));
}

TEST(IntToString, NegativeValuesInOtherBasesShowTheirBits) {
  EXPECT_EQ(L"FF", Std(Int8ToString(-1, 16)));
  EXPECT_EQ(L"10000000", Std(Int8ToString(-128, 2)));
  EXPECT_EQ(L"FFFE", Std(Int16ToString(-2, 16)));
  EXPECT_EQ(L"FFFFFFFF", Std(Int32ToString(-1, 16)));
  EXPECT_EQ(L"FFFFFFFFFFFFFFFF", Std(Int64ToString(-1, 16)));
  EXPECT_EQ(std::wstring(2 * sizeof(long), L'F'), Std(IntToString(-1, 16)));
}

TEST(IntToString, WidestValues) {
  EXPECT_EQ(L"9223372036854775807",
            Std(Int64ToString(std::numeric_limits<std::int64_t>::max(), 10)));
  EXPECT_EQ(std::to_wstring(std::numeric_limits<unsigned long>::max()),
            Std(UIntToString(std::numeric_limits<unsigned long>::max(), 10)));
  EXPECT_EQ(std::to_wstring(std::numeric_limits<long>::min()),
            Std(IntToString(std::numeric_limits<long>::min(), 10)));
}

TEST(IntToString, BasesOutside2To36Raise) {
  for (const unsigned base : {0u, 1u, 37u, 0xFFFFFFFFu}) {
    EXPECT_THROW(UInt32ToString(255, base), exception::UnableToConvert);
    EXPECT_THROW(UIntToString(0, base), exception::UnableToConvert) << "the first digit counts";
    EXPECT_THROW(Int32ToString(-5, base), exception::UnableToConvert);
    EXPECT_THROW(Int64ToString(1, base), exception::UnableToConvert);
  }
  EXPECT_EQ(Std(UInt32ToString(35, 36)), L"Z");
}

TEST(IntToString, ThreadIdsShowInHexadecimal) {
  const auto id = static_cast<unsigned long>(pthread_self());
  char expected[2 * sizeof id + 1];
  snprintf(expected, sizeof expected, "%lX", id);
  EXPECT_EQ(osdep::ThreadID::getCallingID().getDisplayStringHex().exactCompare(String(expected)),
            0);
}

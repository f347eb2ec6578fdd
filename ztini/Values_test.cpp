#include <gtest/gtest.h>

#include <cerrno>
#include <cmath>
#include <string>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TestDocument.h"

namespace {

using ztini::OwnedText;
using ztini::test::Document;
using ztini::test::FailFromAllocation;
using ztini::test::NewDocument;
using ztini::test::Parse;

// Section "s", item "x" with exactly this value.
Document WithValue(const std::string& value) {
  Document doc = Parse("[s]\nx=\"" + value + "\"\n");
  EXPECT_NE(doc, nullptr);
  return doc;
}

TEST(Values, RawPointer) {
  Document doc = WithValue(" a\\n ");
  const char* value = nullptr;
  EXPECT_EQ(IniGetPointerToRawString(doc.get(), "s", "x", &value), 1);
  EXPECT_STREQ(value, " a\\n ");
  EXPECT_EQ(IniGetPointerToRawString(doc.get(), "s", "none", &value), 0);
  EXPECT_EQ(value, nullptr);
}

TEST(Values, RawBufferIsCutAndEmptiedFirst) {
  Document doc = WithValue("abcdef");
  const struct {
    uint32_t size;
    const char* expected;
  } rows[] = {{100, "abcdef"}, {7, "abcdef"}, {6, "abcde"}, {2, "a"}, {1, ""}};
  for (const auto& row : rows) {
    std::string buffer(100, '#');
    EXPECT_EQ(IniGetRawStringIntoBuffer(doc.get(), "s", "x", buffer.data(), row.size), 1);
    EXPECT_STREQ(buffer.c_str(), row.expected);
    EXPECT_EQ(buffer.substr(row.size), std::string(100 - row.size, '#')) << row.size;
  }
  char buffer[4] = "old";
  EXPECT_EQ(IniGetRawStringIntoBuffer(doc.get(), "s", "none", buffer, 4), 0);
  EXPECT_STREQ(buffer, "");
}

TEST(Values, BuffersOfSizeZeroAreNotTouched) {
  Document doc = WithValue("abc");
  char byte = '#';
  EXPECT_EQ(IniGetRawStringIntoBuffer(doc.get(), "s", "x", &byte, 0), 1);
  EXPECT_EQ(IniGetStringIntoBuffer(doc.get(), "s", "none", &byte, 0), 0);
  EXPECT_EQ(byte, '#');
  EXPECT_EQ(IniGetStringIntoBuffer(doc.get(), "s", "x", nullptr, 10), 1);
}

TEST(Values, RawCopyIsTheCallers) {
  Document doc = WithValue("a\\t");
  char* copy = nullptr;
  EXPECT_EQ(IniGetRawStringCopy(doc.get(), "s", "x", &copy), 1);
  OwnedText owned(copy);
  EXPECT_STREQ(copy, "a\\t");
  EXPECT_EQ(IniGetRawStringCopy(doc.get(), "s", "none", &copy), 0);
  EXPECT_EQ(copy, nullptr);
  FailFromAllocation fail(1);
  EXPECT_EQ(IniGetRawStringCopy(doc.get(), "s", "x", &copy), kIniOutOfMemory);
  EXPECT_EQ(copy, nullptr);
}

TEST(Values, DecodedPointerHoldsUntilTheNextDecoding) {
  Document doc = Parse("[s]\nx=a\\tb\ny=c\\nd\n");
  const char *x = nullptr, *y = nullptr;
  EXPECT_EQ(IniGetPointerToString(doc.get(), "s", "x", &x), 1);
  EXPECT_STREQ(x, "a\tb");
  EXPECT_EQ(IniGetPointerToString(doc.get(), "s", "y", &y), 1);
  EXPECT_STREQ(y, "c\nd");
  EXPECT_EQ(x, y);
  EXPECT_EQ(IniGetPointerToString(doc.get(), "s", "none", &y), 0);
  EXPECT_EQ(y, nullptr);
}

TEST(Values, ADecodedNulEndsTheText) {
  Document doc = WithValue("a\\x00b");
  const char* value = nullptr;
  EXPECT_EQ(IniGetPointerToString(doc.get(), "s", "x", &value), 1);
  EXPECT_STREQ(value, "a");
}

TEST(Values, DecodedBufferAndCopy) {
  Document doc = WithValue("a\\\"b\\\\c");
  char buffer[4];
  EXPECT_EQ(IniGetStringIntoBuffer(doc.get(), "s", "x", buffer, sizeof buffer), 1);
  EXPECT_STREQ(buffer, "a\"b");
  char* copy = nullptr;
  EXPECT_EQ(IniGetStringCopy(doc.get(), "s", "x", &copy), 1);
  OwnedText owned(copy);
  EXPECT_STREQ(copy, "a\"b\\c");
  EXPECT_EQ(IniGetStringCopy(doc.get(), "s", "none", &copy), 0);
  EXPECT_EQ(copy, nullptr);
}

TEST(Values, TheScratchBlockGrowsAndShrinksBack) {
  Document doc = NewDocument();
  const auto decode = [&](size_t length) {
    IniPut(doc.get(), "s", "x", std::string(length, 'v').c_str(), 0);
    const char* value = nullptr;
    EXPECT_EQ(IniGetPointerToString(doc.get(), "s", "x", &value), 1);
    EXPECT_EQ(value, std::string(length, 'v'));
    return ztini_PI_GetHandleSize(doc->scratch);
  };
  EXPECT_EQ(decode(10), 256u);
  EXPECT_EQ(decode(255), 256u);
  EXPECT_EQ(decode(256), 257u);
  EXPECT_EQ(decode(1299), 1300u);
  EXPECT_EQ(decode(275), 1300u);  // 276 + 1024 still covers it
  EXPECT_EQ(decode(274), 275u);
  EXPECT_EQ(decode(65536), 65537u);
  EXPECT_EQ(decode(0), 256u);
}

TEST(Values, DecodingWithoutMemoryKeepsTheScratchBlock) {
  Document doc = WithValue(std::string(1000, 'v'));
  const char* value = "before";
  {
    FailFromAllocation fail(1);
    EXPECT_EQ(IniGetPointerToString(doc.get(), "s", "x", &value), kIniOutOfMemory);
    char* copy = nullptr;
    EXPECT_EQ(IniGetStringCopy(doc.get(), "s", "x", &copy), kIniOutOfMemory);
    EXPECT_EQ(copy, nullptr);
    char buffer[4] = "old";
    EXPECT_EQ(IniGetStringIntoBuffer(doc.get(), "s", "x", buffer, 4), kIniOutOfMemory);
    EXPECT_STREQ(buffer, "");
  }
  EXPECT_EQ(value, nullptr);
  EXPECT_EQ(ztini_PI_GetHandleSize(doc->scratch), 256u);
  EXPECT_EQ(IniGetPointerToString(doc.get(), "s", "x", &value), 1);
}

TEST(Values, Booleans) {
  const struct {
    const char* value;
    int32_t result, expected;
  } rows[] = {{"True", 1, 1},       {"  TRUE ", 1, 1}, {"tRuE", 1, 1},   {"False", 1, 0},
              {"\tfalse", 1, 0},    {"1", -5024, 77},  {"0", -5024, 77}, {"yes", -5024, 77},
              {"Truex", -5024, 77}, {"T", -5024, 77},  {"", 0, 77},      {"   ", 0, 77}};
  for (const auto& row : rows) {
    Document doc = WithValue(row.value);
    int32_t value = 77;
    EXPECT_EQ(IniGetBoolean(doc.get(), "s", "x", &value), row.result) << row.value;
    EXPECT_EQ(value, row.expected) << row.value;
  }
}

TEST(Values, UnsignedIntegers) {
  const struct {
    const char* value;
    int32_t result;
    uint32_t expected;
  } rows[] = {{"12", 1, 12},
              {" +12 ", 1, 12},
              {"4294967295", 1, 4294967295u},
              {"4294967296", -5022, 77},
              {"-0", -5022, 77},
              {"1x", -5022, 77},
              {"+", -5022, 77},
              {"", 0, 77},
              {" \t", 0, 77}};
  for (const auto& row : rows) {
    Document doc = WithValue(row.value);
    uint32_t value = 77;
    EXPECT_EQ(IniGetUInt(doc.get(), "s", "x", &value), row.result) << row.value;
    EXPECT_EQ(value, row.expected) << row.value;
  }
}

TEST(Values, Doubles) {
  const struct {
    const char* value;
    int32_t result;
    double expected;
  } rows[] = {{"1.5", 1, 1.5},
              {"inf", 1, INFINITY},
              {" +INF ", 1, INFINITY},
              {"+Inf", 1, INFINITY},
              {"-Inf", 1, -INFINITY},
              {" -inf\t", 1, -INFINITY},
              {" 1.5", 1, 1.5},
              {"-1e3", 1, -1000},
              {"0x1p4", 1, 16},
              {"infinity", 1, INFINITY},
              {"1.5x", -5023, 77},
              {"1.5 ", -5023, 77},
              {"x", -5023, 77},
              {"1e999", -5023, 77},
              {"1e-400", -5023, 77},
              {"1,5", -5023, 77},
              {"", 0, 77},
              {"  ", 0, 77}};
  for (const auto& row : rows) {
    Document doc = WithValue(row.value);
    double value = 77;
    errno = 5;
    EXPECT_EQ(IniGetDouble(doc.get(), "s", "x", &value), row.result) << row.value;
    EXPECT_EQ(value, row.expected) << row.value;
    EXPECT_EQ(errno, 5) << row.value;
  }
  double value = 77;
  EXPECT_EQ(IniGetDouble(WithValue("nan").get(), "s", "x", &value), 1);
  EXPECT_TRUE(std::isnan(value));
}

TEST(Values, AbsentItemsLeaveNumbersAlone) {
  Document doc = WithValue("1");
  int32_t boolean = 77;
  uint32_t number = 77;
  double real = 77;
  EXPECT_EQ(IniGetBoolean(doc.get(), "s", "none", &boolean), 0);
  EXPECT_EQ(IniGetUInt(doc.get(), "none", "x", &number), 0);
  EXPECT_EQ(IniGetDouble(nullptr, "s", "x", &real), 0);
  EXPECT_EQ(boolean, 77);
  EXPECT_EQ(number, 77u);
  EXPECT_EQ(real, 77);
  EXPECT_EQ(IniGetUInt(doc.get(), "s", "x", nullptr), 1);
}

}  // namespace

#include "ztini/StringTools.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/support/FailingAlloc.h"

namespace {

using ztini::OwnedText;

TEST(StringTools, DupCopiesAndPassesNull) {
  OwnedText copy(ztini_StrDup(" a b "));
  EXPECT_STREQ(copy.get(), " a b ");
  EXPECT_EQ(ztini_StrDup(nullptr), nullptr);
  EXPECT_EQ(ztini_StrDupWithoutSurrWhiteSpace(nullptr), nullptr);
}

TEST(StringTools, DupWithoutSurroundingWhiteSpace) {
  const struct {
    const char *text, *expected;
  } rows[] = {
      {"", ""},      {"  \t\v\f\r\n", ""}, {"a", "a"}, {"  a b\t\n", "a b"}, {"a\x80 ", "a\x80"},
      {"\va\f", "a"}};
  for (const auto& row : rows) {
    OwnedText copy(ztini_StrDupWithoutSurrWhiteSpace(row.text));
    EXPECT_STREQ(copy.get(), row.expected);
  }
}

TEST(StringTools, DupsReturnNullWithoutMemory) {
  ztini::test::FailFromAllocation fail(1);
  EXPECT_EQ(ztini_StrDup("a"), nullptr);
  EXPECT_EQ(ztini_StrDupWithoutSurrWhiteSpace("a"), nullptr);
}

TEST(StringTools, SkipAndHasNonWhiteSpace) {
  EXPECT_STREQ(ztini_SkipWhiteSpace(" \t x "), "x ");
  EXPECT_STREQ(ztini_SkipWhiteSpace("  "), "");
  EXPECT_EQ(ztini_SkipWhiteSpace(nullptr), nullptr);
  EXPECT_EQ(ztini_HasNonWhiteSpace(nullptr), 0);
  EXPECT_EQ(ztini_HasNonWhiteSpace(""), 0);
  EXPECT_EQ(ztini_HasNonWhiteSpace(" \t\v\f\r\n"), 0);
  EXPECT_EQ(ztini_HasNonWhiteSpace("  x"), 1);
  EXPECT_EQ(ztini_HasNonWhiteSpace("\xff"), 1);
}

TEST(StringTools, CompareIgnoresCaseAndSurroundingWhiteSpace) {
  const struct {
    const char *left, *right;
    int32_t expected;
  } rows[] = {
      {"a", "A", 0},      {" a", "A  ", 0},    {"a", "b", -1},      {"B", "a", 1},
      {"", "  ", 0},      {"", "a", -1},       {"a", "", 1},        {"a b", "a", 1},
      {"a", "a b", -1},   {"a b", "ab", -1},   {"a  b", "a b", -1}, {"A B", "a b\t", 0},
      {"a", "a \t\n", 0}, {"a \t", "a  ", -1}, {"_", "a", 1},       {"\xe4", "\xe4 ", 0},
      {"\xff", "a", 1},   {nullptr, "", 0},    {nullptr, "x", -1},  {"x", nullptr, 1},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(ztini_StrICmpWithoutSurrWhiteSpace(row.left, row.right), row.expected)
        << (row.left ? row.left : "null") << "|" << (row.right ? row.right : "null");
  }
}

TEST(StringTools, CopyMaxNeverPassesItsSize) {
  const struct {
    const char* source;
    size_t size;
    const char* expected;
  } rows[] = {
      {"abc", 5, "abc"}, {"abc", 4, "abc"}, {"abc", 3, "ab"}, {"abc", 1, ""}, {nullptr, 3, ""}};
  for (const auto& row : rows) {
    std::string buffer(8, '#');
    ztini_StringCopyMax(buffer.data(), row.source, row.size);
    EXPECT_STREQ(buffer.c_str(), row.expected);
    EXPECT_EQ(buffer.substr(row.size), std::string(8 - row.size, '#'));
  }
  char untouched = '#';
  ztini_StringCopyMax(&untouched, "abc", 0);
  EXPECT_EQ(untouched, '#');
}

TEST(StringTools, UnsignedIntegers) {
  const struct {
    const char* text;
    int32_t result;
    uint32_t value;
  } rows[] = {
      {"0", 1, 0},
      {"12", 1, 12},
      {" +7\t", 1, 7},
      {"\v12 ", 1, 12},
      {"4294967295", 1, 4294967295u},
      {"00000000000000000000005", 1, 5},
      {"4294967296", 0, 99},
      {"42949672950", 0, 99},
      {"99999999999999999999999999", 0, 99},
      {"", 0, 99},
      {"  ", 0, 99},
      {"+", 0, 99},
      {"-", 0, 99},
      {"-0", 0, 99},
      {"-1", 0, 99},
      {"+ 1", 0, 99},
      {"++1", 0, 99},
      {"1 2", 0, 99},
      {"1x", 0, 99},
      {"x1", 0, 99},
      {"0x1", 0, 99},
      {"1.0", 0, 99},
      {nullptr, 0, 99},
  };
  for (const auto& row : rows) {
    uint32_t value = 99;
    EXPECT_EQ(ztini_StrToUInt(row.text, &value), row.result) << (row.text ? row.text : "null");
    EXPECT_EQ(value, row.value) << (row.text ? row.text : "null");
  }
  EXPECT_EQ(ztini_StrToUInt("1", nullptr), 0);
}

}  // namespace

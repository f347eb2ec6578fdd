#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TestDocument.h"

namespace {

using ztini::test::Document;
using ztini::test::FailFromAllocation;
using ztini::test::NewDocument;
using ztini::test::Parse;
using ztini::test::RawValue;
using ztini::test::Show;

TEST(Put, NewSectionsAndItemsGoToTheEnd) {
  Document doc = Parse("[a]\nx=1\n");
  EXPECT_EQ(IniPut(doc.get(), " b ", " y ", " 2 ", 0), 1);
  EXPECT_STREQ(doc->currentSection->name, "b");
  EXPECT_EQ(IniPut(doc.get(), "A", "z", "3", '"'), 1);
  EXPECT_EQ(Show(doc), "[a@1] x=1@2 z=\"3\"@-1 [b@-1] y=2@-1");
}

TEST(Put, KnownItemsKeepNamePlaceAndLine) {
  Document doc = Parse("[a]\nx=\"1\"\ny=2\n");
  EXPECT_EQ(IniPut(doc.get(), "A", "X", "\t9 ", '\''), 1);
  EXPECT_EQ(Show(doc), "[a@1] x='9'@2 y=2@3");
  EXPECT_EQ(IniPut(doc.get(), "a", "x", "8", 0), 1);
  EXPECT_EQ(Show(doc), "[a@1] x=8@2 y=2@3");
}

TEST(Put, WhiteSpaceGoesAndEnclosingQuotesStayText) {
  Document doc = NewDocument();
  IniPut(doc.get(), "a", "x", "  \"v\" \n", '"');
  EXPECT_EQ(RawValue(doc, "a", "x"), "\"v\"");
  EXPECT_EQ(doc->section(1)->item(1)->quote, '"');
  IniPut(doc.get(), "a", "x", nullptr, 0);
  EXPECT_EQ(RawValue(doc, "a", "x"), "");
}

TEST(Put, BlankNamesAreRefusedAndChangeNothing) {
  Document doc = Parse("[a]\nx=1\n");
  for (const char* blank : {"", "  \t", static_cast<const char*>(nullptr)}) {
    EXPECT_EQ(IniPut(doc.get(), blank, "x", "2", 0), kIniEmptyName);
    EXPECT_EQ(IniPut(doc.get(), "a", blank, "2", 0), kIniEmptyName);
    EXPECT_EQ(IniPut(doc.get(), "new", blank, "2", 0), kIniEmptyName);
  }
  EXPECT_EQ(Show(doc), "[a@1] x=1@2");
  EXPECT_EQ(IniPut(nullptr, "a", "x", "2", 0), 0);
}

TEST(Put, WithoutDuplicateCheckingEveryPutAppends) {
  Document doc = Parse("[a]\nx=1\n", 2, 0);
  EXPECT_EQ(IniPut(doc.get(), "a", "x", "2", 0), 1);
  EXPECT_EQ(IniPut(doc.get(), "a", "x", "3", 0), 1);
  EXPECT_EQ(Show(doc), "[a@1] x=1@2 x=2@-1 x=3@-1");
  EXPECT_EQ(RawValue(doc, "a", "x"), "1");
}

TEST(Put, TheNewValueMayLieInTheOldOne) {
  Document doc = NewDocument();
  IniPut(doc.get(), "a", "x", "abcdef", 0);
  const char* value = nullptr;
  IniGet(doc.get(), "a", "x", &value);
  EXPECT_EQ(IniPut(doc.get(), "a", "x", value + 2, 0), 1);
  EXPECT_EQ(RawValue(doc, "a", "x"), "cdef");
}

TEST(Put, WithoutMemoryNothingChangesAndTheCacheIsCleared) {
  for (int number = 1; number < 100; ++number) {
    Document doc = Parse("[a]\nx=1\n[b]\n");
    IniFindSection(doc.get(), "b");
    FailFromAllocation fail(number);
    const int32_t status = IniPut(doc.get(), "new", "y", "2", 0);
    if (!fail.failed()) {
      EXPECT_EQ(status, 1);
      EXPECT_GT(number, 5);
      return;
    }
    EXPECT_EQ(status, kIniOutOfMemory) << number;
    EXPECT_EQ(doc->currentSection, nullptr) << number;
    EXPECT_EQ(Show(doc), "[a@1] x=1@2 [b@3]") << number;
  }
  FAIL() << "never succeeded";
}

TEST(Put, ReplacingWithoutMemoryKeepsTheOldValue) {
  Document doc = Parse("[a]\nx=\"1\"\n");
  FailFromAllocation fail(1);
  EXPECT_EQ(IniPut(doc.get(), "a", "x", "2", 0), kIniOutOfMemory);
  EXPECT_EQ(IniPutStringWithOptions(doc.get(), "a", "x", "2", 1, 1), kIniOutOfMemory);
  EXPECT_EQ(doc->currentSection, nullptr);
  EXPECT_EQ(Show(doc), "[a@1] x=\"1\"@2");
}

TEST(Put, WithoutMemoryForTheIndexOfManyNamesNothingChanges) {
  std::string sections, items = "[s]\n";
  for (int i = 0; i < 20; ++i) {
    sections += "[s" + std::to_string(i) + "]\n";
    items += "i" + std::to_string(i) + "=1\n";
  }
  for (const std::string& text : {sections, items}) {
    Document doc = Parse(text, 2, 0);  // builds no index
    IniSetDuplicateChecking(doc.get(), 1);
    const std::string before = Show(doc);
    {
      ztini::test::FailOneAllocation fail(1);
      EXPECT_EQ(IniPut(doc.get(), "s", "i3", "2", 0), kIniOutOfMemory);
      EXPECT_TRUE(fail.failed());
    }
    EXPECT_EQ(doc->currentSection, nullptr);
    EXPECT_EQ(Show(doc), before);
    EXPECT_EQ(IniPut(doc.get(), "s", "i3", "2", 0), 1);
    EXPECT_EQ(RawValue(doc, "s", "i3"), "2");
  }
}

TEST(Put, StringsQuoteAndEscapeAsAsked) {
  const struct {
    const char* value;
    int32_t quote, escape;
    const char* expected;
    int32_t quoteCharacter;
  } rows[] = {{"a\tb", 0, 0, "a\tb", 0},  {"a\tb", 1, 0, "a\tb", 34},
              {"a\tb", 0, 1, "a\\tb", 0}, {"\n\\\"\r", 5, 9, "\\n\\\\\\\"\\x0d", 34},
              {" a ", 1, 1, "a", 34},     {"\ta\n", 1, 1, "\\ta\\n", 34},
              {nullptr, 1, 1, "", 34},    {nullptr, 0, 0, "", 0}};
  for (const auto& row : rows) {
    Document doc = NewDocument();
    EXPECT_EQ(IniPutStringWithOptions(doc.get(), "s", "x", row.value, row.quote, row.escape), 1);
    EXPECT_EQ(RawValue(doc, "s", "x"), row.expected);
    EXPECT_EQ(doc->section(1)->item(1)->quote, row.quoteCharacter);
  }
}

TEST(Put, EscapedBytesComeBackBlanksAtTheEndsExcepted) {
  Document doc = NewDocument();
  IniPutStringWithOptions(doc.get(), "s", "x", "\t \"C:\\dir\"\r\n\x01\xff", 1, 1);
  EXPECT_EQ(RawValue(doc, "s", "x"), "\\t \\\"C:\\\\dir\\\"\\x0d\\n\\x01\xff");
  const char* value = nullptr;
  IniGetPointerToString(doc.get(), "s", "x", &value);
  EXPECT_STREQ(value, "\t \"C:\\dir\"\r\n\x01\xff");
  IniPutStringWithOptions(doc.get(), "s", "y", "  blanks  ", 1, 1);
  IniGetPointerToString(doc.get(), "s", "y", &value);
  EXPECT_STREQ(value, "blanks");
}

TEST(Put, RawStringsAreQuotedAndNotEscaped) {
  Document doc = NewDocument();
  EXPECT_EQ(IniPutRawString(doc.get(), "s", "x", "a\\n\"b"), 1);
  EXPECT_EQ(RawValue(doc, "s", "x"), "a\\n\"b");
  EXPECT_EQ(doc->section(1)->item(1)->quote, '"');
}

TEST(Put, Doubles) {
  const struct {
    double value;
    const char* expected;
  } rows[] = {{0, "0.00000000000000e+00"},
              {-1.5, "-1.50000000000000e+00"},
              {1.0 / 3.0, "3.33333333333333e-01"},
              {1e300, "1.00000000000000e+300"},
              {INFINITY, "inf"},
              {-INFINITY, "-inf"}};
  for (const auto& row : rows) {
    Document doc = NewDocument();
    EXPECT_EQ(IniPutDouble(doc.get(), "s", "x", row.value), 1);
    EXPECT_EQ(RawValue(doc, "s", "x"), row.expected);
    EXPECT_EQ(doc->section(1)->item(1)->quote, 0);
    double back = 0;
    EXPECT_EQ(IniGetDouble(doc.get(), "s", "x", &back), 1);
    EXPECT_NEAR(back == row.value ? 0 : back - row.value, 0, 1e-14);
  }
}

}  // namespace

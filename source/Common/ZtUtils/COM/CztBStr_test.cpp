#include "source/Common/ZtUtils/COM/CztBStr.h"

#include <gtest/gtest.h>

#include "ztcom/ztcore/ztmemmgr.h"

namespace {

using zt::fnd::String;

TEST(CztBStr, NullIsNeverLessOnEitherSide) {
  CztBStr null, text(String(L"a"));
  EXPECT_FALSE(null < text);
  EXPECT_FALSE(text < null);
  EXPECT_FALSE(null < null);
  EXPECT_TRUE(text < CztBStr(String(L"b")));
  EXPECT_FALSE(text < CztBStr(String(L"B")));  // exact: capitals come first
}

TEST(CztBStr, TakesOrCopiesThePointer) {
  wchar_t* own = ZtSysAllocString(L"own");
  CztBStr taken(own, true);
  EXPECT_EQ(taken.get(), own);
  wchar_t plain[] = L"plain";
  CztBStr copied(plain, false);
  EXPECT_NE(copied.get(), plain);
  EXPECT_STREQ(copied.get(), L"plain");
  EXPECT_EQ(CztBStr(nullptr, false).get(), nullptr);
}

TEST(CztBStr, CopyOwnsATextOfItsOwn) {
  CztBStr a(String(L"a"));
  CztBStr b(a);
  EXPECT_NE(a.get(), b.get());
  EXPECT_STREQ(b.get(), L"a");
  EXPECT_EQ(CztBStr(CztBStr()).get(), nullptr);
}

TEST(CztBStr, AssigningANullNarrowTextKeepsTheOldOne) {
  CztBStr b("old");
  b = static_cast<const char*>(nullptr);
  EXPECT_STREQ(b.get(), L"old");
  b = "new";
  EXPECT_STREQ(b.get(), L"new");
  b = String(L"wide");
  EXPECT_STREQ(b.get(), L"wide");
  b.clear();
  EXPECT_EQ(b.get(), nullptr);
  EXPECT_EQ(CztBStr(static_cast<const char*>(nullptr)).get(), nullptr);
}

TEST(CztBStr, ConvertsToStrings) {
  CztBStr b("text");
  EXPECT_EQ(String(b).exactCompare(L"text"), 0);
  EXPECT_STREQ(b.ToFNDAnsiString().c_str(), "text");
  EXPECT_EQ(CztBStr().ToFNDString().length(), 0u);
  b = *&b;
  EXPECT_STREQ(b.get(), L"text");
}

}  // namespace

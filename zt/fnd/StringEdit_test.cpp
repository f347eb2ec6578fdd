#include <gtest/gtest.h>

#include <string>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"

using namespace zt::fnd;

namespace {

std::wstring Std(const String& s) { return std::wstring(s.begin(), s.end()); }

}  // namespace

TEST(StringEdit, EraseAtTheEndRemovesNothing) {
  String s(L"abc");
  s.erase(s.length(), 5);
  EXPECT_EQ(Std(s), L"abc");
}

TEST(StringEdit, EraseBeyondTheEndRaises) {
  String s(L"abc");
  try {
    s.erase(s.length() + 1, 5);
    FAIL();
  } catch (const exception::OutOfRange2& e) {
    EXPECT_STREQ(e.what(), "Out of range: String offset out of range");
    EXPECT_EQ(e.getErrorCode(), 0x8ABC7007u);
  }
  EXPECT_EQ(Std(s), L"abc");
}

TEST(StringEdit, EraseCutsItsCount) {
  String s(L"abcdef");
  EXPECT_EQ(&s, &s.erase(2, 2));
  EXPECT_EQ(Std(s), L"abef");
  s.erase(2, 0xFFFFFFFF);
  EXPECT_EQ(Std(s), L"ab");
  s.erase(0, 0);
  EXPECT_EQ(Std(s), L"ab");
  s.erase();
  EXPECT_TRUE(s.empty());
  EXPECT_EQ(*s.c_str(), L'\0');
}

TEST(StringEdit, EraseGivesABlockBackThatIsUsedToLessThanHalf) {
  String s(10, L'x');
  s.erase(5, 5);
  EXPECT_EQ(s.capacity(), 10u) << "half is enough to stay";
  s.erase(4, 1);
  EXPECT_EQ(s.capacity(), 4u);
  String kept(10, L'x');
  kept.erase(1, 9, BufferStrategy::Keep);
  EXPECT_EQ(kept.capacity(), 10u);
  EXPECT_EQ(kept.length(), 1u);
}

TEST(StringEdit, EraseByPointersReturnsTheErasedPlaceInTheMovedBlock) {
  String s(L"abcdefghij");
  const wchar_t* const at = s.erase(s.begin() + 1, s.begin() + 8);
  EXPECT_EQ(Std(s), L"aij");
  EXPECT_EQ(s.capacity(), 3u);
  EXPECT_EQ(s.begin() + 1, at);
  wchar_t* const end = s.erase(s.begin() + 1, s.end(), BufferStrategy::Keep);
  EXPECT_EQ(s.end(), end);
  EXPECT_EQ(s.capacity(), 3u);
}

TEST(StringEdit, ResizeFillsAndCuts) {
  String s(L"ab");
  s.resize(5, L'x');
  EXPECT_EQ(Std(s), L"abxxx");
  EXPECT_EQ(s.capacity(), 10u);
  s.resize(5, L'y');
  EXPECT_EQ(Std(s), L"abxxx");
  s.resize(2, L'y', BufferStrategy::Keep);
  EXPECT_EQ(Std(s), L"ab");
  EXPECT_EQ(s.capacity(), 10u);
  s.resize(1);
  EXPECT_EQ(s.capacity(), 1u);
  s.resize(2);
  EXPECT_EQ(Std(s), std::wstring(L"a\0", 2));
  s.resize(0);
  EXPECT_EQ(s.capacity(), 0u);
}

TEST(StringEdit, ReplaceGrowsAndShrinksTheHole) {
  const struct {
    unsigned pos, n;
    const wchar_t* with;
    const wchar_t* result;
  } table[] = {{1, 2, L"XY", L"aXYdef"},   {1, 2, L"XYZW", L"aXYZWdef"}, {1, 2, L"X", L"aXdef"},
               {1, 2, L"", L"adef"},       {0, 0, L"X", L"Xabcdef"},     {6, 5, L"X", L"abcdefX"},
               {3, 99, L"XYZ", L"abcXYZ"}, {0, 0xFFFFFFFF, L"", L""},    {0, 6, L"Z", L"Z"}};
  for (const auto& row : table) {
    String s(L"abcdef");
    s.replace(row.pos, row.n, row.with);
    EXPECT_EQ(row.result, Std(s));
    EXPECT_EQ(*s.end(), L'\0');
  }
}

TEST(StringEdit, ReplaceAppliesTheBufferRule) {
  String s(L"abcdef");
  s.replace(0, 1, L"0123");
  EXPECT_EQ(s.capacity(), 9u) << "growth is exact";
  s.replace(0, 6, L"");
  EXPECT_EQ(Std(s), L"def");
  EXPECT_EQ(s.capacity(), 3u);
  String roomy(L"ab");
  roomy.reserve(100);
  roomy.replace(0, 1, L"xyz");
  EXPECT_EQ(Std(roomy), L"xyzb");
  EXPECT_EQ(roomy.capacity(), 4u) << "growth can shrink the block";
}

TEST(StringEdit, ReplaceTakesAPartOfTheOther) {
  String s(L"abcdef");
  s.replace(1, 2, String(L"0123456"), 2, 3);
  EXPECT_EQ(Std(s), L"a234def");
  s.replace(0, 1, String(L"xyz"), 1, 99);
  EXPECT_EQ(Std(s), L"yz234def");
  s.replace(0, 2, String(L"xyz"), 3, 1);
  EXPECT_EQ(Std(s), L"234def");
}

TEST(StringEdit, ReplaceFromItself) {
  String s(L"abc");
  s.replace(1, 1, s);
  EXPECT_EQ(Std(s), L"aabcc");
  s.replace(0, 3, s, 3, 2);
  EXPECT_EQ(Std(s), L"cccc") << "the old text counts";
}

TEST(StringEdit, ReplaceChecksBothPositions) {
  String s(L"abc");
  EXPECT_THROW(s.replace(4, 0, L"x"), exception::OutOfRange2);
  EXPECT_THROW(s.replace(0, 1, String(L"x"), 2, 0), exception::OutOfRange2);
  EXPECT_EQ(Std(s), L"abc");
}

TEST(StringEdit, CopyWritesNoTerminator) {
  const String s(L"abcdef");
  wchar_t buffer[] = L"########";
  EXPECT_EQ(s.copy(buffer, 3, 2), 3u);
  EXPECT_STREQ(buffer, L"cde#####");
  EXPECT_EQ(s.copy(buffer, 99, 4), 2u);
  EXPECT_STREQ(buffer, L"efe#####");
  EXPECT_EQ(s.copy(buffer, 99, 6), 0u);
  EXPECT_EQ(s.copy(buffer, 8), 6u);
  EXPECT_THROW(s.copy(buffer, 1, 7), exception::OutOfRange2);
}

TEST(StringEdit, SubstrTakesTheRestAndChecksOnlyItsSum) {
  const String s(L"abcdef");
  EXPECT_EQ(Std(s.substr(1, 2)), L"bc");
  EXPECT_EQ(Std(s.substr(1)), L"bcdef");
  EXPECT_EQ(Std(s.substr(1, String::npos)), L"bcdef");
  EXPECT_EQ(Std(s.substr(4, 99)), L"ef");
  EXPECT_EQ(Std(s.substr()), L"abcdef");
  EXPECT_EQ(Std(s.substr(6, 1)), L"");
  EXPECT_EQ(Std(s.substr(7, 1)), L"");
  EXPECT_EQ(Std(s.substr(99)), L"");
  EXPECT_THROW(s.substr(2, 0xFFFFFFFE), exception::OutOfRange);
  EXPECT_EQ(s.substr(1, 2).capacity(), 2u);
}

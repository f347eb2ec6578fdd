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
  EXPECT_EQ(L"abc", Std(s));
}

TEST(StringEdit, EraseBeyondTheEndRaises) {
  String s(L"abc");
  try {
    s.erase(s.length() + 1, 5);
    FAIL();
  } catch (const exception::OutOfRange2& e) {
    EXPECT_STREQ("Out of range: String offset out of range", e.what());
    EXPECT_EQ(0x8ABC7007u, e.getErrorCode());
  }
  EXPECT_EQ(L"abc", Std(s));
}

TEST(StringEdit, EraseCutsItsCount) {
  String s(L"abcdef");
  EXPECT_EQ(&s, &s.erase(2, 2));
  EXPECT_EQ(L"abef", Std(s));
  s.erase(2, 0xFFFFFFFF);
  EXPECT_EQ(L"ab", Std(s));
  s.erase(0, 0);
  EXPECT_EQ(L"ab", Std(s));
  s.erase();
  EXPECT_TRUE(s.empty());
  EXPECT_EQ(L'\0', *s.c_str());
}

TEST(StringEdit, EraseGivesABlockBackThatIsUsedToLessThanHalf) {
  String s(10, L'x');
  s.erase(5, 5);
  EXPECT_EQ(10u, s.capacity()) << "half is enough to stay";
  s.erase(4, 1);
  EXPECT_EQ(4u, s.capacity());
  String kept(10, L'x');
  kept.erase(1, 9, BufferStrategy::Keep);
  EXPECT_EQ(10u, kept.capacity());
  EXPECT_EQ(1u, kept.length());
}

TEST(StringEdit, EraseByPointersReturnsTheErasedPlaceInTheMovedBlock) {
  String s(L"abcdefghij");
  const wchar_t* const at = s.erase(s.begin() + 1, s.begin() + 8);
  EXPECT_EQ(L"aij", Std(s));
  EXPECT_EQ(3u, s.capacity());
  EXPECT_EQ(s.begin() + 1, at);
  wchar_t* const end = s.erase(s.begin() + 1, s.end(), BufferStrategy::Keep);
  EXPECT_EQ(s.end(), end);
  EXPECT_EQ(3u, s.capacity());
}

TEST(StringEdit, ResizeFillsAndCuts) {
  String s(L"ab");
  s.resize(5, L'x');
  EXPECT_EQ(L"abxxx", Std(s));
  EXPECT_EQ(10u, s.capacity());
  s.resize(5, L'y');
  EXPECT_EQ(L"abxxx", Std(s));
  s.resize(2, L'y', BufferStrategy::Keep);
  EXPECT_EQ(L"ab", Std(s));
  EXPECT_EQ(10u, s.capacity());
  s.resize(1);
  EXPECT_EQ(1u, s.capacity());
  s.resize(2);
  EXPECT_EQ(std::wstring(L"a\0", 2), Std(s));
  s.resize(0);
  EXPECT_EQ(0u, s.capacity());
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
    EXPECT_EQ(L'\0', *s.end());
  }
}

TEST(StringEdit, ReplaceAppliesTheBufferRule) {
  String s(L"abcdef");
  s.replace(0, 1, L"0123");
  EXPECT_EQ(9u, s.capacity()) << "growth is exact";
  s.replace(0, 6, L"");
  EXPECT_EQ(L"def", Std(s));
  EXPECT_EQ(3u, s.capacity());
  String roomy(L"ab");
  roomy.reserve(100);
  roomy.replace(0, 1, L"xyz");
  EXPECT_EQ(L"xyzb", Std(roomy));
  EXPECT_EQ(4u, roomy.capacity()) << "growth can shrink the block";
}

TEST(StringEdit, ReplaceTakesAPartOfTheOther) {
  String s(L"abcdef");
  s.replace(1, 2, String(L"0123456"), 2, 3);
  EXPECT_EQ(L"a234def", Std(s));
  s.replace(0, 1, String(L"xyz"), 1, 99);
  EXPECT_EQ(L"yz234def", Std(s));
  s.replace(0, 2, String(L"xyz"), 3, 1);
  EXPECT_EQ(L"234def", Std(s));
}

TEST(StringEdit, ReplaceFromItself) {
  String s(L"abc");
  s.replace(1, 1, s);
  EXPECT_EQ(L"aabcc", Std(s));
  s.replace(0, 3, s, 3, 2);
  EXPECT_EQ(L"cccc", Std(s)) << "the old text counts";
}

TEST(StringEdit, ReplaceChecksBothPositions) {
  String s(L"abc");
  EXPECT_THROW(s.replace(4, 0, L"x"), exception::OutOfRange2);
  EXPECT_THROW(s.replace(0, 1, String(L"x"), 2, 0), exception::OutOfRange2);
  EXPECT_EQ(L"abc", Std(s));
}

TEST(StringEdit, CopyWritesNoTerminator) {
  const String s(L"abcdef");
  wchar_t buffer[] = L"########";
  EXPECT_EQ(3u, s.copy(buffer, 3, 2));
  EXPECT_STREQ(L"cde#####", buffer);
  EXPECT_EQ(2u, s.copy(buffer, 99, 4));
  EXPECT_STREQ(L"efe#####", buffer);
  EXPECT_EQ(0u, s.copy(buffer, 99, 6));
  EXPECT_EQ(6u, s.copy(buffer, 8));
  EXPECT_THROW(s.copy(buffer, 1, 7), exception::OutOfRange2);
}

TEST(StringEdit, SubstrTakesTheRestAndChecksOnlyItsSum) {
  const String s(L"abcdef");
  EXPECT_EQ(L"bc", Std(s.substr(1, 2)));
  EXPECT_EQ(L"bcdef", Std(s.substr(1)));
  EXPECT_EQ(L"bcdef", Std(s.substr(1, String::npos)));
  EXPECT_EQ(L"ef", Std(s.substr(4, 99)));
  EXPECT_EQ(L"abcdef", Std(s.substr()));
  EXPECT_EQ(L"", Std(s.substr(6, 1)));
  EXPECT_EQ(L"", Std(s.substr(7, 1)));
  EXPECT_EQ(L"", Std(s.substr(99)));
  EXPECT_THROW(s.substr(2, 0xFFFFFFFE), exception::OutOfRange);
  EXPECT_EQ(2u, s.substr(1, 2).capacity());
}

#include <gtest/gtest.h>

#include "zt/fnd/String.h"

using namespace zt::fnd;

namespace {

constexpr unsigned npos = 0xFFFFFFFF;

}  // namespace

TEST(StringSearch, NotFoundIsAllOnesOf32Bits) {
  static_assert(String::npos == 0xFFFFFFFFu && sizeof(String::npos) == 4);
  EXPECT_EQ(npos, String(L"abc").find(L'x'));
  EXPECT_EQ(npos, String().find(L'a'));
}

TEST(StringSearch, FindsCharacters) {
  const String s(L"abcabc");
  EXPECT_EQ(s.find(L'b'), 1u);
  EXPECT_EQ(s.find(L'b', 2), 4u);
  EXPECT_EQ(npos, s.find(L'b', 5));
  EXPECT_EQ(npos, s.find(L'b', 6));
  EXPECT_EQ(npos, s.find(L'b', npos));
  EXPECT_EQ(npos, s.find(L'B')) << "searches see case";
  EXPECT_EQ(npos, s.find(0, 0));
  EXPECT_EQ(AnsiString("ab\xE9").find('\xE9'), 2u);
}

TEST(StringSearch, FindsTexts) {
  const String s(L"abcabcd");
  EXPECT_EQ(s.find(L"abc"), 0u);
  EXPECT_EQ(s.find(L"abc", 1), 3u);
  EXPECT_EQ(s.find(L"abcd"), 3u);
  EXPECT_EQ(npos, s.find(L"abcde"));
  EXPECT_EQ(npos, s.find(L"ABC"));
  EXPECT_EQ(s.find(s), 0u);
  EXPECT_EQ(npos, s.find(L"abcabcde"));
  EXPECT_EQ(npos, s.find(L"d", 7));
  EXPECT_EQ(s.find(L"cd"), 5u);
}

TEST(StringSearch, EmptyPatternIsFoundAtEveryValidPosition) {
  const String empty, s(L"abc");
  EXPECT_EQ(s.find(empty, 0), 0u);
  EXPECT_EQ(s.find(empty, 2), 2u);
  EXPECT_EQ(npos, s.find(empty, 3));
  EXPECT_EQ(npos, empty.find(empty, 0));
}

TEST(StringSearch, FindsCharactersBackward) {
  const String s(L"abcabc");
  EXPECT_EQ(s.rfind(L'b'), 4u);
  EXPECT_EQ(s.rfind(L'b', 4), 4u);
  EXPECT_EQ(s.rfind(L'b', 3), 1u);
  EXPECT_EQ(npos, s.rfind(L'b', 0));
  EXPECT_EQ(s.rfind(L'a', 0), 0u);
  EXPECT_EQ(npos, s.rfind(L'x'));
  EXPECT_EQ(npos, String().rfind(L'a'));
}

TEST(StringSearch, FindsTextsBackward) {
  const String s(L"abcabc");
  EXPECT_EQ(s.rfind(L"abc"), 3u);
  EXPECT_EQ(s.rfind(L"abc", 2), 0u);
  EXPECT_EQ(s.rfind(L"abc", 3), 3u);
  EXPECT_EQ(npos, s.rfind(L"abcabcd")) << "longer than the string";
  EXPECT_EQ(npos, String().rfind(L"a"));
  EXPECT_EQ(npos, s.rfind(L"cb"));
  EXPECT_EQ(s.rfind(String()), 6u) << "an empty pattern is at the start of the search";
  EXPECT_EQ(s.rfind(String(), 2), 2u);
  EXPECT_EQ(String().rfind(String()), 0u);
}

TEST(StringSearch, FirstOfAndFirstNotOf) {
  const String s(L"aabbcc"), empty;
  EXPECT_EQ(s.find_first_of(L"cb"), 2u);
  EXPECT_EQ(s.find_first_of(L"c", 3), 4u);
  EXPECT_EQ(npos, s.find_first_of(L"xyz"));
  EXPECT_EQ(npos, s.find_first_of(empty));
  EXPECT_EQ(npos, s.find_first_of(L"a", 6));
  EXPECT_EQ(s.find_first_not_of(L"a"), 2u);
  EXPECT_EQ(npos, s.find_first_not_of(L"abc"));
  EXPECT_EQ(s.find_first_not_of(empty, 3), 3u);
  EXPECT_EQ(npos, s.find_first_not_of(empty, 6));
  EXPECT_EQ(npos, empty.find_first_not_of(L"a"));
}

TEST(StringSearch, LastOfAndLastNotOf) {
  const String s(L"aabbcc"), empty;
  EXPECT_EQ(s.find_last_of(L"ab"), 3u);
  EXPECT_EQ(s.find_last_of(L"ab", 1), 1u);
  EXPECT_EQ(s.find_last_of(L'b'), 3u);
  EXPECT_EQ(s.find_last_of(L'b', 2), 2u);
  EXPECT_EQ(npos, s.find_last_of(L'x'));
  EXPECT_EQ(npos, s.find_last_of(empty));
  EXPECT_EQ(s.find_last_not_of(L'c'), 3u);
  EXPECT_EQ(s.find_last_not_of(L"bc"), 1u);
  EXPECT_EQ(npos, s.find_last_not_of(L"abc"));
  EXPECT_EQ(s.find_last_not_of(empty), 5u);
  EXPECT_EQ(s.find_last_not_of(L'x', 0), 0u);
  EXPECT_EQ(npos, empty.find_last_of(L'a'));
  EXPECT_EQ(npos, empty.find_last_not_of(L"a"));
}

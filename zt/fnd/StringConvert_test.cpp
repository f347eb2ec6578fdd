#include <gtest/gtest.h>

#include <clocale>
#include <string>

#include "tests/support/ScopedLocale.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"

using namespace zt::fnd;
using vlt::test::ScopedLocale;

namespace {

std::string Bytes(const AnsiString& s) { return std::string(s.begin(), s.end()); }
std::string Bytes(const AsciiString& s) { return std::string(s.begin(), s.end()); }
std::string Bytes(const Utf8String& s) {
  return std::string(reinterpret_cast<const char*>(s.begin()), s.length());
}
std::wstring Std(const String& s) { return std::wstring(s.begin(), s.end()); }

constexpr wchar_t kText[] = L"a\xE9\x20AC\x1F600";
constexpr char kUtf8[] = "a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80";

}  // namespace

TEST(StringConvert, LocaleTextUnderUtf8) {
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ(Bytes(AnsiString(kText)), kUtf8);
  EXPECT_EQ(Std(String(kUtf8)), kText);
  EXPECT_EQ(Bytes(AnsiString(String(kText))), kUtf8);
  EXPECT_EQ(Std(String(AnsiString(kUtf8))), kText);
}

TEST(StringConvert, LocaleTextUnderCIsAsciiWithQuestionMarks) {
  const ScopedLocale locale(LC_CTYPE, "C");
  EXPECT_EQ(Bytes(AnsiString(kText)), "a???");
  EXPECT_EQ(Std(String(kUtf8)), L"a?????????") << "one for each byte";
}

TEST(StringConvert, BadTextBecomesQuestionMarks) {
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ(Std(String("a\xFF"
                       "b")),
            L"a?b");
  EXPECT_EQ(Std(String("a\xE2\x82")), L"a??") << "a sequence cut at the end";
  EXPECT_EQ(Bytes(AnsiString(L"a\xD800"
                             L"b")),
            "a?b");
  EXPECT_EQ(Bytes(AnsiString(L"\x110000")), "?");
}

TEST(StringConvert, CapacityIsTheUpperBound) {
  EXPECT_EQ(String("abc").capacity(), 3u);
  EXPECT_EQ(AnsiString(L"abc").capacity(), 12u) << "four bytes a character";
  EXPECT_EQ(AsciiString(L"abc").capacity(), 12u);
  EXPECT_EQ(Utf8String(L"abc").capacity(), 3u) << "counted";
  EXPECT_EQ(AnsiString(L"").capacity(), 0u);
  EXPECT_EQ(String("").capacity(), 0u);
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  const String s(kUtf8);
  EXPECT_EQ(s.length(), 4u);
  EXPECT_EQ(s.capacity(), 10u);
}

TEST(StringConvert, ForcedLengthsAndRanges) {
  EXPECT_EQ(Std(String("a\0b", 3u)), std::wstring(L"a\0b", 3));
  const char text[] = "abcdef";
  EXPECT_EQ(Std(String(text + 1, text + 3)), L"bc");
  EXPECT_EQ(Bytes(AnsiString(L"abcdef", 2u)), "ab");
}

TEST(StringConvert, AsciiStringsAreAsciiInEveryLocale) {
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ(Bytes(AsciiString(kText)), "a???");
  EXPECT_EQ(Bytes(AsciiString(nullptr, String(kText))), "a???");
  EXPECT_EQ(Std(String(nullptr, AsciiString("a\xC3\xA9"))), L"a??");
}

TEST(StringConvert, TaggedConversions) {
  const String s(kText);
  const Utf8String u(nullptr, s);
  EXPECT_EQ(Bytes(u), kUtf8);
  EXPECT_EQ(Std(String(nullptr, u)), kText);
  EXPECT_EQ(String(nullptr, u).capacity(), 4u) << "counted";
  const AsciiString ascii("a\xC3\xA9");
  EXPECT_EQ(Bytes(Utf8String(nullptr, ascii)), "a\xC3\xA9") << "the bytes as they are";
  EXPECT_EQ(Utf8String(nullptr, ascii).capacity(), 3u);
  EXPECT_TRUE(String(nullptr, Utf8String()).empty());
  EXPECT_TRUE(Utf8String(nullptr, AsciiString()).empty());
}

TEST(StringConvert, MalformedUtf8RaisesOutOfTheConstructor) {
  const unsigned char bad[] = {'a', 0xC0, 0x80, 0};
  const Utf8String u(bad);
  EXPECT_THROW(String(nullptr, u), exception::InvalidSequence);
}

TEST(StringConvert, AssignmentConvertsIntoANewBlock) {
  AnsiString s("old");
  s = L"abc";
  EXPECT_EQ(Bytes(s), "abc");
  EXPECT_EQ(s.capacity(), 12u);
  s.assign(L"xyz", 1);
  EXPECT_EQ(Bytes(s), "x");
  EXPECT_EQ(s.capacity(), 4u);
  s = String(L"abcd");
  EXPECT_EQ(Bytes(s), "abcd");
  String w;
  w = AnsiString("wide");
  EXPECT_EQ(Std(w), L"wide");
}

TEST(StringConvert, AppendConvertsIntoTheTail) {
  AnsiString s("ab");
  s.append(L"cd");
  EXPECT_EQ(Bytes(s), "abcd");
  EXPECT_EQ(s.capacity(), 20u) << "twice the old length and four bytes a character";
  s.append(L"efgh", 2u).append(String(L"g")).append(String(L"xhix"), 1, 2);
  EXPECT_EQ(Bytes(s), "abcdefghi");
  EXPECT_EQ(s.capacity(), 20u) << "room was there";
  String w(L"ab");
  w.append("cd").append("ef", 1u).append(AnsiString("f")).append(AnsiString("ghi"), 0, 2);
  EXPECT_EQ(Std(w), L"abcdefgh");
  w.append(AnsiString("xyz"), 2, 3);
  EXPECT_EQ(Std(w), std::wstring(L"abcdefghz\0\0", 11));
}

TEST(StringConvert, AppendTakesTheRoomThatIsThere) {
  AnsiString s("a");
  s.reserve(9);
  const char* const block = s.begin();
  s.append(L"bc");
  EXPECT_EQ(block, s.begin());
  EXPECT_EQ(s.capacity(), 9u);
  s.append(L"de");
  EXPECT_EQ(s.capacity(), 22u) << "needs 3 + 8";
  EXPECT_EQ(Bytes(s), "abcde");
}

TEST(StringConvert, Utf8StringsAppendAndCompare) {
  Utf8String s(L"A");
  s.append(L"\xE9").append(String(L"b"));
  s += L"c";
  EXPECT_EQ(Bytes(s),
            "A\xC3\xA9"
            "bc");
  EXPECT_TRUE(s ==
              L"a\xE9"
              L"BC");
  EXPECT_FALSE(s ==
               L"a\xC9"
               L"BC")
      << "folds under the C locale only";
}

TEST(StringConvert, Utf8ComparisonLetsMalformedTextOut) {
  const unsigned char bad[] = {0xC0, 0x80, 0};
  EXPECT_THROW((void)(Utf8String(bad) == Utf8String(L"a")), exception::InvalidSequence);
}

TEST(StringConvert, MixedComparisonGoesWide) {
  const ScopedLocale locale(LC_CTYPE, "C");
  EXPECT_FALSE(String(L"\xE9") == AnsiString("\xE9")) << "the byte is no character here";
  EXPECT_FALSE(AnsiString("?") == L"\xE9") << "no loss on the way to the comparison";
  EXPECT_TRUE(AnsiString("abc") == L"ABC");
}

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
  EXPECT_EQ(kUtf8, Bytes(AnsiString(kText)));
  EXPECT_EQ(kText, Std(String(kUtf8)));
  EXPECT_EQ(kUtf8, Bytes(AnsiString(String(kText))));
  EXPECT_EQ(kText, Std(String(AnsiString(kUtf8))));
}

TEST(StringConvert, LocaleTextUnderCIsAsciiWithQuestionMarks) {
  const ScopedLocale locale(LC_CTYPE, "C");
  EXPECT_EQ("a???", Bytes(AnsiString(kText)));
  EXPECT_EQ(L"a?????????", Std(String(kUtf8))) << "one for each byte";
}

TEST(StringConvert, BadTextBecomesQuestionMarks) {
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ(L"a?b", Std(String("a\xFF"
                               "b")));
  EXPECT_EQ(L"a??", Std(String("a\xE2\x82"))) << "a sequence cut at the end";
  EXPECT_EQ("a?b", Bytes(AnsiString(L"a\xD800"
                                    L"b")));
  EXPECT_EQ("?", Bytes(AnsiString(L"\x110000")));
}

TEST(StringConvert, CapacityIsTheUpperBound) {
  EXPECT_EQ(3u, String("abc").capacity());
  EXPECT_EQ(12u, AnsiString(L"abc").capacity()) << "four bytes a character";
  EXPECT_EQ(12u, AsciiString(L"abc").capacity());
  EXPECT_EQ(3u, Utf8String(L"abc").capacity()) << "counted";
  EXPECT_EQ(0u, AnsiString(L"").capacity());
  EXPECT_EQ(0u, String("").capacity());
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  const String s(kUtf8);
  EXPECT_EQ(4u, s.length());
  EXPECT_EQ(10u, s.capacity());
}

TEST(StringConvert, ForcedLengthsAndRanges) {
  EXPECT_EQ(std::wstring(L"a\0b", 3), Std(String("a\0b", 3u)));
  const char text[] = "abcdef";
  EXPECT_EQ(L"bc", Std(String(text + 1, text + 3)));
  EXPECT_EQ("ab", Bytes(AnsiString(L"abcdef", 2u)));
}

TEST(StringConvert, AsciiStringsAreAsciiInEveryLocale) {
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ("a???", Bytes(AsciiString(kText)));
  EXPECT_EQ("a???", Bytes(AsciiString(nullptr, String(kText))));
  EXPECT_EQ(L"a??", Std(String(nullptr, AsciiString("a\xC3\xA9"))));
}

TEST(StringConvert, TaggedConversions) {
  const String s(kText);
  const Utf8String u(nullptr, s);
  EXPECT_EQ(kUtf8, Bytes(u));
  EXPECT_EQ(kText, Std(String(nullptr, u)));
  EXPECT_EQ(4u, String(nullptr, u).capacity()) << "counted";
  const AsciiString ascii("a\xC3\xA9");
  EXPECT_EQ("a\xC3\xA9", Bytes(Utf8String(nullptr, ascii))) << "the bytes as they are";
  EXPECT_EQ(3u, Utf8String(nullptr, ascii).capacity());
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
  EXPECT_EQ("abc", Bytes(s));
  EXPECT_EQ(12u, s.capacity());
  s.assign(L"xyz", 1);
  EXPECT_EQ("x", Bytes(s));
  EXPECT_EQ(4u, s.capacity());
  s = String(L"abcd");
  EXPECT_EQ("abcd", Bytes(s));
  String w;
  w = AnsiString("wide");
  EXPECT_EQ(L"wide", Std(w));
}

TEST(StringConvert, AppendConvertsIntoTheTail) {
  AnsiString s("ab");
  s.append(L"cd");
  EXPECT_EQ("abcd", Bytes(s));
  EXPECT_EQ(20u, s.capacity()) << "twice the old length and four bytes a character";
  s.append(L"efgh", 2u).append(String(L"g")).append(String(L"xhix"), 1, 2);
  EXPECT_EQ("abcdefghi", Bytes(s));
  EXPECT_EQ(20u, s.capacity()) << "room was there";
  String w(L"ab");
  w.append("cd").append("ef", 1u).append(AnsiString("f")).append(AnsiString("ghi"), 0, 2);
  EXPECT_EQ(L"abcdefgh", Std(w));
  w.append(AnsiString("xyz"), 2, 3);
  EXPECT_EQ(std::wstring(L"abcdefghz\0\0", 11), Std(w));
}

TEST(StringConvert, AppendTakesTheRoomThatIsThere) {
  AnsiString s("a");
  s.reserve(9);
  const char* const block = s.begin();
  s.append(L"bc");
  EXPECT_EQ(block, s.begin());
  EXPECT_EQ(9u, s.capacity());
  s.append(L"de");
  EXPECT_EQ(22u, s.capacity()) << "needs 3 + 8";
  EXPECT_EQ("abcde", Bytes(s));
}

TEST(StringConvert, Utf8StringsAppendAndCompare) {
  Utf8String s(L"A");
  s.append(L"\xE9").append(String(L"b"));
  s += L"c";
  EXPECT_EQ(
      "A\xC3\xA9"
      "bc",
      Bytes(s));
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

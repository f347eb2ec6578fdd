#include "zt/fnd/osdep/LocaleText.h"

#include <gtest/gtest.h>

#include <clocale>
#include <memory>
#include <string>
#include <vector>

#include "tests/support/ScopedLocale.h"
#include "zt/fnd/Exception.h"

using namespace zt::fnd;
using namespace zt::fnd::osdep;
using vlt::test::ScopedLocale;

namespace {

std::wstring ToWide(const std::string& text, const char* locale) {
  const std::unique_ptr<wchar_t[]> out(AnsiToWide(text.data(), text.data() + text.size(), locale));
  return out.get();
}

std::string ToNarrow(const std::wstring& text, const char* locale) {
  const std::unique_ptr<char[]> out(WideToAnsi(text.data(), text.data() + text.size(), locale));
  return out.get();
}

}  // namespace

TEST(LocaleText, RequiredLengthsAreUpperBounds) {
  const char text[] = "abc";
  const wchar_t wide[] = L"abc";
  for (const char* locale : {"", "carbon", "US-ASCII", "UTF-8"}) {
    EXPECT_EQ(GetAnsiToWideRequiredBufferLength(text, text + 3, locale), 3u);
    EXPECT_EQ(GetWideToAnsiRequiredBufferLength(wide, wide + 3, locale), 12u);
    EXPECT_EQ(GetAnsiToWideRequiredBufferLength(nullptr, nullptr, locale), 0u);
    EXPECT_EQ(GetWideToAnsiRequiredBufferLength(nullptr, nullptr, locale), 0u);
  }
}

TEST(LocaleText, LengthsBeyond32BitsAreOutOfRange) {
  if (sizeof(void*) == 4) GTEST_SKIP() << "such ranges do not fit the address space";
  const char* const begin = reinterpret_cast<const char*>(0x10000);
  const wchar_t* const wide = reinterpret_cast<const wchar_t*>(0x10000);
  const uint64_t most = 0xFFFFFFFFu;
  EXPECT_EQ(most, GetAnsiToWideRequiredBufferLength(begin, begin + most, ""));
  EXPECT_THROW(GetAnsiToWideRequiredBufferLength(begin, begin + most + 1, ""),
               exception::OutOfRange);
  EXPECT_EQ(GetWideToAnsiRequiredBufferLength(wide, wide + 0x3FFFFFFF, ""), 0xFFFFFFFCu);
  EXPECT_THROW(GetWideToAnsiRequiredBufferLength(wide, wide + 0x40000000, ""),
               exception::OutOfRange);
  EXPECT_THROW(AnsiToWide(begin, begin + 0x3FFFFFFF, ""), exception::OutOfRange)
      << "with the terminator it passes 32 bits of bytes";
  EXPECT_THROW(WideToAnsi(wide, wide + 0x40000000, ""), exception::OutOfRange);
}

TEST(LocaleText, ProcessLocaleUnderUtf8) {
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ(ToWide("abc\xC3\xA9\xE2\x82\xAC"
                   "d",
                   ""),
            L"abc\xE9\x20AC"
            L"d");
  EXPECT_EQ(ToNarrow(L"abc\xE9\x20AC"
                     L"d",
                     ""),
            "abc\xC3\xA9\xE2\x82\xAC"
            "d");
  EXPECT_EQ(ToWide("ab\xFF"
                   "d",
                   ""),
            L"ab?d");
  EXPECT_EQ(ToWide("\xC3\xA9", "carbon"), L"\xE9");
  EXPECT_EQ(ToNarrow(L"\xE9", "carbon"), "\xC3\xA9");
  EXPECT_EQ(ToNarrow(L"\xE9", nullptr), "\xC3\xA9");
}

TEST(LocaleText, ProcessLocaleUnderCIsAscii) {
  const ScopedLocale locale(LC_CTYPE, "C");
  EXPECT_EQ(ToWide("ab\xC3\xA9"
                   "c",
                   ""),
            L"ab??c");
  EXPECT_EQ(ToNarrow(L"ab\xE9"
                     L"c",
                     ""),
            "ab?c");
  EXPECT_EQ(ToWide("abc", "carbon"), L"abc");
}

TEST(LocaleText, FollowsAChangeOfTheHostsLocale) {
  EXPECT_EQ("?", ToNarrow(L"\xE9", ""));
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ(ToNarrow(L"\xE9", ""), "\xC3\xA9");
}

TEST(LocaleText, AsciiIsTheSameInEveryLocale) {
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ(ToWide("ab\xC3\xA9", "US-ASCII"), L"ab??");
  EXPECT_EQ(ToNarrow(L"ab\xE9\x20AC"
                     L"c",
                     "US-ASCII"),
            "ab??c");
  EXPECT_EQ(ToNarrow(std::wstring(1, static_cast<wchar_t>(0x80000041)), "US-ASCII"), "?");
}

TEST(LocaleText, OtherEncodingsByName) {
  EXPECT_EQ(L"\xE9", ToWide("\xE9", "ISO-8859-1"));
  EXPECT_EQ("\xE9?", ToNarrow(L"\xE9\x20AC", "ISO-8859-1"));
  EXPECT_THROW(ToWide("a", "no-such-code"), exception::InvalidLocale);
  EXPECT_THROW(ToWide("", "no-such-code"), exception::InvalidLocale);
  EXPECT_THROW(ToNarrow(L"a", "Carbon"), exception::InvalidLocale) << "the name is exact";
}

TEST(LocaleText, ConvertsIntoABufferAsFarAsThereIsRoom) {
  for (const char* name : {"C", "C.UTF-8"}) {
    const ScopedLocale locale(LC_CTYPE, name);
    const char text[] = "abcd";
    wchar_t wide[] = L"######";
    wchar_t* wideEnd = wide + 3;
    EXPECT_EQ(AnsiToWideNoAlloc(text, text + 4, "", wide, wideEnd), 3u);
    EXPECT_EQ(wide + 3, wideEnd);
    EXPECT_STREQ(wide, L"abc###");
    wideEnd = wide + 6;
    EXPECT_EQ(AnsiToWideNoAlloc(text, text + 4, "", wide, wideEnd), 4u);
    EXPECT_EQ(wide + 4, wideEnd);
    const wchar_t source[] = L"abcd";
    char narrow[] = "######";
    char* narrowEnd = narrow + 2;
    EXPECT_EQ(WideToAnsiNoAlloc(source, source + 4, "", narrow, narrowEnd), 2u);
    EXPECT_STREQ(narrow, "ab####");
    narrowEnd = narrow + 6;
    EXPECT_EQ(WideToAnsiNoAlloc(nullptr, nullptr, "carbon", narrow, narrowEnd), 0u);
    EXPECT_EQ(narrow, narrowEnd);
    narrowEnd = narrow;
    EXPECT_EQ(WideToAnsiNoAlloc(source, source + 4, "", narrow, narrowEnd), 0u);
  }
}

TEST(LocaleText, MixedTextIsTruncatedInItsSecondHalf) {
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  const wchar_t source[] =
      L"ab\x20AC"
      L"c";
  char narrow[] = "########";
  char* end = narrow + 5;
  EXPECT_EQ(WideToAnsiNoAlloc(source, source + 4, "", narrow, end), 5u);
  EXPECT_STREQ(narrow, "ab\xE2\x82\xAC###");
  end = narrow + 4;
  EXPECT_EQ(WideToAnsiNoAlloc(source, source + 4, "", narrow, end), 4u);
  EXPECT_EQ(std::string(narrow, 4), "ab?c");
}

TEST(LocaleText, NewBlocksTellTheirEnd) {
  const char text[] = "abc";
  wchar_t *wide, *wideEnd;
  AnsiToWide(text, text + 3, "US-ASCII", wide, wideEnd);
  const std::unique_ptr<wchar_t[]> wideOwner(wide);
  EXPECT_STREQ(wide, L"abc");
  EXPECT_EQ(wide + 3, wideEnd);
  char *narrow, *narrowEnd;
  WideToAnsi(wide, wideEnd, "US-ASCII", narrow, narrowEnd);
  const std::unique_ptr<char[]> narrowOwner(narrow);
  EXPECT_STREQ(narrow, "abc");
  EXPECT_EQ(narrow + 3, narrowEnd);
  const std::unique_ptr<char[]> terminated(WideToAnsi(L"xyz", "US-ASCII")),
      null(WideToAnsi(nullptr, "US-ASCII"));
  EXPECT_STREQ(terminated.get(), "xyz");
  EXPECT_STREQ(null.get(), "");
  EXPECT_EQ(ToWide("", ""), L"");
}

TEST(LocaleText, ThrowingOnBadTextCannotBeSwitchedOn) {
  EXPECT_FALSE(MakeWideToAnsiThrow(true));
  EXPECT_EQ(ToNarrow(L"\xE9", "US-ASCII"), "?");
  EXPECT_FALSE(MakeWideToAnsiThrow(false));
}

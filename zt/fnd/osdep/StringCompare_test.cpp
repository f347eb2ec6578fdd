#include "zt/fnd/osdep/StringCompare.h"

#include <gtest/gtest.h>

#include <climits>
#include <clocale>
#include <cwctype>

#include "tests/support/CompiledLocales.h"
#include "tests/support/InChild.h"
#include "tests/support/ScopedLocale.h"
#include "zt/fnd/Exception.h"

using namespace zt::fnd;
using namespace zt::fnd::osdep;
using vlt::test::ScopedLocale;

namespace {

template <class C, size_t A, size_t B>
int CaseRanges(const C (&a)[A], const C (&b)[B]) {
  return StringCaseCompare(a, a + A - 1, b, b + B - 1);
}

template <class C, size_t A, size_t B>
int ExactRanges(const C (&a)[A], const C (&b)[B]) {
  return StringExactCompare(a, a + A - 1, b, b + B - 1);
}

const char* const kNull = nullptr;
const wchar_t* const kWideNull = nullptr;

int Sign(int number) { return (number > 0) - (number < 0); }

// The rule as it is: the locale's upper-case characters compare. The two cases of an ASCII letter have a
// quicker way, which must not be taken where a locale folds i to another letter.
int PlainComparison(wchar_t a, wchar_t b) {
  return static_cast<int>(towupper(static_cast<wint_t>(a))) -
         static_cast<int>(towupper(static_cast<wint_t>(b)));
}

bool PairsFoldAsTheLocaleSays() {
  for (wchar_t a = 1; a < 0x180; ++a) {
    for (wchar_t b = 1; b < 0x180; ++b) {
      if (Sign(StringCaseCompare(&a, &a + 1, &b, &b + 1)) == Sign(PlainComparison(a, b))) continue;
      ADD_FAILURE() << std::hex << "0x" << static_cast<int>(a) << " 0x" << static_cast<int>(b);
      return false;
    }
  }
  return true;
}

}  // namespace

TEST(StringCompare, NullIsEmpty) {
  EXPECT_EQ(0, StringCaseCompare(kNull, ""));
  EXPECT_EQ(0, StringCaseCompare(kNull, kNull));
  EXPECT_EQ(0, StringCaseCompare(L"", kWideNull));
  EXPECT_EQ(0, StringExactCompare(kNull, ""));
  EXPECT_EQ(0, StringExactCompare(kWideNull, L""));
  EXPECT_LT(StringCaseCompare(kNull, "a"), 0);
  EXPECT_GT(StringCaseCompare(L"a", kWideNull), 0);
  EXPECT_GT(StringExactCompare("a", kNull), 0);
  EXPECT_LT(StringExactCompare(kWideNull, L"a"), 0);
}

TEST(StringCompare, CaseIsFolded) {
  EXPECT_EQ(0, StringCaseCompare("KORComponents", "korcomponentS"));
  EXPECT_EQ(0, StringCaseCompare(L"KORComponents", L"korcomponentS"));
  EXPECT_LT(StringCaseCompare("abc", "ABD"), 0);
  EXPECT_GT(StringCaseCompare(L"abd", L"ABC"), 0);
}

TEST(StringCompare, NarrowResultIsTheDifferenceOfTheFoldedCharacters) {
  EXPECT_EQ('A' - 'C', StringCaseCompare("xa", "Xc"));
  EXPECT_EQ(StringCaseCompare("abc", "ab"), 'C');
  EXPECT_EQ(-'C', StringCaseCompare("AB", "abc"));
  EXPECT_EQ('_' - 'Z', StringCaseCompare("_", "z")) << "folding is upward";
  EXPECT_EQ(0xE9 - 'A', StringCaseCompare("\xE9", "a")) << "bytes are unsigned";
}

TEST(StringCompare, WideResultHasASign) {
  EXPECT_LT(StringCaseCompare(L"ab", L"ABC"), 0);
  EXPECT_GT(StringCaseCompare(L"abc", L"AB"), 0);
  EXPECT_LT(StringCaseCompare(L"", L"a"), 0);
  EXPECT_GT(StringCaseCompare(L"a", L""), 0);
  EXPECT_GT(StringCaseCompare(L"_", L"z"), 0);
  EXPECT_GT(StringCaseCompare(L"\x10FFFF", L"a"), 0);
}

TEST(StringCompare, ExactSeesCase) {
  EXPECT_EQ(0, StringExactCompare("abc", "abc"));
  EXPECT_GT(StringExactCompare("a", "A"), 0);
  EXPECT_LT(StringExactCompare(L"A", L"a"), 0);
  EXPECT_EQ(StringExactCompare(L"a\xE9", L"a\xE9"), 0);
}

TEST(StringCompare, FoldsByTheHostsLocale) {
  const wchar_t lower[] = L"\xE9", upper[] = L"\xC9";
  {
    // The "C" locale of some systems has no letters but ASCII's.
    const ScopedLocale locale(LC_CTYPE, "C");
    EXPECT_EQ(StringCaseCompare(lower, upper) == 0, towupper(L'\xE9') == L'\xC9');
    EXPECT_EQ(StringCaseCompare(L"\x131", L"i") == 0, towupper(L'\x131') == L'I');
  }
  const ScopedLocale locale(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ(StringCaseCompare(lower, upper), 0);
  EXPECT_EQ(StringCaseCompare(L"\x131", L"i"), 0) << "both fold to I";
  EXPECT_EQ(StringCaseCompare(L"\x17F", L"s"), 0);
  EXPECT_NE(StringExactCompare(lower, upper), 0);
}

TEST(StringCompare, RangesReturnLengthDifferences) {
  EXPECT_EQ(-1, CaseRanges("ab", "abc"));
  EXPECT_EQ(-1, CaseRanges(L"ab", L"ABC"));
  EXPECT_EQ(3, CaseRanges("abcde", "AB"));
  EXPECT_EQ(-2, ExactRanges("", "ab"));
  EXPECT_EQ(2, ExactRanges(L"ab", L""));
  EXPECT_EQ(0, CaseRanges("", ""));
  EXPECT_EQ(0, StringCaseCompare(kNull, kNull, kNull, kNull));
}

TEST(StringCompare, RangesStopAtTheFirstDifference) {
  EXPECT_EQ('A' - 'B', CaseRanges("aazz", "abb"));
  EXPECT_GT(CaseRanges(L"bzz", L"azzzz"), 0);
  EXPECT_EQ('a' - 'A', ExactRanges("a", "A"));
  EXPECT_GT(ExactRanges("\xE9", "a"), 0) << "bytes are unsigned";
  EXPECT_GT(ExactRanges(L"a", L"A"), 0);
}

TEST(StringCompare, RangesSeeThroughZeros) {
  EXPECT_NE(0, CaseRanges("a\0b", "a\0c"));
  EXPECT_EQ(0, CaseRanges("a\0b", "A\0B"));
  EXPECT_EQ(1, ExactRanges(L"a\0b", L"a\0"));
}

TEST(StringCompare, DifferenceBeyond32BitsRaises) {
  EXPECT_EQ(INT_MAX, LengthDifference(INT_MAX, 0));
  EXPECT_EQ(INT_MIN, LengthDifference(0, 0x80000000LL));
  EXPECT_THROW(LengthDifference(0x80000000LL, 0), exception::OutOfRange);
  EXPECT_THROW(LengthDifference(0, 0x80000001LL), exception::OutOfRange);
  if (sizeof(void*) == 8) {
    // The ends are compared, the characters never read: one side is empty.
    const char* const begin = reinterpret_cast<const char*>(0x10000);
    const char* const end = reinterpret_cast<const char*>(0x10000 + 0x80000000ull);
    EXPECT_THROW(StringCaseCompare(begin, end, begin, begin), exception::OutOfRange);
    EXPECT_THROW(StringExactCompare(begin, end, begin, begin), exception::OutOfRange);
  }
}

TEST(StringCompare, EveryPairOfCharactersFoldsAsTheLocaleSays) {
  vlt::test::CompiledLocales locales;
  locales.make("tr_TR", "UTF-8");
  locales.make("tr_TR", "ISO-8859-9");
  for (const char* name : {"C", "C.UTF-8", "tr_TR.UTF-8", "tr_TR.ISO-8859-9"}) {
    SCOPED_TRACE(name);
    vlt::test::ExpectInChild([&] {
      ASSERT_TRUE(locales.use(name));
      EXPECT_TRUE(PairsFoldAsTheLocaleSays());
    });
  }
}

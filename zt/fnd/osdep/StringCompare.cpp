// All comparisons are one of two loops, over terminated text or over ranges, with a difference of
// characters as parameter. Narrow characters are compared as unsigned bytes everywhere: whether
// char is signed differs between processors, and an order that is stored must not.
#include "zt/fnd/osdep/StringCompare.h"

#include <cctype>
#include <cstdint>
#include <cstring>
#include <cwchar>
#include <cwctype>
#include <limits>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/UpperCase.h"

namespace zt::fnd::osdep {
namespace {

const char* OrEmpty(const char* s) { return s ? s : ""; }
const wchar_t* OrEmpty(const wchar_t* s) { return s ? s : L""; }

int Upper(char c) { return std::toupper(static_cast<unsigned char>(c)); }
wchar_t Upper(wchar_t c) { return static_cast<wchar_t>(towupper(static_cast<wint_t>(c))); }

int Raw(char c) { return static_cast<unsigned char>(c); }
wchar_t Raw(wchar_t c) { return c; }

int Difference(int a, int b) { return a - b; }
int Difference(wchar_t a, wchar_t b) { return wcsncmp(&a, &b, 1); }

// By the library's tables. Out of line, so that the usual comparison saves no registers.
template <class C>
[[gnu::noinline]] int UpperDifference(C a, C b) {
  return Difference(Upper(a), Upper(b));
}

// Folds the characters of one comparison, and keeps what it knows of the locale meanwhile.
template <class C>
class Folding {
 public:
  // Equal characters fold to equal ones, whatever the locale: only a raw difference needs the
  // library's tables.
  int operator()(C a, C b) {
    if (a == b || areCasesOfALetter(a, b)) [[likely]]
      return 0;
    return UpperDifference(a, b);
  }

 private:
  // The two cases of one ASCII letter, by the table of single bytes, which is quicker to ask than
  // that of wide characters. A letter that folds to another ASCII letter there folds so here, too;
  // that of i in a Turkish locale is no single byte, and is not seen.
  bool areCasesOfALetter(wchar_t a, wchar_t b) {
    if ((a ^ b) != 0x20) return false;
    const int letter = static_cast<int>(a) | 0x20;
    return letter >= 'a' && letter <= 'z' && upper(letter) == letter - 0x20;
  }
  bool areCasesOfALetter(char, char) { return false; }

  int upper(int letter) {
    if (!m_table) m_table = UpperCaseTable();
    if (m_table) [[likely]]
      return m_table[letter];
    return std::toupper(letter);
  }

  const int32_t* m_table = nullptr;  // until the first two cases of a letter
};

template <class C>
struct RawDifference {
  int operator()(C a, C b) const { return a == b ? 0 : Difference(Raw(a), Raw(b)); }
};

template <class C>
int CompareFolded(const C* a, const C* b) {
  Folding<C> folded;
  for (;; ++a, ++b) {
    const int difference = folded(*a, *b);
    if (difference != 0 || *a == C() || *b == C()) return difference;
  }
}

template <class C, class CharDifference>
int CompareRanges(const C* a, const C* aEnd, const C* b, const C* bEnd) {
  CharDifference differenceOf;
  while (a != aEnd && b != bEnd) {
    const int difference = differenceOf(*a++, *b++);
    if (difference != 0) return difference;
  }
  return LengthDifference(aEnd - a, bEnd - b);
}

}  // namespace

int LengthDifference(long long a, long long b) {
  const long long difference = a - b;
  if (difference < std::numeric_limits<int32_t>::min() ||
      difference > std::numeric_limits<int32_t>::max()) {
    ZT_RAISE(exception::OutOfRange());
  }
  return static_cast<int>(difference);
}

int StringCaseCompare(const char* a, const char* b) {
  return CompareFolded(OrEmpty(a), OrEmpty(b));
}

int StringCaseCompare(const wchar_t* a, const wchar_t* b) {
  a = OrEmpty(a);
  b = OrEmpty(b);
  // Against the empty text the characters compare as they are: a locale that folds a character to
  // a smaller one must not change which text is the longer.
  if (*a == L'\0' || *b == L'\0') return wcsncmp(a, b, 1);
  return CompareFolded(a, b);
}

int StringExactCompare(const char* a, const char* b) { return strcmp(OrEmpty(a), OrEmpty(b)); }

int StringExactCompare(const wchar_t* a, const wchar_t* b) {
  return wcscmp(OrEmpty(a), OrEmpty(b));
}

int StringCaseCompare(const char* a, const char* aEnd, const char* b, const char* bEnd) {
  return CompareRanges<char, Folding<char>>(a, aEnd, b, bEnd);
}

int StringCaseCompare(const wchar_t* a, const wchar_t* aEnd, const wchar_t* b,
                      const wchar_t* bEnd) {
  return CompareRanges<wchar_t, Folding<wchar_t>>(a, aEnd, b, bEnd);
}

int StringExactCompare(const char* a, const char* aEnd, const char* b, const char* bEnd) {
  return CompareRanges<char, RawDifference<char>>(a, aEnd, b, bEnd);
}

int StringExactCompare(const wchar_t* a, const wchar_t* aEnd, const wchar_t* b,
                       const wchar_t* bEnd) {
  return CompareRanges<wchar_t, RawDifference<wchar_t>>(a, aEnd, b, bEnd);
}

}  // namespace zt::fnd::osdep

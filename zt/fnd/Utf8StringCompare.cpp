// UTF-8 texts compare by their characters, decoded one at a time, so that no wide copy is made.
// Without folding the order of the bytes would be the same, but malformed text would compare where
// the folding form raises InvalidSequence. The public forms use the classic locale: the order of a
// text must not change with the host's.
#include "zt/fnd/Utf8StringCompare.h"

#include <cstring>
#include <cwchar>

#include "zt/fnd/Utf8ToWide.h"
#include "zt/fnd/osdep/StringCompare.h"

namespace zt::fnd {
namespace {

const unsigned char* OrEmpty(const unsigned char* s) {
  static const unsigned char empty[1] = {0};
  return s ? s : empty;
}

const unsigned char* EndOf(const unsigned char* s) {
  return s + strlen(reinterpret_cast<const char*>(s));
}

}  // namespace

int Utf8StringCompareInternal(const unsigned char* a, const unsigned char* aEnd,
                              const unsigned char* b, const unsigned char* bEnd, bool foldCase,
                              const CharacterAttributes<wchar_t>& attributes) {
  wchar_t left, right;
  while (a != aEnd && b != bEnd) {
    a = ConvertNextUtf8Character(a, aEnd, left);
    b = ConvertNextUtf8Character(b, bEnd, right);
    // Most characters are equal; the facet's look-up is for the first difference.
    if (left == right) continue;  // folding maps equal characters to equal ones
    if (foldCase) {
      left = attributes.toUpper(left);
      right = attributes.toUpper(right);
    }
    const int difference = wcsncmp(&left, &right, 1);
    if (difference != 0) return difference;
  }
  return osdep::LengthDifference(aEnd - a, bEnd - b);
}

int Utf8StringCaseInsensitiveCompare(const unsigned char* a, const unsigned char* aEnd,
                                     const unsigned char* b, const unsigned char* bEnd) {
  return Utf8StringCompareInternal(a, aEnd, b, bEnd, true, CharacterAttributes<wchar_t>());
}

int Utf8StringExactCompare(const unsigned char* a, const unsigned char* aEnd,
                           const unsigned char* b, const unsigned char* bEnd) {
  return Utf8StringCompareInternal(a, aEnd, b, bEnd, false, CharacterAttributes<wchar_t>());
}

int Utf8StringCaseInsensitiveCompare(const unsigned char* a, const unsigned char* b) {
  a = OrEmpty(a);
  b = OrEmpty(b);
  return Utf8StringCaseInsensitiveCompare(a, EndOf(a), b, EndOf(b));
}

int Utf8StringExactCompare(const unsigned char* a, const unsigned char* b) {
  a = OrEmpty(a);
  b = OrEmpty(b);
  return Utf8StringExactCompare(a, EndOf(a), b, EndOf(b));
}

}  // namespace zt::fnd

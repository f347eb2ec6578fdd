#pragma once

#include <cctype>
#include <cstdint>

namespace ztini {

// How characters fold in the locale in force. NameFold is the same as a table.
struct LocaleFold {
  static unsigned char upper(char c) {
    return static_cast<unsigned char>(std::toupper(static_cast<unsigned char>(c)));
  }
  static bool isSpace(char c) { return isspace(static_cast<unsigned char>(c)) != 0; }
};

template <class Fold>
const char* SkipSpace(const Fold& fold, const char* text) {
  while (fold.isSpace(*text)) ++text;
  return text;
}

// The rule of ztini_StrICmpWithoutSurrWhiteSpace over any fold. White space that differs in kind
// on both sides ("a \t" and "a  ") is unequal, since neither side has ended there.
template <class Fold>
int32_t CompareNames(const Fold& fold, const char* left, const char* right) {
  left = SkipSpace(fold, left);
  right = SkipSpace(fold, right);
  for (; *left && *right; ++left, ++right) {
    const unsigned char l = fold.upper(*left), r = fold.upper(*right);
    if (l != r) return l < r ? -1 : 1;
  }
  if (*SkipSpace(fold, left)) return 1;
  if (*SkipSpace(fold, right)) return -1;
  return 0;
}

}  // namespace ztini

#pragma once

#include "zt/fnd/CharacterAttributes.h"

namespace zt::fnd {

// Comparison of UTF-8 texts, character by character: below 0, 0, above 0.
//
// Where one text is the start of the other, the result is the difference of the remaining byte
// counts. Case folds under the locale "C" (ASCII only), not under the host's.
// Throws InvalidSequence for malformed text before the first difference, OutOfRange if the
// difference of the counts does not fit 32 bits.

// Over terminated text; a null pointer counts as the empty text.
int Utf8StringCaseInsensitiveCompare(const unsigned char* a, const unsigned char* b);
int Utf8StringExactCompare(const unsigned char* a, const unsigned char* b);

// Over ranges.
int Utf8StringCaseInsensitiveCompare(const unsigned char* a, const unsigned char* aEnd,
                                     const unsigned char* b, const unsigned char* bEnd);
int Utf8StringExactCompare(const unsigned char* a, const unsigned char* aEnd,
                           const unsigned char* b, const unsigned char* bEnd);

// What all of them do; folds by `attributes`.
int Utf8StringCompareInternal(const unsigned char* a, const unsigned char* aEnd,
                              const unsigned char* b, const unsigned char* bEnd, bool foldCase,
                              const CharacterAttributes<wchar_t>& attributes);

}  // namespace zt::fnd

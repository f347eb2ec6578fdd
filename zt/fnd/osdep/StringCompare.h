#pragma once

namespace zt::fnd::osdep {

// Comparison of texts: below 0, 0, above 0.
//
// Case is folded upward, one character at a time, by the C library under the host's C locale: the
// "C" locale folds ASCII only, and "_" sorts after the letters. Narrow characters compare as
// unsigned bytes, wide ones as wcsncmp does.

// Over terminated text; a null pointer counts as the empty text. Compares up to the first
// difference or the first end. The narrow forms return a difference of characters; of the wide
// forms only the sign means something.
int StringCaseCompare(const char* a, const char* b);
int StringCaseCompare(const wchar_t* a, const wchar_t* b);
int StringExactCompare(const char* a, const char* b);
int StringExactCompare(const wchar_t* a, const wchar_t* b);

// Over ranges, which see through embedded zeros. Where one range is the start of the other, and
// where one is empty, the result is the difference of the lengths.
// Throws OutOfRange if that difference does not fit 32 bits.
int StringCaseCompare(const char* a, const char* aEnd, const char* b, const char* bEnd);
int StringCaseCompare(const wchar_t* a, const wchar_t* aEnd, const wchar_t* b, const wchar_t* bEnd);
int StringExactCompare(const char* a, const char* aEnd, const char* b, const char* bEnd);
int StringExactCompare(const wchar_t* a, const wchar_t* aEnd, const wchar_t* b,
                       const wchar_t* bEnd);

// The difference of two counts as a comparison result. Throws OutOfRange as above.
int LengthDifference(long long a, long long b);

}  // namespace zt::fnd::osdep

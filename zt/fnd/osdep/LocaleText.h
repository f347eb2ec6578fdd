#pragma once

#include <cstdint>

namespace zt::fnd::osdep {

// Conversion between 32-bit characters and the text of a locale.
//
// The locale is the name of an encoding as iconv knows it ("ISO-8859-1", "US-ASCII"); "" is the
// encoding of the host's C locale, which is US-ASCII until the host calls setlocale, and "carbon"
// is another name for "". A null name counts as "". Text that cannot be converted becomes "?" in
// its place: bad text is never a failure. A null begin is the empty range. Throws InvalidLocale for
// an unknown encoding, OutOfRange where a length passes 32 bits.

// Upper bounds that need no scan of the text: the byte count, and four bytes a character.
uint32_t GetAnsiToWideRequiredBufferLength(const char* begin, const char* end, const char* locale);
uint32_t GetWideToAnsiRequiredBufferLength(const wchar_t* begin, const wchar_t* end,
                                           const char* locale);

// Convert into the buffer [dest, destEnd) as far as there is space, without terminator; `destEnd`
// then is where the output stopped. Return the count.
uint32_t AnsiToWideNoAlloc(const char* begin, const char* end, const char* locale, wchar_t* dest,
                           wchar_t*& destEnd);
uint32_t WideToAnsiNoAlloc(const wchar_t* begin, const wchar_t* end, const char* locale, char* dest,
                           char*& destEnd);

// Convert into a terminated block, which the caller frees by delete[]. `outEnd` is the terminator.
// `out` and `outEnd` are unchanged when these throw.
void AnsiToWide(const char* begin, const char* end, const char* locale, wchar_t*& out,
                wchar_t*& outEnd);
void WideToAnsi(const wchar_t* begin, const wchar_t* end, const char* locale, char*& out,
                char*& outEnd);
wchar_t* AnsiToWide(const char* begin, const char* end, const char* locale);
char* WideToAnsi(const wchar_t* begin, const wchar_t* end, const char* locale);
char* WideToAnsi(const wchar_t* s, const char* locale);

// Does nothing and returns false: bad text becomes "?".
bool MakeWideToAnsiThrow(bool doThrow);

}  // namespace zt::fnd::osdep

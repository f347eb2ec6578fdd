#pragma once

// How each string is converted to each other: what StringCodec<To, From> offers to the bodies of
// the string template. requiredLength() is an upper bound in characters of To; convert() writes at
// most up to destEnd and returns where it stopped.

#include <cstdint>
#include <cstring>

#include "zt/fnd/StringFwd.h"
#include "zt/fnd/Utf8ToWide.h"
#include "zt/fnd/WideToUtf8.h"
#include "zt/fnd/osdep/LocaleText.h"

namespace zt::fnd {

inline constexpr char kProcessLocale[] = "";
inline constexpr char kAscii[] = "US-ASCII";

// Text of a locale, or of US-ASCII, to 32-bit characters: at most one a byte. What is malformed
// becomes "?".
template <const char* Locale>
struct FromLocaleText {
  static uint32_t requiredLength(const char* first, const char* last) {
    return osdep::GetAnsiToWideRequiredBufferLength(first, last, Locale);
  }
  static wchar_t* convert(const char* first, const char* last, wchar_t* dest, wchar_t* destEnd) {
    osdep::AnsiToWideNoAlloc(first, last, Locale, dest, destEnd);
    return destEnd;
  }
};

// The reverse: at most four bytes a character. What the encoding lacks becomes "?".
template <const char* Locale>
struct ToLocaleText {
  static uint32_t requiredLength(const wchar_t* first, const wchar_t* last) {
    return osdep::GetWideToAnsiRequiredBufferLength(first, last, Locale);
  }
  static char* convert(const wchar_t* first, const wchar_t* last, char* dest, char* destEnd) {
    osdep::WideToAnsiNoAlloc(first, last, Locale, dest, destEnd);
    return destEnd;
  }
};

template <class To, class From>
struct StringCodec;

template <>
struct StringCodec<String, AnsiString> : FromLocaleText<kProcessLocale> {};
template <>
struct StringCodec<String, AsciiString> : FromLocaleText<kAscii> {};
template <>
struct StringCodec<AnsiString, String> : ToLocaleText<kProcessLocale> {};
template <>
struct StringCodec<AsciiString, String> : ToLocaleText<kAscii> {};

// Exact counts, and strict: malformed UTF-8 throws InvalidSequence, in the counting already.
template <>
struct StringCodec<String, Utf8String> {
  static uint32_t requiredLength(const unsigned char* first, const unsigned char* last) {
    return GetUtf8StringLength(first, last);
  }
  static wchar_t* convert(const unsigned char* first, const unsigned char* last, wchar_t* dest,
                          wchar_t* destEnd) {
    return dest + Utf8ToWide(first, last, dest, destEnd);
  }
};

template <>
struct StringCodec<Utf8String, String> {
  static uint32_t requiredLength(const wchar_t* first, const wchar_t* last) {
    return GetUtf8EncodingBytes(first, last);
  }
  static unsigned char* convert(const wchar_t* first, const wchar_t* last, unsigned char* dest,
                                unsigned char* destEnd) {
    return dest + WideToUtf8(first, last, dest, destEnd);
  }
};

// US-ASCII is UTF-8 already.
template <>
struct StringCodec<Utf8String, AsciiString> {
  static uint32_t requiredLength(const char* first, const char* last) {
    return static_cast<uint32_t>(last - first);
  }
  static unsigned char* convert(const char* first, const char* last, unsigned char* dest,
                                unsigned char*) {
    const size_t n = static_cast<size_t>(last - first);
    memcpy(dest, first, n);
    return dest + n;
  }
};

}  // namespace zt::fnd

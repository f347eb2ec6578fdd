#pragma once

#include <bit>

namespace zt::fnd::osdep {

// The name of the wide side: UTF-32 in the host's byte order.
inline constexpr const char* kWideEncoding =
    std::endian::native == std::endian::little ? "UTF-32LE" : "UTF-32BE";

// Conversion by the platform's iconv, which cannot fail on bad text.
//
// Converts the range until input or space runs out and sets `destEnd`, which is the end of the
// buffer on entry, to where the output stopped. Where iconv stops with input and space left,
// whatever its reason, one unit of input (a byte, a wide character) becomes one "?". Nothing is
// terminated. The wide side is named kWideEncoding; "" is the encoding of the host's C locale.
// Throws InvalidLocale where iconv knows no such conversion, also for an empty range. Threads: any;
// each call opens a descriptor of its own.
void IConv(const char* begin, const char* end, const char* fromCode, wchar_t* dest,
           wchar_t*& destEnd, const char* toCode);
void IConv(const wchar_t* begin, const wchar_t* end, const char* fromCode, char* dest,
           char*& destEnd, const char* toCode);

}  // namespace zt::fnd::osdep

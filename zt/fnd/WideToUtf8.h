#pragma once

#include <cstdint>

namespace zt::fnd {

// 32-bit characters to UTF-8, by rules of its own: one byte up to 0x7F, two up to 0x7FF, three up
// to 0xFFFF, four up to 0x1FFFFF, five up to 0x3FFFFFF, six up to 0x7FFFFFFF. Surrogates are
// encoded. A value with the top bit set becomes one "?". The five-byte form is written although the
// decoder does not read it.
//
// Output holds whole sequences only, and is never terminated except in the new[] forms.

// Bytes of the encoding; 0 for null. Throws OutOfRange past 32 bits.
uint32_t GetUtf8EncodingBytes(const wchar_t* s);
uint32_t GetUtf8EncodingBytes(const wchar_t* begin, const wchar_t* end);

// The same, but counting stops at the first character that would pass `limit`.
uint32_t GetUtf8EncodingBytesWithBufferLimit(const wchar_t* begin, const wchar_t* end,
                                             uint32_t limit);

// Encodes all of the range and returns the byte count. A null source produces nothing.
// Throws InvalidArgument (dest null or above destEnd; tested first), BufferOverflow (the
// destination ends first; it then holds what fits).
uint32_t WideToUtf8(const wchar_t* begin, const wchar_t* end, unsigned char* dest,
                    unsigned char* destEnd);

// Encodes what fits, moves `begin` past it and returns the byte count. Throws InvalidArgument.
uint32_t WideToUtf8NoOverflow(const wchar_t*& begin, const wchar_t* end, unsigned char* dest,
                              unsigned char* destEnd);

// A terminated block, which the caller frees by delete[]. Null gives an empty text.
// Throws OutOfRange, std::bad_alloc.
unsigned char* WideToUtf8(const wchar_t* begin, const wchar_t* end);
unsigned char* WideToUtf8(const wchar_t* s);

}  // namespace zt::fnd

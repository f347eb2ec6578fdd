#pragma once

#include <cstdint>

namespace zt::fnd {

// UTF-8 to 32-bit characters, by rules of its own:
//
//   lead 00-7F  1 byte
//        C2-DF  2 bytes
//        E0-EF  3 bytes; after E0 the second byte is at least A0
//        F0-F7  4 bytes; after F0 the second byte is at least 90
//        F8-FD  6 bytes, of whose lead only the lowest bit counts; except after FD the second byte
//               is at least 84
//
// Every other lead and every continuation byte outside 80-BF raises InvalidSequence, as does a
// sequence that passes the end of the input. There is no five-byte form, surrogates are characters,
// and the values reach up to 0x7FFFFFFF.
//
// Nothing is read beyond the given end. Output is never terminated, except in the new[] form.

// Wide characters that the bytes decode to; 0 for a null or empty range.
// Throws InvalidSequence.
uint32_t GetUtf8StringLength(const unsigned char* begin, const unsigned char* end);

// Decodes all of the range and returns the count. A null source produces nothing.
// Throws InvalidArgument (dest null or above destEnd; tested first), InvalidSequence,
// BufferOverflow (the destination ends first; it then holds what fits).
uint32_t Utf8ToWide(const unsigned char* begin, const unsigned char* end, wchar_t* dest,
                    wchar_t* destEnd);

// Decodes what fits, moves `begin` past it and returns the count. `begin` stays where it was when
// this throws InvalidArgument or InvalidSequence.
uint32_t Utf8ToWideNoOverflow(const unsigned char*& begin, const unsigned char* end, wchar_t* dest,
                              wchar_t* destEnd);

// The first n bytes decoded into a terminated block, which the caller frees by delete[]. A null s
// gives an empty text. Throws InvalidSequence, OutOfRange, std::bad_alloc.
wchar_t* Utf8ToWide(const unsigned char* s, uint32_t n);

// Decodes one character and returns the position after it. At a null s and at the end `out` is 0
// and s comes back. Throws InvalidSequence.
const unsigned char* ConvertNextUtf8Character(const unsigned char* s, const unsigned char* end,
                                              wchar_t& out);

}  // namespace zt::fnd

#pragma once

#include <cstddef>
#include <cstdint>

#ifdef __SSE2__
#include <emmintrin.h>
#endif

// Sixteen characters at a time of text that is ASCII, as most text is. The processor's own
// operations, as compilers make a move a byte of the plain form.
namespace zt::fnd::ascii_run {

inline constexpr ptrdiff_t kLength = 16;

#ifdef __SSE2__
static_assert(sizeof(wchar_t) == 4 && kLength == sizeof(__m128i));

inline __m128i Load(const void* s) { return _mm_loadu_si128(static_cast<const __m128i*>(s)); }

// Whether all of the kLength characters at s are below 0x80.
template <class Byte>
inline bool IsAscii(const Byte* s) {
  static_assert(sizeof(Byte) == 1);
  return _mm_movemask_epi8(Load(s)) == 0;
}

inline bool IsAscii(const wchar_t* s) {
  const __m128i bits =
      _mm_or_si128(_mm_or_si128(Load(s), Load(s + 4)), _mm_or_si128(Load(s + 8), Load(s + 12)));
  const __m128i beyond = _mm_andnot_si128(_mm_set1_epi32(0x7F), bits);
  return _mm_movemask_epi8(_mm_cmpeq_epi32(beyond, _mm_setzero_si128())) == 0xFFFF;
}

// Copies kLength characters that are ASCII.
template <class Byte>
inline void Copy(const Byte* s, wchar_t* out) {
  const __m128i zero = _mm_setzero_si128(), bytes = Load(s);
  const __m128i low = _mm_unpacklo_epi8(bytes, zero), high = _mm_unpackhi_epi8(bytes, zero);
  auto* to = reinterpret_cast<__m128i*>(out);
  _mm_storeu_si128(to, _mm_unpacklo_epi16(low, zero));
  _mm_storeu_si128(to + 1, _mm_unpackhi_epi16(low, zero));
  _mm_storeu_si128(to + 2, _mm_unpacklo_epi16(high, zero));
  _mm_storeu_si128(to + 3, _mm_unpackhi_epi16(high, zero));
}

template <class Byte>
inline void Copy(const wchar_t* s, Byte* out) {
  const __m128i low = _mm_packs_epi32(Load(s), Load(s + 4));
  const __m128i high = _mm_packs_epi32(Load(s + 8), Load(s + 12));
  _mm_storeu_si128(reinterpret_cast<__m128i*>(out), _mm_packus_epi16(low, high));
}
#else
template <class C>
inline bool IsAscii(const C* s) {
  uint32_t bits = 0;
  for (ptrdiff_t i = 0; i < kLength; ++i) bits |= static_cast<uint32_t>(s[i]);
  return bits < 0x80;
}

template <class In, class Out>
inline void Copy(const In* s, Out* out) {
  for (ptrdiff_t i = 0; i < kLength; ++i) out[i] = static_cast<Out>(s[i]);
}
#endif

}  // namespace zt::fnd::ascii_run

// The rules of the header are a table: the first byte selects how long the sequence is, which of
// its bits count, and the least second byte, by which forms that are longer than necessary are
// recognised.
//
// Counting decodes like converting, so that malformed text throws before memory is taken for the
// result.
#include "zt/fnd/Utf8ToWide.h"

#include <array>
#include <cstring>
#include <iterator>
#include <memory>

#include "zt/fnd/Exception.h"

#ifdef __SSE2__
#include <emmintrin.h>
#endif

namespace zt::fnd {
namespace {

// Sequences by lead byte; a row holds from its lead up to the next row's.
struct LeadRule {
  unsigned char lead;
  unsigned char length;       // 0: never valid
  unsigned char valueMask;    // bits of the lead that belong to the value
  unsigned char leastSecond;  // for the overlong forms
};

constexpr LeadRule kLeadRules[] = {
    {0x80, 0, 0x00, 0x80}, {0xC2, 2, 0x1F, 0x80}, {0xE0, 3, 0x0F, 0xA0},
    {0xE1, 3, 0x0F, 0x80}, {0xF0, 4, 0x07, 0x90}, {0xF1, 4, 0x07, 0x80},
    {0xF8, 6, 0x01, 0x84}, {0xFD, 6, 0x01, 0x80}, {0xFE, 0, 0x00, 0x80},
};

// The row of each lead from 0x80 on.
constexpr auto kRowOfLead = [] {
  std::array<unsigned char, 0x80> rows{};
  unsigned char row = 0;
  for (unsigned lead = 0x80; lead <= 0xFF; ++lead) {
    const size_t next = row + 1u;
    if (next < std::size(kLeadRules) && kLeadRules[next].lead == lead) ++row;
    rows[lead - 0x80] = row;
  }
  return rows;
}();

// Decodes the sequence of a lead byte of 0x80 or more; s is below end.
const unsigned char* DecodeSequence(const unsigned char* s, const unsigned char* end,
                                    uint32_t& value) {
  const LeadRule rule = kLeadRules[kRowOfLead[*s - 0x80u]];
  // The length first: only then may the second byte be read.
  if (rule.length == 0 || end - s < rule.length || s[1] < rule.leastSecond) {
    ZT_RAISE(exception::InvalidSequence());
  }
  uint32_t result = *s++ & rule.valueMask;
  unsigned bad = 0;  // one test at the end instead of one a byte
  const auto takeNext = [&] {
    bad |= (*s & 0xC0u) ^ 0x80u;
    result = result << 6 | (*s++ & 0x3Fu);
  };
  switch (rule.length) {
    case 6:
      takeNext();
      takeNext();
      [[fallthrough]];
    case 4:
      takeNext();
      [[fallthrough]];
    case 3:
      takeNext();
      [[fallthrough]];
    default:
      takeNext();
  }
  if (bad != 0) ZT_RAISE(exception::InvalidSequence());
  value = result;
  return s;
}

inline bool IsContinuation(unsigned char byte) { return (byte & 0xC0u) == 0x80; }

inline const unsigned char* DecodeOne(const unsigned char* s, const unsigned char* end,
                                      uint32_t& value) {
  const uint32_t lead = *s;
  if (lead < 0x80) {
    value = lead;
    return s + 1;
  }
  // Two to four bytes are nearly all of what is not ASCII; what is wrong with them, if anything, is
  // found by the rules.
  if (lead - 0xC2u < 0xE0u - 0xC2u && end - s >= 2 && IsContinuation(s[1])) {
    value = (lead & 0x1Fu) << 6 | (s[1] & 0x3Fu);
    return s + 2;
  }
  if (lead - 0xE1u < 0xF0u - 0xE1u && end - s >= 3 && IsContinuation(s[1]) &&
      IsContinuation(s[2])) {
    value = (lead & 0x0Fu) << 12 | (s[1] & 0x3Fu) << 6 | (s[2] & 0x3Fu);
    return s + 3;
  }
  if (lead - 0xF0u < 0xF8u - 0xF0u && end - s >= 4 && IsContinuation(s[1]) &&
      IsContinuation(s[2]) && IsContinuation(s[3]) && (lead != 0xF0 || s[1] >= 0x90)) {
    value = (lead & 0x07u) << 18 | (s[1] & 0x3Fu) << 12 | (s[2] & 0x3Fu) << 6 | (s[3] & 0x3Fu);
    return s + 4;
  }
  return DecodeSequence(s, end, value);
}

// Most text is ASCII, and most of that in long runs: bytes at a time of which none has its top bit
// set.
constexpr ptrdiff_t kRun = 16;

inline bool StartsWithAsciiRun(const unsigned char* s, const unsigned char* end) {
  if (end - s < kRun) return false;
  uint64_t words[kRun / sizeof(uint64_t)];
  // The text is not aligned; the compiler makes two loads of it.
  memcpy(words, s, sizeof words);
  return ((words[0] | words[1]) & 0x8080808080808080u) == 0;
}

// Writes a run, as StartsWithAsciiRun has found it. Compilers make a move a byte of a loop here.
inline void WidenAsciiRun(const unsigned char* s, wchar_t* out) {
#ifdef __SSE2__
  static_assert(sizeof(wchar_t) == 4 && kRun == 16);
  const __m128i zero = _mm_setzero_si128();
  const __m128i bytes = _mm_loadu_si128(reinterpret_cast<const __m128i*>(s));
  const __m128i low = _mm_unpacklo_epi8(bytes, zero), high = _mm_unpackhi_epi8(bytes, zero);
  auto* to = reinterpret_cast<__m128i*>(out);
  _mm_storeu_si128(to, _mm_unpacklo_epi16(low, zero));
  _mm_storeu_si128(to + 1, _mm_unpackhi_epi16(low, zero));
  _mm_storeu_si128(to + 2, _mm_unpacklo_epi16(high, zero));
  _mm_storeu_si128(to + 3, _mm_unpackhi_epi16(high, zero));
#else
  for (ptrdiff_t i = 0; i < kRun; ++i) out[i] = s[i];
#endif
}

bool IsEmpty(const unsigned char* begin, const unsigned char* end) {
  return !begin || begin >= end;
}

}  // namespace

uint32_t GetUtf8StringLength(const unsigned char* begin, const unsigned char* end) {
  if (IsEmpty(begin, end)) return 0;
  uint64_t count = 0;
  uint32_t ignored;
  while (begin != end) {
    if (StartsWithAsciiRun(begin, end)) {
      begin += kRun;
      count += kRun;
    } else {
      begin = DecodeOne(begin, end, ignored);
      ++count;
    }
  }
  if (count > 0xFFFFFFFFu) ZT_RAISE(exception::OutOfRange());
  return static_cast<uint32_t>(count);
}

uint32_t Utf8ToWideNoOverflow(const unsigned char*& begin, const unsigned char* end, wchar_t* dest,
                              wchar_t* destEnd) {
  if (!dest || dest > destEnd) ZT_RAISE(exception::InvalidArgument());
  if (IsEmpty(begin, end)) return 0;
  const unsigned char* s = begin;
  wchar_t* out = dest;
  uint32_t value;
  while (s != end && out != destEnd) {
    if (destEnd - out >= kRun && StartsWithAsciiRun(s, end)) {
      WidenAsciiRun(s, out);
      s += kRun;
      out += kRun;
      continue;
    }
    // No run begins here, nor before the next character that is not ASCII or the end is near.
    do {
      s = DecodeOne(s, end, value);
      *out++ = static_cast<wchar_t>(value);
    } while (value < 0x80 && s != end && out != destEnd);
  }
  if (static_cast<uint64_t>(out - dest) > 0xFFFFFFFFu) ZT_RAISE(exception::OutOfRange());
  // Only here: a sequence that is malformed leaves the caller's cursor where the call began.
  begin = s;
  return static_cast<uint32_t>(out - dest);
}

uint32_t Utf8ToWide(const unsigned char* begin, const unsigned char* end, wchar_t* dest,
                    wchar_t* destEnd) {
  const uint32_t count = Utf8ToWideNoOverflow(begin, end, dest, destEnd);
  if (!IsEmpty(begin, end)) ZT_RAISE(exception::BufferOverflow());
  return count;
}

wchar_t* Utf8ToWide(const unsigned char* s, uint32_t n) {
  const unsigned char* const end = s ? s + n : s;
  const uint64_t size = static_cast<uint64_t>(GetUtf8StringLength(s, end)) + 1;
  if (size * sizeof(wchar_t) > 0xFFFFFFFFu) ZT_RAISE(exception::OutOfRange());
  std::unique_ptr<wchar_t[]> text(new wchar_t[static_cast<size_t>(size)]);
  text[Utf8ToWide(s, end, text.get(), text.get() + size - 1)] = L'\0';
  return text.release();
}

const unsigned char* ConvertNextUtf8Character(const unsigned char* s, const unsigned char* end,
                                              wchar_t& out) {
  out = L'\0';
  if (IsEmpty(s, end)) return s;
  uint32_t value;
  s = DecodeOne(s, end, value);
  out = static_cast<wchar_t>(value);
  return s;
}

}  // namespace zt::fnd

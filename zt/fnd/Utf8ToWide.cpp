// The rules of the header are a table: the first byte selects how long the sequence is, which of
// its bits count, and the least second byte, by which forms that are longer than necessary are
// recognised.
//
// Counting decodes like converting, so that malformed text throws before memory is taken for the
// result.
#include "zt/fnd/Utf8ToWide.h"

#include <algorithm>
#include <array>
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

struct Decoded {
  const unsigned char* next;
  uint32_t value;
};

// Decodes the sequence of a lead byte of 0x80 or more; s is below end. Out of line, as the usual
// sequences do not come here.
[[gnu::noinline]] Decoded DecodeSequence(const unsigned char* s, const unsigned char* end) {
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
  return {s, result};
}

// Four bytes of the text, the first one lowest, whatever the order of the host.
inline uint32_t FourBytes(const unsigned char* s) {
  return s[0] | uint32_t{s[1]} << 8 | uint32_t{s[2]} << 16 | uint32_t{s[3]} << 24;
}

// The character at s, of which four bytes may be read.
inline Decoded DecodeInside(const unsigned char* s, const unsigned char* end) {
  const uint32_t lead = *s;
  if (lead < 0x80) return {s + 1, lead};
  // Two to four bytes are nearly all of what is not ASCII: the marks of lead and continuation bytes
  // are compared at once. What is wrong, if anything, is found by the rules.
  const uint32_t four = FourBytes(s);
  const uint32_t second = four >> 8 & 0x3F, third = four >> 16 & 0x3F;
  if ((four & 0xC0E0) == 0x80C0 && lead >= 0xC2) return {s + 2, (lead & 0x1F) << 6 | second};
  if ((four & 0xC0C0F0) == 0x8080E0 && lead != 0xE0) {
    return {s + 3, (lead & 0x0F) << 12 | second << 6 | third};
  }
  if ((four & 0xC0C0C0F8) == 0x808080F0 && (lead != 0xF0 || second >= 0x10)) {
    return {s + 4, (lead & 0x07) << 18 | second << 12 | third << 6 | (four >> 24 & 0x3F)};
  }
  return DecodeSequence(s, end);
}

inline Decoded DecodeOne(const unsigned char* s, const unsigned char* end) {
  if (*s < 0x80) return {s + 1, *s};
  return end - s >= 4 ? DecodeInside(s, end) : DecodeSequence(s, end);
}

// Most text is ASCII, and most of that in long runs: bytes at a time of which none has its top bit
// set. The processor's own operations, as compilers make a move a byte of the plain form.
constexpr ptrdiff_t kRun = 16;

#ifdef __SSE2__
static_assert(sizeof(wchar_t) == 4 && kRun == sizeof(__m128i));

inline __m128i LoadRun(const unsigned char* s) {
  return _mm_loadu_si128(reinterpret_cast<const __m128i*>(s));
}

inline bool IsAsciiRun(const unsigned char* s) { return _mm_movemask_epi8(LoadRun(s)) == 0; }

inline void WidenAsciiRun(const unsigned char* s, wchar_t* out) {
  const __m128i zero = _mm_setzero_si128(), bytes = LoadRun(s);
  const __m128i low = _mm_unpacklo_epi8(bytes, zero), high = _mm_unpackhi_epi8(bytes, zero);
  auto* to = reinterpret_cast<__m128i*>(out);
  _mm_storeu_si128(to, _mm_unpacklo_epi16(low, zero));
  _mm_storeu_si128(to + 1, _mm_unpackhi_epi16(low, zero));
  _mm_storeu_si128(to + 2, _mm_unpacklo_epi16(high, zero));
  _mm_storeu_si128(to + 3, _mm_unpackhi_epi16(high, zero));
}
#else
inline bool IsAsciiRun(const unsigned char* s) {
  unsigned bits = 0;
  for (ptrdiff_t i = 0; i < kRun; ++i) bits |= s[i];
  return bits < 0x80;
}

inline void WidenAsciiRun(const unsigned char* s, wchar_t* out) {
  for (ptrdiff_t i = 0; i < kRun; ++i) out[i] = s[i];
}
#endif

// Writes the runs that the text begins with, of which the first is known to be one; returns their
// characters, which are no more than `most`.
inline ptrdiff_t WidenAsciiRuns(const unsigned char* s, ptrdiff_t most, wchar_t* out) {
  ptrdiff_t done = 0;
  do {
    WidenAsciiRun(s + done, out + done);
    done += kRun;
  } while (most - done >= kRun && IsAsciiRun(s + done));
  return done;
}

// Where no run begins, characters are decoded in groups, whose bytes are all there: one question for
// the ends of text and destination, and for a run, instead of one a character.
constexpr ptrdiff_t kGroup = 8;
constexpr ptrdiff_t kLongestGroup = kGroup * 6;

template <class Put>
inline const unsigned char* DecodeGroup(const unsigned char* s, const unsigned char* end, Put put) {
  for (ptrdiff_t i = 0; i < kGroup; ++i) {
    const Decoded one = DecodeInside(s, end);
    put(i, one.value);
    s = one.next;
  }
  return s;
}

bool IsEmpty(const unsigned char* begin, const unsigned char* end) {
  return !begin || begin >= end;
}

}  // namespace

uint32_t GetUtf8StringLength(const unsigned char* begin, const unsigned char* end) {
  if (IsEmpty(begin, end)) return 0;
  uint64_t count = 0;
  while (begin != end) {
    if (end - begin >= kRun && IsAsciiRun(begin)) {
      begin += kRun;
      count += kRun;
    } else if (end - begin >= kLongestGroup) {
      begin = DecodeGroup(begin, end, [](ptrdiff_t, uint32_t) {});
      count += kGroup;
    } else {
      begin = DecodeOne(begin, end).next;
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
  while (s != end && out != destEnd) {
    const ptrdiff_t most = std::min(end - s, destEnd - out);
    if (most >= kRun && IsAsciiRun(s)) {
      const ptrdiff_t ascii = WidenAsciiRuns(s, most, out);
      s += ascii;
      out += ascii;
      continue;
    }
    if (destEnd - out >= kGroup && end - s >= kLongestGroup) {
      s = DecodeGroup(s, end,
                      [&](ptrdiff_t i, uint32_t value) { out[i] = static_cast<wchar_t>(value); });
      out += kGroup;
      continue;
    }
    const Decoded one = DecodeOne(s, end);
    *out++ = static_cast<wchar_t>(one.value);
    s = one.next;
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
  const Decoded one = DecodeOne(s, end);
  out = static_cast<wchar_t>(one.value);
  return one.next;
}

}  // namespace zt::fnd

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

#include "zt/fnd/AsciiRun.h"
#include "zt/fnd/Exception.h"

namespace zt::fnd {
namespace {

constexpr ptrdiff_t kRun = ascii_run::kLength;

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

// Writes the runs that the text begins with, of which the first is known to be one; returns their
// characters, which are no more than `most`.
inline ptrdiff_t WidenAsciiRuns(const unsigned char* s, ptrdiff_t most, wchar_t* out) {
  ptrdiff_t done = 0;
  do {
    ascii_run::Copy(s + done, out + done);
    done += kRun;
  } while (most - done >= kRun && ascii_run::IsAscii(s + done));
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
    if (end - begin >= kRun && ascii_run::IsAscii(begin)) {
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
    if (most >= kRun && ascii_run::IsAscii(s)) {
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

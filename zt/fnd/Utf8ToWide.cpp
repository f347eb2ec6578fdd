#include "zt/fnd/Utf8ToWide.h"

#include <array>
#include <cstring>
#include <iterator>
#include <memory>

#include "zt/fnd/Exception.h"

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

inline const unsigned char* DecodeOne(const unsigned char* s, const unsigned char* end,
                                      uint32_t& value) {
  if (*s >= 0x80) return DecodeSequence(s, end, value);
  value = *s;
  return s + 1;
}

// Most text is ASCII, and most of that in long runs: bytes at a time of which none has its top bit set.
constexpr ptrdiff_t kRun = 16;

inline bool StartsWithAsciiRun(const unsigned char* s, const unsigned char* end) {
  if (end - s < kRun) return false;
  uint64_t words[kRun / sizeof(uint64_t)];
  memcpy(words, s, sizeof words);
  return ((words[0] | words[1]) & 0x8080808080808080u) == 0;
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
      for (ptrdiff_t i = 0; i < kRun; ++i) out[i] = s[i];
      s += kRun;
      out += kRun;
    } else {
      s = DecodeOne(s, end, value);
      *out++ = static_cast<wchar_t>(value);
    }
  }
  if (static_cast<uint64_t>(out - dest) > 0xFFFFFFFFu) ZT_RAISE(exception::OutOfRange());
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

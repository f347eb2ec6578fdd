// Counting and encoding share EncodedBytes, so that a buffer of the counted size always suffices.
// The scheme of up to six bytes is the older one (RFC 2279): values beyond 0x10FFFF and surrogates
// are written, where RFC 3629 would refuse them.
#include "zt/fnd/WideToUtf8.h"

#include <algorithm>
#include <cwchar>
#include <memory>

#include "zt/fnd/AsciiRun.h"
#include "zt/fnd/Exception.h"

namespace zt::fnd {
namespace {

bool IsEmpty(const wchar_t* begin, const wchar_t* end) { return !begin || begin >= end; }

const wchar_t* EndOf(const wchar_t* s) { return s ? s + wcslen(s) : s; }

// Whether wchar_t is signed differs between processors; the bits decide.
uint32_t ValueOf(wchar_t c) { return static_cast<uint32_t>(c); }

// An unencodable value counts as the one byte of its "?".
unsigned EncodedBytes(uint32_t value) {
  if (value <= 0x7F || value > 0x7FFFFFFF) return 1;
  if (value <= 0x7FF) return 2;
  if (value <= 0xFFFF) return 3;
  if (value <= 0x1FFFFF) return 4;
  return value <= 0x3FFFFFF ? 5 : 6;
}

constexpr ptrdiff_t kRun = ascii_run::kLength;

// Writes the sequence of a value of `count` bytes and returns the place after it.
unsigned char* EncodeOne(uint32_t value, unsigned count, unsigned char* dest) {
  if (count == 1) {
    *dest = value > 0x7F ? '?' : static_cast<unsigned char>(value);
    return dest + 1;
  }
  for (unsigned i = count - 1; i != 0; --i) {
    dest[i] = static_cast<unsigned char>(0x80 | (value & 0x3F));
    value >>= 6;
  }
  dest[0] = static_cast<unsigned char>((0xFF00u >> count) | value);
  return dest + count;
}

// Characters in groups, for which there is space whatever they are: one question for the ends of text
// and destination, and for a run, instead of one a character.
constexpr ptrdiff_t kGroup = 8;
constexpr ptrdiff_t kLongestGroup = kGroup * 6;

inline unsigned char* EncodeGroup(const wchar_t* s, unsigned char* out) {
  for (ptrdiff_t i = 0; i < kGroup; ++i) {
    const uint32_t value = ValueOf(s[i]);
    if (value <= 0x7F) {
      *out++ = static_cast<unsigned char>(value);
    } else if (value <= 0x7FF) {
      *out++ = static_cast<unsigned char>(0xC0 | value >> 6);
      *out++ = static_cast<unsigned char>(0x80 | (value & 0x3F));
    } else if (value <= 0xFFFF) {
      *out++ = static_cast<unsigned char>(0xE0 | value >> 12);
      *out++ = static_cast<unsigned char>(0x80 | (value >> 6 & 0x3F));
      *out++ = static_cast<unsigned char>(0x80 | (value & 0x3F));
    } else {
      out = EncodeOne(value, EncodedBytes(value), out);
    }
  }
  return out;
}

uint32_t Checked(uint64_t count) {
  if (count > 0xFFFFFFFFu) ZT_RAISE(exception::OutOfRange());
  return static_cast<uint32_t>(count);
}

}  // namespace

uint32_t GetUtf8EncodingBytes(const wchar_t* s) { return GetUtf8EncodingBytes(s, EndOf(s)); }

uint32_t GetUtf8EncodingBytes(const wchar_t* begin, const wchar_t* end) {
  if (IsEmpty(begin, end)) return 0;
  uint64_t count = 0;
  while (begin != end) {
    if (end - begin >= kRun && ascii_run::IsAscii(begin)) {
      begin += kRun;
      count += kRun;
    } else {
      const wchar_t* const stop = begin + std::min(end - begin, kGroup);
      for (; begin != stop; ++begin) count += EncodedBytes(ValueOf(*begin));
    }
  }
  return Checked(count);
}

uint32_t GetUtf8EncodingBytesWithBufferLimit(const wchar_t* begin, const wchar_t* end,
                                             uint32_t limit) {
  if (IsEmpty(begin, end)) return 0;
  uint32_t count = 0;
  for (; begin != end; ++begin) {
    const unsigned bytes = EncodedBytes(ValueOf(*begin));
    // Subtracted and not added: the sum could wrap at a limit near 32 bits.
    if (bytes > limit - count) break;
    count += bytes;
  }
  return count;
}

uint32_t WideToUtf8NoOverflow(const wchar_t*& begin, const wchar_t* end, unsigned char* dest,
                              unsigned char* destEnd) {
  if (!dest || dest > destEnd) ZT_RAISE(exception::InvalidArgument());
  if (IsEmpty(begin, end)) return 0;
  const wchar_t* s = begin;
  unsigned char* out = dest;
  while (s != end && out != destEnd) {
    if (end - s >= kRun && destEnd - out >= kRun && ascii_run::IsAscii(s)) {
      ascii_run::Copy(s, out);
      s += kRun;
      out += kRun;
      continue;
    }
    if (end - s >= kGroup && destEnd - out >= kLongestGroup) {
      out = EncodeGroup(s, out);
      s += kGroup;
      continue;
    }
    const uint32_t value = ValueOf(*s);
    const unsigned count = EncodedBytes(value);
    // No sequence is ever cut: its rest would read as malformed text.
    if (static_cast<ptrdiff_t>(count) > destEnd - out) break;
    out = EncodeOne(value, count, out);
    ++s;
  }
  // Before `begin` moves: a count that does not fit throws with the caller's cursor unchanged.
  const uint32_t written = Checked(static_cast<uint64_t>(out - dest));
  begin = s;
  return written;
}

uint32_t WideToUtf8(const wchar_t* begin, const wchar_t* end, unsigned char* dest,
                    unsigned char* destEnd) {
  const uint32_t written = WideToUtf8NoOverflow(begin, end, dest, destEnd);
  if (!IsEmpty(begin, end)) ZT_RAISE(exception::BufferOverflow());
  return written;
}

unsigned char* WideToUtf8(const wchar_t* begin, const wchar_t* end) {
  const uint32_t count = GetUtf8EncodingBytes(begin, end);
  const size_t size = Checked(static_cast<uint64_t>(count) + 1);
  std::unique_ptr<unsigned char[]> text(new unsigned char[size]);
  text[WideToUtf8(begin, end, text.get(), text.get() + count)] = 0;
  return text.release();
}

unsigned char* WideToUtf8(const wchar_t* s) { return WideToUtf8(s, EndOf(s)); }

}  // namespace zt::fnd

// Conversion between a narrow encoding and wide text. Nearly all text is UTF-8 or ASCII, and those
// are converted here; iconv does the others. The hand-written converters give what iconv with its
// "?" rule gives, to the character, so that it makes no difference which way a text takes
// (LocaleTextIConv_test.cpp compares them). The needed space is an upper bound and not a count:
// converting twice, once to count, would cost more than a block that is a little too large.
#include "zt/fnd/osdep/LocaleText.h"

#include <langinfo.h>

#include <cstring>
#include <cwchar>
#include <memory>

#include "zt/fnd/AsciiRun.h"
#include "zt/fnd/NumericCast.h"
#include "zt/fnd/SafeInteger.h"
#include "zt/fnd/osdep/IConv.h"

namespace zt::fnd::osdep {
namespace {

using SafeCount = SafeInteger<uint32_t>;
// Of UTF-8; no encoding of a locale has longer ones.
constexpr uint32_t kMostBytesPerCharacter = 4;

bool Same(const char* a, const char* b) { return strcmp(a, b) == 0; }

// The name that iconv gets.
const char* EncodingOf(const char* locale) {
  // "carbon" is the name of the system's own conversion on another platform; here it is the
  // locale's.
  return !locale || *locale == '\0' || Same(locale, "carbon") ? "" : locale;
}

// The encodings that need no iconv, which is slow to open and has locks of its own.
enum class ByHand {
  Nothing,
  Ascii,        // "US-ASCII": "?" for all else
  LocaleAscii,  // the same, but the invisible tag characters are left out, as iconv does
  Utf8,
};

// What C libraries call the encoding of the "C" locale: glibc, BSD and macOS, musl.
bool IsAsciiCodeset(const char* codeset) {
  return Same(codeset, "ANSI_X3.4-1968") || Same(codeset, "US-ASCII") || Same(codeset, "ASCII");
}

// The host may change its locale at any time, so the answer for "" is never kept.
ByHand ByHandOf(const char* encoding) {
  if (*encoding != '\0') {
    if (Same(encoding, "US-ASCII")) return ByHand::Ascii;
    return Same(encoding, "UTF-8") ? ByHand::Utf8 : ByHand::Nothing;
  }
  const char* const codeset = nl_langinfo(CODESET);
  if (Same(codeset, "UTF-8")) return ByHand::Utf8;
  return IsAsciiCodeset(codeset) ? ByHand::LocaleAscii : ByHand::Nothing;
}

bool IsAscii(char c) { return static_cast<unsigned char>(c) < 0x80; }
bool IsAscii(wchar_t c) { return static_cast<uint32_t>(c) < 0x80; }
bool IsTag(char) { return false; }
bool IsTag(wchar_t c) { return static_cast<uint32_t>(c) >> 7 == 0xE0000 >> 7; }

// Copies the ASCII that the text begins with, as far as there are whole runs of it and space.
template <class In, class Out>
void CopyAsciiRuns(const In*& begin, const In* end, Out*& dest, Out* destEnd) {
  using ascii_run::kLength;
  while (end - begin >= kLength && destEnd - dest >= kLength && ascii_run::IsAscii(begin)) {
    ascii_run::Copy(begin, dest);
    begin += kLength;
    dest += kLength;
  }
}

// Copies as far as there is space, with "?" in the place of what is not ASCII. Returns the end.
template <class In, class Out>
Out* CopyAscii(const In* begin, const In* end, Out* dest, Out* destEnd, bool leaveOutTags) {
  CopyAsciiRuns(begin, end, dest, destEnd);
  for (; begin != end && dest != destEnd; ++begin) {
    if (leaveOutTags && IsTag(*begin)) continue;
    *dest++ = IsAscii(*begin) ? static_cast<Out>(*begin) : static_cast<Out>('?');
  }
  return dest;
}

bool IsCharacter(uint32_t c) { return c < 0xD800 || (c > 0xDFFF && c <= 0x10FFFF); }

// Bytes of the sequence that a byte begins; 0 for one that begins none.
size_t LengthByLead(unsigned char lead) {
  if (lead < 0x80) return 1;
  if (lead < 0xC2) return 0;
  if (lead < 0xE0) return 2;
  if (lead < 0xF0) return 3;
  return lead < 0xF5 ? 4 : 0;
}

// Reads a character. Returns its bytes; 0, with `c` undefined, where there is no whole and valid
// one.
size_t ReadUtf8(const char* begin, const char* end, uint32_t& c) {
  static constexpr unsigned char kLeadBits[] = {0, 0x7F, 0x1F, 0x0F, 0x07};
  static constexpr uint32_t kLeast[] = {0, 0, 0x80, 0x800, 0x10000};
  const size_t n = LengthByLead(static_cast<unsigned char>(*begin));
  if (n == 0 || static_cast<size_t>(end - begin) < n) return 0;
  c = static_cast<unsigned char>(*begin) & kLeadBits[n];
  for (size_t i = 1; i < n; ++i) {
    const unsigned char next = static_cast<unsigned char>(begin[i]);
    if ((next & 0xC0) != 0x80) return 0;
    c = c << 6 | (next & 0x3F);
  }
  // Overlong forms and surrogates are malformed by RFC 3629: accepting them would give one name two
  // spellings.
  return c >= kLeast[n] && IsCharacter(c) ? n : 0;
}

// Of each malformed sequence every byte becomes a "?" of its own.
wchar_t* ConvertUtf8(const char* begin, const char* end, wchar_t* dest, wchar_t* destEnd) {
  CopyAsciiRuns(begin, end, dest, destEnd);
  for (; begin != end && dest != destEnd; ++dest) {
    if (IsAscii(*begin)) {
      *dest = static_cast<wchar_t>(*begin++);
      continue;
    }
    uint32_t c;
    const size_t n = ReadUtf8(begin, end, c);
    *dest = n == 0 ? L'?' : static_cast<wchar_t>(c);
    begin += n == 0 ? 1 : n;
  }
  return dest;
}

size_t Utf8Length(uint32_t c) {
  if (c < 0x80) return 1;
  if (c < 0x800) return 2;
  return c < 0x10000 ? 3 : 4;
}

void WriteUtf8(uint32_t c, size_t n, char* dest) {
  static constexpr unsigned char kMark[] = {0, 0, 0xC0, 0xE0, 0xF0};
  for (size_t i = n; --i > 0; c >>= 6) dest[i] = static_cast<char>(0x80 | (c & 0x3F));
  *dest = static_cast<char>(kMark[n] | c);
}

// A character that has no space becomes a "?" too, and the next ones may have space again.
char* ConvertUtf8(const wchar_t* begin, const wchar_t* end, char* dest, char* destEnd) {
  CopyAsciiRuns(begin, end, dest, destEnd);
  for (; begin != end && dest != destEnd; ++begin) {
    uint32_t c = static_cast<uint32_t>(*begin);
    if (c < 0x80) {
      *dest++ = static_cast<char>(c);
      continue;
    }
    size_t n = Utf8Length(c);
    if (!IsCharacter(c) || n > static_cast<size_t>(destEnd - dest)) {
      c = '?';
      n = 1;
    }
    WriteUtf8(c, n, dest);
    dest += n;
  }
  return dest;
}

template <class In, class Out>
uint32_t Convert(const In* begin, const In* end, const char* encoding, Out* dest, Out*& destEnd,
                 const char* fromCode, const char* toCode) {
  if (!begin) end = begin;
  switch (const ByHand byHand = ByHandOf(encoding)) {
    case ByHand::Ascii:
    case ByHand::LocaleAscii:
      destEnd = CopyAscii(begin, end, dest, destEnd, byHand == ByHand::LocaleAscii);
      break;
    case ByHand::Utf8:
      destEnd = ConvertUtf8(begin, end, dest, destEnd);
      break;
    case ByHand::Nothing:
      IConv(begin, end, fromCode, dest, destEnd, toCode);
  }
  return NumericCast<uint32_t>(destEnd - dest);
}

template <class In>
uint32_t CountOf(const In* begin, const In* end) {
  return begin ? NumericCast<uint32_t>(end - begin) : 0;
}

// Space for `required` characters and the terminator.
template <class Out>
std::unique_ptr<Out[]> NewText(uint32_t required) {
  const SafeCount count = SafeCount::Add(required, 1);
  SafeCount::Multiply(count, sizeof(Out));
  return std::unique_ptr<Out[]>(new Out[count]);
}

const wchar_t* EndOf(const wchar_t* s) { return s ? s + wcslen(s) : s; }

}  // namespace

uint32_t GetAnsiToWideRequiredBufferLength(const char* begin, const char* end, const char*) {
  return CountOf(begin, end);
}

uint32_t GetWideToAnsiRequiredBufferLength(const wchar_t* begin, const wchar_t* end, const char*) {
  return SafeCount::Multiply(CountOf(begin, end), kMostBytesPerCharacter);
}

uint32_t AnsiToWideNoAlloc(const char* begin, const char* end, const char* locale, wchar_t* dest,
                           wchar_t*& destEnd) {
  const char* const encoding = EncodingOf(locale);
  return Convert(begin, end, encoding, dest, destEnd, encoding, kWideEncoding);
}

uint32_t WideToAnsiNoAlloc(const wchar_t* begin, const wchar_t* end, const char* locale, char* dest,
                           char*& destEnd) {
  const char* const encoding = EncodingOf(locale);
  return Convert(begin, end, encoding, dest, destEnd, kWideEncoding, encoding);
}

void AnsiToWide(const char* begin, const char* end, const char* locale, wchar_t*& out,
                wchar_t*& outEnd) {
  const uint32_t required = GetAnsiToWideRequiredBufferLength(begin, end, locale);
  std::unique_ptr<wchar_t[]> text = NewText<wchar_t>(required);
  wchar_t* stop = text.get() + required;
  AnsiToWideNoAlloc(begin, end, locale, text.get(), stop);
  *stop = L'\0';
  outEnd = stop;
  out = text.release();
}

void WideToAnsi(const wchar_t* begin, const wchar_t* end, const char* locale, char*& out,
                char*& outEnd) {
  const uint32_t required = GetWideToAnsiRequiredBufferLength(begin, end, locale);
  std::unique_ptr<char[]> text = NewText<char>(required);
  char* stop = text.get() + required;
  WideToAnsiNoAlloc(begin, end, locale, text.get(), stop);
  *stop = '\0';
  outEnd = stop;
  out = text.release();
}

wchar_t* AnsiToWide(const char* begin, const char* end, const char* locale) {
  wchar_t* out;
  wchar_t* outEnd;
  AnsiToWide(begin, end, locale, out, outEnd);
  return out;
}

char* WideToAnsi(const wchar_t* begin, const wchar_t* end, const char* locale) {
  char* out;
  char* outEnd;
  WideToAnsi(begin, end, locale, out, outEnd);
  return out;
}

char* WideToAnsi(const wchar_t* s, const char* locale) { return WideToAnsi(s, EndOf(s), locale); }

bool MakeWideToAnsiThrow(bool) { return false; }

}  // namespace zt::fnd::osdep

#include "zt/fnd/osdep/LocaleText.h"

#include <langinfo.h>

#include <cstring>
#include <cwchar>
#include <memory>

#include "zt/fnd/NumericCast.h"
#include "zt/fnd/SafeInteger.h"
#include "zt/fnd/osdep/IConv.h"

namespace zt {
namespace fnd {
namespace osdep {
namespace {

typedef SafeInteger<std::uint32_t> SafeCount;

constexpr char k_wideCode[] = "UTF-32LE";
constexpr std::uint32_t k_mostBytesPerCharacter = 4;

bool Same(const char* a, const char* b) { return std::strcmp(a, b) == 0; }

// The name that iconv gets.
const char* EncodingOf(const char* locale) {
  return locale == nullptr || Same(locale, "carbon") ? "" : locale;
}

// What stands for itself in the encoding, so that iconv need not be asked.
enum class ByHand { Nothing, AsciiRun, Everything };

// The host may change its locale at any time, so the answer for "" is never kept.
ByHand ByHandOf(const char* encoding) {
  if (Same(encoding, "US-ASCII")) return ByHand::Everything;
  if (*encoding != '\0') return ByHand::Nothing;
  const char* const codeset = nl_langinfo(CODESET);
  const bool extendsAscii = Same(codeset, "UTF-8") || Same(codeset, "ANSI_X3.4-1968");
  return extendsAscii ? ByHand::AsciiRun : ByHand::Nothing;
}

bool IsAscii(char c) { return static_cast<unsigned char>(c) < 0x80; }
bool IsAscii(wchar_t c) { return static_cast<std::uint32_t>(c) < 0x80; }

// Copies up to the first character that is not ASCII, or all with "?" in the place of such.
template <class In, class Out>
void CopyAscii(const In*& begin, const In* end, Out*& dest, Out* destEnd, bool replace) {
  for (; begin != end && dest != destEnd; ++begin, ++dest) {
    if (IsAscii(*begin)) {
      *dest = static_cast<Out>(*begin);
    } else if (replace) {
      *dest = static_cast<Out>('?');
    } else {
      return;
    }
  }
}

template <class In, class Out>
std::uint32_t Convert(const In* begin, const In* end, const char* encoding, Out* dest,
                      Out*& destEnd, const char* fromCode, const char* toCode) {
  if (begin == nullptr) end = begin;
  Out* out = dest;
  const ByHand byHand = ByHandOf(encoding);
  if (byHand != ByHand::Nothing) {
    CopyAscii(begin, end, out, destEnd, byHand == ByHand::Everything);
    if (begin == end || out == destEnd) destEnd = out;
  }
  if (destEnd != out || byHand == ByHand::Nothing) {
    IConv(begin, end, fromCode, out, destEnd, toCode);
  }
  return NumericCast<std::uint32_t>(destEnd - dest);
}

template <class In>
std::uint32_t CountOf(const In* begin, const In* end) {
  return begin == nullptr ? 0 : NumericCast<std::uint32_t>(end - begin);
}

// Room for `required` characters and the terminator.
template <class Out>
std::unique_ptr<Out[]> NewText(std::uint32_t required) {
  const SafeCount count = SafeCount::Add(required, 1);
  SafeCount::Multiply(count, sizeof(Out));
  return std::unique_ptr<Out[]>(new Out[count]);
}

const wchar_t* EndOf(const wchar_t* s) { return s == nullptr ? s : s + std::wcslen(s); }

}  // namespace

std::uint32_t GetAnsiToWideRequiredBufferLength(const char* begin, const char* end, const char*) {
  return CountOf(begin, end);
}

std::uint32_t GetWideToAnsiRequiredBufferLength(const wchar_t* begin, const wchar_t* end,
                                                const char*) {
  return SafeCount::Multiply(CountOf(begin, end), k_mostBytesPerCharacter);
}

std::uint32_t AnsiToWideNoAlloc(const char* begin, const char* end, const char* locale,
                                wchar_t* dest, wchar_t*& destEnd) {
  const char* const encoding = EncodingOf(locale);
  return Convert(begin, end, encoding, dest, destEnd, encoding, k_wideCode);
}

std::uint32_t WideToAnsiNoAlloc(const wchar_t* begin, const wchar_t* end, const char* locale,
                                char* dest, char*& destEnd) {
  const char* const encoding = EncodingOf(locale);
  return Convert(begin, end, encoding, dest, destEnd, k_wideCode, encoding);
}

void AnsiToWide(const char* begin, const char* end, const char* locale, wchar_t*& out,
                wchar_t*& outEnd) {
  const std::uint32_t required = GetAnsiToWideRequiredBufferLength(begin, end, locale);
  std::unique_ptr<wchar_t[]> text = NewText<wchar_t>(required);
  wchar_t* stop = text.get() + required;
  AnsiToWideNoAlloc(begin, end, locale, text.get(), stop);
  *stop = L'\0';
  outEnd = stop;
  out = text.release();
}

void WideToAnsi(const wchar_t* begin, const wchar_t* end, const char* locale, char*& out,
                char*& outEnd) {
  const std::uint32_t required = GetWideToAnsiRequiredBufferLength(begin, end, locale);
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

}  // namespace osdep
}  // namespace fnd
}  // namespace zt

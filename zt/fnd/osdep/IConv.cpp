// iconv stops at the first text that it cannot convert; the callers want all of the rest. The loop
// therefore replaces one unit and goes on from the next, until input or space runs out. errno is
// not consulted: bad text, text cut at the end and a character that the target lacks all become
// "?". POSIX lets iconv write a character of its choice for one that the target lacks, and musl
// writes "*"; it then gets one character at a time, and what it chose is taken back.
#include "zt/fnd/osdep/IConv.h"

#include <iconv.h>
#include <string.h>

#include <cstddef>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/LeakedInstance.h"

namespace zt::fnd::osdep {
namespace {

// The C library opens and closes under a lock of its own, which a child may find held for good.
struct Opening {
  ForkSafeMutex lock{AtFork::Wait, 95};
};

iconv_t Open(const char* toCode, const char* fromCode) {
  Hold hold(LeakedInstance<Opening>().lock);
  return iconv_open(toCode, fromCode);
}

// What is left to do: input, and space.
struct Rest {
  char* in;
  size_t inLeft;
  char* out;
  size_t outLeft;
};

class ScopedIconv {
 public:
  ScopedIconv(const char* toCode, const char* fromCode) : m_cd(Open(toCode, fromCode)) {
    if (m_cd == reinterpret_cast<iconv_t>(-1)) ZT_RAISE(exception::InvalidLocale());
  }
  ~ScopedIconv() {
    Hold hold(LeakedInstance<Opening>().lock);
    iconv_close(m_cd);
  }
  ScopedIconv(const ScopedIconv&) = delete;
  ScopedIconv& operator=(const ScopedIconv&) = delete;

  // False where iconv stopped before the end of the input.
  bool convert(Rest& rest) const { return call(rest) != kStopped; }

  // The same for the next `size` bytes, a character; also false, and nothing is converted, where
  // iconv chose another character for it.
  bool convertOne(Rest& rest, size_t size) const {
    Rest one = {rest.in, size, rest.out, rest.outLeft};
    if (call(one) != 0) return false;
    rest = {one.in, rest.inLeft - size, one.out, one.outLeft};
    return true;
  }

  // For a descriptor from the wide side, not used yet: true if iconv writes another character where
  // the target lacks one. Asked with a character of private use.
  bool substitutes() const {
    char32_t lacking = 0x10FFFD;
    char out[16];
    Rest rest = {reinterpret_cast<char*>(&lacking), sizeof lacking, out, sizeof out};
    const size_t substituted = call(rest);
    iconv(m_cd, nullptr, nullptr, nullptr, nullptr);
    return substituted != 0 && substituted != kStopped;
  }

 private:
  static constexpr size_t kStopped = static_cast<size_t>(-1);

  // The number of characters that iconv chose others for.
  size_t call(Rest& rest) const {
    return iconv(m_cd, &rest.in, &rest.inLeft, &rest.out, &rest.outLeft);
  }

  iconv_t m_cd;
};

template <class In, class Out>
void Convert(const In* begin, const In* end, const char* fromCode, Out* dest, Out*& destEnd,
             const char* toCode) {
  const ScopedIconv converter(toCode, fromCode);
  // The wide side lacks no character, and who asks for substitutes ("//TRANSLIT") gets them.
  const bool oneByOne =
      sizeof(In) == sizeof(wchar_t) && !strstr(toCode, "//") && converter.substitutes();
  // iconv takes a pointer to non-const for history's sake; it does not write there.
  Rest rest = {const_cast<char*>(reinterpret_cast<const char*>(begin)),
               static_cast<size_t>(end - begin) * sizeof(In), reinterpret_cast<char*>(dest),
               static_cast<size_t>(destEnd - dest) * sizeof(Out)};
  while (rest.inLeft != 0 && rest.outLeft >= sizeof(Out)) {
    if (oneByOne ? converter.convertOne(rest, sizeof(In)) : converter.convert(rest)) continue;
    // A full buffer stops iconv too, and is no bad text.
    if (rest.inLeft == 0 || rest.outLeft < sizeof(Out)) break;
    *reinterpret_cast<Out*>(rest.out) = static_cast<Out>('?');
    rest.out += sizeof(Out);
    rest.outLeft -= sizeof(Out);
    rest.in += sizeof(In);
    rest.inLeft -= sizeof(In);
  }
  destEnd = reinterpret_cast<Out*>(rest.out);
}

}  // namespace

void IConv(const char* begin, const char* end, const char* fromCode, wchar_t* dest,
           wchar_t*& destEnd, const char* toCode) {
  Convert(begin, end, fromCode, dest, destEnd, toCode);
}

void IConv(const wchar_t* begin, const wchar_t* end, const char* fromCode, char* dest,
           char*& destEnd, const char* toCode) {
  Convert(begin, end, fromCode, dest, destEnd, toCode);
}

}  // namespace zt::fnd::osdep

// iconv stops at the first text that it cannot convert; the callers want all of the rest. The loop
// therefore replaces one unit and goes on from the next, until input or space runs out. errno is
// not consulted: bad text, text cut at the end and a character that the target lacks all become
// "?".
#include "zt/fnd/osdep/IConv.h"

#include <iconv.h>

#include <algorithm>
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
  bool convert(char*& in, size_t& inLeft, char*& out, size_t& outLeft) const {
    return iconv(m_cd, &in, &inLeft, &out, &outLeft) != static_cast<size_t>(-1);
  }

 private:
  iconv_t m_cd;
};

template <class In, class Out>
void Convert(const In* begin, const In* end, const char* fromCode, Out* dest, Out*& destEnd,
             const char* toCode) {
  const ScopedIconv converter(toCode, fromCode);
  // iconv takes a pointer to non-const for history's sake; it does not write there.
  char* in = const_cast<char*>(reinterpret_cast<const char*>(begin));
  size_t inLeft = static_cast<size_t>(end - begin) * sizeof(In);
  char* out = reinterpret_cast<char*>(dest);
  size_t outLeft = static_cast<size_t>(destEnd - dest) * sizeof(Out);
  while (inLeft != 0 && outLeft >= sizeof(Out)) {
    if (converter.convert(in, inLeft, out, outLeft)) continue;
    // A full buffer stops iconv too, and is no bad text.
    if (inLeft == 0 || outLeft < sizeof(Out)) break;
    *reinterpret_cast<Out*>(out) = static_cast<Out>('?');
    out += sizeof(Out);
    outLeft -= sizeof(Out);
    in += std::min(inLeft, sizeof(In));
    inLeft -= std::min(inLeft, sizeof(In));
  }
  destEnd = reinterpret_cast<Out*>(out);
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

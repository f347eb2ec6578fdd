#include "zt/fnd/osdep/SystemString.h"

#include <cstdint>
#include <cstring>
#include <cwchar>
#include <limits>

#include "zt/fnd/DLLAlloc.h"

namespace zt::fnd::osdep {
namespace {

using Count = uint32_t;

constexpr uint64_t kMax32 = std::numeric_limits<uint32_t>::max();

}  // namespace

wchar_t* SystemAllocString(const wchar_t* s) {
  if (!s) return nullptr;
  const uint64_t n = wcslen(s);
  return n > kMax32 ? nullptr : SystemAllocStringLen(s, static_cast<unsigned int>(n));
}

wchar_t* SystemAllocStringLen(const wchar_t* s, unsigned int n) {
  // In 64 bits, where no n can make it wrap.
  const uint64_t bytes = (static_cast<uint64_t>(n) + 1) * sizeof(wchar_t) + sizeof(Count);
  if (bytes > kMax32) return nullptr;
  char* const block = static_cast<char*>(DLLMallocNoThrow(static_cast<unsigned long>(bytes)));
  if (!block) return nullptr;
  // Readers of such a string find its length in front of the text.
  const Count count = n;
  memcpy(block, &count, sizeof count);
  wchar_t* const text = reinterpret_cast<wchar_t*>(block + sizeof count);
  if (s && n != 0) memcpy(text, s, static_cast<size_t>(n) * sizeof(wchar_t));
  text[n] = L'\0';
  return text;
}

void SystemFreeString(wchar_t* s) {
  // The block begins at the length, in front of what the caller has.
  if (s) DLLFree(reinterpret_cast<char*>(s) - sizeof(Count));
}

}  // namespace zt::fnd::osdep

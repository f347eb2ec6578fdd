
#include <cctype>
#include <cstring>
#include <cwchar>

#include "source/Common/vltFailure.h"
#include "source/Common/vltHookPoints.h"
#include "source/Common/vltTestHook.h"
#include "source/Common/vltcmn.h"

namespace {

// Characters. Callers see the capacity that grows by it.
constexpr size_t kAppendStep = 360;

wchar_t* AllocateText(size_t characters) {
  // On 32 bits the bytes of a count that fits may not.
  if (characters > SIZE_MAX / sizeof(wchar_t)) return nullptr;
  return static_cast<wchar_t*>(vltTaskMemAlloc(characters * sizeof(wchar_t)));
}

}  // namespace

wchar_t* Dup(const wchar_t* text) {
  if (!text) return nullptr;
  size_t sizeBytes = (wcslen(text) + 1) * sizeof(wchar_t);
  auto* copy = static_cast<wchar_t*>(vltTaskMemAlloc(sizeBytes));
  if (copy) memcpy(copy, text, sizeBytes);
  return copy;
}

HRESULT vltDuplicateString(const wchar_t* s, wchar_t** out) {
  if (!s || !out) return E_POINTER;
  wchar_t* copy = Dup(s);
  if (!copy) return E_OUTOFMEMORY;
  *out = copy;
  return S_OK;
}

HRESULT vltDuplicateString2(const wchar_t* s, wchar_t** out) {
  if (!s || !out) return E_POINTER;
  wchar_t* copy = vlt::hook::Strikes(vlt::hook::kDuplicateString2) ? nullptr : Dup(s);
  if (!copy) {
    return vltReportOutOfMemory("HRESULT vltDuplicateString2(const wchar_t*, wchar_t**)");
  }
  *out = copy;
  return S_OK;
}

HRESULT vltAppendString2(wchar_t** buffer, const wchar_t* tail, size_t* capacity) {
  if (!buffer || !*buffer || !tail || !capacity) return E_POINTER;
  size_t length = wcslen(*buffer);
  // Measured before anything moves: the tail may be a part of the buffer.
  size_t tailSizeBytes = (wcslen(tail) + 1) * sizeof(wchar_t);
  size_t needed = length + tailSizeBytes / sizeof(wchar_t);
  if (needed >= *capacity) {
    // Until one character more than needed fits, in whole steps.
    *capacity += ((needed - *capacity) / kAppendStep + 1) * kAppendStep;
    wchar_t* grown =
        vlt::hook::Strikes(vlt::hook::kAppendString2) ? nullptr : AllocateText(*capacity);
    if (!grown) {
      return vltReportOutOfMemory("HRESULT vltAppendString2(wchar_t**, const wchar_t*, size_t*)");
    }
    memcpy(grown, *buffer, length * sizeof(wchar_t));
    memcpy(grown + length, tail,
           tailSizeBytes);  // Before the free: the tail may be the text itself.
    vltTaskMemFree(*buffer);
    *buffer = grown;
    return S_OK;
  }
  // Not wcscat: the tail may be the text itself, whose terminator the copy overwrites.
  memmove(*buffer + length, tail, tailSizeBytes);
  return S_OK;
}

int vltStruprImpl(char* s) {
  if (!s || !*s) return 1;
  for (; *s; ++s) *s = static_cast<char>(toupper(static_cast<unsigned char>(*s)));
  return 0;
}

int vltWcsuprImpl(wchar_t* s) {
  if (!s || !*s) return 1;
  for (; *s; ++s) {
    // The narrow function on purpose: it is defined up to 255 only, and above that nothing changes.
    if (*s > 0 && *s <= 255) *s = static_cast<wchar_t>(toupper(static_cast<int>(*s)));
  }
  return 0;
}

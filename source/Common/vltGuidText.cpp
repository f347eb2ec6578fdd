
#include <cstdio>
#include <cstring>
#include <cwchar>
#include <tuple>

#include "source/Common/vltFailure.h"
#include "source/Common/vltHookPoints.h"
#include "source/Common/vltTestHook.h"
#include "source/Common/vltcmn.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/Guid.h"

HRESULT vltStringFromCLSID(const GUID* g, wchar_t** out) {
  if (!g || !out) return E_POINTER;
  zt::fnd::String text;
  zt::fnd::Guid(*g).toString(text);
  size_t sizeBytes = (text.length() + 1) * sizeof(wchar_t);
  wchar_t* copy = nullptr;
  if (!vlt::hook::Strikes(vlt::hook::kStringFromClsid)) {
    copy = static_cast<wchar_t*>(vltTaskMemAlloc(sizeBytes));
  }
  if (!copy) {
    return vltReportOutOfMemory("HRESULT vltStringFromCLSID(const GUID*, wchar_t**)");
  }
  memcpy(copy, text.c_str(), sizeBytes);
  *out = copy;
  return S_OK;
}

zt::fnd::String vltGUIDToString(const GUID& g) {
  TaskMem<wchar_t> text;
  if (vltStringFromCLSID(&g, text.out()) < 0) return zt::fnd::String();
  return zt::fnd::String(text.get());
}

wchar_t* vltGuidToString2(GUID g) {
  wchar_t* copy = nullptr;
  return vltDuplicateString2(vltGUIDToString(g).c_str(), &copy) < 0 ? nullptr : copy;
}

wchar_t* vltGuidToStructString2(GUID g) {
  char text[128];
  const unsigned char* b = g.Data4;
  snprintf(text, sizeof text, "{%#lx,%#hx,%#hx,{%#hhx,%#hhx,%#hhx,%#hhx,%#hhx,%#hhx,%#hhx,%#hhx}}",
           static_cast<unsigned long>(g.Data1), g.Data2, g.Data3, b[0], b[1], b[2], b[3], b[4],
           b[5], b[6], b[7]);
  return Dup(zt::fnd::String(text).c_str());
}

int vltCLSIDFromString(const wchar_t* s, GUID* out) {
  try {
    // The one strict reader of GUIDs; this source only decides what bad text means.
    zt::fnd::Guid guid;
    guid.fromString(s, s ? s + wcslen(s) : s);
    *out = guid.get();
    return 0;
  } catch (const zt::fnd::exception::BadGuidString&) {
    // Bad text is a result here, not a failure: it reads as the null GUID.
    *out = GUID_NULL;
    return 1;
  }
}

int vltStringToGUID(const wchar_t* s, GUID* out) {
  *out = GUID_NULL;
  return vltCLSIDFromString(s, out);
}

GUID vltGuidFromString2(const wchar_t* s) {
  GUID g = GUID_NULL;
  if (!s) return g;
  // One brace anywhere decides: a text with a brace in the wrong place is bad text, and is not
  // completed to a good one.
  if (wcschr(s, L'{')) {
    vltStringToGUID(s, &g);
    return g;
  }
  wchar_t text[] = L"{00000000-0000-0000-0000-000000000000}";
  constexpr size_t kLengthInside = std::size(text) - 3;
  // A text of another length is bad without braces as it is with them.
  const bool fits = wcslen(s) == kLengthInside;
  if (fits) wmemcpy(text + 1, s, kLengthInside);
  vltStringToGUID(fits ? text : s, &g);
  return g;
}

int vltDceGuidCompare2(const GUID& a, const GUID& b) {
  // memcmp over the whole record would compare the numbers' low bytes first on little-endian hosts.
  auto numbers = [](const GUID& g) { return std::tie(g.Data1, g.Data2, g.Data3); };
  if (numbers(a) != numbers(b)) return numbers(a) > numbers(b) ? 1 : -1;
  int order = memcmp(a.Data4, b.Data4, sizeof a.Data4);
  return (order > 0) - (order < 0);
}

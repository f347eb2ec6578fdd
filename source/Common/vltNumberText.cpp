
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <cwchar>
#include <initializer_list>

#include "source/Common/vltcmn.h"
#include "zt/fnd/osdep/StringCompare.h"

wchar_t* Dup(const char* text) {
  if (!text) return nullptr;
  size_t sizeBytes = (strlen(text) + 1) * sizeof(wchar_t);
  TaskMem<wchar_t> copy(static_cast<wchar_t*>(vltTaskMemAlloc(sizeBytes)));
  // A narrow character never widens to more than one wide character, so the text fits.
  if (copy) wcscpy(copy.get(), zt::fnd::String(text).c_str());
  return copy.release();
}

wchar_t* vltU32ToString2(unsigned v) {
  char text[24];
  snprintf(text, sizeof text, "%lu", static_cast<unsigned long>(v));
  return Dup(text);
}

wchar_t* vltI32ToString2(int v) {
  char text[24];
  // Through uint32_t: a 64-bit long must not take the sign.
  snprintf(text, sizeof text, "%ld", static_cast<long>(static_cast<uint32_t>(v)));
  return Dup(text);
}

wchar_t* vltF64ToString2(double v) {
  char text[64];
  // Fifteen digits, and not the seventeen of a full round trip: 0.1 prints as it was written.
  snprintf(text, sizeof text, "%.15g", v);
  return Dup(text);
}

unsigned vltU32FromString2(const wchar_t* s) {
  return s ? static_cast<unsigned>(wcstoul(s, nullptr, 10)) : 0;
}

// wcstol saturates at the limits of long before the cut, so that on 32 bits too large a number is
// the largest, and on 64 bits its low half.
int vltI32FromString2(const wchar_t* s) { return s ? static_cast<int>(wcstol(s, nullptr, 10)) : 0; }

double vltF64FromString2(const wchar_t* s) { return s ? wcstod(s, nullptr) : 0; }

const wchar_t* vltBoolToString2(int v) { return v != 0 ? L"True" : L"False"; }

int vltBoolFromString2(const wchar_t* s) {
  for (const wchar_t* yes : {L"true", L"t", L"yes", L"y"}) {
    if (zt::fnd::osdep::StringCaseCompare(s, yes) == 0) return 1;
  }
  return 0;
}

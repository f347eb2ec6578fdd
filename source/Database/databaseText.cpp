#include "source/Database/databaseText.h"

#include <wchar.h>

#include <algorithm>
#include <iterator>

#include "source/Common/vltcmn.h"
#include "zt/fnd/osdep/LocaleText.h"

namespace registrar {

std::string Narrow(const wchar_t* text) {
  if (!text) return {};
  // Most texts are paths and names, of which a start converts thousands: without a block in between.
  constexpr size_t kShort = 256;
  char narrow[kShort * 4];
  const size_t length = wcslen(text);
  const wchar_t* end = text + length;
  if (length > kShort) return zt::fnd::AnsiString(text, end).c_str();
  char* stop = narrow + zt::fnd::osdep::GetWideToAnsiRequiredBufferLength(text, end, "");
  zt::fnd::osdep::WideToAnsiNoAlloc(text, end, "", narrow, stop);
  return std::string(narrow, stop);
}

GUID GuidOf(const char* text) {
  // All characters of a GUID are ASCII, which needs no conversion; others are bad as they are.
  wchar_t wide[] = L"{00000000-0000-0000-0000-000000000000}";
  constexpr size_t kLength = std::size(wide) - 1;
  const size_t length = strlen(text);
  const bool isBare = length == kLength - 2;
  if (!isBare && length != kLength) return GUID_NULL;
  std::transform(text, text + length, wide + (isBare ? 1 : 0),
                 [](char c) { return static_cast<unsigned char>(c); });
  GUID guid;
  vltStringToGUID(wide, &guid);
  return guid;
}

}  // namespace registrar

#include "source/Database/databaseText.h"

#include <wchar.h>

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

}  // namespace registrar

#include "tools/common/Locale.h"

#include <langinfo.h>
#include <locale.h>
#include <string.h>

namespace vltctl {
namespace {

bool s_replaced = false;

}  // namespace

void SetLocale() {
  const char* taken = setlocale(LC_ALL, "");
  bool isAscii = strcmp(nl_langinfo(CODESET), "ANSI_X3.4-1968") == 0;
  s_replaced = (!taken || isAscii) && setlocale(LC_ALL, "C.UTF-8");
}

bool LocaleWasReplaced() { return s_replaced; }

}  // namespace vltctl

#include "tools/common/Locale.h"

#include <langinfo.h>
#include <locale.h>
#include <string.h>

#include <algorithm>

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

std::string LocaleNote(const std::vector<NamedTexts>& components) {
  if (!s_replaced) return "";
  std::string unseen;
  for (const NamedTexts& component : components) {
    bool isAscii = std::all_of(component.texts.begin(), component.texts.end(),
                               [](char c) { return static_cast<signed char>(c) >= 0; });
    if (!isAscii) unseen += (unseen.empty() ? "" : ", ") + component.name;
  }
  if (unseen.empty()) return "";
  return "the environment has no UTF-8 locale: a program that is started with it does not find " +
         unseen + "; set LANG=C.UTF-8 for it";
}

}  // namespace vltctl

#pragma once

#include <string>

#include "tests/support/TempDir.h"

namespace vlt::test {

// Character types of a locale that the machine need not have installed, compiled by localedef into a
// directory of their own. All other categories are those of "C".
//
//   const CompiledLocales locales;
//   locales.make("tr_TR", "UTF-8");
//   ... in a child: locales.use("tr_TR.UTF-8")
class CompiledLocales {
 public:
  // Why this system reads none of them; empty if it does.
  static std::string Missing();

  // Makes "NAME.CHARMAP". Fails the test if the machine cannot (package "locales").
  void make(const std::string& name, const std::string& charmap) const;

  // Makes this process find the locales, and sets LC_CTYPE to one of them or of the system. False if
  // there is none of the name.
  bool use(const std::string& locale) const;

 private:
  TempDir m_dir;
};

}  // namespace vlt::test

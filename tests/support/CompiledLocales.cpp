#include "tests/support/CompiledLocales.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <bit>
#include <clocale>

#include "tests/support/Child.h"
#include "tests/support/PlainPosix.h"

namespace vlt::test {

std::string CompiledLocales::Missing() {
  return kGlibc ? "" : "this C library does not read locales of the kind that localedef makes";
}

void CompiledLocales::make(const std::string& name, const std::string& charmap) const {
  std::string source = "LC_CTYPE\ncopy \"" + name + "\"\nEND LC_CTYPE\n";
  for (const char* category :
       {"COLLATE", "IDENTIFICATION", "MONETARY", "NUMERIC", "TIME", "MESSAGES", "PAPER", "NAME",
        "ADDRESS", "TELEPHONE", "MEASUREMENT"}) {
    std::string section = std::string("LC_") + category;
    source += section + "\ncopy \"POSIX\"\nEND " + section + "\n";
  }
  std::string file = m_dir / (name + ".source");
  WriteBytes(file, source);
  // Under an emulator the program is another processor's.
  const char* order = std::endian::native == std::endian::big ? "--big-endian" : "--little-endian";
  ProgramResult made = RunProgram({"localedef", "--no-archive", order, "-c", "-i", file, "-f",
                                   charmap, m_dir / (name + "." + charmap)});
  // It ends with 1 where it has only warned, as it does of a source with so little in it.
  EXPECT_LE(made.exitCode, 1) << made.err;
  EXPECT_TRUE(Exists(m_dir / (name + "." + charmap + "/LC_CTYPE"))) << made.err;
}

bool CompiledLocales::use(const std::string& locale) const {
  // The system's may be in a place of their own, as another processor's are.
  const char* others = getenv("LOCPATH");
  std::string places = m_dir.path() + (others ? std::string(":") + others : "");
  setenv("LOCPATH", places.c_str(), 1);
  return std::setlocale(LC_CTYPE, locale.c_str()) != nullptr;
}

}  // namespace vlt::test

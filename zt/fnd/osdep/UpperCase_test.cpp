#include "zt/fnd/osdep/UpperCase.h"

#include <gtest/gtest.h>

#include <cctype>
#include <clocale>

#include "tests/support/PlainPosix.h"
#include "tests/support/ScopedLocale.h"

namespace zt::fnd::osdep {
namespace {

TEST(UpperCase, TableIsToupperOfTheLocale) {
  for (const char* name : {"C", "C.UTF-8"}) {
    vlt::test::ScopedLocale locale(LC_CTYPE, name);
    const int32_t* table = UpperCaseTable();
    if (vlt::test::kPlainPosix || !vlt::test::kGlibc) {
      EXPECT_EQ(table, nullptr);
      continue;
    }
    ASSERT_NE(table, nullptr);
    for (int byte = 0; byte < 256; ++byte) EXPECT_EQ(table[byte], std::toupper(byte)) << name;
  }
}

}  // namespace
}  // namespace zt::fnd::osdep

#include "source/Database/databaseText.h"

#include <gtest/gtest.h>

#include "tests/support/ScopedLocale.h"

namespace registrar {
namespace {

// Short texts are converted on the stack, longer ones in a block.
TEST(databaseText, NarrowsTextsOfAnyLengthAsTheStringDoes) {
  for (const char* locale : {"C", "C.UTF-8"}) {
    vlt::test::ScopedLocale scoped(LC_CTYPE, locale);
    for (size_t length : {0, 1, 15, 16, 255, 256, 257, 1000, 100000}) {
      for (wchar_t last : {L'a', L'\u00e9', L'\U0001F600', static_cast<wchar_t>(0xD800)}) {
        const std::wstring wide(length, last);
        EXPECT_EQ(Narrow(wide.c_str()), zt::fnd::AnsiString(wide.c_str()).c_str()) << length;
      }
    }
  }
  EXPECT_EQ(Narrow(nullptr), "");
}

}  // namespace
}  // namespace registrar

#include "source/Database/databaseText.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "source/Common/vltcmn.h"
#include "tests/support/ScopedLocale.h"
#include "zt/fnd/Guid.h"

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

TEST(databaseText, IdentifiersAreReadAsWideTextsAre) {
  const std::string good = "01234567-89ab-CDEF-0123-456789abcdef";
  std::vector<std::string> texts = {"",
                                    "{",
                                    good,
                                    "{" + good + "}",
                                    "{" + good,
                                    good + "}",
                                    " " + good,
                                    good + " ",
                                    "{" + good + "} ",
                                    good + good,
                                    "{}" + good,
                                    std::string(36, '-')};
  for (size_t at = 0; at < good.size(); ++at) {
    for (char c : {'\xC3', '\x80', 'g', '-', '{'}) {
      texts.push_back(good);
      texts.back()[at] = c;
      texts.push_back("{" + texts.back() + "}");
    }
  }
  for (const char* locale : {"C", "C.UTF-8"}) {
    vlt::test::ScopedLocale scoped(LC_CTYPE, locale);
    for (const std::string& text : texts) {
      EXPECT_TRUE(GuidOf(text.c_str()) == vltGuidFromString2(Widen(text).c_str())) << text;
    }
  }
  EXPECT_FALSE(GuidOf(good.c_str()) == GUID_NULL);
}

}  // namespace
}  // namespace registrar

// The worked example of docs/ini-dialect.md, byte for byte.
#include <gtest/gtest.h>

#include <string>

#include "tests/support/TempDir.h"
#include "tests/support/TestDocument.h"

namespace {

constexpr char kRead[] =
    "\xEF\xBB\xBF; note\r\n[ Jar ]\r\n\r\nPort=42\r\nEmpty=\r\nTxt = \" a\\n\"\r\nport=7\r\n[B]";

constexpr char kWritten[] = "[Jar]\nPort = 7\nTxt = \" a\\n\"\n[B]\n\n[New]\nK = \"a\\tb\"\n\n";

TEST(Dialect, WorkedExample) {
  vlt::test::TempDir dir;
  const std::string path = dir / "a.ini";
  ASSERT_EQ(sizeof kRead - 1, 64u);
  ASSERT_EQ(sizeof kWritten - 1, 51u);
  vlt::test::WriteBytes(path, kRead);
  ztini::test::Document doc = ztini::test::NewDocument();
  ASSERT_EQ(IniReadFromFile(doc.get(), path.c_str()), 0);
  EXPECT_EQ(ztini::test::Show(doc), "[Jar@2] Port=7@7 Txt=\" a\\n\"@6 [B@8]");
  EXPECT_EQ(doc->firstBadLine, 3);
  const char* text = nullptr;
  EXPECT_EQ(IniGetPointerToString(doc.get(), "jar", "TXT", &text), 1);
  EXPECT_STREQ(text, " a\n");
  EXPECT_EQ(IniPutStringWithOptions(doc.get(), "New", "K", "a\tb", 1, 1), 1);
  EXPECT_EQ(IniSetWriteOptions(doc.get(), -1, 32, 26), 1);
  EXPECT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
  EXPECT_EQ(vlt::test::ReadBytes(path), kWritten);
}

}  // namespace

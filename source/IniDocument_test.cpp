#include "source/IniDocument.h"

#include <gtest/gtest.h>

#include "source/vlIniMgr.h"
#include "tests/support/TempDir.h"

namespace {

using namespace std::string_literals;
using vlt::test::ReadBytes;
using vlt::test::TempDir;
using vlt::test::WriteBytes;

std::string Value(const IniDocument& document, const char* section, const char* item) {
  std::string value;
  return document.GetItem(section, item, &value) < 0 ? "none" : value;
}

TEST(IniDocument, HoldsNothingBeforeItIsParsed) {
  IniDocument document(true);
  EXPECT_EQ(document.GetNumberOfSections(), 0);
  EXPECT_EQ(Value(document, "a", "x"), "none");
}

TEST(IniDocument, ParsesAndRendersAsAFileIsReadAndWritten) {
  const std::string texts[] = {"", "[a]\nx = \"1\"\n", "\xEF\xBB\xBF[a]\nx=1\n\n[b]\ny = '\\x41'\n",
                               "[a]\nname Line0001 = \"1\"\nname Line0002 = \"2\"\n", "[a]\nx=1"};
  TempDir dir;
  std::string file = dir / "x.ini";
  for (const std::string& text : texts) {
    WriteBytes(file, text);
    {
      CvlIniMgr ini = CvlIniMgr::OpenForUpdate(file);
      ASSERT_EQ(ini.SetItem("a", "new", "v\n", true), S_OK);
      ASSERT_EQ(ini.Write(), S_OK);
    }
    IniDocument document(true);
    ASSERT_EQ(document.Parse(text), 0);
    ASSERT_EQ(document.SetItem("a", "new", "v\n", true), S_OK);
    std::string rendered;
    ASSERT_EQ(document.Render(&rendered), 0);
    EXPECT_EQ(rendered, ReadBytes(file)) << text;
  }
}

TEST(IniDocument, AnUnsupportedEncodingLeavesAnEmptyDocument) {
  IniDocument document(true);
  ASSERT_EQ(document.Parse("[a]\nx=1\n"), 0);
  EXPECT_EQ(document.Parse("\xFF\xFE[\0a\0]\0"s), kIniUnsupportedEncoding);
  EXPECT_EQ(document.GetNumberOfSections(), 0);
}

TEST(IniDocument, ASectionAnswersAsTheDocument) {
  for (bool escapes : {false, true}) {
    IniDocument document(escapes);
    EXPECT_EQ(document.Parse("[a]\nx=1\ny=\"two\\x41\"\nz=\n[b]\nx=3\n"), 0);
    for (const char* name : {"a", " A ", "b", "none", ""}) {
      const IniDocument::Section section(document, name);
      EXPECT_EQ(section.count(), document.GetNumberOfItems(name)) << name;
      for (const char* item : {"x", "Y", " z ", "none", ""}) {
        std::string value;
        const bool has = document.ItemExists(name, item) == S_OK;
        EXPECT_EQ(section.has(item), has) << name << item;
        const bool found = document.GetItem(name, item, &value) == S_OK;
        const char* own = section.value(item);
        EXPECT_EQ(own != nullptr, found) << name << item;
        if (own) {
          EXPECT_EQ(own, value);
        }
      }
      for (int n = -2; n < 5; ++n) {
        std::string item;
        const bool found = document.GetNthItemName(name, n, &item) == S_OK;
        const char* own = section.itemName(n);
        EXPECT_EQ(own != nullptr, found) << name << n;
        const char* value = section.itemValue(n);
        EXPECT_EQ(value != nullptr, found) << name << n;
        if (own) {
          EXPECT_EQ(own, item);
          EXPECT_STREQ(value, section.value(own));
        }
      }
    }
  }
}

// Long enough for an index, which knows most names as those of one item.
TEST(IniDocument, AnItemsValueIsThatOfItsName) {
  IniDocument document(true);
  std::string text = "[s]\n";
  for (int n = 0; n < 40; ++n)
    text += "n" + std::to_string(n) + "=" + std::to_string(n) + "\\x41\n";
  ASSERT_EQ(document.Parse(text), 0);
  for (bool changed : {false, true}) {
    const IniDocument::Section section(document, "s");
    for (int n = 1; n <= section.count(); ++n) {
      const std::string expected = section.value(section.itemName(n));
      EXPECT_EQ(section.itemValue(n), expected);
      EXPECT_NE(expected.find(changed && n == section.count() ? 'Z' : 'A'), std::string::npos)
          << expected;
    }
    document.EraseItem("s", "n20");
    document.SetItem("s", "N7", "Z", false);
    document.EraseItem("s", "n7");
    document.SetItem("s", "n7", "Z", false);
  }
}

TEST(IniDocument, ValuesAreDecodedOnlyWhereEscapesAreUsed) {
  IniDocument escaped(true), raw(false);
  for (IniDocument* document : {&escaped, &raw}) ASSERT_EQ(document->Parse("[a]\nx=\\x41\n"), 0);
  EXPECT_EQ(Value(escaped, "a", "x"), "A");
  EXPECT_EQ(Value(raw, "a", "x"), "\\x41");
}

}  // namespace

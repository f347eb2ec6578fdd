#include "source/Database/recordText.h"

#include <gtest/gtest.h>

#include "source/IniDocument.h"
#include "zt/fnd/Guid.h"

namespace registrar {
namespace {

RecordText Read(const std::string& items, EmptyFileName emptyFileName = EmptyFileName::IsNone) {
  IniDocument document(true);
  EXPECT_EQ(document.Parse("[C]\n" + items), 0);
  return ReadRecord(document, "C", emptyFileName);
}

constexpr GUID kOne = {1, 0, 0, {0, 0, 0, 0, 0, 0, 0, 0}};
constexpr const char* kOneText = "00000000-0000-0000-0000-000000000000";

TEST(recordText, TheItemsDecideOnTheType) {
  EXPECT_EQ(Read("SchemaVersion=1\nPnP=p\n").type, vltComponentDataDictionary);
  EXPECT_EQ(Read("PnP=p\n").type, vltComponentResourceExpert);
  EXPECT_EQ(Read("x=p\n").type, vltComponentObjectExpert);
  EXPECT_EQ(Read("").type, vltComponentObjectExpert);
}

TEST(recordText, ADictionaryHasItsNumbers) {
  RecordText text = Read(
      "SchemaVersion=7\nFragmentRegistered=23\nLastInstalledSchemaVersion=6\nPrefix=\"p\"\n"
      "FileName=\"d\"\n");
  EXPECT_EQ(text.version, 2u);
  EXPECT_EQ(text.schemaVersion, 7u);
  EXPECT_EQ(text.fragmentRegistered, 23u);
  EXPECT_EQ(text.lastInstalledSchemaVersion, 6u);
  EXPECT_EQ(text.prefix, "p");
  EXPECT_EQ(text.file, "d");
  EXPECT_FALSE(LacksDirectory(text));
  EXPECT_EQ(Read("SchemaVersion=7\n").lastInstalledSchemaVersion, kNeverInstalled);
}

TEST(recordText, IdentifiersAreReadWithAndWithoutBraces) {
  std::string one = std::string(kOneText).replace(7, 1, "1");
  EXPECT_TRUE(Read("Identifier=\"" + one + "\"\n").identifier == kOne);
  EXPECT_TRUE(Read("Identifier=\"{" + one + "}\"\n").identifier == kOne);
  EXPECT_TRUE(Read("Identifier=\"one\"\n").identifier == GUID_NULL);
  EXPECT_TRUE(Read("").identifier == GUID_NULL);
}

TEST(recordText, AnEmptyFileNameOfAResourceExpertCountsAsAsked) {
  const char* items = "PnP=p\nFileName=\"\"\n";
  EXPECT_FALSE(Read(items).file);
  EXPECT_EQ(Read(items, EmptyFileName::Counts).file, "");
}

TEST(recordText, ABareNameOfAnExpertLacksItsDirectory) {
  EXPECT_TRUE(LacksDirectory(Read("FileName=e.vle\n")));
  EXPECT_FALSE(LacksDirectory(Read("FileName=/x/e.vle\n")));
  EXPECT_FALSE(LacksDirectory(Read("FileName=x\\\\e.vle\n")));
  EXPECT_FALSE(LacksDirectory(Read("x=1\n")));
}

}  // namespace
}  // namespace registrar

#include "ztini/Document.h"

#include <gtest/gtest.h>

#include <string>
#include <thread>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestDocument.h"

namespace {

using ztini::test::Document;
using ztini::test::FailFromAllocation;
using ztini::test::NewDocument;

TEST(Document, NewOneHasTheSettledDefaults) {
  Document doc = NewDocument();
  ASSERT_NE(doc, nullptr);
  EXPECT_EQ(doc->sections.count(), 0);
  EXPECT_EQ(doc->currentSection, nullptr);
  EXPECT_EQ(doc->sectionFlags, 0);
  EXPECT_EQ(doc->duplicateChecking, 1);
  EXPECT_EQ(doc->caseSensitive, 0);
  EXPECT_EQ(doc->lastItemLine, -1);
  EXPECT_EQ(ztini_PI_GetHandleSize(doc->scratch), 256u);
  EXPECT_EQ(doc->maxLineLength, 80);
  EXPECT_EQ(doc->breakCharacter, 0);
  EXPECT_EQ(doc->writeOptions, 14);
  EXPECT_EQ(doc->readOptions, 2);
  EXPECT_EQ(doc->firstBadLine, -1);
  EXPECT_EQ(doc->fileName, nullptr);
  EXPECT_EQ(doc->fileTimestamp, 0);
}

TEST(Document, ReservedMustBeZero) {
  EXPECT_EQ(IniNew(1), nullptr);
  EXPECT_EQ(IniNew(-1), nullptr);
}

TEST(Document, NewFailsWithNullAtEveryAllocation) {
  for (int number = 1; number <= 3; ++number) {
    FailFromAllocation fail(number);
    EXPECT_EQ(IniNew(0), nullptr) << number;
  }
}

TEST(Document, DisposeTakesNull) { IniDispose(nullptr); }

TEST(Document, SettersReplaceAndTellWhatWas) {
  Document doc = NewDocument();
  EXPECT_EQ(IniSetDuplicateChecking(doc.get(), 0), 1);
  EXPECT_EQ(IniSetDuplicateChecking(doc.get(), 7), 0);
  EXPECT_EQ(IniSetDuplicateChecking(doc.get(), 1), 7);
  EXPECT_EQ(IniSetReadOptions(doc.get(), 12), 1);
  EXPECT_EQ(doc->readOptions, 12);
  EXPECT_EQ(IniSetWriteOptions(doc.get(), -1, 32, 26), 1);
  EXPECT_EQ(doc->maxLineLength, -1);
  EXPECT_EQ(doc->breakCharacter, 32);
  EXPECT_EQ(doc->writeOptions, 26);
  EXPECT_EQ(IniSetDurability(doc.get(), IniDurability::Synced), IniDurability::None);
  EXPECT_EQ(IniSetDurability(doc.get(), IniDurability::None), IniDurability::Synced);
}

TEST(Document, SettersTakeNull) {
  EXPECT_EQ(IniSetDuplicateChecking(nullptr, 1), 0);
  EXPECT_EQ(IniSetReadOptions(nullptr, 1), 0);
  EXPECT_EQ(IniSetWriteOptions(nullptr, 1, 2, 3), 0);
  EXPECT_EQ(IniSetDurability(nullptr, IniDurability::Synced), IniDurability::None);
}

TEST(Document, RecordsAreTrimmedAndCarryTheDocumentsFlags) {
  Document doc = NewDocument();
  doc->sectionFlags = 77;
  IniSection* section = IniNewSection(doc.get(), "  a b\t");
  EXPECT_STREQ(section->name, "a b");
  EXPECT_EQ(section->flags, 77);
  EXPECT_EQ(section->line, -1);
  IniDisposeSection(section);
  IniEntry* entry = IniNewEntry(" n ", " \"v\" ", 0);
  EXPECT_STREQ(entry->name, "n");
  EXPECT_STREQ(entry->value, "\"v\"");
  EXPECT_EQ(entry->quote, 0);
  EXPECT_EQ(entry->line, -1);
  IniDisposeEntry(entry);
}

TEST(Document, QuotesAreRemovedAsTheOptionsSay) {
  const struct {
    int32_t options;
    const char *value, *expected;
    int32_t quote;
  } rows[] = {
      {2, "\"a\"", "a", 34},
      {2, "\"\"", "", 34},
      {2, "\"", "\"", 0},
      {2, "'a'", "'a'", 0},
      {4, "'a'", "a", 39},
      {4, "''", "", 39},
      {4, "'", "'", 0},
      {4, "\"a\"", "\"a\"", 0},
      {6, "\"'a'\"", "'a'", 34},
      {6, "'\"a\"'", "\"a\"", 39},
      {6, "'a\"", "'a\"", 0},
      {0, "\"a\"", "\"a\"", 0},
      {2, "\"a\" b", "\"a\" b", 0},
      {2, "a \"b\"", "a \"b\"", 0},
      {2, "\"a\"b\"", "a\"b", 34},
      {2, "\"\"a\"\"", "\"a\"", 34},
      {2, "\" a \"", " a ", 34},
      {2, "\"a\\\"", "a\\", 34},
  };
  for (const auto& row : rows) {
    IniEntry* entry = IniNewEntry("n", row.value, row.options);
    EXPECT_STREQ(entry->value, row.expected) << row.value;
    EXPECT_EQ(entry->quote, row.quote) << row.value;
    IniDisposeEntry(entry);
  }
}

TEST(Document, RecordsFailWithNullAtEveryAllocation) {
  Document doc = NewDocument();
  for (int number = 1; number <= 2; ++number) {
    FailFromAllocation fail(number);
    EXPECT_EQ(IniNewSection(doc.get(), "a"), nullptr) << number;
  }
  for (int number = 1; number <= 3; ++number) {
    FailFromAllocation fail(number);
    EXPECT_EQ(IniNewEntry("a", "b", 2), nullptr) << number;
  }
}

TEST(Document, DocumentsOfDifferentThreadsShareNothing) {
  const auto work = [] {
    std::string text = "[s]\n";
    for (int i = 0; i < 200; ++i) text += "n" + std::to_string(i) + "=v\n";
    vlt::test::TempDir dir;
    const std::string path = dir / "a.ini";
    vlt::test::WriteBytes(path, text);
    for (int round = 0; round < 20; ++round) {
      Document doc = NewDocument();
      EXPECT_EQ(IniReadFromFile(doc.get(), path.c_str()), 0);
      EXPECT_EQ(IniItemExists(doc.get(), "S", "N199"), 1);
      EXPECT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
    }
  };
  std::thread other(work);
  work();
  other.join();
}

}  // namespace

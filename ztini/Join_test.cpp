#include "ztini/Join.h"

#include <gtest/gtest.h>

#include <climits>
#include <string>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TestDocument.h"

namespace {

using ztini::test::Document;
using ztini::test::Parse;
using ztini::test::RawValue;
using ztini::test::Show;

TEST(Join, NamesOfPieces) {
  const struct {
    std::string name;
    int32_t result;
    size_t baseLength;
    long number;
  } rows[] = {
      {"Name Line0001", 1, 4, 1},
      {"Name Line1", 1, 4, 1},
      {"a  Line7", 1, 2, 7},
      {"Name Line0", 1, 4, 0},
      {"Name Line000000000000000000000000000001", 1, 4, 1},
      {"A Line" + std::to_string(LONG_MAX), 1, 1, LONG_MAX},
      {std::string(255, 'n') + " Line1", 1, 255, 1},
      {std::string(256, 'n') + " Line1", 0, 0, 0},
      {"A Line" + std::to_string(LONG_MAX) + "0", 0, 0, 0},
      {"a Line1b", 0, 0, 0},
      {"a Line1 Line2", 0, 0, 0},
      {"a Line", 0, 0, 0},
      {"a Line-1", 0, 0, 0},
      {"a Line+1", 0, 0, 0},
      {"a Line 1", 0, 0, 0},
      {"a line1", 0, 0, 0},
      {"a LINE1", 0, 0, 0},
      {"Line1", 0, 0, 0},
      {"aLine1", 0, 0, 0},
      {"plain", 0, 0, 0},
      {"", 0, 0, 0},
  };
  for (const auto& row : rows) {
    size_t baseLength = 0;
    long number = 0;
    EXPECT_EQ(AnalyzeItemName(row.name.c_str(), &baseLength, &number), row.result) << row.name;
    EXPECT_EQ(baseLength, row.baseLength) << row.name;
    EXPECT_EQ(number, row.number) << row.name;
  }
  EXPECT_EQ(AnalyzeItemName(nullptr, nullptr, nullptr), 0);
}

TEST(Join, RunsMergeIntoTheirFirstPiece) {
  const struct {
    const char *items, *expected;
  } rows[] = {
      {"Name Line0001=ab\nName Line0002=cd\nOther=1\n", "Name=abcd@2 Other=1@4"},
      {"Name Line0002=x\n", "Name Line0002=x@2"},
      {"Name Line0001=x\n", "Name=x@2"},
      {"A Line0001=x\nB Line0007=y\n", "A=xy@2"},
      {"A Line1=1\nA Line9=2\nA Line3=3\n", "A=123@2"},
      {"A Line1=1\nA Line0=2\n", "A=12@2"},
      {"A Line0=1\nA Line1=2\n", "A Line0=1@2 A=2@3"},
      // The repeat of "A Line2" goes to its first place, before the run.
      {"A Line2=0\nA Line1=1\nA Line2=2\n", "A Line2=2@4 A=1@3"},
      {"A Line1=1\nx=5\nA Line2=2\n", "A=1@2 x=5@3 A Line2=2@4"},
      {"A Line1=1\nB Line1=2\nB Line2=3\n", "A=1@2 B=23@3"},
      {"A Line1=\"1 \"\nA Line2=2\n", "A=\"1 2\"@2"},
      {"A Line1=1\nA Line2=\" 2\"\n", "A=1 2@2"},
      {"a  Line1=1\n", "a=1@2"},
      {"a Line1b=1\n", "a Line1b=1@2"},
      {"a Line1 Line2=1\n", "a Line1 Line2=1@2"},
      {"A=0\nA Line1=1\n", "A=0@2 A=1@3"},
      {"x=1\nA Line1=1\nA Line2=2\ny=2\nB Line1=3\nB Line2=4\nz=5\n",
       "x=1@2 A=12@3 y=2@5 B=34@6 z=5@8"},
      {"A Line99999999999999999999=1\n", "A Line99999999999999999999=1@2"},
      {"A Line1=1\nA Line99999999999999999999=2\n", "A=1@2 A Line99999999999999999999=2@3"},
      {"A Line00000000000000001=1\nA Line00000000000000002=2\n", "A=12@2"},
      {"Motion Line1=x\n", "Motion=x@2"},
  };
  for (const auto& row : rows) {
    Document doc = Parse(std::string("[s]\n") + row.items);
    EXPECT_EQ(Show(doc), std::string("[s@1] ") + row.expected) << row.items;
  }
}

TEST(Join, RunsEndWithTheirSection) {
  Document doc = Parse("[a]\nA Line1=1\n[b]\nA Line2=2\n");
  EXPECT_EQ(Show(doc), "[a@1] A=1@2 [b@3] A Line2=2@4");
}

TEST(Join, ReopenedSectionsJoinAcrossTheirParts) {
  Document doc = Parse("[a]\nA Line1=1\n[b]\n[a]\nA Line2=2\n");
  EXPECT_EQ(Show(doc), "[a@4] A=12@2 [b@3]");
}

TEST(Join, LookUpKnowsTheNewNames) {
  std::string text = "[s]\n";
  for (int i = 0; i < 50; ++i) text += "n" + std::to_string(i) + " Line1=v\n";
  Document doc = Parse(text);
  EXPECT_EQ(RawValue(doc, "s", "N49"), "v");
  EXPECT_EQ(RawValue(doc, "s", "n49 Line1"), "<absent>");
}

TEST(Join, ALongBaseIsAnOrdinaryItem) {
  const std::string base(256, 'n');
  Document doc = Parse("[s]\n" + base + " Line1=v\n");
  EXPECT_EQ(RawValue(doc, "s", (base + " Line1").c_str()), "v");
}

TEST(Join, AHundredThousandPiecesJoinInBoundedTime) {
  std::string text = "[s]\n", expected;
  for (int i = 1; i <= 100000; ++i) {
    text += "A Line" + std::to_string(i) + "=ab\n";
    expected += "ab";
  }
  Document doc = Parse(text);
  EXPECT_EQ(IniNumberOfItems(doc.get(), "s"), 1);
  EXPECT_EQ(RawValue(doc, "s", "A"), expected);
}

TEST(Join, WithoutMemoryTheRemainingRunsStayInPieces) {
  Document doc = Parse("[s]\na=1\nb=2\nc=3\nd=4\n");
  const char* const names[] = {"A Line1", "A Line2", "B Line1", "B Line2"};
  for (int i = 0; i < 4; ++i) {
    ztini::ReplaceName(doc->section(1)->item(i + 1), strdup(names[i]));
  }
  {
    ztini::test::FailFromAllocation fail(3);
    EXPECT_EQ(IniJoinPieces(doc.get()), kIniOutOfMemory);
  }
  EXPECT_EQ(Show(doc), "[s@1] A=12@2 B Line1=3@4 B Line2=4@5");
}

}  // namespace

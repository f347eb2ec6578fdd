#include <gtest/gtest.h>

#include <cstdio>
#include <string>
#include <vector>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestDocument.h"

namespace {

using ztini::test::Document;
using ztini::test::FailFromAllocation;
using ztini::test::NewDocument;
using ztini::test::Parse;
using ztini::test::RawValue;
using ztini::test::Read;
using ztini::test::WrittenLines;
using ztini::test::WrittenText;

using Lines = std::vector<std::string>;

Document WithItem(const char* name, const std::string& value, int32_t quote, int32_t limit,
                  int32_t breakCharacter = 0, int32_t options = 14) {
  Document doc = NewDocument();
  IniPut(doc.get(), "s", name, "v", quote);
  // Not through IniPut, which would trim it.
  IniReplaceValue(doc->section(1)->item(1), strdup(value.c_str()));
  IniSetWriteOptions(doc.get(), limit, breakCharacter, options);
  return doc;
}

// The lines of the one item.
Lines ItemLines(const Document& doc) {
  Lines lines = WrittenLines(doc);
  EXPECT_EQ(lines.front(), "[s]");
  EXPECT_EQ(lines.back(), "");
  return Lines(lines.begin() + 1, lines.end() - 1);
}

TEST(Writer, DefaultsPutABlankLineAfterEverySection) {
  Document doc = NewDocument();
  IniPut(doc.get(), "a", "x", "1", 0);
  IniPut(doc.get(), "b", "y", "2", '"');
  EXPECT_EQ(WrittenText(doc), "[a]\nx = 1\n\n[b]\ny = \"2\"\n\n");
}

TEST(Writer, SeparatorFollowsItsOption) {
  Document doc = NewDocument();
  IniPut(doc.get(), "a", "x", "1", 0);
  IniSetWriteOptions(doc.get(), 80, 0, 0);
  EXPECT_EQ(WrittenText(doc), "[a]\nx=1\n\n");
}

TEST(Writer, EmptyDocumentAndEmptySections) {
  Document doc = NewDocument();
  int32_t status = 7;
  EXPECT_EQ(WrittenLines(doc, &status), Lines{});
  EXPECT_EQ(status, 0);
  EXPECT_EQ(WrittenText(Parse("[a]\n[b]\n")), "[a]\n\n[b]\n\n");
}

TEST(Writer, NullArgumentsWriteNothing) {
  EXPECT_EQ(IniWrite(nullptr, IniFileOutputFunc, nullptr), 0);
  EXPECT_EQ(IniWrite(NewDocument().get(), nullptr, nullptr), 0);
  EXPECT_EQ(ztini_IniWriteToFileHelper(nullptr, nullptr), 0);
}

TEST(Writer, TightOptionSetsOnlyNewSectionsApart) {
  Document doc = Parse("[a]\nx=1\n\n\n[b]\ny=2\n");
  IniSetWriteOptions(doc.get(), -1, 32, 26);
  EXPECT_EQ(WrittenText(doc), "[a]\nx = 1\n[b]\ny = 2\n");
  IniPut(doc.get(), "new", "z", "3", 0);
  EXPECT_EQ(WrittenText(doc), "[a]\nx = 1\n[b]\ny = 2\n\n[new]\nz = 3\n\n");
  IniPut(doc.get(), "newer", "z", "4", 0);
  EXPECT_EQ(WrittenText(doc), "[a]\nx = 1\n[b]\ny = 2\n\n[new]\nz = 3\n\n[newer]\nz = 4\n\n");
  // Once read back, nothing is new.
  EXPECT_EQ(Read(doc, WrittenText(doc)), 0);
  EXPECT_EQ(WrittenText(doc), "[a]\nx = 1\n[b]\ny = 2\n[new]\nz = 3\n[newer]\nz = 4\n");
}

TEST(Writer, TightOptionInAWhollyNewDocument) {
  Document doc = NewDocument();
  IniPut(doc.get(), "a", "x", "1", 0);
  IniPut(doc.get(), "b", "x", "1", 0);
  IniSetWriteOptions(doc.get(), -1, 32, 26);
  EXPECT_EQ(WrittenText(doc), "[a]\nx = 1\n\n[b]\nx = 1\n\n");
}

TEST(Writer, TheNullSectionHasNoHeader) {
  Document doc = Parse("x=1\n[a]\ny=2\n", 10);
  EXPECT_EQ(WrittenText(doc), "x = 1\n\n[a]\ny = 2\n\n");
  IniSetWriteOptions(doc.get(), -1, 0, 24);
  EXPECT_EQ(WrittenText(doc), "x = 1\n[a]\ny = 2\n");
  Document literal = Parse("[a]\ny=2\n[(null)]\nx=1\n");
  IniSetWriteOptions(literal.get(), -1, 0, 24);
  EXPECT_EQ(WrittenText(literal), "[a]\ny = 2\nx = 1\n");
  Document put = Parse("[a]\ny=2\n");
  IniPut(put.get(), "(null)", "x", "1", 0);
  IniSetWriteOptions(put.get(), -1, 0, 24);
  EXPECT_EQ(WrittenText(put), "[a]\ny = 2\n\nx = 1\n");
}

TEST(Writer, EmptyValues) {
  Document doc = NewDocument();
  IniPut(doc.get(), "s", "key", "", 0);
  IniPut(doc.get(), "s", "quoted", "", '"');
  EXPECT_EQ(WrittenText(doc), "[s]\nkey = \nquoted = \"\"\n\n");
  Document back = Parse(WrittenText(doc));
  EXPECT_EQ(RawValue(back, "s", "key"), "<absent>");
  EXPECT_EQ(RawValue(back, "s", "quoted"), "");
}

TEST(Writer, OneLineUpToTheLimit) {
  // Name 4, separator 3, quotes 2.
  EXPECT_EQ(ItemLines(WithItem("Name", std::string(71, 'v'), '"', 80)).size(), 1u);
  EXPECT_EQ(ItemLines(WithItem("Name", std::string(72, 'v'), '"', 80)).size(), 2u);
  EXPECT_EQ(ItemLines(WithItem("Name", std::string(73, 'v'), 0, 80)).size(), 1u);
  EXPECT_EQ(ItemLines(WithItem("Name", std::string(74, 'v'), 0, 80)).size(), 2u);
  EXPECT_EQ(ItemLines(WithItem("Name", std::string(75, 'v'), 0, 80, 0, 6)).size(), 1u);
  EXPECT_EQ(ItemLines(WithItem("Name", std::string(76, 'v'), 0, 80, 0, 6)).size(), 2u);
  EXPECT_EQ(ItemLines(WithItem("Name", std::string(70000, 'v'), '"', -1)).size(), 1u);
}

TEST(Writer, QuotedPiecesHoldRoomBytesAndReadBack) {
  std::string value;
  for (int i = 0; value.size() < 200; ++i) value += " part " + std::to_string(i);
  Document doc = WithItem("Name", value, '"', 80);
  const size_t room = 80 - 4 - 12 - 2;
  const Lines lines = ItemLines(doc);
  ASSERT_EQ(lines.size(), (value.size() + room - 1) / room);
  for (size_t i = 0; i < lines.size(); ++i) {
    EXPECT_EQ(lines[i], "Name Line000" + std::to_string(i + 1) + " = \"" +
                            value.substr(i * room, room) + "\"");
  }
  EXPECT_EQ(RawValue(Parse(WrittenText(doc)), "s", "Name"), value);
}

TEST(Writer, UnquotedPiecesSubtractTheSameTwelve) {
  const std::string value(30, 'v');
  EXPECT_EQ(ItemLines(WithItem("Name", value, 0, 30)),
            (Lines{"Name Line0001 = " + std::string(14, 'v'),
                   "Name Line0002 = " + std::string(14, 'v'), "Name Line0003 = vv"}));
  EXPECT_EQ(ItemLines(WithItem("Name", value, 0, 30, 0, 6)),
            (Lines{"Name Line0001=" + std::string(14, 'v'), "Name Line0002=" + std::string(14, 'v'),
                   "Name Line0003=vv"}));
}

TEST(Writer, PiecesEndAfterTheLastBreakCharacter) {
  const struct {
    const char* value;
    Lines pieces;
  } rows[] = {
      // Space is 10.
      {"aa bb cc dd ee ff gg hh", {"aa bb cc ", "dd ee ff ", "gg hh"}},
      {"aaaaaaaaaaaaaaaaaa bb", {"aaaaaaaaaa", "aaaaaaaa ", "bb"}},
      {"aaaa bbbbbbbbbbbbbbbbb", {"aaaa ", "bbbbbbbbbb", "bbbbbbb"}},
      // Exactly space left: still breaks. Less: all of it.
      {"aaaa aaaa bbbb cc dd", {"aaaa aaaa ", "bbbb cc ", "dd"}},
      {"aaaa aaaa aaaaaaaaa bbbb cc d", {"aaaa aaaa ", "aaaaaaaaa ", "bbbb cc d"}},
      {"                    ", {"          ", "          "}},
      {"aaaaaaaaa bbbbbbbbbb", {"aaaaaaaaa ", "bbbbbbbbbb"}},
  };
  for (const auto& row : rows) {
    Document doc = WithItem("N", row.value, '"', 25, ' ');
    Lines expected;
    for (size_t i = 0; i < row.pieces.size(); ++i) {
      expected.push_back("N Line000" + std::to_string(i + 1) + " = \"" + row.pieces[i] + "\"");
    }
    EXPECT_EQ(ItemLines(doc), expected) << row.value;
    EXPECT_EQ(RawValue(Parse(WrittenText(doc)), "s", "N"), row.value);
  }
}

TEST(Writer, UnquotedPiecesLoseWhiteSpaceAtTheBreak) {
  Document doc = WithItem("N", "aa bb cc dd ee ff", 0, 20, ' ');
  EXPECT_EQ(RawValue(Parse(WrittenText(doc)), "s", "N"), "aa bbcc ddee ff");
}

TEST(Writer, NoRoomBesideTheNameIsAnError) {
  int32_t status = 0;
  const Lines lines =
      WrittenLines(WithItem(std::string(68, 'n').c_str(), "vvvvvvvvvv", 0, 80), &status);
  EXPECT_EQ(status, kIniNoRoom);
  EXPECT_EQ(lines, Lines{"[s]"});
  WrittenLines(WithItem(std::string(67, 'n').c_str(), "vvvvvvvvvvvv", 0, 80), &status);
  EXPECT_EQ(status, 0);
  WrittenLines(WithItem(std::string(66, 'n').c_str(), "vvvvvvvvvvvv", '"', 80), &status);
  EXPECT_EQ(status, kIniNoRoom);
  for (int32_t limit : {0, -2, INT32_MIN}) {
    WrittenLines(WithItem("n", "v", 0, limit), &status);
    EXPECT_EQ(status, kIniNoRoom) << limit;
  }
}

TEST(Writer, PieceNumbersGrowBeyondFourDigits) {
  const Lines lines = ItemLines(WithItem("N", std::string(10001, 'v'), 0, 14));
  ASSERT_EQ(lines.size(), 10001u);
  EXPECT_EQ(lines[9998], "N Line9999 = v");
  EXPECT_EQ(lines[9999], "N Line10000 = v");
  EXPECT_EQ(lines[10000], "N Line10001 = v");
}

TEST(Writer, AnOutputFailureStopsTheWriting) {
  const auto output = [](void* left, const char*) -> int32_t {
    return --*static_cast<int*>(left) < 0 ? -99 : 0;
  };
  Document doc = Parse("[a]\nx=1\n[b]\ny=2\n");
  for (int lines = 0; lines < 6; ++lines) {
    int left = lines;
    EXPECT_EQ(IniWrite(doc.get(), output, &left), -99) << lines;
    EXPECT_EQ(left, -1) << lines;
  }
  int left = 6;
  EXPECT_EQ(IniWrite(doc.get(), output, &left), 0);
}

TEST(Writer, WithoutMemoryForALineTheResultIsOutOfMemory) {
  Document doc = Parse("[a]\nx=1\n");
  FailFromAllocation fail(1);
  int32_t status = 0;
  WrittenLines(doc, &status);
  EXPECT_EQ(status, kIniOutOfMemory);
}

TEST(Writer, FileOutputKeepsLineFeedsAndAddsOne) {
  vlt::test::TempDir dir;
  const std::string path = dir / "out";
  FILE* file = fopen(path.c_str(), "wb");
  EXPECT_EQ(IniFileOutputFunc(file, "a\nb"), 0);
  EXPECT_EQ(IniFileOutputFunc(file, ""), 0);
  EXPECT_EQ(ztini_WriteStringToFile(file, "c\n\nd"), 0);
  fclose(file);
  EXPECT_EQ(vlt::test::ReadBytes(path), "a\nb\n\nc\n\nd");
}

TEST(Writer, HelperWritesTheMarkOnlyUnderItsOption) {
  vlt::test::TempDir dir;
  const std::string path = dir / "out";
  Document doc = Parse("[a]\nx=1\n");
  for (int32_t mark : {0, 1}) {
    IniSetWriteOptions(doc.get(), 80, 0, mark);
    FILE* file = fopen(path.c_str(), "wb");
    EXPECT_EQ(ztini_IniWriteToFileHelper(doc.get(), file), 0);
    fclose(file);
    EXPECT_EQ(vlt::test::ReadBytes(path), std::string(mark ? "\xEF\xBB\xBF" : "") + "[a]\nx=1\n\n");
  }
}

TEST(Writer, AFullDeviceIsAWriteFailure) {
  FILE* full = fopen("/dev/full", "wb");
  ASSERT_NE(full, nullptr);
  Document doc = Parse("[a]\nx=1\n");
  EXPECT_EQ(ztini_IniWriteToFileHelper(doc.get(), full), kIniWriteFailed);  // at the flush
  setvbuf(full, nullptr, _IONBF, 0);
  EXPECT_EQ(IniFileOutputFunc(full, "x"), kIniWriteFailed);
  IniSetWriteOptions(doc.get(), 80, 0, kIniWriteMark);
  EXPECT_EQ(ztini_IniWriteToFileHelper(doc.get(), full), kIniWriteFailed);
  fclose(full);
}

TEST(Writer, WritingLeavesTheDocumentAlone) {
  Document doc = Parse("[a]\nx=1\n");
  IniPut(doc.get(), "new", "y", "2", 34);
  const std::string before = ztini::test::Show(doc);
  WrittenLines(doc);
  EXPECT_EQ(ztini::test::Show(doc), before);
}

}  // namespace

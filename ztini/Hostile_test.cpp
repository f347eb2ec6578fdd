// Input that is damaged or made to hurt: it ends in a defined result, in bounded time.
#include <gtest/gtest.h>

#include <chrono>
#include <string>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestDocument.h"

namespace {

using vlt::test::TempDir;
using vlt::test::WriteBytes;
using ztini::test::Document;
using ztini::test::NewDocument;
using ztini::test::Parse;
using ztini::test::RawValue;
using ztini::test::WrittenText;
using namespace std::string_literals;

// Far above what a linear engine needs, far below what a quadratic one would.
class Deadline {
 public:
  ~Deadline() { EXPECT_LT(std::chrono::steady_clock::now() - m_begin, std::chrono::seconds(60)); }

 private:
  std::chrono::steady_clock::time_point m_begin = std::chrono::steady_clock::now();
};

TEST(Hostile, AMillionSectionsAreReadFoundWrittenAndDisposed) {
  Deadline deadline;
  constexpr int kSections = 1000000;
  std::string text;
  for (int i = 0; i < kSections; ++i) text += "[Section " + std::to_string(i) + "]\n";
  TempDir dir;
  const std::string path = dir / "a.ini";
  WriteBytes(path, text);
  Document doc = NewDocument();
  ASSERT_EQ(IniReadFromFile(doc.get(), path.c_str()), 0);
  EXPECT_EQ(IniNumberOfSections(doc.get()), kSections);
  for (int i = 0; i < kSections; i += 7) {
    const std::string name = "SECTION " + std::to_string(i);
    ASSERT_EQ(IniLineOfSection(doc.get(), name.c_str()), i + 1);
  }
  IniSetWriteOptions(doc.get(), -1, 32, 26);
  EXPECT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
  EXPECT_TRUE(vlt::test::ReadBytes(path) == text);
}

TEST(Hostile, AMillionItemsOfOneSection) {
  Deadline deadline;
  constexpr int kItems = 1000000;
  std::string text = "[s]\n";
  for (int i = 0; i < kItems; ++i) text += "i" + std::to_string(i) + "=v\n";
  Document doc = Parse(text);
  EXPECT_EQ(IniNumberOfItems(doc.get(), "s"), kItems);
  EXPECT_EQ(RawValue(doc, "s", "I999999"), "v");
}

TEST(Hostile, AMillionRepeatsOfOneNameWithoutDuplicateChecking) {
  Deadline deadline;
  constexpr int kRepeats = 300000;
  std::string text;
  for (int i = 0; i < kRepeats; ++i) text += "[s]\nx=" + std::to_string(i) + "\n";
  Document doc = Parse(text, 2, 0);
  EXPECT_EQ(IniNumberOfSections(doc.get()), kRepeats);
  EXPECT_EQ(RawValue(doc, "s", "x"), "0");
  for (int i = 1; i < 1000; ++i) {
    ASSERT_EQ(IniRemoveSection(doc.get(), "s"), 1);
    ASSERT_EQ(RawValue(doc, "S", "X"), std::to_string(i));
  }
}

// What reading takes from the heap, tables that were outgrown included. A file may hold 256 MiB, and
// the shortest records take 4 bytes of it, so it is these figures that keep a planted file from taking
// all memory of a machine.
struct Cost {
  double bytes, blocks;  // of one record
};

Cost CostOfReading(const std::string& text, int records) {
  Document doc = NewDocument();
  IniSetReadOptions(doc.get(), 22);
  ztini::test::CountAllocations count;
  EXPECT_EQ(ztini::test::Read(doc, text), 0);
  return {static_cast<double>(count.bytes()) / records,
          static_cast<double>(count.blocks()) / records};
}

std::string Repeat(int records, std::string (*record)(int)) {
  std::string text;
  for (int i = 0; i < records; ++i) text += record(i);
  return text;
}

TEST(Hostile, RecordsOfAFileTakeFewBytesAndFewBlocks) {
  constexpr int kRecords = 100000;
  const struct {
    const char* what;
    std::string text;
    double bytes, blocks;
  } rows[] = {
      {"empty sections", Repeat(kRecords, [](int i) { return "[" + std::to_string(i) + "]\n"; }),
       128, 0.01},
      {"items of one section",
       "[s]\n" + Repeat(kRecords, [](int i) { return std::to_string(i) + "=\"\"\n"; }), 96, 0.01},
      {"sections of one item",
       Repeat(kRecords, [](int i) { return "[" + std::to_string(i) + "]\na=1\n"; }), 164, 0.01},
      {"sections of three items",
       Repeat(kRecords, [](int i) { return "[" + std::to_string(i) + "]\na=1\nb=1\nc=1\n"; }), 264,
       1.01},
      {"one item again and again",
       "[s]\n" + Repeat(kRecords, [](int i) { return "a=" + std::to_string(i) + "\n"; }), 8, 1.01},
  };
  for (const auto& row : rows) {
    const Cost cost = CostOfReading(row.text, kRecords);
    EXPECT_LT(cost.bytes, row.bytes) << row.what;
    EXPECT_LT(cost.blocks, row.blocks) << row.what;
  }
}

// A text that is read as a whole is the document's, and few blocks beside it.
TEST(Hostile, ATextIsReadIntoAHandfulOfBlocks) {
  constexpr int kRecords = 100000;
  const std::string text = Repeat(
      kRecords, [](int i) { return "[" + std::to_string(i) + "]\na=\"1\"\nb=\"2\"\nc=3\n"; });
  Document doc = NewDocument();
  ztini::test::CountAllocations count;
  EXPECT_EQ(IniReadBytes(doc.get(), text.data(), text.size()), 0);
  EXPECT_LT(static_cast<double>(count.bytes() - text.size()) / kRecords, 240);
  EXPECT_LT(count.blocks(), 40u);
}

TEST(Hostile, ManyPutsAndRemovalsFromEitherEnd) {
  Deadline deadline;
  constexpr int kCount = 200000;
  Document doc = NewDocument();
  for (int i = 0; i < kCount; ++i) {
    const std::string n = std::to_string(i);
    ASSERT_EQ(IniPut(doc.get(), ("s" + n).c_str(), "x", n.c_str(), 0), 1);
    ASSERT_EQ(IniPut(doc.get(), "all", n.c_str(), "v", 0), 1);
  }
  for (int i = 0; i < kCount / 2; ++i) {
    ASSERT_EQ(IniRemoveItem(doc.get(), "all", std::to_string(i).c_str()), 1);
    ASSERT_EQ(IniRemoveItem(doc.get(), "all", std::to_string(kCount - 1 - i).c_str()), 1);
    ASSERT_EQ(IniRemoveSection(doc.get(), ("S" + std::to_string(i)).c_str()), 1);
  }
  EXPECT_EQ(IniNumberOfItems(doc.get(), "all"), 0);
  EXPECT_EQ(IniNumberOfSections(doc.get()), kCount / 2 + 1);
}

TEST(Hostile, NamesOfHighBytesSpreadLikeAnyOther) {
  Deadline deadline;
  std::string text;
  constexpr int kSections = 300000;
  for (int i = 0; i < kSections; ++i) {
    std::string name;
    for (int rest = i, n = 0; n < 4; ++n, rest /= 64) name += static_cast<char>(0x80 + rest % 64);
    text += "[" + name + "]\n";
  }
  EXPECT_EQ(IniNumberOfSections(Parse(text).get()), kSections);
}

TEST(Hostile, ValuesAndNamesOf65536Bytes) {
  const std::string big(65536, 'b');
  Document doc = Parse("[" + big + "]\n" + big + "=\"" + big + "\"\n");
  EXPECT_EQ(RawValue(doc, big.c_str(), big.c_str()), big);
  char buffer[100];
  EXPECT_EQ(IniGetStringIntoBuffer(doc.get(), big.c_str(), big.c_str(), buffer, 100), 1);
  EXPECT_EQ(std::string(buffer), big.substr(0, 99));
  IniSetWriteOptions(doc.get(), -1, 32, 26);
  EXPECT_EQ(WrittenText(doc), "[" + big + "]\n" + big + " = \"" + big + "\"\n");
}

TEST(Hostile, ALineOfMegabytesWithoutAnEnd) {
  Deadline deadline;
  const std::string huge(20000000, 'h');
  EXPECT_EQ(RawValue(Parse("[s]\nx=" + huge), "s", "x").size(), huge.size());
  EXPECT_EQ(IniNumberOfSections(Parse(std::string(20000000, '[')).get()), 0);
  EXPECT_EQ(IniNumberOfSections(Parse(std::string(5000000, '\0')).get()), 0);
}

TEST(Hostile, NulsEndLinesWhereverTheyStand) {
  EXPECT_EQ(ztini::test::Show(Parse("[s]\nx=a\0b=c\n\0\0y=2\n"s)), "[s@1] x=a@2 b=c@3 y=2@5");
}

TEST(Hostile, LineFeedsInNamesAndValuesBreakLinesAndNothingElse) {
  Document doc = NewDocument();
  IniPut(doc.get(), "a\nb", "x\ny", "1\n[c]\nz=2", 0);
  EXPECT_EQ(RawValue(doc, "A\nB", "X\nY"), "1\n[c]\nz=2");
  EXPECT_EQ(WrittenText(doc), "[a\nb]\nx\ny = 1\n[c]\nz=2\n\n");
  EXPECT_EQ(ztini::test::Show(Parse(WrittenText(doc))), "[c@5] z=2@6");
}

TEST(Hostile, BracketsAndSeparatorsInPutNames) {
  Document doc = NewDocument();
  IniPut(doc.get(), "a]b", "x=y", "1", 0);
  IniPut(doc.get(), "a]b", ";c", "1", 0);
  EXPECT_EQ(ztini::test::Show(Parse(WrittenText(doc))), "[a@1] x=y = 1@2");
}

// Every file of up to four bytes over the characters that mean something.
TEST(Hostile, EveryShortFileIsReadUnderEveryOption) {
  const std::string alphabet = "\n\r\0;[]=:\"' x1\xFF\xFE"s;
  std::string bytes;
  for (size_t i = 0; i < alphabet.size() * alphabet.size() * alphabet.size(); ++i) {
    bytes = "[s]\n";
    for (size_t rest = i, n = 0; n < 3; ++n, rest /= alphabet.size()) {
      bytes += alphabet[rest % alphabet.size()];
    }
    for (int32_t options : {0, 2, 15}) {
      Document doc = Parse(bytes, options);
      ASSERT_NE(doc, nullptr);
      Document again = Parse(WrittenText(doc), options | 1);
      ASSERT_NE(again, nullptr);
    }
  }
}

// Random bytes from the same characters: what was read, written and read again holds still.
TEST(Hostile, WrittenDocumentsReadBackAsThemselves) {
  const std::string alphabet = "\n\n\n[]]==;:\"'\\ xyzab Line1"s;
  uint32_t random = 20260101;
  for (int round = 0; round < 3000; ++round) {
    std::string bytes = "[s]\n";
    for (int i = 0; i < 120; ++i) {
      random = random * 1664525u + 1013904223u;
      bytes += alphabet[(random >> 16) % alphabet.size()];
    }
    Document first = Parse(bytes);
    IniSetWriteOptions(first.get(), -1, 0, 26);
    const std::string once = WrittenText(first);
    Document second = Parse(once);
    IniSetWriteOptions(second.get(), -1, 0, 26);
    ASSERT_EQ(IniNumberOfSections(first.get()), IniNumberOfSections(second.get())) << bytes;
    if (bytes.find(" Line1") != std::string::npos) continue;
    ASSERT_EQ(WrittenText(second), once) << bytes;
  }
}

}  // namespace

// A save takes what has not changed from the save before, or from the bytes that were read. The judge
// is the way that makes every line again: IniWrite.
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <random>
#include <string>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestDocument.h"
#include "ztini/Render.h"

namespace {

using vlt::test::ReadBytes;
using vlt::test::TempDir;
using ztini::test::Document;
using ztini::test::FailFromAllocation;
using ztini::test::NewDocument;
using ztini::test::WrittenText;

ztini::TextBuffer TextOf(std::string_view bytes) {
  ztini::TextBuffer text;
  memcpy(text.fill(bytes.size()), bytes.data(), bytes.size());
  return text;
}

class RandomEdits {
 public:
  explicit RandomEdits(unsigned seed) : m_random(seed) {
    IniSetWriteOptions(m_doc.get(), -1, ' ', options());
    IniSetReadOptions(m_doc.get(), kIniReadDoubleQuotes | kIniReadSingleQuotes);
  }

  // One to four edits; afterwards the file holds what IniWrite makes.
  void step() {
    for (int n = below(4); n >= 0; --n) edit();
    std::string expected = WrittenText(m_doc);
    ASSERT_EQ(IniWriteToFile(m_doc.get(), m_path.c_str()), 0);
    ASSERT_EQ(ReadBytes(m_path), expected);
    if (below(2) && IniIsSettled(m_doc.get())) IniTakeAsRead(m_doc.get());
  }

 private:
  int below(int limit) { return static_cast<int>(m_random() % static_cast<unsigned>(limit)); }
  std::string name(const char* head) { return head + std::to_string(below(8)); }
  int32_t options() {
    return kIniWriteSafely | (below(2) ? kIniWriteSpaces : 0) | (below(2) ? kIniWriteTight : 0);
  }

  void edit() {
    const std::string section = below(12) ? name("s") : kIniNullSectionName, item = name("i");
    switch (below(16)) {
      case 0:
        IniRemoveItem(m_doc.get(), section.c_str(), item.c_str());
        break;
      case 1:
        IniRemoveSection(m_doc.get(), section.c_str());
        break;
      case 2:
        IniRenameSection(m_doc.get(), section.c_str(), name("r").c_str());
        break;
      case 3:
        IniSetWriteOptions(m_doc.get(), below(2) ? -1 : 40, ' ', options());
        break;
      case 4:
        if (IniReadFromFile(m_doc.get(), m_path.c_str()) == 0 && below(4)) keepSource();
        break;
      case 5:
        EXPECT_LT(IniWriteToFile(m_doc.get(), (m_dir / "no/file.ini").c_str()), 0);
        break;
      case 6: {
        FailFromAllocation failing(below(6));
        IniWriteToFile(m_doc.get(), m_path.c_str());
        break;
      }
      default:
        IniPut(m_doc.get(), section.c_str(), item.c_str(),
               std::string(static_cast<size_t>(below(60)), 'v').c_str(), below(2) ? '"' : 0);
    }
  }

  // Often the file's bytes as they are, sometimes others: the result must not depend on them.
  void keepSource() {
    std::string bytes = ReadBytes(m_path);
    const size_t at = bytes.size() * static_cast<size_t>(below(8)) / 8;
    switch (below(6)) {
      case 0:
        bytes.resize(at);
        break;
      case 1:
        bytes.insert(at, "x");
        break;
      case 2:
        bytes += "; more\n";
    }
    IniKeepSource(m_doc.get(), TextOf(bytes));
  }

  std::mt19937 m_random;
  TempDir m_dir;
  std::string m_path = m_dir / "a.ini";
  Document m_doc = NewDocument();
};

TEST(WriterReuse, EverySaveAfterRandomEditsIsWhatTheLinesAre) {
  const char* full = getenv("VLT_FULL");
  const unsigned seeds = full && *full == '1' ? 5000 : 200;
  for (unsigned seed = 0; seed < seeds && !HasFatalFailure(); ++seed) {
    SCOPED_TRACE(seed);
    RandomEdits edits(seed);
    for (int step = 0; step < 40 && !HasFatalFailure(); ++step) edits.step();
  }
}

// Documents of many steps of the comparison, with a change at each of their sections in turn.
TEST(WriterReuse, ATextGoesOnInItsSourceFromTheFirstDifferenceOn) {
  constexpr int kSections = 60;
  std::string source;
  for (int n = 0; n < kSections; ++n) {
    source += "[s" + std::to_string(n) + "]\nname = " + std::string(400, 'v') + "\nother = 1\n";
  }
  for (int changed = -1; changed < kSections; ++changed) {
    for (const char* value : {"", "22", "a longer one than before"}) {
      Document doc = NewDocument();
      IniSetWriteOptions(doc.get(), -1, ' ', kIniWriteSpaces | kIniWriteTight);
      ASSERT_EQ(IniReadBytes(doc.get(), source.data(), source.size()), 0);
      IniKeepSource(doc.get(), TextOf(source));
      const std::string section = "s" + std::to_string(changed);
      if (changed >= 0) IniPut(doc.get(), section.c_str(), "other", value, 0);
      ztini::TextBuffer text;
      size_t unchanged = 0;
      ASSERT_EQ(ztini::IniRender(doc.get(), &text, &unchanged), 0);
      EXPECT_EQ(text.view(), WrittenText(doc)) << changed;
      ASSERT_LE(unchanged, text.size());
      EXPECT_EQ(text.view().substr(0, unchanged), source.substr(0, unchanged));
      EXPECT_EQ(unchanged == text.size(), changed < 0) << changed;
      EXPECT_EQ(text.view() == source, changed < 0);
    }
  }
}

TEST(WriterReuse, AShorterTextThanItsSourceIsABeginningOfIt) {
  const std::string source = "[a]\nx=1\n[b]\ny=2\n";
  Document doc = NewDocument();
  IniSetWriteOptions(doc.get(), -1, ' ', kIniWriteTight);
  ASSERT_EQ(IniReadBytes(doc.get(), source.data(), source.size()), 0);
  IniKeepSource(doc.get(), TextOf(source));
  IniRemoveSection(doc.get(), "b");
  ztini::TextBuffer text;
  size_t unchanged = 0;
  ASSERT_EQ(ztini::IniRender(doc.get(), &text, &unchanged), 0);
  EXPECT_EQ(text.view(), "[a]\nx=1\n");
  EXPECT_EQ(unchanged, text.size());
}

TEST(WriterReuse, WithoutMemoryForTheTextTheNextSaveIsWhole) {
  const std::string source = "[a]\nx=1\n";
  for (int allocation = 0;; ++allocation) {
    Document doc = NewDocument();
    IniSetWriteOptions(doc.get(), -1, ' ', kIniWriteTight);
    ASSERT_EQ(IniReadBytes(doc.get(), source.data(), source.size()), 0);
    IniKeepSource(doc.get(), TextOf(source));
    IniPut(doc.get(), "a", "x", "2", 0);
    ztini::TextBuffer text;
    int32_t status;
    {
      FailFromAllocation failing(allocation);
      status = ztini::IniRender(doc.get(), &text);
    }
    if (status == 0) {
      EXPECT_GT(allocation, 0);
      break;
    }
    EXPECT_EQ(status, kIniOutOfMemory);
    ztini::TextBuffer again;
    size_t unchanged = 1;
    ASSERT_EQ(ztini::IniRender(doc.get(), &again, &unchanged), 0);
    EXPECT_EQ(again.view(), "[a]\nx=2\n");
    EXPECT_EQ(unchanged, 0u);
  }
}

// The mark is all of the text then: no line is made that would see the failure.
TEST(WriterReuse, WithoutMemoryForTheMarkOfAnEmptyDocumentThereIsNoText) {
  const std::string source = "; no section\n";
  for (bool withSource : {false, true}) {
    Document doc = NewDocument();
    IniSetWriteOptions(doc.get(), -1, ' ', kIniWriteMark);
    ASSERT_EQ(IniReadBytes(doc.get(), source.data(), source.size()), 0);
    if (withSource) IniKeepSource(doc.get(), TextOf(source));
    ztini::TextBuffer text;
    FailFromAllocation failing(1);
    EXPECT_EQ(ztini::IniRender(doc.get(), &text), kIniOutOfMemory) << withSource;
  }
}

TEST(WriterReuse, ASaveThatFailedLeavesNothingToCopyFrom) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  Document doc = NewDocument();
  for (const char* section : {"a", "b", "c"}) IniPut(doc.get(), section, "x", "1", 0);
  for (int saves = 0; saves < 2; ++saves) ASSERT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
  ASSERT_GT(doc->rendering.size(), 0u);
  IniPut(doc.get(), "b", "x", "longer than before", 0);
  EXPECT_LT(IniWriteToFile(doc.get(), (dir / "no/a.ini").c_str()), 0);
  ASSERT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
  EXPECT_EQ(ReadBytes(path), "[a]\nx = 1\n\n[b]\nx = longer than before\n\n[c]\nx = 1\n\n");
}

TEST(WriterReuse, ADocumentThatIsSavedOnceKeepsNoSecondText) {
  TempDir dir;
  const std::string path = dir / "a.ini";
  Document doc = NewDocument();
  IniPut(doc.get(), "a", "x", "1", 0);
  for (int reads = 0; reads < 2; ++reads) {
    ASSERT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
    EXPECT_EQ(doc->rendering.size(), 0u);
    ASSERT_EQ(IniWriteToFile(doc.get(), path.c_str()), 0);
    EXPECT_EQ(doc->rendering.size(), ReadBytes(path).size());
    ASSERT_EQ(IniReadFromFile(doc.get(), path.c_str()), 0);
    EXPECT_EQ(doc->rendering.size(), 0u);
  }
}

}  // namespace

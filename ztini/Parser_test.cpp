#include <gtest/gtest.h>

#include <string>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TestDocument.h"

namespace {

using ztini::test::Document;
using ztini::test::FailFromAllocation;
using ztini::test::MemoryLines;
using ztini::test::NewDocument;
using ztini::test::Parse;
using ztini::test::RawValue;
using ztini::test::Read;
using ztini::test::Show;
using namespace std::string_literals;

struct Row {
  const char* text;
  int32_t options;
  const char* expected;
  int32_t firstBadLine;
};

void Check(const Row& row, int32_t duplicateChecking = 1) {
  Document doc = Parse(row.text, row.options, duplicateChecking);
  ASSERT_NE(doc, nullptr) << row.text;
  EXPECT_EQ(Show(doc), row.expected) << row.text;
  EXPECT_EQ(doc->firstBadLine, row.firstBadLine) << row.text;
}

TEST(Parser, Headers) {
  const Row rows[] = {
      {"[a]", 2, "[a@1]", -1},
      {"[ name ]tail", 2, "[name@1]", -1},
      {"  [\ta b\v]\n", 2, "[a b@1]", -1},
      {"[a]b]\n", 2, "[a@1]", -1},
      {"[a;b]\n", 2, "[a;b@1]", -1},
      {"[a=b]\n", 2, "[a=b@1]", -1},
      {"[[a]\n", 2, "[[a@1]", -1},
      {"[]\n", 2, "", 1},
      {"[   ]\n", 2, "", 1},
      {"[abc\n", 2, "", 1},
      {"[x=1\n", 2, "", 1},
      {"[a]\n[bad\nx=1\n", 2, "[a@1] x=1@3", 2},
      {"[a]\n[ ]\nx=1\n", 2, "[a@1] x=1@3", 2},
      {"[a] x=1\n", 2, "[a@1]", -1},
  };
  for (const Row& row : rows) Check(row);
}

TEST(Parser, Items) {
  const Row rows[] = {
      {"[s]\nkey=value\n", 2, "[s@1] key=value@2", -1},
      {"[s]\n  my key \t=\t my value \v\n", 2, "[s@1] my key=my value@2", -1},
      {"[s]\na=b=c\n", 2, "[s@1] a=b=c@2", -1},
      {"[s]\na:b=c\n", 2, "[s@1] a:b=c@2", -1},
      {"[s]\n=value\n", 2, "[s@1]", 2},
      {"[s]\n  =value\n", 2, "[s@1]", 2},
      {"[s]\n \t \n", 2, "[s@1]", 2},
      {"[s]\nword\n", 2, "[s@1]", 2},
      {"[s]\nx=1\n\ny=2\nbad\n", 2, "[s@1] x=1@2 y=2@4", 3},
      {"[s]\nkey=\n", 2, "[s@1]", 2},
      {"[s]\nkey=   \n", 2, "[s@1]", 2},
      {"[s]\nkey=\n", 3, "[s@1] key=@2", -1},
      {"[s]\nkey=\"\"\n", 2, "[s@1] key=\"\"@2", -1},
      {"[s]\nkey=\"\"\n", 0, "[s@1] key=\"\"@2", -1},
      {"[s]\nkey = \"a\" b\n", 2, "[s@1] key=\"a\" b@2", -1},
      {"[s]\nkey=\"\n", 2, "[s@1] key=\"@2", -1},
      {"[s]\nkey=\"  a \"\n", 2, "[s@1] key=\"  a \"@2", -1},
      {"[s]\nkey='a'\n", 4, "[s@1] key='a'@2", -1},
      {"[s]\na.b[1]=x\n", 2, "[s@1] a.b[1]=x@2", -1},
      {"[s]\nx=a;b\n", 2, "[s@1] x=a;b@2", -1},
      {"[s]\nx=\\n\\\"\n", 2, "[s@1] x=\\n\\\"@2", -1},
      {"[s]\nx]=1\n", 2, "[s@1] x]=1@2", -1},
  };
  for (const Row& row : rows) Check(row);
}

TEST(Parser, ALoneQuoteStaysAOneCharacterValue) {
  Document doc = Parse("[s]\nkey=\"\n");
  EXPECT_EQ(doc->section(1)->item(1)->quote, 0);
  EXPECT_EQ(RawValue(doc, "s", "key"), "\"");
}

TEST(Parser, AQuoteInsideAValueLeavesItWhole) {
  Document doc = Parse("[s]\nkey = \"a\" b\n");
  EXPECT_EQ(doc->section(1)->item(1)->quote, 0);
  EXPECT_EQ(RawValue(doc, "s", "key"), "\"a\" b");
}

TEST(Parser, CommentsBeginALineWithASemicolonAndNothingElseDoes) {
  const Row rows[] = {
      {";c\n[s]\n ; x=1\nx=1 ; y\n", 2, "[s@2] x=1 ; y@4", -1},
      {"[s]\n#x=1\n", 2, "[s@1] #x=1@2", -1},
      {"[s]\n//x=1\n", 2, "[s@1] //x=1@2", -1},
      {"[s]\nx;y=1\n", 2, "[s@1] x;y=1@2", -1},
  };
  for (const Row& row : rows) Check(row);
}

TEST(Parser, ColonsSeparateUnderTheirOptionOnly) {
  const Row rows[] = {
      {"[s]\na:b\n", 10, "[s@1] a=b@2", -1},
      {"[s]\na:=b\n", 10, "[s@1] a=b@2", -1},
      {"[s]\na : = b\n", 10, "[s@1] a== b@2", -1},
      {"[s]\na=:b\n", 10, "[s@1] a=:b@2", -1},
      {"[s]\na=b:c\n", 10, "[s@1] a=b:c@2", -1},
      {"[s]\na:b=c\n", 10, "[s@1] a=b=c@2", -1},
      {"[s]\n:b\n", 10, "[s@1]", 2},
      {"[s]\n:=b\n", 10, "[s@1]", 2},
      {"[s]\na:=\n", 10, "[s@1]", 2},
      {"[s]\na:=\n", 11, "[s@1] a=@2", -1},
      {"[s]\na:b\n", 2, "[s@1]", 2},
  };
  for (const Row& row : rows) Check(row);
}

TEST(Parser, ItemsBeforeTheFirstHeader) {
  const Row rows[] = {
      {"x=1\n[a]\ny=2\n", 2, "[a@2] y=2@3", -1},
      {"x=1\n[a]\ny=2\n", 10, "[(null)@-1] x=1@1 [a@2] y=2@3", -1},
      {"x=1\nz=3\n[(null)]\ny=2\n", 10, "[(null)@3] x=1@1 z=3@2 y=2@4", -1},
      {"bad\nx=\n", 10, "", 1},
  };
  for (const Row& row : rows) Check(row);
}

TEST(Parser, RepeatsUpdateTheFirstOne) {
  const Row rows[] = {
      {"[a]\nx=1\n[b]\n[A]\nx=2\n", 2, "[a@4] x=2@5 [b@3]", -1},
      {"[a]\nx=1\ny=2\n X =\"3\"\n", 2, "[a@1] x=\"3\"@4 y=2@3", -1},
      {"[a]\nx=\"1\"\nx=2\n", 2, "[a@1] x=2@3", -1},
      {"[a]\nx=1\nx=\n", 2, "[a@1] x=1@2", 3},
      {"[a]\nx=1\n[b]\ny=1\n[ a ]\nz=3\n", 2, "[a@5] x=1@2 z=3@6 [b@3] y=1@4", -1},
  };
  for (const Row& row : rows) Check(row);
}

TEST(Parser, RepeatsStaySeparateWithoutDuplicateChecking) {
  const Row rows[] = {
      {"[a]\nx=1\nX=2\n[A]\nx=3\n", 2, "[a@1] x=1@2 X=2@3 [A@4] x=3@5", -1},
      {"x=1\n[(null)]\ny=2\n", 10, "[(null)@-1] x=1@1 [(null)@2] y=2@3", -1},
  };
  for (const Row& row : rows) Check(row, 0);
}

TEST(Parser, OptionSixteenDoesNothing) {
  Check({"[s]\na:b\nkey=\nx='1'\n", 16, "[s@1] x='1'@4", 2});
}

TEST(Parser, EveryLineEndReadsAlike) {
  for (const std::string& end : {"\n"s, "\r"s, "\r\n"s, "\n\r"s, "\0"s}) {
    Document doc = Parse("[a]" + end + "x=1" + end + "[b]" + end + "y=2" + end);
    EXPECT_EQ(Show(doc), "[a@1] x=1@2 [b@3] y=2@4");
  }
  Document mixed = Parse("[a]\r\nx=1\n[b]\ry=2");
  EXPECT_EQ(Show(mixed), "[a@1] x=1@2 [b@3] y=2@4");
}

TEST(Parser, ALastLineWithoutATerminatorIsRead) {
  EXPECT_EQ(Show(Parse("[a]\nx=1")), "[a@1] x=1@2");
  EXPECT_EQ(Show(Parse("[a]")), "[a@1]");
}

TEST(Parser, AnUnterminatedLastLineOfExactlyTheCapacityLessOneIsLost) {
  const struct {
    size_t length;
    bool lost;
  } rows[] = {{254, false}, {255, true},  {256, false},  {510, false}, {511, true},
              {512, false}, {513, false}, {1022, false}, {1023, true}, {1024, false}};
  for (const auto& row : rows) {
    const std::string value(row.length - 2, 'v');
    Document doc = Parse("[a]\nx=" + value);
    EXPECT_EQ(RawValue(doc, "a", "x"), row.lost ? "<absent>" : value) << row.length;
  }
}

TEST(Parser, TheLossyLengthFollowsTheCapacityReached) {
  const std::string grow = "[a]\ny=" + std::string(298, 'y') + "\n";
  EXPECT_EQ(RawValue(Parse(grow + "x=" + std::string(253, 'v')), "a", "x"), std::string(253, 'v'));
  EXPECT_EQ(RawValue(Parse(grow + "x=" + std::string(509, 'v')), "a", "x"), "<absent>");
}

TEST(Parser, AFirstLineOf255CharactersMergesWithTheNext) {
  const std::string header = "[" + std::string(253, 'n') + "]";
  ASSERT_EQ(header.size(), 255u);
  Document doc = Parse(header + "\nx=1\ny=2\n");
  // The second line is what follows the "]" of the first; it counts as line 1.
  EXPECT_EQ(Show(doc), "[" + std::string(253, 'n') + "@1] y=2@2");
  const std::string comment = ";" + std::string(254, 'c');
  EXPECT_EQ(Show(Parse(comment + "\n[a]\n[b]\nx=1\n")), "[b@2] x=1@3");
  EXPECT_EQ(Show(Parse(header + "\n")), "");  // its end goes as half a pair, then the file ends
}

TEST(Parser, LaterLinesOfTheBoundaryLengthsReadCorrectly) {
  for (size_t length : {254u, 255u, 256u, 257u, 510u, 511u, 512u, 513u}) {
    for (const std::string& end : {"\n"s, "\r\n"s, "\r"s}) {
      const std::string value(length - 2, 'v');
      Document doc = Parse("[a]" + end + "x=" + value + end + "y=2" + end);
      EXPECT_EQ(RawValue(doc, "a", "x"), value) << length;
      EXPECT_EQ(RawValue(doc, "a", "y"), "2") << length;
    }
  }
}

TEST(Parser, EachReadEmptiesTheDocumentFirst) {
  Document doc = Parse("bad\n[a]\nx=1\n");
  IniFindSection(doc.get(), "a");
  EXPECT_EQ(doc->firstBadLine, 1);
  EXPECT_EQ(Read(doc, "[b]\ny=2\n"), 0);
  EXPECT_EQ(Show(doc), "[b@1] y=2@2");
  EXPECT_EQ(doc->firstBadLine, -1);
  EXPECT_EQ(IniSectionExists(doc.get(), "a"), 0);
  EXPECT_EQ(Read(doc, ""), 0);
  EXPECT_EQ(Show(doc), "");
}

TEST(Parser, NullDocumentAndNullFunction) {
  MemoryLines lines("[a]\n");
  EXPECT_EQ(IniRead(nullptr, IniLineFileInputFunction, lines.state()), 0);
  Document doc = Parse("[a]\nx=1\n");
  EXPECT_EQ(IniRead(doc.get(), nullptr, nullptr), 0);
  EXPECT_EQ(IniNumberOfSections(doc.get()), 0);
}

TEST(Parser, ANegativeStatusEndsTheReadAtOnceWithoutJoining) {
  const auto input = [](void* context, char* buffer, int32_t, int32_t* endOfFile,
                        int32_t* endOfLine, int32_t* line) -> int32_t {
    static const char* const lines[] = {"[a]", "x Line0001=1", "x Line0002=2"};
    int& next = *static_cast<int*>(context);
    if (next == 3) return -4711;
    strcpy(buffer, lines[next++]);
    *endOfFile = 0;
    *endOfLine = 1;
    *line = next;
    return 0;
  };
  Document doc = NewDocument();
  int next = 0;
  EXPECT_EQ(IniRead(doc.get(), input, &next), -4711);
  EXPECT_EQ(Show(doc), "[a@1] x Line0001=1@2 x Line0002=2@3");
}

// Each allocation in turn fails: the status says so, the document stays usable, nothing leaks.
TEST(Parser, EveryFailedAllocationIsOutOfMemoryWithAUsableDocument) {
  std::string text =
      "[a]\nx=1\nx=2\np Line0001=a\np Line0002=b\n[b]\ny=" + std::string(400, 'v') + "\n";
  for (int i = 0; i < 20; ++i) text += "i" + std::to_string(i) + "=1\n";
  for (int i = 0; i < 40; ++i) text += "[c" + std::to_string(i) + "]\nx=1\nx=2\ny=3\n";
  int number = 1;
  for (; number < 1000; ++number) {
    Document doc = NewDocument();
    MemoryLines lines(text);
    FailFromAllocation fail(number);
    const int32_t status = IniRead(doc.get(), IniLineFileInputFunction, lines.state());
    if (!fail.failed()) {
      EXPECT_EQ(status, 0);
      EXPECT_EQ(RawValue(doc, "b", "i19"), "1");
      EXPECT_EQ(RawValue(doc, "a", "p"), "ab");
      break;
    }
    EXPECT_EQ(status, kIniOutOfMemory) << number;
    for (int32_t s = 1; s <= IniNumberOfSections(doc.get()); ++s)
      EXPECT_NE(doc->section(s), nullptr);
  }
  EXPECT_GT(number, 60);
  EXPECT_LT(number, 1000);
}

// The same of a text as a whole. Memory that is asked for in advance may be refused: then it is asked
// for piece by piece. What was read is there after a failure, and can be changed.
TEST(Parser, EveryFailedAllocationOfATextLeavesWhatWasRead) {
  std::string text = "[first]\nx=1\nx=2\ny=1\n";
  for (int i = 0; i < 40; ++i) text += "[c" + std::to_string(i) + "]\nx=1\ny=2\nz=3\nz=4\nu=5\n";
  text += "[long]\n";
  for (int i = 0; i < 40; ++i) text += "i" + std::to_string(i) + "=1\n";
  int failures = 0;
  for (int number = 1; number < 1000; ++number) {
    Document doc = NewDocument();
    int32_t status;
    bool failed;
    {
      FailFromAllocation fail(number);
      status = IniReadBytes(doc.get(), text.data(), text.size());
      failed = fail.failed();
    }
    if (status == 0) {
      EXPECT_FALSE(failed);
      EXPECT_EQ(RawValue(doc, "long", "I39"), "1");
      EXPECT_EQ(RawValue(doc, "c39", "z"), "4");
      EXPECT_GT(failures, 40);
      return;
    }
    ++failures;
    EXPECT_EQ(status, kIniOutOfMemory) << number;
    const int32_t sections = IniNumberOfSections(doc.get());
    // Of a section that ended before, all items are there.
    for (int32_t s = 2; s < sections && s < 42; ++s) {
      EXPECT_EQ(doc->section(s)->items.count(), 4) << number;
    }
    EXPECT_EQ(IniPut(doc.get(), "c0", "new", "2", 0), 1) << number;
    EXPECT_EQ(RawValue(doc, "c0", "new"), "2") << number;
    if (sections > 1) {
      EXPECT_EQ(RawValue(doc, "c0", "x"), "1") << number;
    }
  }
  FAIL() << "never succeeded";
}

// A document made of many names, as two sections that a reader must look through.
std::string ManyNames(int number) {
  std::string text;
  for (int i = 0; i < number; ++i) text += "[s" + std::to_string(i) + "]\n";
  for (int i = 0; i < number; ++i) text += "i" + std::to_string(i) + "=1\n";
  return text;
}

// An index that could not grow may be built again as long as memory is there: then nothing is lost.
TEST(Parser, ASingleFailedAllocationIsReportedOrMadeUpFor) {
  constexpr int kNames = 300;
  const std::string text = ManyNames(kNames);
  int reported = 0;
  for (int number = 1; number < 1000; ++number) {
    Document doc = NewDocument();
    MemoryLines lines(text);
    ztini::test::FailOneAllocation fail(number);
    const int32_t status = IniRead(doc.get(), IniLineFileInputFunction, lines.state());
    if (status == kIniOutOfMemory) ++reported;
    const int32_t items = IniNumberOfItems(doc.get(), "s299");
    EXPECT_EQ(status, items == kNames ? 0 : kIniOutOfMemory) << number;
    for (int32_t i = 0; i < items; ++i) {
      ASSERT_EQ(RawValue(doc, "s299", ("I" + std::to_string(i)).c_str()), "1") << number;
    }
    if (!fail.failed()) {
      EXPECT_GT(reported, 30);
      return;
    }
    EXPECT_EQ(IniPut(doc.get(), "s299", "new", "2", 0), 1) << number;
    EXPECT_EQ(RawValue(doc, "s299", "new"), "2") << number;
  }
  FAIL() << "never succeeded";
}

// While an object lives, the tables of indexes cannot be allocated: the only blocks whose size is a
// power of two from 128 bytes on, in documents without long lines.
class FailIndexTables {
 public:
  FailIndexTables() : m_before(ztini::g_realloc) {
    s_refused = 0;
    ztini::g_realloc = [](void* block, size_t size) -> void* {
      const bool isTable = !block && size >= 128 && size != 256 && (size & (size - 1)) == 0;
      if (!isTable) return realloc(block, size);
      ++s_refused;
      return nullptr;
    };
  }
  ~FailIndexTables() { ztini::g_realloc = m_before; }
  FailIndexTables(const FailIndexTables&) = delete;
  FailIndexTables& operator=(const FailIndexTables&) = delete;

  int refused() const { return s_refused; }

 private:
  inline static int s_refused = 0;
  ztini::ReallocFunction m_before;
};

// Reading on without an index would look at all names for each line.
TEST(Parser, WithoutMemoryForAnIndexTheReadingEnds) {
  const std::string text = ManyNames(20000);
  Document doc = NewDocument();
  {
    FailIndexTables fail;
    EXPECT_EQ(Read(doc, text), kIniOutOfMemory);
    EXPECT_GE(fail.refused(), 1);
    EXPECT_LT(fail.refused(), 10);
    EXPECT_LT(IniNumberOfSections(doc.get()), 40);
    EXPECT_EQ(IniLineOfSection(doc.get(), "S3"), 4);  // a question is answered all the same
  }
  EXPECT_EQ(Read(doc, text), 0);
  EXPECT_EQ(IniNumberOfSections(doc.get()), 20000);
}

}  // namespace

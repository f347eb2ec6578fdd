#include "ztini/LineReader.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TestDocument.h"
#include "ztini/ztini.h"

namespace {

using ztini::test::MemoryLines;
using namespace std::string_literals;

// Every call's text, flags and line number: "ab/3" a line, "ab+" more to come, "~" end of file.
std::string Calls(const std::string& bytes, int32_t maximum, size_t chunk = 2084) {
  MemoryLines lines(bytes, chunk);
  std::string shown;
  for (int calls = 0; calls < 1000; ++calls) {
    std::string buffer(static_cast<size_t>(maximum) + 1, '#');
    int32_t endOfFile = 7, endOfLine = 7, line = -7;
    EXPECT_EQ(IniLineFileInputFunction(lines.state(), buffer.data(), maximum, &endOfFile,
                                       &endOfLine, &line),
              0);
    shown += buffer.c_str();
    if (endOfFile) return shown + "~";
    shown += endOfLine ? "/" + std::to_string(line) + " " : "+";
  }
  return shown + "endless";
}

TEST(LineReader, CutsLinesAtEveryTerminator) {
  const struct {
    const char* what;
    std::string bytes;
    const char* expected;
  } rows[] = {
      {"empty", "", "~"},
      {"no terminator", "ab", "ab/1 ~"},
      {"LF", "a\nb\n", "a/1 b/2 ~"},
      {"CR", "a\rb\r", "a/1 b/2 ~"},
      {"CR LF", "a\r\nb\r\n", "a/1 b/2 ~"},
      {"LF CR", "a\n\rb\n\r", "a/1 b/2 ~"},
      {"NUL", "a\0b\0"s, "a/1 b/2 ~"},
      {"mixed", "a\nb\rc\r\nd", "a/1 b/2 c/3 d/4 ~"},
      {"blank LF", "a\n\nb\n", "a/1 /2 b/3 ~"},
      {"blank CR LF", "a\r\n\r\nb", "a/1 /2 b/3 ~"},
      {"blank CR", "a\r\rb", "a/1 /2 b/3 ~"},
      {"first byte LF is half a pair", "\na\n", "a/1 ~"},
      {"first byte CR is half a pair", "\ra\n", "a/1 ~"},
      {"first two LF", "\n\na\n", "/1 a/2 ~"},
      {"first byte NUL is a line", "\0a\n"s, "/1 a/2 ~"},
      {"NUL after LF is half a pair", "a\n\0b\n"s, "a/1 b/2 ~"},
      {"LF NUL LF", "a\n\0\nb"s, "a/1 /2 b/3 ~"},
      {"white lines stay", " \n\t\n", " /1 \t/2 ~"},
      {"high bytes pass", "\xff\xfe\n", "\xff\xfe/1 ~"},
  };
  for (const auto& row : rows) {
    EXPECT_EQ(Calls(row.bytes, 100), row.expected) << row.what;
    EXPECT_EQ(Calls(row.bytes, 100, 1), row.expected) << row.what << ", byte by byte";
  }
}

TEST(LineReader, StopsAtTheMaximumAndLeavesTheTerminator) {
  EXPECT_EQ(Calls("a\nabcd\n", 3), "a/1 abc+d/2 ~");
  // The LF is the first byte of the next call and repeats the last terminator: it ends the line.
  EXPECT_EQ(Calls("a\nabc\nd\n", 3), "a/1 abc+/2 d/3 ~");
  // In the first line nothing was seen before, so that the LF passes for half a pair.
  EXPECT_EQ(Calls("abc\nd\n", 3), "abc+d/1 ~");
  EXPECT_EQ(Calls("abc", 3), "abc+~");
  EXPECT_EQ(Calls("abc\n", 3), "abc+~");
}

TEST(LineReader, KeepsCountOfBytesAndHalves) {
  MemoryLines lines("ab\r\ncd\r\n", 3);
  char buffer[10];
  int32_t endOfFile = 0, endOfLine = 0, line = 0;
  for (int calls = 0; calls < 2; ++calls) {
    IniLineFileInputFunction(lines.state(), buffer, 9, &endOfFile, &endOfLine, &line);
  }
  EXPECT_STREQ(buffer, "cd");
  EXPECT_EQ(lines.state()->linesCompleted, 2);
  EXPECT_EQ(lines.state()->skippedBytes, 1);
  EXPECT_EQ(lines.state()->lineOffset, 7);
  EXPECT_EQ(lines.state()->lastTerminator, '\r');
}

TEST(LineReader, ANegativeFillStopsTheCallAndPassesNoLineNumber) {
  MemoryLines lines("");
  lines.state()->fill = [](LineFile*) -> int32_t { return -77; };
  char buffer[10] = "###";
  int32_t endOfFile = 7, endOfLine = 7, line = -7;
  EXPECT_EQ(IniLineFileInputFunction(lines.state(), buffer, 9, &endOfFile, &endOfLine, &line), -77);
  EXPECT_STREQ(buffer, "");
  EXPECT_EQ(endOfFile, 0);
  EXPECT_EQ(endOfLine, 0);
  EXPECT_EQ(line, -7);
}

TEST(LineReader, AStreamErrorIsAReadFailure) {
  cookie_io_functions_t broken = {};
  broken.read = [](void*, char*, size_t) -> ssize_t { return -1; };
  FILE* file = fopencookie(nullptr, "r", broken);
  LineFile* state = LineFileNew(file);
  EXPECT_EQ(LineFileReadFromFile(state), kIniReadFailed);
  EXPECT_EQ(state->bytesLeft, 0);
  LineFileDispose(state);
  fclose(file);
}

TEST(LineReader, NewWithoutMemoryIsNull) {
  ztini::test::FailFromAllocation fail(1);
  EXPECT_EQ(LineFileNew(nullptr), nullptr);
  LineFileDispose(nullptr);
}

}  // namespace

// A text cut in memory, against the line function and the buffer that files were read through.
#include "ztini/TextLines.h"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

#include "tests/support/TestDocument.h"
#include "ztini/LineBuffer.h"

namespace {

using ztini::test::MemoryLines;
using Lines = std::vector<std::string>;

std::string Numbered(int32_t number, const std::string& line) {
  return std::to_string(number) + ":" + line;
}

Lines ByFunction(const std::string& text) {
  MemoryLines source(text);
  ztini::LineBuffer buffer;
  EXPECT_TRUE(buffer.open());
  Lines lines;
  do {
    EXPECT_EQ(buffer.next(IniLineFileInputFunction, source.state()), 0);
    if (buffer.complete()) lines.push_back(Numbered(buffer.lineNumber(), buffer.text()));
  } while (!buffer.atEnd());
  return lines;
}

Lines InMemory(std::string text) {
  const size_t size = text.size();
  text.push_back('#');  // the byte that may be written
  ztini::TextLines source(text.data(), text.data() + size);
  Lines lines;
  while (source.next()) {
    lines.push_back(Numbered(source.lineNumber(), std::string(source.begin(), source.end())));
    *source.end() = 0;
  }
  return lines;
}

TEST(TextLines, AreThoseOfTheLineFunction) {
  const std::string x(255, 'x'), y(511, 'y'), z(1023, 'z');
  using namespace std::string_literals;
  const std::string texts[] = {"",
                               "\n",
                               "\r\n",
                               "\n\r\n",
                               "a",
                               "a\n",
                               "a\r\nb\r\n",
                               "a\n\nb",
                               "a\r\rb\n\rc",
                               "a\0b\0\0c"s,
                               "\0"s,
                               x,
                               x + "\n",
                               x + "\nb\n",
                               "a\n" + x + "\nb\n",
                               "a\r" + x + "\nb\n",
                               x + "\r\nb",
                               y + "\n" + x + "\nb",
                               y + "\n" + y + "\nb",
                               y,
                               z + "\r" + y + "\n" + z + "\r\n" + x};
  for (const std::string& text : texts) EXPECT_EQ(InMemory(text), ByFunction(text)) << text;
}

TEST(TextLines, RandomTextsAreCutAlike) {
  std::mt19937 random(1);
  for (int round = 0; round < 20000; ++round) {
    std::string text;
    for (unsigned pieces = random() % 8; pieces > 0; --pieces) {
      static const size_t kLengths[] = {0,   1,   2,   254,  255,  256, 257,
                                        510, 511, 512, 1022, 1023, 1024};
      text.append(kLengths[random() % std::size(kLengths)], 'x');
      for (unsigned ends = random() % 3; ends > 0; --ends) text += "\n\r\0"[random() % 3];
    }
    ASSERT_EQ(InMemory(text), ByFunction(text)) << "round " << round;
  }
}

}  // namespace

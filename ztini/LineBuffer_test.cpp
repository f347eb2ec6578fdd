#include "ztini/LineBuffer.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/support/FailingAlloc.h"
#include "tests/support/TestDocument.h"

namespace {

using ztini::LineBuffer;

// A line function that gives prepared answers and notes what it was asked.
struct Script {
  struct Answer {
    std::string text;
    int32_t endOfFile, endOfLine, line, status;
  };
  std::vector<Answer> answers;
  std::vector<int32_t> asked;

  static int32_t give(void* context, char* buffer, int32_t maximum, int32_t* endOfFile,
                      int32_t* endOfLine, int32_t* line) {
    Script& self = *static_cast<Script*>(context);
    const Answer answer = self.asked.size() < self.answers.size() ? self.answers[self.asked.size()]
                                                                  : Answer{"", 1, 0, 0, 0};
    self.asked.push_back(maximum);
    strcpy(buffer, answer.text.c_str());
    *endOfFile = answer.endOfFile;
    *endOfLine = answer.endOfLine;
    *line = answer.line;
    return answer.status;
  }
};

TEST(LineBuffer, AsksForItsCapacityLessOneAndThenForEachNewHalf) {
  Script script{{{std::string(255, 'a'), 0, 0, 0, 0},
                 {std::string(256, 'b'), 0, 0, 0, 0},
                 {"c", 0, 1, 9, 0},
                 {"next", 0, 1, 10, 0}},
                {}};
  LineBuffer line;
  ASSERT_TRUE(line.open());
  EXPECT_EQ(line.next(Script::give, &script), 0);
  EXPECT_EQ(line.text(), std::string(255, 'a') + std::string(256, 'b') + "c");
  EXPECT_TRUE(line.complete());
  EXPECT_EQ(line.lineNumber(), 9);
  EXPECT_EQ(line.next(Script::give, &script), 0);
  EXPECT_STREQ(line.text(), "next");
  EXPECT_EQ(script.asked, (std::vector<int32_t>{255, 256, 512, 1023}));  // never shrinks
}

TEST(LineBuffer, GoesOnWhereAShortAnswerStopped) {
  Script script{{{"ab", 0, 0, 0, 0}, {"cd", 0, 1, 1, 0}}, {}};
  LineBuffer line;
  ASSERT_TRUE(line.open());
  EXPECT_EQ(line.next(Script::give, &script), 0);
  EXPECT_STREQ(line.text(), "abcd");
}

TEST(LineBuffer, BothFlagsGiveALastLine) {
  Script script{{{"last", 1, 1, 4, 0}}, {}};
  LineBuffer line;
  ASSERT_TRUE(line.open());
  EXPECT_EQ(line.next(Script::give, &script), 0);
  EXPECT_TRUE(line.complete());
  EXPECT_TRUE(line.atEnd());
}

TEST(LineBuffer, EndOfFileAloneIsNoLine) {
  Script script{{{"lost", 0, 0, 0, 0}, {"", 1, 0, 0, 0}}, {}};
  LineBuffer line;
  ASSERT_TRUE(line.open());
  EXPECT_EQ(line.next(Script::give, &script), 0);
  EXPECT_FALSE(line.complete());
  EXPECT_TRUE(line.atEnd());
}

TEST(LineBuffer, ANegativeStatusIsPassedOn) {
  Script script{{{"x", 0, 1, 0, -5002}}, {}};
  LineBuffer line;
  ASSERT_TRUE(line.open());
  EXPECT_EQ(line.next(Script::give, &script), -5002);
}

TEST(LineBuffer, AFunctionThatDoesNothingTwiceRunningIsStopped) {
  Script idle{std::vector<Script::Answer>(50, {"", 0, 0, 0, 0}), {}};
  LineBuffer line;
  ASSERT_TRUE(line.open());
  EXPECT_EQ(line.next(Script::give, &idle), kIniOutOfMemory);
  EXPECT_EQ(idle.asked.size(), 2u);
  Script slow{{{"a", 0, 0, 0, 0}, {"", 0, 0, 0, 0}, {"b", 0, 0, 0, 0}, {"", 0, 1, 1, 0}}, {}};
  LineBuffer other;
  ASSERT_TRUE(other.open());
  EXPECT_EQ(other.next(Script::give, &slow), 0);
  EXPECT_STREQ(other.text(), "ab");
}

TEST(LineBuffer, WithoutMemoryToGrowTheResultIsOutOfMemory) {
  Script script{{{std::string(255, 'a'), 0, 0, 0, 0}}, {}};
  LineBuffer line;
  ASSERT_TRUE(line.open());
  ztini::test::FailFromAllocation fail(1);
  EXPECT_EQ(line.next(Script::give, &script), kIniOutOfMemory);
  EXPECT_FALSE(LineBuffer().open());
}

}  // namespace

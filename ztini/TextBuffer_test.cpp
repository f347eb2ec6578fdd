#include "ztini/TextBuffer.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/support/FailingAlloc.h"

namespace {

using ztini::TextBuffer;

TEST(TextBuffer, AppendsTextCharactersAndNumbers) {
  TextBuffer buffer;
  EXPECT_STREQ(buffer.text(), "");
  buffer.append("ab").append('c').append("").appendNumber(7).append(' ').appendNumber(12345);
  EXPECT_STREQ(buffer.text(), "abc0007 12345");
  buffer.clear();
  buffer.append("z");
  EXPECT_STREQ(buffer.text(), "z");
  EXPECT_TRUE(buffer.ok());
}

TEST(TextBuffer, GrowsAsFarAsNeeded) {
  TextBuffer buffer;
  std::string expected;
  for (int i = 0; i < 5000; ++i) {
    buffer.append("0123456789");
    expected += "0123456789";
  }
  EXPECT_EQ(buffer.text(), expected);
}

TEST(TextBuffer, RemembersThatMemoryRanOut) {
  TextBuffer buffer;
  {
    ztini::test::FailFromAllocation fail(1);
    buffer.append("a");
  }
  buffer.append("b");
  EXPECT_FALSE(buffer.ok());
  EXPECT_STREQ(buffer.text(), "");
}

}  // namespace

#include "ztini/TextBuffer.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
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

TEST(TextBuffer, IsFilledByTheCallerCutAndGoesOn) {
  TextBuffer buffer;
  buffer.append("before");
  char* bytes = buffer.fill(4);
  ASSERT_NE(bytes, nullptr);
  memcpy(bytes, "abcd", 4);
  EXPECT_EQ(buffer.view(), "abcd");
  buffer.cut(2);
  EXPECT_STREQ(buffer.text(), "ab");
  buffer.append("xyz");
  EXPECT_STREQ(buffer.text(), "abxyz");
  EXPECT_NE(buffer.fill(0), nullptr);
  EXPECT_STREQ(buffer.text(), "");
}

TEST(TextBuffer, IsTerminatedInABlockThatNothingWasAppendedTo) {
  // A block of this size that is not cleared, for the allocator to give again.
  void* used = malloc(100);
  memset(used, 'x', 100);
  free(used);
  TextBuffer buffer;
  buffer.reserve(99);
  EXPECT_STREQ(buffer.text(), "");
}

TEST(TextBuffer, WithoutMemoryItIsNotFilled) {
  TextBuffer buffer;
  ztini::test::FailFromAllocation fail(0);
  EXPECT_EQ(buffer.fill(10), nullptr);
  EXPECT_EQ(buffer.size(), 0u);
  EXPECT_FALSE(buffer.ok());
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

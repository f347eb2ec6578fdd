#include "ztini/EscapeCodec.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/support/FailingAlloc.h"
#include "ztini/Alloc.h"

namespace {

using ztini::OwnedText;
using namespace std::string_literals;

std::string Encoded(const std::string& text) {
  OwnedText encoded(ztini::EncodeEscapes(text.c_str()));
  return encoded.get();
}

std::string Decoded(const std::string& text) {
  std::string decoded(text.size() + 1, '#');
  const size_t length = ztini::DecodeEscapes(text.c_str(), decoded.data());
  EXPECT_EQ(length, ztini::DecodeEscapes(text.c_str(), nullptr));
  return decoded.substr(0, length);
}

TEST(EscapeCodec, Encoding) {
  const struct {
    const char *text, *expected;
  } rows[] = {{"", ""},
              {"abc", "abc"},
              {"\t", "\\t"},
              {"\n", "\\n"},
              {"\"", "\\\""},
              {"\\", "\\\\"},
              {"\r", "\\x0d"},
              {"\x01", "\\x01"},
              {"\x1f", "\\x1f"},
              {"\x7f", "\\x7f"},
              {"\v\f", "\\x0b\\x0c"},
              {"'", "'"},
              {" a b ", " a b "},
              {"\x80\xff\xc3\xa4", "\x80\xff\xc3\xa4"},
              {"a\\tb", "a\\\\tb"}};
  for (const auto& row : rows) EXPECT_EQ(Encoded(row.text), row.expected);
}

TEST(EscapeCodec, Decoding) {
  const struct {
    const char* text;
    std::string expected;
  } rows[] = {{"", ""},
              {"abc", "abc"},
              {"\\t\\n", "\t\n"},
              {"nt", "nt"},
              {"x41", "x41"},
              {"\"", "\""},
              {"\\\"", "\""},
              {"\\\\", "\\"},
              {"\\\\n", "\\n"},
              {"\\\\\\n", "\\\n"},
              {"\\x41", "A"},
              {"\\x0d\\x0D", "\r\r"},
              {"\\xfF", "\xff"},
              {"\\x414", "A4"},
              {"\\q", "q"},
              {"\\ ", " "},
              {"\\N\\T\\X41", "NTX41"},
              {"a\\", "a"},
              {"\\x00b", "\0b"s},
              {"\\xg1", std::string(1, static_cast<char>(-16 + 1))},
              {"\\x1g", std::string(1, static_cast<char>(16 - 1))},
              {"\\xzz.", std::string(1, static_cast<char>(-17)) + "."},
              {"\\x\\n", std::string(1, static_cast<char>(-17))},
              {"a\\x", "a"},
              {"a\\x4", "a"}};
  for (const auto& row : rows) EXPECT_EQ(Decoded(row.text), row.expected) << row.text;
}

TEST(EscapeCodec, EveryByteSurvivesBothWays) {
  for (int c = 1; c < 256; ++c) {
    const std::string text = "<" + std::string(1, static_cast<char>(c)) + ">";
    EXPECT_EQ(Decoded(Encoded(text)), text) << c;
  }
}

TEST(EscapeCodec, ALongValueOfControlsGrowsFourfold) {
  const std::string text(65536, '\x02');
  EXPECT_EQ(Encoded(text).size(), 4u * 65536u);
  EXPECT_EQ(Decoded(Encoded(text)), text);
}

TEST(EscapeCodec, EncodingWithoutMemoryIsNull) {
  ztini::test::FailFromAllocation fail(1);
  EXPECT_EQ(ztini::EncodeEscapes("a"), nullptr);
}

}  // namespace

#include "tools/common/Terminal.h"

#include <gtest/gtest.h>

#include "tests/support/ScopedLocale.h"

namespace vltctl {
namespace {

struct Row {
  std::string text, shown;
};

TEST(Terminal, WhatATerminalObeysIsEscaped) {
  vlt::test::ScopedLocale locale(LC_ALL, "C.UTF-8");
  const Row rows[] = {
      {"", ""},
      {"plain text, C:\\x1B", "plain text, C:\\x1B"},
      {"\x1B]0;title\x07", "\\x1B]0;title\\x07"},
      {"a\nb\r\tc", "a\\x0Ab\\x0D\\x09c"},
      {std::string("a\0b", 3), "a\\x00b"},
      {"\x7F", "\\x7F"},
      {"\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80", "\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80"},
      // C1 controls: as characters, and as the bytes that an 8-bit terminal takes for them.
      {"\xC2\x9B\x33\x31m", "\\u{9B}31m"},
      {"\xC2\x80\xC2\x9F\xC2\xA0", "\\u{80}\\u{9F}\xC2\xA0"},
      {"\x9B\x33\x31m", "\\x9B31m"},
      // Not a character: a lone continuation, one that is cut short, and one that is too long.
      {"\xA9", "\\xA9"},
      {"\xE2\x82", "\\xE2\\x82"},
      {"\xE2\x1B[m", "\\xE2\\x1B[m"},
      {"\xC0\x9B", "\\xC0\\x9B"},
      // Text that is written backwards, and separators of lines.
      {"\xE2\x80\xAE\x66\x64\x70", "\\u{202E}fdp"},
      {"\xE2\x80\xA8\xE2\x81\xA6", "\\u{2028}\\u{2066}"}};
  for (const Row& row : rows) EXPECT_EQ(ForTerminal(row.text), row.shown);
}

// Whatever the "C" locale makes of bytes beyond ASCII: none of them is a control that gets through.
TEST(Terminal, NoControlGetsThroughInTheCLocale) {
  vlt::test::ScopedLocale locale(LC_ALL, "C");
  for (int c = 0; c < 256; ++c) {
    std::string shown = ForTerminal(std::string(1, static_cast<char>(c)));
    bool control = c < 0x20 || (c >= 0x7F && c < 0xA0);
    if (control) {
      EXPECT_EQ(shown[0], '\\') << c;
      EXPECT_GE(shown.size(), 4u) << c;
    }
    if (c >= 0x20 && c < 0x7F) {
      EXPECT_EQ(shown, std::string(1, static_cast<char>(c)));
    }
  }
}

TEST(Terminal, WidthIsThatOfTheTerminal) {
  vlt::test::ScopedLocale locale(LC_ALL, "C.UTF-8");
  EXPECT_EQ(DisplayWidth(""), 0u);
  EXPECT_EQ(DisplayWidth("plain"), 5u);
  EXPECT_EQ(DisplayWidth("Gr\xC3\xB6\xC3\x9F"
                         "e"),
            5u);
  EXPECT_EQ(DisplayWidth("e\xCC\x81"), 1u);                 // a combining accent
  EXPECT_EQ(DisplayWidth("\xE6\x97\xA5\xE6\x9C\xAC"), 4u);  // two wide characters
  EXPECT_EQ(DisplayWidth("a\xFF"
                         "b"),
            3u);
}

}  // namespace
}  // namespace vltctl

#include "tools/common/Terminal.h"

#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>
#include <wchar.h>

#include <algorithm>

namespace vltctl {
namespace {

template <class... Values>
std::string Formatted(const char* format, Values... values) {
  char text[16];
  snprintf(text, sizeof text, format, values...);
  return text;
}

// Not control characters by their category, yet they change how what follows is laid out.
bool ChangesLayout(wchar_t c) {
  return c == 0x061C || c == 0x200E || c == 0x200F || (c >= 0x2028 && c <= 0x202E) ||
         (c >= 0x2066 && c <= 0x2069);
}

// How many bytes of the beginning every encoding has as the same visible characters, one column each.
size_t PlainLength(std::string_view text) {
  auto isPlain = [](char c) { return c >= 0x20 && c < 0x7F; };
  return static_cast<size_t>(std::find_if_not(text.begin(), text.end(), isPlain) - text.begin());
}

std::string Character(wchar_t c, std::string_view bytes) {
  auto code = static_cast<unsigned>(c);
  if (code < 0x20 || code == 0x7F) return Formatted("\\x%02X", code);
  if ((code >= 0x80 && code < 0xA0) || ChangesLayout(c)) return Formatted("\\u{%02X}", code);
  return std::string(bytes);
}

}  // namespace

std::string ForTerminal(std::string_view text) {
  std::string out;
  mbstate_t state = {};
  for (;;) {
    size_t plain = PlainLength(text);
    out += text.substr(0, plain);
    text.remove_prefix(plain);
    if (text.empty()) return out;
    wchar_t c = 0;
    size_t size = mbrtowc(&c, text.data(), text.size(), &state);
    if (size == 0) size = 1;  // a zero byte is a character of its own
    if (size > text.size()) {
      // No character, or only the beginning of one: this byte is shown, and the next one begins again.
      state = {};
      out += Formatted("\\x%02X", static_cast<unsigned char>(text[0]));
      size = 1;
    } else {
      out += Character(c, text.substr(0, size));
    }
    text.remove_prefix(size);
  }
}

size_t DisplayWidth(std::string_view text) {
  size_t width = 0;
  mbstate_t state = {};
  for (;;) {
    size_t plain = PlainLength(text);
    width += plain;
    text.remove_prefix(plain);
    if (text.empty()) return width;
    wchar_t c = 0;
    size_t size = mbrtowc(&c, text.data(), text.size(), &state);
    bool isCharacter = size > 0 && size <= text.size();
    int columns = isCharacter ? wcwidth(c) : 1;
    width += columns > 0 ? static_cast<size_t>(columns) : 0;
    if (!isCharacter) state = {};
    text.remove_prefix(isCharacter ? size : 1);
  }
}

bool ShowsColours() {
  auto isSet = [](const char* name) {
    const char* value = getenv(name);
    return value && *value;
  };
  auto is = [](const char* name, const char* value) {
    const char* found = getenv(name);
    return found && strcmp(found, value) == 0;
  };
  if (isSet("NO_COLOR")) return false;
  if (isSet("CLICOLOR_FORCE") && !is("CLICOLOR_FORCE", "0")) return true;
  return isatty(STDOUT_FILENO) && !is("TERM", "dumb");
}

std::string Coloured(std::string_view text, Mood mood) {
  static const bool shows = ShowsColours();
  constexpr const char* kCodes[] = {"", "\x1B[32m", "\x1B[33m", "\x1B[31m"};
  if (!shows || mood == Mood::Plain) return std::string(text);
  return kCodes[static_cast<int>(mood)] + std::string(text) + "\x1B[0m";
}

}  // namespace vltctl

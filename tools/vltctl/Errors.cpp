// error: names and meanings of result and exception codes, from the table that clients have, too.
#include <algorithm>
#include <cctype>
#include <charconv>

#include "client/results.hpp"
#include "tools/vltctl/Reading.h"

namespace admin {
namespace {

// "0x80040326", "80040326", "-2147220698", "2147746598"; nothing for other words.
std::optional<uint32_t> CodeOf(const std::string& word) {
  bool isHex = word.starts_with("0x") || word.starts_with("0X") ||
               (word.size() == 8 &&
                std::all_of(word.begin(), word.end(), [](unsigned char c) { return isxdigit(c); }));
  std::string digits = word.substr(isHex && word[1] != '0' && tolower(word[1]) == 'x' ? 2 : 0);
  long long value = 0;
  auto [end, error] =
      std::from_chars(digits.data(), digits.data() + digits.size(), value, isHex ? 16 : 10);
  bool isWhole = error == std::errc() && end == digits.data() + digits.size() && !digits.empty();
  if (!isWhole || value > 0xFFFFFFFFll || value < -0x80000000ll) return std::nullopt;
  return static_cast<uint32_t>(value);
}

std::string Lower(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(),
                 [](unsigned char c) { return tolower(c); });
  return text;
}

std::string Hex(uint32_t code) {
  char text[16];
  snprintf(text, sizeof text, "0x%08X", code);
  return text;
}

}  // namespace

int Error(const Arguments& arguments, Output& output) {
  const std::string word = arguments.text("CODE");
  std::optional<uint32_t> code = CodeOf(word);
  vltctl::Table table;
  std::vector<std::string> names;
  bool found = false;
  for (const vlt::ResultInfo& row : vlt::kResults) {
    names.push_back(row.name);
    if (!word.empty() && (code ? row.code != *code : Lower(row.name) != Lower(word))) continue;
    found = true;
    table.add({Hex(row.code), row.name, row.meaning});
    output.item({{"code", row.code}, {"name", row.name}, {"meaning", row.meaning}});
  }
  output.print(table);
  if (found) return vltctl::kGood;
  std::string guess = code ? "" : vltctl::DidYouMean(word, names);
  throw vltctl::Failure(vltctl::kNotFound,
                        {"no-such-code", "", "the library has no code or name " + word, "",
                         guess.empty() ? "\"vltctl error\" shows all" : guess});
}

}  // namespace admin

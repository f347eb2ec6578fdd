#include "tools/common/IniLines.h"

#include <strings.h>

#include <algorithm>

namespace vltctl {
namespace {

constexpr const char* kWhite = " \t\v\f";
constexpr const char* kUtf8Mark = "\xEF\xBB\xBF";

std::string Trimmed(const std::string& text) {
  size_t first = text.find_first_not_of(kWhite);
  if (first == std::string::npos) return "";
  return text.substr(first, text.find_last_not_of(kWhite) - first + 1);
}

// Without one pair of quotes around all of it.
std::string Unquoted(const std::string& text) {
  bool isQuoted = text.size() >= 2 && text.front() == text.back() &&
                  (text.front() == '"' || text.front() == '\'');
  return isQuoted ? text.substr(1, text.size() - 2) : text;
}

void ReadHeader(const std::string& text, IniLine* line) {
  size_t end = text.find(']');
  std::string name = end == std::string::npos ? "" : Trimmed(text.substr(1, end - 1));
  if (name.empty()) return;
  line->kind = IniLine::Kind::Header;
  line->section = name;
}

void ReadItem(const std::string& text, IniLine* line) {
  size_t separator = text.find('=');
  std::string name = separator == std::string::npos ? "" : Trimmed(text.substr(0, separator));
  std::string value = separator == std::string::npos ? "" : Trimmed(text.substr(separator + 1));
  if (name.empty() || value.empty()) return;
  line->kind = IniLine::Kind::Item;
  line->name = name;
  line->value = Unquoted(value);
}

IniLine ReadLine(size_t number, const std::string& section, const std::string& text) {
  IniLine line{number, IniLine::Kind::Bad, section, "", "", text};
  if (text.empty()) {
    line.kind = IniLine::Kind::Blank;
  } else if (text[0] == ';') {
    line.kind = IniLine::Kind::Comment;
  } else if (text[0] == '[') {
    ReadHeader(text, &line);
  } else {
    ReadItem(text, &line);
  }
  return line;
}

}  // namespace

std::vector<IniLine> LinesOf(const std::string& bytes) {
  std::vector<IniLine> lines;
  std::string section;
  size_t at = bytes.starts_with(kUtf8Mark) ? 3 : 0;
  while (at < bytes.size()) {
    size_t end = bytes.find_first_of("\r\n", at);
    std::string text = bytes.substr(at, end == std::string::npos ? end : end - at);
    lines.push_back(ReadLine(lines.size() + 1, section, Trimmed(text)));
    section = lines.back().section;
    if (end == std::string::npos) break;
    bool isPair = end + 1 < bytes.size() && bytes[end] != bytes[end + 1] &&
                  (bytes[end + 1] == '\r' || bytes[end + 1] == '\n');
    at = end + (isPair ? 2 : 1);
  }
  return lines;
}

bool SameName(const std::string& a, const std::string& b) {
  return strcasecmp(a.c_str(), b.c_str()) == 0;
}

const IniLine* FindItem(const std::vector<IniLine>& lines, const std::string& section,
                        const std::string& name) {
  auto found = std::find_if(lines.rbegin(), lines.rend(), [&](const IniLine& line) {
    return line.kind == IniLine::Kind::Item && SameName(line.section, section) &&
           SameName(line.name, name);
  });
  return found == lines.rend() ? nullptr : &*found;
}

}  // namespace vltctl

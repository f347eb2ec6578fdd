#pragma once

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tests/support/TempDir.h"

namespace vlt::test {

// An INI file as it is on disk, read by a few lines that know nothing of the engine under
// test. Values are raw: with their quotes and escapes.
class DatabaseText {
 public:
  using Items = std::vector<std::pair<std::string, std::string>>;

  explicit DatabaseText(const std::string& file) : m_bytes(ReadBytes(file)) {
    for (size_t begin = 0; begin < m_bytes.size();) {
      size_t end = m_bytes.find('\n', begin);
      if (end == std::string::npos) end = m_bytes.size();
      add(m_bytes.substr(begin, end - begin));
      begin = end + 1;
    }
  }

  const std::string& bytes() const { return m_bytes; }

  bool has(const std::string& section) const { return find(section) != nullptr; }

  // Items of the section in order; none for an unknown one.
  Items items(const std::string& section) const {
    auto found = find(section);
    return found ? *found : Items();
  }

  std::optional<std::string> raw(const std::string& section, const std::string& item) const {
    for (const auto& [name, value] : items(section)) {
      if (name == item) return value;
    }
    return std::nullopt;
  }

  // The value of a quoted item without its quotes; "(none)" if it is absent or not quoted.
  std::string quoted(const std::string& section, const std::string& item) const {
    auto value = raw(section, item);
    if (!value || value->size() < 2 || value->front() != '"' || value->back() != '"') {
      return "(none)";
    }
    return value->substr(1, value->size() - 2);
  }

  std::vector<std::string> sections() const {
    std::vector<std::string> names;
    for (const auto& [name, items] : m_sections) names.push_back(name);
    return names;
  }

 private:
  void add(const std::string& line) {
    size_t equals = line.find(" = ");
    if (!line.empty() && line.front() == '[') {
      m_sections.push_back({line.substr(1, line.find(']') - 1), {}});
    } else if (equals != std::string::npos && !m_sections.empty()) {
      m_sections.back().second.push_back({line.substr(0, equals), line.substr(equals + 3)});
    }
  }

  const Items* find(const std::string& section) const {
    for (const auto& [name, items] : m_sections) {
      if (name == section) return &items;
    }
    return nullptr;
  }

  std::string m_bytes;
  std::vector<std::pair<std::string, Items>> m_sections;
};

}  // namespace vlt::test

#pragma once

#include <cstddef>
#include <string>
#include <vector>

// The lines of an INI file with their numbers, for messages about them. What a file means is for the
// engine to say (ztini/ztini.h), whose dialect this follows (docs/ini-dialect.md); it keeps no lines.
namespace vltctl {

struct IniLine {
  enum class Kind { Blank, Comment, Header, Item, Bad };
  size_t number;  // from 1
  Kind kind;
  std::string section;      // the header that it is below, or that it is; empty before the first
  std::string name, value;  // of an item: without white space around them, and without quotes
  std::string text;         // of a bad line
};

std::vector<IniLine> LinesOf(const std::string& bytes);

// As the engine compares names.
bool SameName(const std::string& a, const std::string& b);

// The line of the item that counts: the last one of that name. Null if there is none.
const IniLine* FindItem(const std::vector<IniLine>& lines, const std::string& section,
                        const std::string& name);

}  // namespace vltctl

#pragma once

#include <string>
#include <vector>

#include "tools/common/Output.h"

// What a check of components finds, and how it is shown.
namespace vltctl {

// What the check of one component finds.
struct Verdict {
  std::string code;                   // "missing-dependency"; empty if it is sound
  std::string library;                // the file that was loaded, or refused to load
  std::vector<std::string> messages;  // what is wrong, in one sentence each
  std::vector<std::string> notes;     // the loader's own words, and what the library's check says
};

// Nothing is to be said beside the message.
Verdict Bad(const char* code, const std::string& message);

// One component with its verdict. `component` is its JSON form, with "type" and "name".
void Show(const Json& component, const Verdict& verdict, Output& output);

// The last line of a check: how many components there were, and how many of them are bad.
std::string Summary(size_t all, size_t bad);

}  // namespace vltctl

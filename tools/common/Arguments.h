#pragma once

#include <map>
#include <string>
#include <vector>

#include "tools/common/Commands.h"

namespace vltctl {

// The arguments of one command, as the table of commands describes them.
class Arguments {
 public:
  const Command& command() const { return *m_command; }
  // True if the flag or option was given. `name` as in the table: "--json", "FILE".
  bool has(const std::string& name) const { return m_values.count(name) != 0; }
  // The value; empty if it was not given.
  std::string text(const std::string& name) const;
  // All values of a list.
  std::vector<std::string> list(const std::string& name) const;
  // The value as a number. Throws a Failure of kUsage (Output.h) for anything but digits.
  unsigned number(const std::string& name, unsigned fallback) const;
  bool json() const { return has("--json"); }

 private:
  friend struct Parser;
  const Command* m_command = nullptr;
  std::map<std::string, std::vector<std::string>> m_values;
};

// What the command line asks for.
struct Parsed {
  enum class Kind { Run, Help, Version, Wrong };
  Kind kind = Kind::Wrong;
  Arguments arguments;            // Run
  std::string helpFor;            // Help: name of a command, or of several ("hook"); empty for all
  std::string whatIsWrong, next;  // Wrong: why, and what to do instead
};

Parsed Parse(int argc, char** argv);

// True for the text form of a GUID, with or without braces.
bool IsGuidText(const std::string& text);

// Text forms of one GUID become equal: without braces, in upper case.
std::string BareGuid(std::string text);

// The candidate that a mistyped word may stand for; empty if none is near.
std::string Nearest(const std::string& word, const std::vector<std::string>& candidates);

// "; did you mean \"list\"?", or nothing.
std::string DidYouMean(const std::string& word, const std::vector<std::string>& candidates);

}  // namespace vltctl

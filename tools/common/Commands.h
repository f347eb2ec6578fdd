#pragma once

#include <span>
#include <string>
#include <string_view>
#include <vector>

// The one table of vltctl's commands. The parser of the arguments (Arguments.h), the help, the list in
// man/vltctl.1 and the completion of shells (Help.h) are made from it.
//
// To add a command:
// 1. a row in Commands.cpp, with an array of its arguments, kRoot among them, or with the reason why
//    it takes none; --json and --help are added to each;
// 2. a function `int(const Arguments&, Output&)` in a source of its own, declared in
//    tools/vltctl/Reading.h and named in the table of handlers in tools/vltctl/main.cpp. A command
//    without a handler there is done by vltctl-client, which has a table of its own;
// 3. `vltctl completion man`, whose output replaces the list in man/vltctl.1. A test compares them.
namespace vltctl {

// What a command ends with.
enum ExitCode {
  kGood = 0,
  kNotFound = 1,      // no such thing, or findings
  kUsage = 2,         // the arguments are wrong; nothing was done
  kDataUnusable = 3,  // the installation's data cannot be used
  kBusy = 4,          // another process holds what is needed
  kCannotWrite = 5,   // the output, or a file that the command was to write
};

// A flag ("--json"), an option with a value ("--index", "N") or, without dashes, what has no name on the
// command line ("GUID"). A positional of the name GUID is checked for its form. No value but that of
// VALUE may be empty.
struct Argument {
  const char* name;
  const char* value;  // what the help calls the value; null for flags and positionals
  const char* summary;
  bool isRequired = false;  // positionals only
  bool isList = false;      // may be given several times, or take several words
  // What completion offers in this place; null for nothing: words with blanks between them, or one of
  // kFiles and kDirectories.
  const char* offers = nullptr;
  const char* letter = nullptr;  // "-f": the short form of a flag

  bool isFlag() const { return name[0] == '-' && !value; }
  bool isPositional() const { return name[0] != '-'; }
};
inline constexpr const char* kFiles = "<file>";
inline constexpr const char* kDirectories = "<directory>";

struct Command {
  const char* group;
  const char* name;  // of two words for a command below another one: "hook arm"
  const char* summary;
  std::span<const Argument> arguments;
  const char* whyNoRoot = nullptr;  // for a command without --root: why that makes no sense
};

// In the order of the help.
std::span<const Command> Commands();

// Null for an unknown name.
const Command* FindCommand(std::string_view name);

// First words of the commands, each once, in their order.
std::vector<std::string> CommandWords();

// Second words of the commands below the first word: "list", "arm", "clear" of "hook".
std::vector<std::string> WordsBelow(const std::string& word);

// "hook arm POINT FLAG...": the command with its arguments, as the help and the manual show it.
std::string Synopsis(const Command& command);

}  // namespace vltctl

#pragma once

#include <string>

// Texts that are made from the table of commands.
namespace vltctl {

// The help of a command, or of all whose first word it is; of everything for an empty name.
// Without the end of the last line.
std::string HelpText(const std::string& command);

// The list of commands of man/vltctl.1, in the man macros.
std::string ManualText();

// A completion script for "bash", "zsh" or "fish"; empty for any other shell.
std::string CompletionText(const std::string& shell);

}  // namespace vltctl

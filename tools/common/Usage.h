#pragma once

#include <stdio.h>

#include <CLI/CLI.hpp>
#include <sstream>

#include "tools/common/Terminal.h"

namespace vltctl {

// Prints the help, or what is wrong with the arguments, which is text of others' where a script has
// passed it on. Returns CLI11's exit code: 0 for help and version.
inline int ExitOf(const CLI::App& app, const CLI::ParseError& error) {
  std::ostringstream out, err;
  int code = app.exit(error, out, err);
  fputs(LinesForTerminal(out.str()).c_str(), stdout);
  fputs(LinesForTerminal(err.str()).c_str(), stderr);
  return code;
}

}  // namespace vltctl

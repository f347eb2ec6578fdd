#pragma once

#include <span>

#include "tools/common/Arguments.h"
#include "tools/common/Output.h"

// The frame of vltctl and vltctl-client.
namespace vltctl {

struct Handler {
  const char* command;
  int (*run)(const Arguments&, Output&);
};

// Does what the command line asks for: parses it, prints help and version, runs the handler of the
// command and reports what it throws. Sets the locale (Locale.h) first. `other` runs for a command
// without a handler. Returns the exit code.
int Run(int argc, char** argv, std::span<const Handler> handlers,
        int (*other)(char** argv, Output& output));

}  // namespace vltctl

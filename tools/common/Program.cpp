#include "tools/common/Program.h"

#include <algorithm>
#include <new>
#include <string>

#include "tools/common/Help.h"
#include "tools/common/Locale.h"

namespace vltctl {
namespace {

// Also for a command line that cannot be parsed: whoever asks for JSON gets it.
bool AsksForJson(int argc, char** argv) {
  return std::any_of(argv + std::min(argc, 1), argv + argc,
                     [](const char* text) { return std::string_view(text) == "--json"; });
}

int Report(Output& output, int code, const Problem& problem) {
  output.problem(problem);
  return output.finish(code);
}

int Show(Output& output, const char* what, const std::string& text) {
  output.raw(text + "\n");
  output.item({{what, text}});
  return output.finish(kGood);
}

int RunCommand(const Arguments& arguments, char** argv, std::span<const Handler> handlers,
               int (*other)(char** argv, Output& output)) {
  Output output(arguments.command().name, arguments.json(), arguments.text("--root"));
  auto handler = std::find_if(handlers.begin(), handlers.end(), [&](const Handler& row) {
    return std::string_view(row.command) == arguments.command().name;
  });
  try {
    return output.finish(handler == handlers.end() ? other(argv, output)
                                                   : handler->run(arguments, output));
  } catch (const Failure& failure) {
    return Report(output, failure.code, failure.problem);
  } catch (int) {
    // The library's own report of a guarded file that cannot be opened.
    return Report(output, kDataUnusable,
                  {"cannot-open", "", "a file of the installation, or its lock, cannot be opened",
                   "", "run the command as a user who may write them"});
  } catch (const std::bad_alloc&) {
    return Report(output, kDataUnusable, {"no-memory", "", "out of memory", "", ""});
  } catch (const std::exception& error) {
    // What files are not as they should be, in the words of the library.
    return Report(output, kDataUnusable, {"unusable", "", error.what(), "", ""});
  }
}

}  // namespace

int Run(int argc, char** argv, std::span<const Handler> handlers,
        int (*other)(char** argv, Output& output)) {
  SetLocale();
  Parsed parsed = Parse(argc, argv);
  if (parsed.kind == Parsed::Kind::Run) {
    return RunCommand(parsed.arguments, argv, handlers, other);
  }
  Output output("", AsksForJson(argc, argv));
  if (parsed.kind == Parsed::Kind::Help) return Show(output, "help", HelpText(parsed.helpFor));
  if (parsed.kind == Parsed::Kind::Version) return Show(output, "version", VLTCTL_VERSION);
  return Report(output, kUsage, {"usage", "", parsed.whatIsWrong, "", parsed.next});
}

}  // namespace vltctl

// vltctl: shows and tests an installation. The commands that are calls of the library are done by
// vltctl-client, which this program becomes.
#include <locale.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <exception>
#include <filesystem>

#include "tools/common/Commands.h"
#include "tools/common/Terminal.h"
#include "tools/common/Usage.h"
#include "tools/vltctl/Reading.h"

namespace {

// It lies beside this program, or, once installed, among those that only other programs start.
[[noreturn]] void BecomeClient(char** argv) {
  std::filesystem::path here = std::filesystem::read_symlink("/proc/self/exe").parent_path();
  for (const char* place : {"vltctl-client", "../libexec/vltutils/vltctl-client"}) {
    std::string program = here / place;
    if (access(program.c_str(), X_OK) == 0) execv(program.c_str(), argv);
  }
  fprintf(stderr, "vltctl: vltctl-client is not installed\n");
  exit(vltctl::kDataUnusable);
}

struct Arguments {
  bool json = false, client = false, server = false;
  unsigned index = 3;
  std::string name, file;
  std::vector<std::string> flags;
};

int Run(int argc, char** argv) {
  Arguments a;
  int result = vltctl::kUsage;
  CLI::App app("Files of the storage's rendezvous and diagnostics.", "vltctl");
  app.require_subcommand(1);
  auto command = [&](CLI::App& parent, const char* name, const char* text, auto run) {
    CLI::App* sub = parent.add_subcommand(name, text);
    sub->callback([&result, run] { result = run(); });
    return sub;
  };
  auto own = [&](const char* name, auto run) {
    return command(app, name, vltctl::SummaryOfFileCommand(name), run);
  };
  auto json = [&](CLI::App* sub) { sub->add_flag("--json", a.json, "Print JSON"); };

  CLI::App* settings =
      own("settings", [&] { return admin::Settings(a.index, a.client, a.server, a.name, a.json); });
  settings->add_option("--index", a.index, "Number after the names of the items")
      ->capture_default_str();
  settings->add_flag("--client", a.client, "What a client reads");
  settings->add_flag("--server", a.server, "What the server reads");
  settings->add_option("--name", a.name, "NAME.ini instead of kor.ini");
  json(settings);
  json(own("jar", [&] { return admin::Jar(a.json); }));
  CLI::App* verify = own("verify", [&] { return admin::Verify(a.file, a.json); });
  verify->add_option("file", a.file, "The INI file")->required();
  json(verify);
  json(own("trace", [&] { return admin::Trace(a.json); }));
  json(own("events", [&] { return admin::Events(a.json); }));

  CLI::App* hook = app.add_subcommand("hook", vltctl::SummaryOfFileCommand("hook"));
  hook->require_subcommand(1);
  json(command(*hook, "list", "The points", [&] { return admin::HookList(a.json); }));
  CLI::App* arm = command(*hook, "arm", "Arms one point for processes that refresh their hooks",
                          [&] { return admin::HookArm(a.name, a.flags); });
  arm->add_option("name", a.name, "The point")->required();
  arm->add_option("flags", a.flags, "hang[=MS], crash, fail, throw, exhaust")->required();
  command(*hook, "clear", "Disarms", [&] { return admin::HookClear(); });

  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    return vltctl::ExitOf(app, error) == 0 ? vltctl::kGood : vltctl::kUsage;
  }
  return result;
}

}  // namespace

int main(int argc, char** argv) {
  setlocale(LC_ALL, "");
  if (argc < 2 || !vltctl::SummaryOfFileCommand(argv[1])) BecomeClient(argv);
  try {
    return Run(argc, argv);
  } catch (const std::exception& error) {
    fprintf(stderr, "vltctl: %s\n", vltctl::ForTerminal(error.what()).c_str());
  } catch (int) {
    fprintf(stderr, "vltctl: the file cannot be opened\n");
  }
  return vltctl::kDataUnusable;
}

// vltctl: shows, tests and mends an installation. It reads and writes the system's files itself, and
// becomes vltctl-client for what only a client of the library can do.
#include <sys/auxv.h>
#include <unistd.h>

#include <filesystem>
#include <system_error>

#include "tools/common/Help.h"
#include "tools/common/Program.h"
#include "tools/vltctl/Components.h"
#include "tools/vltctl/GuardedFiles.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"

namespace admin {
namespace {

namespace fs = std::filesystem;

// Without /proc, by the path that this program was started with; relative ones count from the working
// directory, which does not change.
fs::path OwnPath() {
  std::error_code hidden;
  fs::path self = fs::read_symlink("/proc/self/exe", hidden);
  if (!hidden) return self;
  const char* started = reinterpret_cast<const char*>(getauxval(AT_EXECFN));
  return fs::canonical(started ? started : "", hidden);
}

}  // namespace

int Completion(const Arguments& arguments, Output& output) {
  std::string shell = arguments.text("SHELL");
  std::string text = shell == "man" ? vltctl::ManualText() : vltctl::CompletionText(shell);
  if (text.empty()) {
    throw vltctl::Failure(vltctl::kUsage, {"no-such-shell", "", "no completion for " + shell, "",
                                           "give bash, zsh, fish or man"});
  }
  output.raw(text);
  output.item({{"shell", shell}, {"text", text}});
  return vltctl::kGood;
}

// It lies beside this program, or, once installed, among those that only other programs start.
int BecomeClient(char** argv, Output&) {
  ExpectUsableDatabase();
  fs::path here = OwnPath().parent_path();
  for (const char* place : {"vltctl-client", "../libexec/vltutils/vltctl-client"}) {
    std::string program = here / place;
    if (access(program.c_str(), X_OK) == 0) execv(program.c_str(), argv);
  }
  throw vltctl::Failure(
      vltctl::kDataUnusable,
      {"no-client", here, "vltctl-client is neither here nor in ../libexec/vltutils", "",
       "install vltutils again, with both programs"});
}

}  // namespace admin

namespace {

char** s_argv;

// Reads the snapshot, or, with --live, becomes the client when no other process has the registrar.
template <int (*snapshot)(const vltctl::Arguments&, vltctl::Output&)>
int OrLive(const vltctl::Arguments& arguments, vltctl::Output& output) {
  if (!arguments.has("--live")) return snapshot(arguments, output);
  admin::WaitForRegistrar(arguments);
  return admin::BecomeClient(s_argv, output);
}

// The client loads libraries, which those of an image are not for.
int Check(const vltctl::Arguments& arguments, vltctl::Output& output) {
  if (admin::HasChosenRoot()) return admin::CheckImage(arguments, output);
  return admin::BecomeClient(s_argv, output);
}

// The command on the installation in force, or on that of --root.
template <int (*command)(const vltctl::Arguments&, vltctl::Output&)>
int At(const vltctl::Arguments& arguments, vltctl::Output& output) {
  admin::ChooseRoot(arguments);
  return command(arguments, output);
}

}  // namespace

int main(int argc, char** argv) {
  s_argv = argv;
  const vltctl::Handler handlers[] = {
      {"list", At<OrLive<admin::List>>},
      {"show", At<OrLive<admin::Show>>},
      {"classes", At<OrLive<admin::Classes>>},
      {"scan", At<admin::Scan>},
      {"why", At<admin::Why>},
      {"watch", admin::Watch},
      {"check", At<Check>},
      {"settings", At<admin::Settings>},
      {"settings set", At<admin::SettingsSet>},
      {"url", At<admin::Url>},
      {"identity", At<admin::Identity>},
      {"jar", At<admin::Jar>},
      {"verify", At<admin::Verify>},
      {"repair", At<admin::Repair>},
      {"trace", admin::Trace},
      {"events", admin::Events},
      {"hook list", admin::HookList},
      {"hook arm", At<admin::HookArm>},
      {"hook clear", At<admin::HookClear>},
      {"error", admin::Error},
      {"paths", At<admin::Paths>},
      {"locks", admin::Locks},
      {"doctor", At<admin::Doctor>},
      {"lint", admin::Lint},
      {"new", admin::New},
      {"completion", admin::Completion},
  };
  return vltctl::Run(argc, argv, handlers, admin::BecomeClient);
}

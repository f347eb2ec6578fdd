#include "tools/common/Commands.h"

#include <algorithm>

namespace vltctl {
namespace {

constexpr const char* kComponents = "Components";
constexpr const char* kAuthors = "For authors of components";
constexpr const char* kRendezvous = "Rendezvous";
constexpr const char* kDiagnostics = "Diagnostics";
constexpr const char* kTool = "The command itself";

// What list, show and classes share. Without --live they read the files and take part in nothing.
constexpr Argument kLive = {"--live", nullptr,
                            "Ask the registrar, which registers what has changed"};
constexpr Argument kWait = {
    "--wait", "SECONDS", "With --live: how long to wait while another process holds it; 0 without"};
constexpr Argument kRoot = {"--root", "DIR", "The installation in that directory; an image will do",
                            false,    false, kDirectories};

// Why a command takes no --root.
constexpr const char* kGivenFiles = "it reads the files that are given";
constexpr const char* kOfMachine = "it shows this machine, not an installation";
constexpr const char* kOfLibrary = "it shows what the library has in every installation";

constexpr Argument kList[] = {
    {"--type", "TYPE", "Only dictionary, object-expert or resource-expert", false, false,
     "dictionary object-expert resource-expert"},
    {"--class", "GUID", "Only experts that bind to the class"},
    {"--name", "PATTERN", "Only names that match, with * and ?"},
    {"--long", nullptr, "With prefix or PnP, number of classes, registration file"},
    kLive,
    kWait,
    kRoot};
constexpr Argument kShow[] = {
    {"COMPONENT", nullptr, "Name, GUID or path, or the beginning of a name or GUID", true},
    {"--exists", nullptr, "Print nothing; the exit code is the answer"},
    {"--at-least", "VERSION", "Print nothing; 0 if it is a dictionary of that schema version"},
    kLive,
    kWait,
    kRoot};
constexpr Argument kClasses[] = {
    {"GUID", nullptr, "Identifier of the class", true}, kLive, kWait, kRoot};
constexpr Argument kWhy[] = {
    {"COMPONENT", nullptr, "Name, GUID or path of a bundle or registration file", true}, kRoot};
constexpr Argument kScan[] = {
    {"--dry-run", nullptr, "Required: only report it; a registrar scans when it starts"}, kRoot};
constexpr Argument kWatch[] = {
    {"--count", "N", "End after N changes"},
    {"--for", "SECONDS", "End then; with --count and fewer changes the exit code is 1"},
    kRoot};
constexpr Argument kCheck[] = {
    {"--only-bad", nullptr, "Show the components that are not sound only"},
    {"--library", nullptr, "Add what the library's own check says, as notes"},
    {"COMPONENT", nullptr, "Identifier or name of one component; all without"},
    kRoot};

constexpr Argument kSettings[] = {
    {"--index", "N", "Number after the names of the items; 3 without it"},
    {"--client", nullptr, "What a client reads"},
    {"--server", nullptr, "What the server reads"},
    {"--name", "NAME", "NAME.ini instead of kor.ini"},
    kRoot};
constexpr Argument kSettingsSet[] = {
    {"--name", "NAME", "NAME.ini instead of kor.ini"},
    {"KEY", nullptr, "Name of the setting, with its index if it has one", true},
    {"VALUE", nullptr, "What it is to be", true},
    kRoot};
constexpr Argument kVerify[] = {
    {"--content", nullptr, "Registration files instead: whether the database has what they say"},
    {"--all", nullptr, "The database, the jar and the settings; so it is without files too"},
    {"FILE", nullptr, "An INI file", false, true, kFiles},
    kRoot};
constexpr Argument kRepair[] = {
    {"--all", nullptr, "The database, the jar and the settings; so it is without files too"},
    {"--dry-run", nullptr, "Say what would be done; exit code 1 if it is anything"},
    {"FILE", nullptr, "An INI file", false, true, kFiles},
    kRoot};

constexpr Argument kOnlyRoot[] = {kRoot};

constexpr Argument kHookArm[] = {
    {"POINT", nullptr, "Number or name of a point, as \"hook list\" shows them", true},
    {"FLAG", nullptr, "hang[=MS], crash, fail, throw, exhaust", true, true,
     "hang crash fail throw exhaust"},
    kRoot};

constexpr Argument kError[] = {
    {"CODE", nullptr, "A code (0x80040326, -2147220698) or a name (E_FAIL); all without"}};
constexpr Argument kLocks[] = {
    {"--sweep", nullptr, "Remove the locks of logs whose processes have ended"}};

constexpr Argument kTrace[] = {
    {"--follow", nullptr, "Print what is added, until the process or this command is ended", false,
     false, nullptr, "-f"},
    {"PID", nullptr, "Process whose log it is; the newest log without"}};

constexpr Argument kLint[] = {
    {"--strict", nullptr, "Warnings make the exit code 1, too"},
    {"PATH", nullptr, "A registration file, a bundle, or a directory with bundles below it", true,
     true, kFiles}};
constexpr Argument kNew[] = {
    {"--name", "NAME", "Name of the component and its bundle"},
    {"--class", "GUID", "Class of objects that an expert binds to; a fresh one without"},
    {"KIND", nullptr, "dictionary, object-expert or resource-expert", true, false,
     "dictionary object-expert resource-expert"},
    {"DIR", nullptr, "Directory to make the sources in", true, false, kDirectories}};

constexpr Argument kCompletion[] = {{"SHELL", nullptr,
                                     "bash, zsh or fish; \"man\" is the list of the manual", true,
                                     false, "bash zsh fish man"}};

constexpr Command kCommands[] = {
    {kComponents, "list", "All components: type, name, GUID, schema version, file", kList},
    {kComponents, "show", "One component and what belongs to it", kShow},
    {kComponents, "classes", "The experts that bind to a class of objects", kClasses},
    {kComponents, "scan", "What the next start of a registrar would merge, remove and save", kScan},
    {kComponents, "why", "Why a component is not registered, and what to do; 1 if it is not", kWhy},
    {kComponents, "watch",
     "What changes in the components, settings and database, line by line; ends with SIGINT",
     kWatch},
    {kComponents, "check", "Whether the components' files load and offer their entry points",
     kCheck},
    {kAuthors, "lint", "What is wrong with registration files, by file and line", kLint,
     kGivenFiles},
    {kAuthors, "new", "Skeleton of a component that builds, registers and checks sound", kNew,
     "it makes sources in the directory that is given"},
    {kRendezvous, "settings", "Settings in force, where they come from, and what is ignored",
     kSettings},
    {kRendezvous, "settings set", "Changes a setting, under the file's lock", kSettingsSet},
    {kRendezvous, "jar", "What server and clients have left each other", kOnlyRoot},
    {kRendezvous, "url", "Where a local server of this installation listens", kOnlyRoot},
    {kRendezvous, "identity", "Identity of this machine's server; made if there is none",
     kOnlyRoot},
    {kRendezvous, "verify", "Guarded INI files and their sidecars, and what the next opening does",
     kVerify},
    {kRendezvous, "repair",
     "Makes guarded INI files such that the next opening takes them; keeps a copy of each",
     kRepair},
    {kDiagnostics, "doctor", "What is good, doubtful and bad here, and what to do", kOnlyRoot},
    {kDiagnostics, "paths", "Every place in use, and what decides it", kOnlyRoot},
    {kDiagnostics, "error", "Name and meaning of a result or exception code", kError, kOfLibrary},
    {kDiagnostics, "locks", "Named locks and events, their holders and age", kLocks, kOfMachine},
    {kDiagnostics, "trace", "Where the log of this user goes, its options and last lines", kTrace,
     kOfMachine},
    {kDiagnostics, "events", "Named events of the machine and who holds them", {}, kOfMachine},
    {kDiagnostics, "hook list", "Points of fault injection", {}, kOfLibrary},
    {kDiagnostics, "hook arm", "Arms one point for processes that refresh their hooks", kHookArm},
    {kDiagnostics, "hook clear", "Disarms", kOnlyRoot},
    {kTool, "completion", "Completion of this command for a shell", kCompletion,
     "it prints a script that is the same everywhere"},
};

}  // namespace

std::span<const Command> Commands() { return kCommands; }

const Command* FindCommand(std::string_view name) {
  for (const Command& command : kCommands) {
    if (name == command.name) return &command;
  }
  return nullptr;
}

std::vector<std::string> CommandWords() {
  std::vector<std::string> words;
  for (const Command& command : kCommands) {
    std::string_view name = command.name;
    std::string word(name.substr(0, name.find(' ')));
    if (std::find(words.begin(), words.end(), word) == words.end()) words.push_back(word);
  }
  return words;
}

std::vector<std::string> WordsBelow(const std::string& word) {
  std::vector<std::string> words;
  for (const Command& command : Commands()) {
    std::string name = command.name;
    if (name.starts_with(word + " ")) words.push_back(name.substr(word.size() + 1));
  }
  return words;
}

std::string Synopsis(const Command& command) {
  std::string out = command.name;
  for (const Argument& argument : command.arguments) {
    std::string text = argument.name;
    if (argument.value) text += std::string(" ") + argument.value;
    if (argument.isList) text += "...";
    bool isOptional = !argument.isRequired;
    out += isOptional ? " [" + text + "]" : " " + text;
  }
  return out;
}

}  // namespace vltctl

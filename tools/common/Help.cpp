#include "tools/common/Help.h"

#include <algorithm>
#include <sstream>
#include <string_view>
#include <vector>

#include "tools/common/Commands.h"
#include "tools/common/Output.h"

namespace vltctl {
namespace {

constexpr const char* kPurpose =
    "Shows, tests and mends an installation of the configuration storage.";
constexpr Argument kJson = {"--json", nullptr, "Print one JSON document (schema \"vltctl/1\")"};
constexpr Argument kHelp = {"--help", nullptr, "Print this"};
constexpr Argument kVersion = {"--version", nullptr, "Print the version"};
constexpr const char* kExitCodes =
    "Exit codes: 0 good, 1 not found or findings, 2 usage, 3 the installation's data cannot be "
    "used,\n"
    "4 busy, 5 the output cannot be written.\n";

struct NamedWord {
  std::string word, summary;
};

std::string FirstWord(const Command& command) {
  std::string name = command.name;
  return name.substr(0, name.find(' '));
}

std::string SecondWord(const Command& command) {
  std::string name = command.name;
  size_t blank = name.find(' ');
  return blank == std::string::npos ? "" : name.substr(blank + 1);
}

bool BelongsTo(const Command& command, const std::string& name) {
  return name == command.name || name == FirstWord(command);
}

std::vector<const Argument*> OptionsOf(const Command& command) {
  std::vector<const Argument*> out;
  for (const Argument& argument : command.arguments) out.push_back(&argument);
  out.push_back(&kJson);
  out.push_back(&kHelp);
  return out;
}

std::string Left(const Argument& argument) {
  std::string name = argument.name;
  if (argument.letter) name = argument.letter + (", " + name);
  return argument.value ? name + " " + argument.value : name;
}

std::string Indented(const Table& table) {
  std::string out, text = table.text();
  for (size_t at = 0; at < text.size();) {
    size_t end = text.find('\n', at) + 1;
    out += "  " + text.substr(at, end - at);
    at = end;
  }
  return out;
}

std::string HelpOfAll() {
  std::string out = std::string("vltctl COMMAND [ARGUMENTS] [--json]\n") + kPurpose + "\n";
  std::string group;
  Table table;
  auto endGroup = [&] {
    if (!group.empty()) out += "\n" + group + ":\n" + Indented(table);
    table = Table();
  };
  for (const Command& command : Commands()) {
    if (group != command.group) endGroup();
    group = command.group;
    table.add({command.name, command.summary});
  }
  endGroup();
  for (const Argument* option : {&kJson, &kHelp, &kVersion}) {
    table.add({option->name, option->summary});
  }
  out += "\nOptions:\n" + Indented(table);
  return out + "\n\"vltctl COMMAND --help\" shows the arguments of a command.\n" + kExitCodes;
}

std::string HelpOf(const Command& command) {
  Table table;
  for (const Argument* option : OptionsOf(command)) table.add({Left(*option), option->summary});
  return "vltctl " + Synopsis(command) + "\n" + command.summary + ".\n\n" + Indented(table);
}

}  // namespace

std::string HelpText(const std::string& name) {
  std::string out;
  for (const Command& command : Commands()) {
    if (BelongsTo(command, name)) out += (out.empty() ? "" : "\n") + HelpOf(command);
  }
  if (out.empty()) out = HelpOfAll();
  out.pop_back();
  return out;
}

// ---- The manual

namespace {

std::string Escaped(std::string_view text) {
  std::string out;
  for (char c : text) {
    if (c == '-') {
      out += "\\-";
    } else if (c == '\\') {
      out += "\\e";
    } else {
      out += c;
    }
  }
  return out;
}

// In lines of at most 80 bytes, as "mandoc -T lint" wants them. None begins with a macro's character.
std::string Wrapped(const std::string& text) {
  constexpr size_t kWidth = 80;
  std::string out, line;
  std::istringstream words(text);
  for (std::string word; words >> word;) {
    if (!line.empty() && line.size() + 1 + word.size() > kWidth) {
      out += line + "\n";
      line.clear();
    }
    line += (line.empty() ? "" : " ") + word;
  }
  return out + line + "\n";
}

std::string InManual(const Argument& argument) {
  std::string out = argument.isPositional() ? "\\fI" : "\\fB";
  if (argument.letter) out += Escaped(argument.letter) + "\\fR, \\fB";
  out += Escaped(argument.name) + "\\fR";
  if (argument.value) out += " \\fI" + Escaped(argument.value) + "\\fR";
  if (argument.isList) out += " ...";
  return out;
}

std::string InManual(const Command& command) {
  std::string head = "\\fB" + Escaped(command.name) + "\\fR", list;
  for (const Argument& argument : command.arguments) {
    std::string text = InManual(argument);
    head += argument.isRequired ? " " + text : " [" + text + "]";
    list += ".TP\n" + text + "\n" + Wrapped(Escaped(argument.summary) + ".");
  }
  if (!list.empty()) list = ".RS\n" + list + ".RE\n";
  return ".TP\n" + head + "\n" + Wrapped(Escaped(command.summary) + ".") + list;
}

}  // namespace

std::string ManualText() {
  std::string out, group;
  for (const Command& command : Commands()) {
    if (group != command.group) out += std::string(".SS ") + command.group + "\n";
    group = command.group;
    out += InManual(command);
  }
  return out;
}

// ---- Completion

namespace {

std::vector<NamedWord> WordsBelow(const std::string& first) {
  std::vector<NamedWord> out;
  for (const Command& command : Commands()) {
    if (FirstWord(command) != first || SecondWord(command).empty()) continue;
    out.push_back({SecondWord(command), command.summary});
  }
  return out;
}

std::vector<NamedWord> FirstWords() {
  std::vector<NamedWord> out;
  for (const std::string& word : CommandWords()) {
    const Command* command = FindCommand(word);
    std::string summary = command ? command->summary : "";
    if (!command) {
      for (const NamedWord& below : WordsBelow(word)) {
        summary += (summary.empty() ? "" : ", ") + below.word;
      }
    }
    out.push_back({word, summary});
  }
  return out;
}

std::string Join(const std::vector<NamedWord>& words) {
  std::string out;
  for (const NamedWord& word : words) out += (out.empty() ? "" : " ") + word.word;
  return out;
}

struct Offers {
  std::string words;
  bool files = false, directories = false;
};

Offers OffersOf(const Command& command) {
  Offers out;
  for (const Argument* option : OptionsOf(command)) {
    if (!option->isPositional())
      out.words += (out.words.empty() ? "" : " ") + std::string(option->name);
    if (!option->offers || option->value) continue;
    std::string_view offers = option->offers;
    out.files = out.files || offers == kFiles;
    out.directories = out.directories || offers == kDirectories;
    if (offers != kFiles && offers != kDirectories) out.words += " " + std::string(offers);
  }
  return out;
}

// Options with a value, each name once: what follows one is its value.
std::vector<const Argument*> ValuedOptions() {
  std::vector<const Argument*> out;
  for (const Command& command : Commands()) {
    for (const Argument& argument : command.arguments) {
      bool isKnown = std::any_of(out.begin(), out.end(), [&](const Argument* known) {
        return std::string_view(known->name) == argument.name;
      });
      if (argument.value && !isKnown) out.push_back(&argument);
    }
  }
  return out;
}

bool OffersDirectories(const Argument& argument) {
  return argument.offers == std::string_view(kDirectories);
}

std::string BashValues() {
  std::string out = "  case ${COMP_WORDS[COMP_CWORD - 1]} in\n";
  for (const Argument* option : ValuedOptions()) {
    bool isDirectory = option->offers && OffersDirectories(*option);
    std::string words = option->offers && !isDirectory ? option->offers : "";
    out += std::string("    ") + option->name + ") words=\"" + words +
           "\" kind=" + (isDirectory ? "-d" : "") + " ;;\n";
  }
  return out + "  esac\n";
}

std::string Bash() {
  std::string out =
      "# Completion of vltctl for bash, made by \"vltctl completion bash\".\n"
      "_vltctl() {\n"
      "  local current=${COMP_WORDS[COMP_CWORD]} key=${COMP_WORDS[1]-} words= kind=\n"
      "  ((COMP_CWORD > 2)) && case $key in\n";
  for (const NamedWord& first : FirstWords()) {
    std::vector<NamedWord> below = WordsBelow(first.word);
    if (below.empty()) continue;
    std::string pattern = Join(below);
    std::replace(pattern.begin(), pattern.end(), ' ', '|');
    out += "    " + first.word + ") case ${COMP_WORDS[2]} in " + pattern +
           ") key+=\" ${COMP_WORDS[2]}\" ;; esac ;;\n";
  }
  out += "  esac\n  ((COMP_CWORD == 1)) && key=\n  case $key in\n    '') words=\"" +
         Join(FirstWords()) + " --help --version\" ;;\n";
  for (const NamedWord& first : FirstWords()) {
    if (!FindCommand(first.word)) {
      out += "    " + first.word + ") words=\"" + Join(WordsBelow(first.word)) + "\" ;;\n";
    }
  }
  for (const Command& command : Commands()) {
    Offers offers = OffersOf(command);
    std::string below = Join(WordsBelow(command.name));
    out += "    '" + std::string(command.name) + "') words=\"" + offers.words +
           (below.empty() ? "" : " " + below) + "\"";
    if (offers.files) out += " kind=-f";
    if (offers.directories) out += " kind=-d";
    out += " ;;\n";
  }
  return out + "  esac\n" + BashValues() +
         "  mapfile -t COMPREPLY < <(compgen -W \"$words\" -- \"$current\"\n"
         "    [[ -z $kind ]] || compgen $kind -- \"$current\")\n"
         "  [[ -z $kind ]] || compopt -o filenames\n"
         "}\n"
         "complete -F _vltctl vltctl\n";
}

// Text of a zsh word between single quotes, in which a colon ends the word.
std::string ZshQuoted(std::string_view text) {
  std::string out = "'";
  for (char c : text) {
    if (c == '\'') {
      out += "'\\''";
    } else if (c == ':') {
      out += "\\:";
    } else {
      out += c;
    }
  }
  return out + "'";
}

std::string ZshList(const std::vector<NamedWord>& words) {
  std::string out;
  for (const NamedWord& word : words) {
    std::string quoted = ZshQuoted(word.summary);
    out += "      '" + word.word + ":" + quoted.substr(1) + "\n";
  }
  return out;
}

std::string ZshValues() {
  std::string out = "case $words[CURRENT-1] in\n";
  for (const Argument* option : ValuedOptions()) {
    std::string offer = !option->offers ? ""
                        : OffersDirectories(*option)
                            ? "_files -/; "
                            : std::string("compadd -- ") + option->offers + "; ";
    out += std::string("  ") + option->name + ") " + offer + "return ;;\n";
  }
  return out + "esac\n";
}

std::string Zsh() {
  std::string out =
      "#compdef vltctl\n# Completion of vltctl for zsh, made by \"vltctl completion zsh\".\n"
      "local -a commands\nlocal key=$words[2]\n"
      "(( CURRENT == 2 )) && key=\n"
      "(( CURRENT > 3 )) && key+=\" $words[3]\"\n" +
      ZshValues() + "case $key in\n  '')\n    commands=(\n" + ZshList(FirstWords()) +
      "    )\n    _describe command commands\n    compadd -- --help --version\n    ;;\n";
  for (const NamedWord& first : FirstWords()) {
    if (WordsBelow(first.word).empty()) continue;
    const Command* command = FindCommand(first.word);
    out += "  " + first.word + ")\n    commands=(\n" + ZshList(WordsBelow(first.word)) +
           "    )\n    _describe command commands\n";
    if (command) out += "    compadd -- " + OffersOf(*command).words + "\n";
    out += "    ;;\n";
  }
  for (const Command& command : Commands()) {
    if (!WordsBelow(command.name).empty()) continue;
    Offers offers = OffersOf(command);
    std::string pattern = SecondWord(command).empty()
                              ? std::string(command.name) + "|" + command.name + "\\ *"
                              : FirstWord(command) + "\\ " + SecondWord(command);
    out += "  " + pattern + ")\n    compadd -- " + offers.words + "\n";
    if (offers.files) out += "    _files\n";
    if (offers.directories) out += "    _files -/\n";
    out += "    ;;\n";
  }
  return out + "esac\n";
}

std::string FishQuoted(std::string_view text) {
  std::string out = "'";
  for (char c : text) {
    if (c == '\'' || c == '\\') out += '\\';
    out += c;
  }
  return out + "'";
}

std::string FishValues(const Argument& option) {
  if (!option.value || !option.offers) return "";
  return OffersDirectories(option) ? " -a '(__fish_complete_directories)'"
                                   : std::string(" -a '") + option.offers + "'";
}

std::string FishOption(const std::string& condition, const Argument& option) {
  if (option.isPositional()) {
    if (!option.offers || option.offers == std::string_view(kFiles)) return "";
    bool directories = option.offers == std::string_view(kDirectories);
    std::string list = directories ? "(__fish_complete_directories)" : option.offers;
    return "complete -c vltctl -n " + condition + " -a '" + list + "'\n";
  }
  return "complete -c vltctl -n " + condition + " -l " + (option.name + 2) +
         (option.letter ? std::string(" -s ") + (option.letter + 1) : "") +
         (option.value ? " -x" : "") + FishValues(option) + " -d " + FishQuoted(option.summary) +
         "\n";
}

// By the words before the cursor: what they are in whole, and what they begin with. The words of a command
// are also values of others.
constexpr const char* kFishFunctions =
    "function __vltctl_is\n"
    "  set -l words (commandline -opc)\n"
    "  test \"$words[2..-1]\" = \"$argv\"\n"
    "end\n"
    "function __vltctl_in\n"
    "  set -l words (commandline -opc)\n"
    "  test \"$words[2..\"(math 1 + (count $argv))\"]\" = \"$argv\"\n"
    "end\n";

std::string FishWords(const std::string& above, const std::vector<NamedWord>& words) {
  std::string out;
  for (const NamedWord& word : words) {
    out += "complete -c vltctl -n '__vltctl_is" + above + "' -a " + word.word + " -d " +
           FishQuoted(word.summary) + "\n";
  }
  return out;
}

std::string Fish() {
  std::string out =
      std::string("# Completion of vltctl for fish, made by \"vltctl completion fish\".\n") +
      kFishFunctions + "complete -c vltctl -f\n" + FishWords("", FirstWords()) +
      "complete -c vltctl -n __vltctl_is -l help\n"
      "complete -c vltctl -n __vltctl_is -l version\n";
  for (const NamedWord& first : FirstWords()) {
    out += FishWords(" " + first.word, WordsBelow(first.word));
  }
  for (const Command& command : Commands()) {
    std::string condition = std::string("'__vltctl_in ") + command.name;
    for (const NamedWord& word : WordsBelow(command.name)) {
      condition += "; and not __vltctl_in " + std::string(command.name) + " " + word.word;
    }
    condition += "'";
    if (OffersOf(command).files) out += "complete -c vltctl -n " + condition + " -F\n";
    for (const Argument* option : OptionsOf(command)) out += FishOption(condition, *option);
  }
  return out;
}

}  // namespace

std::string CompletionText(const std::string& shell) {
  if (shell == "bash") return Bash();
  if (shell == "zsh") return Zsh();
  return shell == "fish" ? Fish() : "";
}

}  // namespace vltctl

#include "tools/common/Arguments.h"

#include <ctype.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <numeric>

#include "tools/common/Output.h"

namespace vltctl {

std::string Arguments::text(const std::string& name) const {
  auto found = m_values.find(name);
  return found == m_values.end() || found->second.empty() ? "" : found->second.front();
}

std::vector<std::string> Arguments::list(const std::string& name) const {
  auto found = m_values.find(name);
  return found == m_values.end() ? std::vector<std::string>() : found->second;
}

unsigned Arguments::number(const std::string& name, unsigned fallback) const {
  if (!has(name)) return fallback;
  std::string digits = text(name);
  unsigned value = 0;
  auto [end, error] = std::from_chars(digits.data(), digits.data() + digits.size(), value);
  if (error != std::errc() || end != digits.data() + digits.size()) {
    throw Failure{kUsage,
                  {"not-a-number", name, "\"" + digits + "\" is no number", "",
                   "give digits, from 0 to 4294967295"}};
  }
  return value;
}

bool IsGuidText(const std::string& text) {
  bool braces = text.size() == 38 && text.front() == '{' && text.back() == '}';
  std::string bare = braces ? text.substr(1, 36) : text;
  if (bare.size() != 36) return false;
  for (size_t i = 0; i < bare.size(); ++i) {
    bool isDash = i == 8 || i == 13 || i == 18 || i == 23;
    if (isDash ? bare[i] != '-' : !isxdigit(static_cast<unsigned char>(bare[i]))) return false;
  }
  return true;
}

std::string BareGuid(std::string text) {
  std::erase_if(text, [](char c) { return c == '{' || c == '}'; });
  std::transform(text.begin(), text.end(), text.begin(),
                 [](unsigned char c) { return toupper(c); });
  return text;
}

namespace {

std::string Lower(std::string text) {
  for (char& c : text) c = static_cast<char>(tolower(static_cast<unsigned char>(c)));
  return text;
}

// Number of characters to change, add or remove, by rows of the usual table.
size_t Distance(const std::string& a, const std::string& b) {
  std::vector<size_t> row(b.size() + 1);
  std::iota(row.begin(), row.end(), size_t{0});
  for (size_t i = 0; i < a.size(); ++i) {
    size_t diagonal = row[0];
    row[0] = i + 1;
    for (size_t j = 0; j < b.size(); ++j) {
      size_t changed = diagonal + (a[i] != b[j]);
      diagonal = row[j + 1];
      row[j + 1] = std::min({changed, row[j] + 1, row[j + 1] + 1});
    }
  }
  return row.back();
}

}  // namespace

std::string Nearest(const std::string& word, const std::vector<std::string>& candidates) {
  constexpr size_t kLongest =
      200;  // longer words are no typing errors, and the table grows with the square
  if (word.empty() || word.size() > kLongest) return "";
  std::string best;
  size_t least = 1 + word.size() / 3 + 1;
  for (const std::string& candidate : candidates) {
    if (candidate.size() > kLongest) continue;
    size_t distance = Distance(Lower(word), Lower(candidate));
    if (distance >= least) continue;
    least = distance;
    best = candidate;
  }
  return best;
}

std::string DidYouMean(const std::string& word, const std::vector<std::string>& candidates) {
  std::string near = Nearest(word, candidates);
  return near.empty() ? "" : "did you mean \"" + near + "\"?";
}

// Builds CLI11's tree from the table, and reads its answers.
struct Parser {
  CLI::App app{"", "vltctl"};
  std::map<const Command*, Arguments> arguments;
  std::map<std::string, CLI::App*> parents;  // by the first word
  const Command* chosen = nullptr;

  Parser() {
    app.set_version_flag("--version", "");
    app.require_subcommand(1);
    for (const Command& command : Commands()) add(command);
  }

  CLI::App* parentOf(const std::string& word) {
    CLI::App*& parent = parents[word];
    if (parent) return parent;
    parent = app.add_subcommand(word);
    if (!FindCommand(word)) parent->require_subcommand(1);
    return parent;
  }

  void add(const Command& command) {
    std::string name = command.name;
    size_t blank = name.find(' ');
    CLI::App* sub = parentOf(name.substr(0, blank));
    if (blank != std::string::npos) sub = sub->add_subcommand(name.substr(blank + 1));
    Arguments& values = arguments[&command];
    values.m_command = &command;
    sub->add_flag_callback("--json", [&values] { values.m_values["--json"] = {}; });
    for (const Argument& argument : command.arguments) add(sub, argument, &values);
    // Those of commands below another one run before its own.
    sub->callback([this, &command] {
      if (!chosen) chosen = &command;
    });
  }

  static void add(CLI::App* sub, const Argument& argument, Arguments* values) {
    std::string name = argument.name;
    if (argument.isFlag()) {
      std::string names = argument.letter ? argument.letter + ("," + name) : name;
      sub->add_flag_callback(names, [values, name] { values->m_values[name] = {}; });
      return;
    }
    CLI::callback_t take = [values, name](const CLI::results_t& texts) {
      values->m_values[name] = texts;
      return true;
    };
    CLI::Option* option = sub->add_option(name, take);
    option->required(argument.isRequired);
    if (argument.isList) {
      option->expected(1, CLI::detail::expected_max_vector_size)->allow_extra_args();
    } else {
      option->expected(1);
    }
    // A variable of a script that is not set must not stand for all components, or for no filter.
    if (name != "VALUE") {
      option->check([](const std::string& text) {
        return text.empty() ? std::string("is empty") : std::string();
      });
    }
    if (name == "GUID") {
      option->check([](const std::string& text) {
        return IsGuidText(text) ? std::string() : "not a GUID: " + text;
      });
    }
  }
};

namespace {

Parsed Wrong(const std::string& what, const std::string& next) {
  Parsed out;
  out.whatIsWrong = what;
  out.next = next;
  return out;
}

// The command that the first words name, as far as they do.
std::string CommandOf(const CLI::App& app) {
  auto below = app.get_subcommands();
  if (below.empty()) return "";
  std::string rest = CommandOf(*below.front());
  return below.front()->get_name() + (rest.empty() ? "" : " " + rest);
}

std::string HelpHint(const std::string& command) {
  return "see \"vltctl " + (command.empty() ? "" : command + " ") + "--help\"";
}

// A first or second word that is no command, where one must be.
Parsed WrongWord(const std::string& word, const std::vector<std::string>& known,
                 const std::string& parent) {
  std::string guess = DidYouMean(word, known);
  return Wrong("no such command: " + (parent.empty() ? "" : parent + " ") + word,
               guess.empty() ? HelpHint(parent) : guess);
}

bool IsOneOf(const std::string& word, const std::vector<std::string>& words) {
  return std::find(words.begin(), words.end(), word) != words.end();
}

std::vector<std::string> OptionsOf(const CLI::App& app) {
  std::vector<std::string> names;
  for (const CLI::Option* option : app.get_options()) names.push_back(option->get_name());
  return names;
}

// What is too much, with the option that it may stand for.
Parsed WrongExtras(const CLI::App& app, const std::string& message) {
  const CLI::App* sub = &app;
  while (!sub->get_subcommands().empty()) sub = sub->get_subcommands().front();
  std::vector<std::string> extras = app.remaining(true);
  const Command* command = FindCommand(CommandOf(app));
  if (command && command->whyNoRoot && !extras.empty() && extras.front().starts_with("--root")) {
    return Wrong(std::string(command->name) + " takes no --root: " + command->whyNoRoot, "");
  }
  std::string guess = extras.empty() ? "" : DidYouMean(extras.front(), OptionsOf(*sub));
  return Wrong(message, guess.empty() ? HelpHint(CommandOf(app)) : guess);
}

}  // namespace

Parsed Parse(int argc, char** argv) {
  if (argc < 2) return Wrong("no command", HelpHint(""));
  std::string first = argc > 1 ? argv[1] : "-", second = argc > 2 ? argv[2] : "-";
  if (!first.starts_with('-') && !IsOneOf(first, CommandWords())) {
    return WrongWord(first, CommandWords(), "");
  }
  if (first.starts_with('-') && !IsOneOf(first, {"-h", "--help", "--version"})) {
    return Wrong("the command comes before " + first, HelpHint(""));
  }
  std::vector<std::string> below = WordsBelow(first);
  if (!FindCommand(first) && argc == 2 && !below.empty()) {
    return Wrong(first + " needs one more word", HelpHint(first));
  }
  if (!FindCommand(first) && !second.starts_with('-') && !IsOneOf(second, below)) {
    return WrongWord(second, below, first);
  }
  Parser parser;
  Parsed out;
  try {
    parser.app.parse(argc, argv);
    out.kind = Parsed::Kind::Run;
    out.arguments = parser.arguments[parser.chosen];
  } catch (const CLI::CallForHelp&) {
    out.kind = Parsed::Kind::Help;
    out.helpFor = CommandOf(parser.app);
  } catch (const CLI::CallForVersion&) {
    out.kind = Parsed::Kind::Version;
  } catch (const CLI::ExtrasError& error) {
    return WrongExtras(parser.app, error.what());
  } catch (const CLI::ArgumentMismatch& error) {
    const std::string option = error.what();
    bool isMissing = option.ends_with("missing");
    return Wrong(isMissing ? option.substr(0, option.find(':')) + " needs a value" : option,
                 HelpHint(CommandOf(parser.app)));
  } catch (const CLI::ParseError& error) {
    return Wrong(error.what(), HelpHint(CommandOf(parser.app)));
  }
  return out;
}

}  // namespace vltctl

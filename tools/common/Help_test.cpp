#include "tools/common/Help.h"

#include <gtest/gtest.h>

#include <algorithm>

#include <regex>
#include <set>
#include <sstream>

#include "tests/support/Child.h"
#include "tests/support/TempDir.h"
#include "tools/common/Commands.h"

namespace vltctl {
namespace {

using vlt::test::ReadBytes;
using vlt::test::RunProgram;
using vlt::test::WriteBytes;

const std::string kSource = VLT_TEST_SOURCE;

bool IsHere(const char* program) {
  return RunProgram({"sh", "-c", std::string("command -v ") + program}).exitCode == 0;
}

TEST(Help, TheManualHasTheListOfTheTable) {
  std::string manual = ReadBytes(kSource + "/man/vltctl.1");
  const std::string begin = ".\\\" Made by \"vltctl completion man\".\n",
                    end = ".\\\" End of it.\n";
  size_t first = manual.find(begin), last = manual.find(end);
  ASSERT_NE(first, std::string::npos);
  ASSERT_NE(last, std::string::npos);
  first += begin.size();
  EXPECT_EQ(manual.substr(first, last - first), ManualText());
}

TEST(Help, TheManualsAreClean) {
  if (!IsHere("mandoc")) GTEST_SKIP() << "NOT TESTED: mandoc is not installed";
  for (const char* manual : {"/man/vltctl.1", "/man/vltutils.3", "/man/Info.vlr.5",
                             "/man/kor.ini.5", "/man/vlt.vlr.5", "/man/vltutils.7"}) {
    auto result = RunProgram({"mandoc", "-T", "lint", kSource + manual});
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(result.exitCode, 0);
  }
}

TEST(Help, TheManualOfTheLibraryNamesEachExport) {
  const std::string manual = ReadBytes(kSource + "/man/vltutils.3");
  std::istringstream map(ReadBytes(kSource + "/cmake/exports.map"));
  const std::regex function("\\s*(vlt\\w+);");
  std::smatch name;
  int count = 0;
  for (std::string line; std::getline(map, line);) {
    if (!std::regex_match(line, name, function)) continue;
    ++count;
    EXPECT_NE(manual.find(".B " + name[1].str() + "\n"), std::string::npos) << name[1];
  }
  EXPECT_GE(count, 60);
}

// Declarations of functions, each in one line, in their order.
std::vector<std::string> Declarations(const std::string& text, const std::string& pattern) {
  const std::regex declaration(pattern), blanks("\\s+"), afterBracket("\\( ");
  std::vector<std::string> found;
  for (std::sregex_iterator one(text.begin(), text.end(), declaration), end; one != end; ++one) {
    std::string line = std::regex_replace(one->str(1), blanks, " ");
    found.push_back(std::regex_replace(line, afterBracket, "("));
  }
  return found;
}

TEST(Help, TheManualOfTheLibraryHasTheDeclarationsOfTheHeader) {
  const std::string manual = ReadBytes(kSource + "/man/vltutils.3");
  const size_t begin = manual.find(".SH SYNOPSIS"), end = manual.find("\n.fi\n", begin);
  ASSERT_NE(end, std::string::npos);
  const std::vector<std::string> declared = Declarations(
      ReadBytes(kSource + "/source/Utilities/vltutils.h"), "VLT_EXPORT ([^;]*\\bvlt\\w+\\([^;]*;)");
  EXPECT_GE(declared.size(), 60u);
  EXPECT_EQ(Declarations(manual.substr(begin, end - begin), "\n(\\w[^;]*\\bvlt\\w+\\([^;]*;)"),
            declared);
}

TEST(Help, NamesEachCommandAndEachArgument) {
  std::string all = HelpText("");
  for (const Command& command : Commands()) {
    EXPECT_NE(all.find(std::string("  ") + command.name), std::string::npos) << command.name;
    EXPECT_NE(all.find(command.summary), std::string::npos) << command.name;
    std::string one = HelpText(command.name);
    EXPECT_EQ(one.find("vltctl " + Synopsis(command) + "\n"), 0u) << one;
    for (const Argument& argument : command.arguments) {
      EXPECT_NE(one.find(std::string(argument.letter ? ", " : "\n  ") + argument.name),
                std::string::npos)
          << argument.name;
    }
  }
}

TEST(Help, NamesOfCommandsAreUniqueAndSummariesHaveNoFullStop) {
  std::set<std::string> names;
  for (const Command& command : Commands()) {
    EXPECT_TRUE(names.insert(command.name).second) << command.name;
    EXPECT_NE(std::string(command.summary).back(), '.') << command.name;
    EXPECT_EQ(FindCommand(command.name), &command);
  }
  EXPECT_EQ(FindCommand("nothing"), nullptr);
}

// What bash completes after these words.
std::string Completed(const std::vector<std::string>& words) {
  vlt::test::TempDir dir;
  std::string script = CompletionText("bash") + "COMP_WORDS=(vltctl";
  for (const std::string& word : words) script += " '" + word + "'";
  script += ")\nCOMP_CWORD=" + std::to_string(words.size()) +
            "\ncompopt() { :; }\n_vltctl\nprintf '%s ' \"${COMPREPLY[@]}\"\n";
  WriteBytes(dir / "script", script);
  auto result = RunProgram({"bash", "--norc", dir / "script"});
  EXPECT_EQ(result.exitCode, 0) << result.err;
  EXPECT_EQ(result.err, "");
  return result.out;
}

TEST(Help, EachCommandTakesARootOrSaysWhyNot) {
  for (const Command& command : Commands()) {
    bool takesRoot = std::any_of(command.arguments.begin(), command.arguments.end(),
                                 [](const Argument& a) { return a.name == std::string("--root"); });
    EXPECT_NE(takesRoot, command.whyNoRoot != nullptr) << command.name;
  }
}

TEST(Help, BashCompletesCommandsOptionsAndWords) {
  EXPECT_EQ(Completed({"ver"}), "verify ");
  EXPECT_EQ(Completed({"hook", "a"}), "arm ");
  EXPECT_EQ(Completed({"hook", ""}), "list arm clear ");
  EXPECT_EQ(Completed({"settings", "--c"}), "--client ");
  EXPECT_EQ(Completed({"hook", "arm", "x", "ex"}), "exhaust ");
  EXPECT_EQ(Completed({"completion", ""}), "bash zsh fish man --json --help ");
  std::string all = Completed({""});
  for (const std::string& word : CommandWords()) {
    EXPECT_NE((" " + all).find(" " + word + " "), std::string::npos) << word;
  }
}

TEST(Help, BashCompletesTheValueOfAnOption) {
  EXPECT_EQ(Completed({"list", "--type", "d"}), "dictionary ");
  EXPECT_EQ(Completed({"verify", "--root", kSource + "/m"}), kSource + "/man ");
  EXPECT_EQ(Completed({"watch", "--count", ""}), " ");
}

TEST(Help, BashCompletesFiles) {
  std::string completed = Completed({"verify", kSource + "/man/vltctl."});
  EXPECT_EQ(completed, kSource + "/man/vltctl.1 ");
}

struct Completion {
  const char *line, *expected;
};

// All that fish offers for the last word of the line.
TEST(Help, FishOffersWhatFits) {
  if (!IsHere("fish")) GTEST_SKIP() << "NOT TESTED: fish is not installed";
  const std::string man = kSource + "/man/", root = "vltctl verify --root " + kSource + "/m",
                    file = "vltctl verify " + man + "vltctl.";
  const std::string page = man + "vltctl.1";
  const Completion rows[] = {
      {"vltctl ver", "verify "},
      {"vltctl -", "--help --version "},
      {"vltctl hook ", "arm clear list "},
      {"vltctl hook list ", ""},
      {"vltctl hook list --", "--help --json "},
      {"vltctl hook arm x ", "crash exhaust fail hang throw "},
      {"vltctl settings --c", "--client "},
      {"vltctl settings set --", "--help --json --name --root "},
      {"vltctl list --type ", "dictionary object-expert resource-expert "},
      {root.c_str(), man.c_str()},
      {file.c_str(), page.c_str()},
  };
  vlt::test::TempDir dir;
  WriteBytes(dir / "vltctl.fish", CompletionText("fish"));
  for (const auto& [line, expected] : rows) {
    auto result = RunProgram({"fish", "--no-config", "-c",
                              "source " + (dir / "vltctl.fish") + "; complete -C '" + line + "'"});
    std::istringstream offers(result.out);
    std::string words;
    for (std::string offer; std::getline(offers, offer);) {
      words += offer.substr(0, offer.find('\t')) + " ";
    }
    if (*expected == '/') words.pop_back();
    EXPECT_EQ(words, expected) << line << result.err;
  }
}

// What zsh makes of the line, in a terminal of its own, when its completion is asked for.
TEST(Help, ZshCompletesWhatFits) {
  if (!IsHere("zsh")) GTEST_SKIP() << "NOT TESTED: zsh is not installed";
  const std::string root = "vltctl verify --root " + kSource + "/m",
                    file = "vltctl verify " + kSource + "/man/vltctl.";
  const std::string man = "vltctl verify --root " + kSource + "/man/", page = file + "1 ";
  const Completion rows[] = {
      {"vltctl ver", "vltctl verify "},
      {"vltctl --v", "vltctl --version "},
      {"vltctl hook a", "vltctl hook arm "},
      {"vltctl hook arm x ex", "vltctl hook arm x exhaust "},
      {"vltctl hook list --j", "vltctl hook list --json "},
      {"vltctl hook list --t", "vltctl hook list --t"},
      {"vltctl settings --c", "vltctl settings --client "},
      {"vltctl settings set --n", "vltctl settings set --name "},
      {"vltctl list --type d", "vltctl list --type dictionary "},
      {root.c_str(), man.c_str()},
      {file.c_str(), page.c_str()},
  };
  vlt::test::TempDir dir;
  WriteBytes(dir / "_vltctl", CompletionText("zsh"));
  WriteBytes(dir / "ask",
             "zmodload zsh/zpty\n"
             "zpty shell zsh -f -i\n"
             "zpty -w shell \"PS1= PS2= fpath=($1 \\$fpath)\"\n"
             "zpty -w shell 'autoload -Uz compinit && compinit -D -u'\n"
             "zpty -w shell \"answer() { zle complete-word; print -rn -- \\\"\\$BUFFER\\\" >$2; "
             "exit }\"\n"
             "zpty -w shell 'zle -N answer; bindkey \"^X\" answer'\n"
             "zpty -w -n shell \"$3\"$'\\x18'\n"
             "while zpty -r shell output; do :; done\n");
  for (const auto& [line, expected] : rows) {
    WriteBytes(dir / "answer", "none");
    RunProgram({"timeout", "60", "zsh", "-f", dir / "ask", dir / "", dir / "answer", line});
    EXPECT_EQ(ReadBytes(dir / "answer"), expected) << line;
  }
}

// The other shells, if they are here, accept their scripts.
TEST(Help, ZshAndFishAcceptTheirScripts) {
  vlt::test::TempDir dir;
  int tested = 0;
  for (const char* shell : {"zsh", "fish"}) {
    if (!IsHere(shell)) continue;
    WriteBytes(dir / shell, CompletionText(shell));
    auto result = RunProgram({shell, "-n", dir / shell});
    EXPECT_EQ(result.exitCode, 0) << result.err;
    ++tested;
  }
  EXPECT_EQ(CompletionText("csh"), "");
  if (!tested) GTEST_SKIP() << "NOT TESTED: neither zsh nor fish is installed";
}

}  // namespace
}  // namespace vltctl

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
  if (RunProgram({"sh", "-c", "command -v mandoc"}).exitCode != 0) {
    GTEST_SKIP() << "NOT TESTED: mandoc is not installed";
  }
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

// The other shells, if they are here, accept their scripts.
TEST(Help, ZshAndFishAcceptTheirScripts) {
  vlt::test::TempDir dir;
  int tested = 0;
  for (const char* shell : {"zsh", "fish"}) {
    if (RunProgram({"sh", "-c", std::string("command -v ") + shell}).exitCode != 0) continue;
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

// The JSON of every command beside the schema that is installed: a good document and a failing one.
#include <gtest/gtest.h>

#include <filesystem>
#include <iostream>
#include <map>
#include <regex>
#include <set>
#include <sstream>

#include "tests/e2e/CheckTree.h"

namespace vlt::test {
namespace {

using nlohmann::json;

using Words = std::vector<std::string>;

struct Runs {
  Words good,
      failing;  // the words after the command; no failing ones where only its usage can be wrong
  int failure = kGood;  // exit code
  bool hasItems = true;
};

const Words kOnlyUsage;

class VltctlJsonOfAll : public testing::Test {
 protected:
  VltctlJsonOfAll() {
    m_installation.addObjectExpert("Tank", "Tank", GText(1),
                                   "{" + GText(1) + "}:1:{" + GText(9) + "}");
    Build(m_bundle + "/libTank.so", kGoodEntry);
    std::filesystem::create_directory(m_installation.root() + "/Data");
    WriteBytes(m_installation.root() + "/Data/vltjar.ini",
               "[ServerSection]\nServerIdentity={00000001-0002-0003-0405-060708090A0B}\n");
    EXPECT_EQ(Vltctl({"list", "--live"}).exitCode, kGood);
  }

  std::map<std::string, Runs> runs() const {
    const Words empty = {"--root", m_empty / ""}, missing = {"--root", m_empty / "missing"},
                here = {"--root", m_installation.root()};
    return {
        {"list", {{}, {"--type", "nothing"}, kUsage}},
        {"show", {{"Tank"}, {"Nothing"}, kNotFound}},
        {"classes", {{GText(9)}, {GText(8)}, kNotFound}},
        {"scan", {{"--dry-run"}, {}, kUsage}},
        {"why", {{"Tank"}, {"Nothing"}, kNotFound}},
        {"watch", {{"--for", "0"}, {"--for", "0", "--count", "1"}, kNotFound, false}},
        {"check", {{"Tank"}, {"Nothing"}, kNotFound}},
        {"settings", {{}, {"--index", "x"}, kUsage}},
        {"settings set", {{"NumCheckpoints", "5"}, {"Potatoes", "5"}, kUsage}},
        {"jar", {{}, empty, kNotFound}},
        {"url", {{}, missing, kDataUnusable}},
        {"identity", {{}, empty, kNotFound}},
        {"verify", {{}, {m_empty / "x.ini"}, kNotFound}},
        {"repair", {{}, {"--all", m_empty / "x.ini"}, kUsage}},
        {"doctor", {here, missing, kDataUnusable}},
        {"paths", {{}, missing, kDataUnusable}},
        {"error", {{"E_FAIL"}, {"0x80041234"}, kNotFound}},
        {"locks", {{}, kOnlyUsage, kGood, false}},
        {"trace", {{}, {"0"}, kUsage}},
        {"events", {{}, kOnlyUsage, kGood, false}},
        {"hook list", {{}, kOnlyUsage}},
        {"hook arm", {{"1", "fail"}, {"99", "fail"}, kNotFound}},
        {"hook clear", {{}, missing, kDataUnusable}},
        {"lint", {{m_bundle}, {m_empty / ""}, kNotFound, false}},
        {"new",
         {{"object-expert", m_empty / "new", "--name", "New"},
          {"nothing", m_empty / "new"},
          kUsage}},
        {"completion", {{"bash"}, {"csh"}, kUsage}},
    };
  }

  // The document, which is that of the command.
  static JsonResult run(const std::string& command, const Words& words) {
    Words all;
    std::istringstream parts(command);
    for (std::string part; parts >> part;) all.push_back(part);
    all.insert(all.end(), words.begin(), words.end());
    all.push_back("--json");
    ProgramResult result = Vltctl(all);
    json document = Document(result.out);
    EXPECT_EQ(document["command"], command) << result.out;
    return {result.exitCode, document["items"], document["problems"], result.err};
  }

  Installation m_installation;
  const std::string m_bundle = m_installation.root() + "/Experts/Tank.vle";
  TempDir m_empty;
};

// As the program itself lists them, for its manual.
std::set<std::string> AllCommands() {
  const std::string text = Vltctl({"completion", "man"}).out;
  const std::regex name("\n\\.TP\n\\\\fB([a-z][a-z ]*)\\\\fR");
  std::set<std::string> names;
  for (std::sregex_iterator one(text.begin(), text.end(), name), end; one != end; ++one) {
    names.insert(one->str(1));
  }
  return names;
}

TEST_F(VltctlJsonOfAll, EachCommandHasAGoodAndAFailingDocumentOfTheSchema) {
  const std::map<std::string, Runs> all = runs();
  std::set<std::string> covered;
  int good = 0, failing = 0;
  for (const auto& [command, runs] : all) {
    covered.insert(command);
    JsonResult result = run(command, runs.good);
    EXPECT_EQ(result.exitCode, kGood) << command << ": " << result.err;
    EXPECT_EQ(result.problems, json::array()) << command;
    EXPECT_TRUE(!runs.hasItems || !result.items.empty()) << command;
    ++good;
    if (runs.failure == kGood) continue;
    JsonResult failed = run(command, runs.failing);
    EXPECT_EQ(failed.exitCode, runs.failure) << command << ": " << failed.err;
    ++failing;
  }
  EXPECT_EQ(covered, AllCommands());
  std::cout << good << " good and " << failing << " failing documents are of the schema\n";
}

}  // namespace
}  // namespace vlt::test

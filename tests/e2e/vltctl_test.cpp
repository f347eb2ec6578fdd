// The command-line client as its users meet it: arguments, output, exit codes.
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <sstream>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

using nlohmann::json;

// Dictionary, object expert and resource expert, the latter two bound to one class.
class Sample : public Installation {
 public:
  Sample() {
    addDictionary("Core", "Core Dictionary", GText(1), 7, "co");
    addObjectExpert("Tank", "Tank", GText(2), "{" + GText(2) + "}:1:{" + GText(9) + "}");
    addResourceExpert("Serial", "Serial \"Ports\"", GText(3), "PNP0501",
                      "{" + GText(3) + "}:1:{" + GText(9) + "}");
    EXPECT_EQ(Vltctl({"list", "--live"}).exitCode, kGood);
  }
};

std::string B(uint32_t n) { return "{" + GText(n) + "}"; }

// ---- Arguments

TEST(Vltctl, HelpAndVersionAreGoodAndGoToStandardOutput) {
  for (const char* option : {"--help", "-h"}) {
    ProgramResult result = Vltctl({option});
    EXPECT_EQ(result.exitCode, kGood);
    EXPECT_EQ(result.err, "");
    for (const char* word : {"list", "show", "classes", "--version", "Exit codes"}) {
      EXPECT_NE(result.out.find(word), std::string::npos) << word;
    }
  }
  ProgramResult version = Vltctl({"--version"});
  EXPECT_EQ(version.exitCode, kGood);
  EXPECT_EQ(version.out, "1.0.0\n");
  ProgramResult help = Vltctl({"show", "--help"});
  EXPECT_EQ(help.exitCode, kGood);
  EXPECT_NE(help.out.find("--json"), std::string::npos);
}

TEST(Vltctl, HelpAndVersionAsJson) {
  EXPECT_EQ(VltctlJson({"--version"}).items.at(0), (json{{"version", "1.0.0"}}));
  std::string help = VltctlJson({"list", "--help"}).items.at(0)["help"];
  EXPECT_EQ(help.find("vltctl list "), 0u) << help;
}

TEST(Vltctl, BadArgumentsAreUsageErrorsAndStartNothing) {
  Installation i;
  const std::vector<std::vector<std::string>> rows = {{},
                                                      {"nothing"},
                                                      {"--nothing"},
                                                      {"list", "more"},
                                                      {"list", "--nothing"},
                                                      {"show"},
                                                      {"show", "words", "--live"},
                                                      {"list", "--type", "words"},
                                                      {"scan"},
                                                      {"show", GText(1), GText(2)},
                                                      {"classes"},
                                                      {"classes", "{" + GText(1)}};
  for (const auto& row : rows) {
    ProgramResult result = Vltctl(row);
    EXPECT_EQ(result.exitCode, kUsage) << json(row);
    EXPECT_NE(result.err, "") << json(row);
    EXPECT_EQ(result.out, "") << json(row);
  }
  EXPECT_FALSE(Exists(i.database()));
}

// ---- list

TEST(Vltctl, ListShowsATable) {
  Sample s;
  ProgramResult result = Vltctl({"list", "--live"});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.err, "");
  std::vector<std::string> lines;
  std::istringstream in(result.out);
  for (std::string line; std::getline(in, line);) lines.push_back(line);
  ASSERT_EQ(lines.size(), 6u);
  EXPECT_EQ(lines[0].substr(0, 4), "TYPE");
  auto holds = [&](int n, const std::vector<std::string>& words) {
    size_t at = 0;
    for (const std::string& word : words) {
      at = lines[n].find(word, at);
      EXPECT_NE(at, std::string::npos) << word << " in " << lines[n];
      if (at == std::string::npos) return;
    }
  };
  holds(1, {"dictionary", "Core Dictionary", B(1), "7",
            s.root() + "/Data Dictionaries/Core.framework"});
  holds(2,
        {"dictionary", "vltdd", "{790F6A90-E0D8-11D3-AA15-005004D131EE}", "0", "vltdd.framework"});
  holds(3, {"object expert", "Tank", B(2), "-", s.root() + "/Experts/Tank.vle"});
  holds(4, {"resource expert", "Serial \"Ports\"", B(3), "-", s.root() + "/Experts/Serial.vle"});
  holds(5, {"4 components", "ms"});
}

TEST(Vltctl, ListAsJson) {
  Sample s;
  JsonResult result = VltctlJson({"list"});
  EXPECT_EQ(result.exitCode, kGood);
  json out = result.items;
  ASSERT_EQ(out.size(), 4u);
  EXPECT_EQ(out[0], (json{{"type", "dictionary"},
                          {"name", "Core Dictionary"},
                          {"guid", B(1)},
                          {"file", s.root() + "/Data Dictionaries/Core.framework"},
                          {"schemaVersion", 7},
                          {"changed", true},
                          {"lastInstalledSchemaVersion", nullptr},
                          {"prefix", "co"},
                          {"pnp", nullptr},
                          {"registrationFile",
                           s.root() + "/Data Dictionaries/Core.framework" + "/Resources/Info.vlr"},
                          {"classes", json::array()}}));
  EXPECT_EQ(out[2], (json{{"type", "object expert"},
                          {"name", "Tank"},
                          {"guid", B(2)},
                          {"file", s.root() + "/Experts/Tank.vle"},
                          {"schemaVersion", nullptr},
                          {"changed", nullptr},
                          {"lastInstalledSchemaVersion", nullptr},
                          {"prefix", nullptr},
                          {"pnp", nullptr},
                          {"registrationFile", s.root() + "/Experts/Tank.vle/Resources/Info.vlr"},
                          {"classes", {B(9)}}}));
  EXPECT_EQ(out[3]["name"], "Serial \"Ports\"");
  EXPECT_EQ(out[3]["pnp"], "PNP0501");
  // The registrar does not say which file brought a component.
  for (json& item : out) {
    item.erase("registrationFile");
    item.erase("classes");
  }
  EXPECT_EQ(VltctlJson({"list", "--live"}).items, out);
}

TEST(Vltctl, JsonIsValidWhateverTheNames) {
  Installation i;
  i.addBundle("Experts", "x.vle",
              "[KORComponents]\nx = \"x\"\n[x]\nIdentifier = \"" + GText(1) +
                  "\"\nFileName = \"/a\\x01\xFF\xC3\x28\\n\\\"b\"\n");
  for (const char* locale : {"C", "C.UTF-8"}) {
    JsonResult result = VltctlJson({"list", "--live"}, {{"LC_ALL", locale}});
    EXPECT_EQ(result.exitCode, kGood) << result.err;
    EXPECT_EQ(result.items.size(), 2u);
  }
}

// ---- show

TEST(Vltctl, ShowTakesEveryFormOfTheIdentifier) {
  Sample s;
  for (const std::string& guid :
       {GText(1), B(1), std::string("{00000001-1111-4222-8333-444444444444}")}) {
    ProgramResult result = Vltctl({"show", guid});
    EXPECT_EQ(result.exitCode, kGood) << result.err;
    for (const char* word : {"Core Dictionary", "schema version", "co", "none", "yes"}) {
      EXPECT_NE(result.out.find(word), std::string::npos) << word;
    }
  }
  json out = VltctlJson({"show", GText(3)}).items.at(0);
  EXPECT_EQ(out["type"], "resource expert");
  EXPECT_EQ(out["pnp"], "PNP0501");
}

TEST(Vltctl, ShowOfAnUnknownOneIsNotFound) {
  Sample s;
  ProgramResult text = Vltctl({"show", GText(77)});
  EXPECT_EQ(text.exitCode, kNotFound);
  EXPECT_EQ(text.out, "");
  EXPECT_EQ(text.err, "vltctl: no component " + GText(77) +
                          "; \"vltctl list\" shows all, and \"vltctl why\" says why\n");
  JsonResult asJson = VltctlJson({"show", GText(77)});
  EXPECT_EQ(asJson.exitCode, kNotFound);
  EXPECT_EQ(asJson.problems.at(0)["code"], "no-component");
  EXPECT_EQ(asJson.items.size(), 0u);
}

// ---- classes

TEST(Vltctl, ClassesListsTheExpertsOfBothTypes) {
  Sample s;
  ProgramResult table = Vltctl({"classes", GText(9)});
  EXPECT_EQ(table.exitCode, kGood);
  EXPECT_NE(table.out.find("Tank"), std::string::npos);
  EXPECT_NE(table.out.find("Serial"), std::string::npos);
  EXPECT_EQ(table.out.find("Core"), std::string::npos);
  json out = VltctlJson({"classes", B(9)}).items;
  ASSERT_EQ(out.size(), 2u);
  EXPECT_EQ(out[0]["name"], "Tank");
  EXPECT_EQ(out[1]["type"], "resource expert");
}

TEST(Vltctl, ClassesOfAnUnknownClassIsNotFound) {
  Sample s;
  ProgramResult result = Vltctl({"classes", GText(2)});
  EXPECT_EQ(result.exitCode, kNotFound);
  EXPECT_EQ(result.out, "");
  EXPECT_NE(result.err, "");
}

// ---- Unusable data: tests/e2e/vltctl_bad_situations_test.cpp

TEST(Vltctl, DataThatCannotBeUsedIsToldInOneLine) {
  auto expectUnusable = [](bool live) {
    for (const std::vector<std::string>& command :
         {std::vector<std::string>{"list"}, {"show", GText(1)}, {"classes", GText(1)}}) {
      std::vector<std::string> arguments = command;
      if (live) arguments.push_back("--live");
      ProgramResult result = Vltctl(arguments);
      EXPECT_EQ(result.exitCode, kDataUnusable) << command[0];
      EXPECT_EQ(result.out, "");
      EXPECT_EQ(result.err.substr(0, 8), "vltctl: ");
      EXPECT_EQ(std::count(result.err.begin(), result.err.end(), '\n'), 1);
    }
  };
  Sample s;
  Installation::setDir("");
  expectUnusable(false);
  expectUnusable(true);
  Installation::setDir(s.root());
  unlink(s.database().c_str());
  expectUnusable(false);
  ASSERT_EQ(mkfifo(s.database().c_str(), 0666), 0);
  expectUnusable(false);
  expectUnusable(true);
  unlink(s.database().c_str());
  std::filesystem::remove_all(s.root() + "/Data");
  WriteBytes(s.root() + "/Data", "in the way");
  expectUnusable(true);
  unlink((s.root() + "/Data").c_str());
  EXPECT_EQ(Vltctl({"list", "--live"}).exitCode, kGood);
}

TEST(Vltctl, ADatabaseThatWouldBeSetAsideIsReportedAndRepaired) {
  Sample s;
  WriteBytes(s.sidecar(), "short");
  for (const std::vector<std::string>& command :
       {std::vector<std::string>{"list"}, {"list", "--live"}}) {
    ProgramResult result = Vltctl(command);
    EXPECT_EQ(result.exitCode, kDataUnusable);
    EXPECT_NE(result.err.find("the sidecar is short"), std::string::npos) << result.err;
  }
  EXPECT_EQ(Vltctl({"repair"}).exitCode, kGood);
  EXPECT_EQ(Vltctl({"list"}).exitCode, kGood);
  EXPECT_EQ(Vltctl({"list", "--live"}).exitCode, kGood);
}

}  // namespace
}  // namespace vlt::test

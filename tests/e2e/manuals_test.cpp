// Manuals and documents beside what the programs read and print.
#include <gtest/gtest.h>

#include <regex>
#include <set>
#include <sstream>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

using nlohmann::json;

using Names = std::set<std::string>;

std::string Source(const std::string& file) {
  return ReadBytes(std::string(VLT_TEST_SOURCE) + "/" + file);
}

// The first matches of the pattern's group, each once.
Names FoundIn(const std::string& text, const char* pattern) {
  const std::regex expression(pattern);
  Names names;
  for (std::sregex_iterator one(text.begin(), text.end(), expression), end; one != end; ++one) {
    names.insert(one->str(1));
  }
  return names;
}

// The part of a manual below a heading.
std::string Section(const std::string& manual, const std::string& heading) {
  size_t begin = manual.find(".SH " + heading + "\n");
  EXPECT_NE(begin, std::string::npos) << heading;
  return manual.substr(begin, manual.find("\n.SH ", begin + 1) - begin);
}

class Manuals : public testing::Test {
 protected:
  Installation m_installation;
};

TEST_F(Manuals, KorIniHasTheSettingsThatAreRead) {
  const Names inManual = FoundIn(Section(Source("man/kor.ini.5"), "ITEMS"), "\\.TP\n\\.B (\\w+)\n");
  Names inCommand;
  for (const json& item : VltctlJson({"settings"}).items) {
    std::string name = item["name"];
    if (name.ends_with("3")) name.back() = 'N';  // the index
    inCommand.insert(name);
  }
  EXPECT_EQ(inManual, inCommand);
  Names inLibrary;
  const std::string keys = Source("source/Utilities/vltSettingsKeys.h");
  for (const std::string& key :
       FoundIn(keys, "(?:IndexedText|PlainNumber) k\\w+ = \\{\"(\\w+)\"")) {
    inLibrary.insert(inManual.count(key + "N") ? key + "N" : key);
  }
  for (const std::string& key : FoundIn(keys, "char\\* k\\w+ = \"(\\w+)\"")) {
    if (key != "STORAGE") inLibrary.insert(key + "N");
  }
  EXPECT_EQ(inManual, inLibrary);
}

TEST_F(Manuals, KorIniHasTheDefaults) {
  const std::string manual = Source("man/kor.ini.5");
  for (const json& item : VltctlJson({"settings"}).items) {
    std::string name = item["name"], value = item["value"].is_string()
                                                 ? item["value"].get<std::string>()
                                                 : item["value"].dump();
    if (name.ends_with("3")) name.back() = 'N';
    if (value.empty()) value = "empty";
    EXPECT_TRUE(
        std::regex_search(manual, std::regex("\\.B " + name + "\nDefault: " + value + "\\b")))
        << name << " " << value;
  }
}

// Each name that the library has for something in an INI file is tried as the key of a component.
TEST_F(Manuals, InfoVlrHasTheKeysThatLintKnows) {
  Names candidates =
      FoundIn(Source("source/Database/databaseText.h"), "char\\* k\\w+ = \"(\\w+)\"");
  Names documented;
  std::istringstream lines(Section(Source("man/Info.vlr.5"), "KEYS"));
  for (std::string line; std::getline(lines, line);) {
    if (!line.starts_with(".B ")) continue;
    for (const std::string& key : FoundIn(line.substr(3), "(\\w+)")) documented.insert(key);
  }
  candidates.insert(documented.begin(), documented.end());
  TempDir dir;
  Names known;
  for (const std::string& key : candidates) {
    WriteBytes(dir / "Info.vlr", "[KORComponents]\nX = \"X\"\n[X]\n" + key + " = \"1\"\n");
    const json findings = VltctlJson({"lint", dir / "Info.vlr"}).items;
    bool isUnknown = ItemWith(findings, "code", "unknown-key") != nullptr ||
                     ItemWith(findings, "code", "misspelt-key") != nullptr;
    if (!isUnknown) known.insert(key);
  }
  EXPECT_EQ(documented, known);
  EXPECT_GE(documented.size(), 8u);
}

TEST_F(Manuals, TheHookFileHasTheNumbersOfThePoints) {
  const std::string document = Source("docs/hook-file.md");
  const json points = VltctlJson({"hook", "list"}).items;
  EXPECT_GE(points.size(), 21u);
  for (const json& point : points) {
    std::string row =
        "\n| " + point["number"].dump() + " | `" + point["name"].get<std::string>() + "` | ";
    EXPECT_NE(document.find(row), std::string::npos) << row;
  }
  EXPECT_EQ(FoundIn(document, "\n\\| (\\d+) \\|").size(), points.size());
}

}  // namespace
}  // namespace vlt::test

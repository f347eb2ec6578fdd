// vltctl lint and new: each fault of a registration file by its line, and skeletons that are sound.
#include <gtest/gtest.h>

#include <filesystem>

#include "tests/e2e/CheckTree.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;
using nlohmann::json;

const std::string kGuid = "{A0000001-1111-4222-8333-444444444444}";
const std::string kOther = "{A0000002-1111-4222-8333-444444444444}";

// A registration file of one object expert named X in a bundle X.vle, with these lines after its own.
std::string Expert(const std::string& more = "") {
  return "[KORComponents]\nX = \"X\"\n[X]\nIdentifier = \"" + kGuid + "\"\nFileName = \"X\"\n" +
         more;
}

class VltctlLint : public testing::Test {
 protected:
  VltctlLint() {
    fs::create_directories(m_bundle + "/Resources");
    Build(m_bundle + "/libX.so", kGoodEntry);
  }
  // The findings of the file with this text: "line: level: text".
  std::vector<std::string> linted(const std::string& text) const {
    WriteBytes(m_file, text);
    std::vector<std::string> findings;
    for (const json& item : VltctlJson({"lint", m_bundle}).items) {
      findings.push_back(std::to_string(item["line"].get<int>()) + ": " +
                         item["level"].get<std::string>() + ": " + item["text"].get<std::string>());
    }
    return findings;
  }

  Installation m_installation;
  TempDir m_dir;
  const std::string m_bundle = m_dir / "X.vle", m_file = m_bundle + "/Resources/Info.vlr";
};

using Findings = std::vector<std::string>;

TEST_F(VltctlLint, ACleanFileHasNone) {
  EXPECT_EQ(linted(Expert("BINDING_CLASSES = \"" + kGuid + ":2:" + kOther + ":" + kOther + "\"\n")),
            Findings());
  ProgramResult result = Vltctl({"lint", m_file});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.out, "0 errors and 0 warnings in 1 file\n");
}

struct Fault {
  std::string text;
  Findings findings;
};

TEST_F(VltctlLint, EachFaultHasItsLine) {
  const std::string binding = "BINDING_CLASSES = \"" + kGuid;
  const Fault faults[] = {
      {"", {"1: error: there is no section [KORComponents], so nothing is registered"}},
      {"[KORComponents]\n", {"1: error: [KORComponents] lists nothing, so nothing is registered"}},
      {"[KORComponents]\nY = \"Y\"\n", {"2: error: there is no section [Y]"}},
      {"[KORComponents]\nKOR = \"KOR\"\n",
       {"2: error: \"KOR\" is a section of the database itself"}},
      {"[KORComponents]\nvltdd = \"vltdd\"\n",
       {"2: error: \"vltdd\" is the library's own dictionary"}},
      {"[KORComponents]\nX = \"Z\"\n[X]\nIdentifier=" + kGuid + "\nFileName=X\n",
       {"2: error: the list entry \"X\" has the value \"Z\": the key names the section, and by the "
        "value the component is removed"}},
      {Expert("[Y]\na = 1\n"), {"6: warning: [Y] is not listed in [KORComponents]"}},
      {Expert("[Registration]\na = 1\n"),
       {"6: error: [Registration] is a section of the database itself"}},
      {Expert("hello\n"), {"6: error: \"hello\" is neither a section nor a key with a value"}},
      {"a = 1\n" + Expert(), {"1: error: a is above the first section and is ignored"}},
      {Expert("FileNmae = \"X\"\n"), {"6: error: FileNmae is read by nothing"}},
      {Expert("Colour = \"red\"\n"), {"6: warning: Colour is kept, and read by nothing"}},
      {Expert("filename = \"X\"\n"), {"5: error: FileName is ignored, as line 6 sets it again"}},
      {Expert("[X]\n"), {"6: warning: [X] goes on from line 3"}},
      {Expert("Prefix = \"x\"\n"), {"6: warning: Prefix says nothing of an expert"}},
      {Expert("FragmentRegistered = 1\n"),
       {"6: warning: FragmentRegistered is the registrar's own to set"}},
      {Expert("PnP = \"" + std::string(1100, 'p') + "\"\n"),
       {"6: error: the value of PnP has 1100 bytes, more than 1023",
        "5: error: " + m_bundle + "/libX.so does not export \"vltCreateResourceExpert\""}},
      {"[KORComponents]\nX=X\n[X]\nFileName=X\n", {"3: error: [X] has no Identifier"}},
      {"[KORComponents]\nX=X\n[X]\nIdentifier=" + kGuid + "\n", {"3: error: [X] has no FileName"}},
      {"[KORComponents]\nX=X\n[X]\nIdentifier={A-1}\nFileName=X\n",
       {"4: error: Identifier \"{A-1}\" is no GUID"}},
      {"[KORComponents]\nX=X\n[X]\nIdentifier=00000000-0000-0000-0000-000000000000\nFileName=X\n",
       {"4: error: Identifier is the null GUID, which stands for all components"}},
      {"[KORComponents]\nX=X\n[X]\nIdentifier={790f6a90-E0D8-11D3-AA15-005004D131EE}\nFileName=X\n",
       {"4: error: Identifier is that of the library's own dictionary"}},
      {"[KORComponents]\nX=X\nY=Y\n[X]\nIdentifier=" + kGuid +
           "\nFileName=X\n[Y]\nIdentifier=" + kGuid + "\nFileName=X\n",
       {"8: error: Identifier is that of [X] of " + m_file}},
      {"[KORComponents]\nX=X\n[X]\nIdentifier=" + kGuid + "\nFileName=Z\n",
       {"5: error: FileName leads to Z.vle, and the bundle is X.vle"}},
      {"[KORComponents]\nX=X\n[X]\nIdentifier=" + kGuid + "\nFileName=/tmp/X.vle\n",
       {"5: warning: FileName has a directory, so it holds on this machine only"}},
      {Expert(binding + ":3:" + kOther + "\"\n"),
       {"6: error: the count is 3, and there are 1 classes"}},
      {Expert(binding + ":1:" + kOther + ":" + kOther + "\"\n"),
       {"6: error: the count is 1, and there are 2 classes"}},
      {Expert(binding + "\"\n"),
       {"6: error: after \"" + kGuid + "\" there is no count of classes"}},
      {Expert(binding + ":1:words\"\n"),
       {"6: error: \"words\" is no GUID of a class or component here"}},
      {Expert("BINDING_CLASSES = \"" + kOther + ":1:" + kOther + "\"\n"),
       {"6: warning: the entry is of " + kOther + ", not of this component"}},
      {Expert("SchemaVersion = seven\nPrefix = x\n"),
       {"6: error: SchemaVersion is \"seven\", which is no number",
        "5: error: FileName leads to X.framework, and the bundle is X.vle"}},
      {"\xFF\xFE[\0",
       {"1: error: the file is UTF-16 or UTF-32, and the library sets such files aside"}},
      {Expert("Colour = \"\xE4\"\n"),
       {"1: error: the file is not UTF-8, so names differ by the reader's locale",
        "6: warning: Colour is kept, and read by nothing"}},
  };
  for (const Fault& fault : faults) EXPECT_EQ(linted(fault.text), fault.findings) << fault.text;
}

TEST_F(VltctlLint, TheLibraryAndItsEntryPoint) {
  fs::remove(m_bundle + "/libX.so");
  EXPECT_EQ(linted(Expert()), Findings{"5: error: the bundle has none of libX.so, X.so and X"});
  Build(m_bundle + "/X.so", "int nothing;\n");
  EXPECT_EQ(linted(Expert()),
            Findings{"5: error: " + m_bundle + "/X.so does not export \"vltCreateObjectExpert\""});
}

TEST_F(VltctlLint, WarningsCountWhereTheyAreAsked) {
  WriteBytes(m_file, Expert("Colour = \"red\"\n"));
  EXPECT_EQ(Vltctl({"lint", m_bundle}).exitCode, kGood);
  ProgramResult strict = Vltctl({"lint", "--strict", m_bundle});
  EXPECT_EQ(strict.exitCode, kNotFound);
  EXPECT_EQ(strict.out,
            m_file +
                ":6: warning: Colour is kept, and read by nothing\n0 errors and 1 warning in "
                "1 file\n");
}

TEST_F(VltctlLint, IdentifiersOfInstalledComponentsAreTaken) {
  m_installation.addObjectExpert("Tank", "Tank", kGuid);
  ExpectStart([](IvltRegistrar&) {});
  EXPECT_EQ(linted(Expert()),
            Findings{"4: error: Identifier is that of [Tank], which is installed"});
  // In its own place a component does not take its own.
  ProgramResult own = Vltctl({"lint", m_installation.root() + "/Experts"});
  EXPECT_EQ(own.out.find("Identifier"), std::string::npos) << own.out;
}

TEST_F(VltctlLint, WhereThereIsNoFileThatIsSaid) {
  TempDir empty;
  ProgramResult result = Vltctl({"lint", empty.path()});
  EXPECT_EQ(result.exitCode, kNotFound);
  EXPECT_EQ(result.err, "vltctl: " + empty.path() +
                            ": there is no registration file below; a bundle has it as "
                            "Resources/Info.vlr\n");
}

// ---- new

// From nothing to a component that a client finds.
TEST(VltctlLintNew, EachKindBuildsLintsCleanIsListedAndIsSound) {
  for (const std::string& kind :
       {std::string("dictionary"), std::string("object-expert"), std::string("resource-expert")}) {
    Installation installation;
    TempDir dir;
    const std::string source = dir / "source", build = dir / "build";
    ProgramResult made = Vltctl({"new", kind, source, "--name", "Widget"});
    ASSERT_EQ(made.exitCode, kGood) << made.err;
    EXPECT_EQ(made.out,
              source + "/CMakeLists.txt\n" + source + "/Widget.cpp\n" + source + "/Info.vlr\n");
    std::string flags = sizeof(void*) == 4 ? "-DCMAKE_CXX_FLAGS=-m32" : "-DCMAKE_CXX_FLAGS=-m64";
    for (const std::vector<std::string>& step :
         {std::vector<std::string>{"cmake", "-G", "Ninja", "-S", source, "-B", build, flags},
          {"cmake", "--build", build},
          {"cmake", "--install", build, "--prefix", installation.root()}}) {
      ProgramResult result = RunProgram(step);
      ASSERT_EQ(result.exitCode, 0) << result.out << result.err;
    }
    ProgramResult linted = Vltctl({"lint", "--strict", installation.root()});
    EXPECT_EQ(linted.exitCode, kGood) << linted.out;
    JsonResult checked = VltctlJson({"check", "Widget"});
    EXPECT_EQ(checked.exitCode, kGood) << checked.items;
    ASSERT_EQ(checked.items.size(), 1u);
    std::string type = checked.items[0]["type"];
    EXPECT_EQ(type, kind == "dictionary"      ? "dictionary"
                    : kind == "object-expert" ? "object expert"
                                              : "resource expert");
  }
}

TEST(VltctlLintNew, TheClassIsTheOneGivenAndIdentifiersAreFresh) {
  TempDir dir;
  ASSERT_EQ(Vltctl({"new", "object-expert", dir / "a", "--name", "A", "--class", kGuid}).exitCode,
            kGood);
  ASSERT_EQ(Vltctl({"new", "object-expert", dir / "b", "--name", "A", "--class", kGuid}).exitCode,
            kGood);
  std::string a = ReadBytes(dir / "a/Info.vlr"), b = ReadBytes(dir / "b/Info.vlr");
  EXPECT_NE(a.find(":1:" + kGuid + "\""), std::string::npos) << a;
  EXPECT_NE(a, b);
}

TEST(VltctlLintNew, WhatIsWrongIsSaidAndMakesNothing) {
  TempDir dir;
  WriteBytes(dir / "file", "");
  const std::vector<std::pair<std::vector<std::string>, std::string>> rows = {
      {{"new", "object-expret", dir / "x", "--name", "A"},
       "no such kind of component: object-expret; did you mean \"object-expert\"?"},
      {{"new", "dictionary", dir / "x"}, "new needs a name; give it as --name NAME"},
      {{"new", "dictionary", dir / "x", "--name", ""},
       "--name: is empty; see \"vltctl new --help\""},
      {{"new", "dictionary", dir / "x", "--name", "../A"},
       "--name: \"../A\" is no name for a bundle; give letters, digits, \"-\" and \"_\", a letter "
       "first"},
      {{"new", "object-expert", dir / "x", "--name", "A", "--class", "words"},
       "--class: \"words\" is no GUID; give the identifier of the class, with or without braces"},
      {{"new", "dictionary", dir.path(), "--name", "A"},
       dir.path() + ": there is something already; give a directory that is empty or missing"}};
  for (const auto& [command, text] : rows) {
    ProgramResult result = Vltctl(command);
    EXPECT_NE(result.exitCode, kGood) << text;
    EXPECT_EQ(result.err, "vltctl: " + text + "\n");
    EXPECT_FALSE(Exists(dir / "x"));
  }
}

}  // namespace
}  // namespace vlt::test

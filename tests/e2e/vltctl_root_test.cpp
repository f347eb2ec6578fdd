// --root: the installation of another machine, read where it lies here, while another one is in force.
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;
using nlohmann::json;

// An image with a dictionary, an expert without its library, a jar and settings; and an installation in
// force, which has nothing.
class VltctlRoot : public testing::Test {
 protected:
  VltctlRoot() {
    Installation::setDir(m_source.root());
    m_source.addDictionary("Core", "Core", GText(1), 7, "co");
    m_source.addObjectExpert("Tank", "Tank", GText(2));
    ExpectStart("ok");
    fs::create_directories(m_source.root() + "/Data");
    WriteBytes(m_source.root() + "/Data/kor.ini", "[STORAGE]\nLocalServerEndpoint3=71\n");
    WriteBytes(m_source.root() + "/Data/vltjar.ini",
               "[ServerSection]\nServerIdentity = \"{" + GText(9) + "}\"\n");
    fs::rename(m_source.root(), root());
    Installation::setDir(m_inForce.root());
  }

  std::string root() const { return m_elsewhere / "image"; }
  std::string file(const std::string& name) const { return root() + "/" + name; }

  static std::vector<std::string> at(std::vector<std::string> command, const std::string& root) {
    command.insert(command.end(), {"--root", root});
    return command;
  }
  ProgramResult text(const std::vector<std::string>& command) const {
    return Vltctl(at(command, root()));
  }
  JsonResult asJson(const std::vector<std::string>& command) const {
    return VltctlJson(at(command, root()));
  }
  std::string listing() const {
    return RunProgram({"ls", "-lnaR", "--time-style=full-iso", root(), m_inForce.root()}).out;
  }

  Installation m_source, m_inForce;
  TempDir m_elsewhere;
};

TEST_F(VltctlRoot, WhatReadsAnswersFromTheImageAndChangesNothing) {
  const std::string before = listing();
  EXPECT_EQ(ItemWith(asJson({"settings"}).items, "name", "LocalServerEndpoint3")["value"], "71");
  EXPECT_EQ(asJson({"url"}).items.at(0)["url"], "127.0.0.1:71");
  EXPECT_EQ(asJson({"jar"}).items.at(0)["value"], "{" + GText(9) + "}");
  EXPECT_EQ(asJson({"identity"}).items.at(0)["identity"], "{" + GText(9) + "}");
  EXPECT_EQ(ItemWith(asJson({"verify"}).items, "file", file("vlt.vlr"))["state"], "sound");
  EXPECT_EQ(ItemWith(asJson({"repair", "--dry-run"}).items, "file", file("vlt.vlr"))["action"],
            "none");
  EXPECT_EQ(asJson({"list"}).items.size(), 3u);
  EXPECT_EQ(asJson({"why", "Tank"}).items.at(0)["verdict"], "registered");
  EXPECT_EQ(listing(), before);
}

TEST_F(VltctlRoot, PlacesAndSignsAreThoseOfTheImageAlone) {
  for (const json& place : asJson({"paths"}).items) {
    EXPECT_EQ(place["path"].get<std::string>().find(root()), 0u) << place;
  }
  JsonResult doctor = asJson({"doctor"});
  EXPECT_EQ(doctor.exitCode, kGood);
  for (const json& sign : doctor.items) {
    EXPECT_EQ(sign["where"].get<std::string>().find(root()), 0u) << sign;
  }
}

TEST_F(VltctlRoot, WhatToDoIsSaidForTheImage) {
  const std::string option = " --root " + root() + "\"";
  EXPECT_EQ(text({"show", "Nothing"}).err, "vltctl: no component Nothing; \"vltctl list" + option +
                                               " shows all, and \"vltctl why" + option +
                                               " says why\n");
  EXPECT_EQ(asJson({"show", "Nothing"}).problems.at(0)["next"],
            "\"vltctl list" + option + " shows all, and \"vltctl why" + option + " says why");
  WriteBytes(file("vlt.vl5"), "short");
  const std::string repair = "\"vltctl repair" + option + " keeps the file and gives it a sidecar";
  EXPECT_EQ(ItemWith(asJson({"verify"}).items, "file", file("vlt.vlr"))["next"], repair);
  EXPECT_NE(text({"verify"}).out.find("\n  " + repair + "\n"), std::string::npos);
  EXPECT_EQ(ItemWith(asJson({"doctor"}).items, "code", "sidecar-short")["next"], repair);
  EXPECT_EQ(text({"list"}).err,
            "vltctl: " + file("vlt.vlr") + ": the sidecar is short; " + repair + "\n");
}

TEST_F(VltctlRoot, AnIdentityIsNotMadeInAnImage) {
  fs::remove(file("Data/vltjar.ini"));
  JsonResult result = asJson({"identity"});
  EXPECT_EQ(result.exitCode, kNotFound);
  EXPECT_EQ(result.problems.at(0)["code"], "no-identity");
  EXPECT_FALSE(Exists(file("Data/vltjar.ini")));
}

TEST_F(VltctlRoot, WhatWritesWritesToTheImage) {
  EXPECT_EQ(text({"settings", "set", "NumCheckpoints", "5"}).exitCode, kGood);
  EXPECT_EQ(ItemWith(asJson({"settings"}).items, "name", "NumCheckpoints")["value"], 5);
  WriteBytes(file("vlt.vl5"), "short");
  EXPECT_EQ(text({"verify"}).exitCode, kDataUnusable);
  EXPECT_EQ(text({"repair"}).exitCode, kGood);
  EXPECT_EQ(text({"verify"}).exitCode, kGood);
  EXPECT_EQ(text({"hook", "arm", "vltjarValidChecksumSet", "fail"}).exitCode, kGood);
  EXPECT_TRUE(Exists(file("VLTHooks.ini")));
  EXPECT_EQ(text({"hook", "clear"}).exitCode, kGood);
  EXPECT_TRUE(fs::is_empty(m_inForce.root()));
}

TEST_F(VltctlRoot, ARelativeDirectoryIsThatOfTheWorkingDirectory) {
  ProgramResult result = RunProgram(
      {"sh", "-c", "cd \"$1\" && \"$0\" paths --root image", kVltctl, m_elsewhere.path()});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_NE(result.out.find("  " + root() + "/vlt.vlr  "), std::string::npos) << result.out;
}

// ---- check

TEST_F(VltctlRoot, CheckReadsTheLibrariesAndLoadsNone) {
  const std::string library = file("Experts/Tank.vle/libTank.so");
  auto code = [&] { return ItemWith(asJson({"check"}).items, "name", "Tank")["code"]; };
  EXPECT_EQ(code(), "no-library");
  WriteBytes(library, "text");
  EXPECT_EQ(code(), "not-a-library");
  TempDir made;
  const std::string witness = made / "witness";
  WriteBytes(made / "x.cpp",
             "#include <cstdio>\n__attribute__((constructor)) void start() { fclose(fopen(\"" +
                 witness + "\", \"w\")); }\nextern \"C\" int NAME() { return 0; }\n");
  auto build = [&](const std::string& name) {
    EXPECT_EQ(
        RunProgram({"c++", "-shared", "-fPIC", "-DNAME=" + name, "-o", library, made / "x.cpp"})
            .exitCode,
        0);
  };
  build("vltCreateResourceExpert");
  EXPECT_EQ(code(), "no-entry-point");
  build("vltCreateObjectExpert");
  EXPECT_EQ(code(), json());
  EXPECT_FALSE(Exists(witness));
  EXPECT_EQ(asJson({"show", "Tank"}).items.at(0)["library"], library);
  EXPECT_EQ(text({"check", "Tank"}).out,
            "object expert Tank: sound\n1 component: sound; nothing was loaded\n");
}

// ---- Links

TEST_F(VltctlRoot, ALinkOutOfTheImageIsReportedAndNotFollowed) {
  TempDir machine;
  WriteBytes(machine / "kor.ini", "[STORAGE]\nLocalServerEndpoint3=99\n");
  fs::remove(file("Data/kor.ini"));
  fs::create_symlink(machine / "kor.ini", file("Data/kor.ini"));
  for (const std::vector<std::string>& command : {std::vector<std::string>{"settings"},
                                                  {"list"},
                                                  {"verify"},
                                                  {"repair"},
                                                  {"settings", "set", "NumCheckpoints", "1"}}) {
    ProgramResult result = text(command);
    EXPECT_EQ(result.exitCode, kDataUnusable);
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(result.err, "vltctl: " + file("Data/kor.ini") + ": is a link out of the image, to " +
                              (machine / "kor.ini") +
                              ": the machine of the image has another file there; put a copy of "
                              "that file in its place\n");
  }
  EXPECT_EQ(ReadBytes(machine / "kor.ini"), "[STORAGE]\nLocalServerEndpoint3=99\n");
}

TEST_F(VltctlRoot, LinksAreJudgedByWhereTheyLead) {
  struct {
    std::string target;
    int code;
  } rows[] = {
      {"vlt.vlr", kGood},    {root() + "/Data", kGood},       {"Data/../vlt.vlr", kGood},
      {"link", kGood},  // to itself
      {"..", kDataUnusable}, {"Data/../../x", kDataUnusable}, {"/nothing/there", kDataUnusable}};
  for (const auto& row : rows) {
    fs::remove(file("link"));
    fs::create_symlink(row.target, file("link"));
    EXPECT_EQ(text({"paths"}).exitCode, row.code) << row.target;
  }
}

TEST_F(VltctlRoot, TheImageItselfMayBeALink) {
  fs::create_symlink(root(), m_elsewhere / "link");
  EXPECT_EQ(VltctlJson(at({"list"}, m_elsewhere / "link")).items.size(), 3u);
}

// ---- Where it makes no sense

TEST_F(VltctlRoot, WithoutADirectoryThereIsNothingToDo) {
  ProgramResult result = Vltctl(at({"verify"}, m_elsewhere / "none"));
  EXPECT_EQ(result.exitCode, kDataUnusable);
  EXPECT_EQ(result.err, "vltctl: " + (m_elsewhere / "none") +
                            ": is no directory: No such file or directory; give the install "
                            "directory, the one with vlt.vlr, as --root\n");
}

TEST_F(VltctlRoot, FilesThatAreGivenAreOfNoImage) {
  EXPECT_EQ(text({"verify", "x.ini"}).exitCode, kUsage);
  EXPECT_EQ(text({"repair", "x.ini"}).exitCode, kUsage);
  EXPECT_EQ(text({"check", "--library"}).exitCode, kUsage);
}

TEST_F(VltctlRoot, CommandsOfNoInstallationSayWhy) {
  const std::pair<std::vector<std::string>, const char*> rows[] = {
      {{"lint", "x"}, "lint takes no --root: it reads the files that are given"},
      {{"new", "dictionary", "x"},
       "new takes no --root: it makes sources in the directory that is given"},
      {{"error"}, "error takes no --root: it shows what the library has in every installation"},
      {{"locks"}, "locks takes no --root: it shows this machine, not an installation"},
      {{"events"}, "events takes no --root: it shows this machine, not an installation"},
      {{"trace"}, "trace takes no --root: it shows this machine, not an installation"},
      {{"hook", "list"},
       "hook list takes no --root: it shows what the library has in every installation"},
      {{"completion", "bash"},
       "completion takes no --root: it prints a script that is the same everywhere"}};
  for (const auto& [command, why] : rows) {
    ProgramResult result = text(command);
    EXPECT_EQ(result.exitCode, kUsage) << why;
    EXPECT_EQ(result.err, "vltctl: " + std::string(why) + "\n");
  }
}

}  // namespace
}  // namespace vlt::test

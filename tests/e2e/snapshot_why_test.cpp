// why: a fixture for each verdict.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <optional>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

std::string Registration(const std::string& list, const std::string& sections) {
  return "[KORComponents]\n" + list + "\n" + sections;
}

std::string Section(const std::string& name, const std::string& guid,
                    const std::string& file = "Tank") {
  return "[" + name + "]\nIdentifier = \"" + guid + "\"\nFileName = \"" + file + "\"\n";
}

struct SnapshotWhy : testing::Test {
  Installation i;

  static void start() {
    ExpectStart([](IvltRegistrar&) {});
  }
  // Whatever the text is: a registration file "Tank.vle".
  std::string addTank(const std::string& list, const std::string& sections) {
    return i.addBundle("Experts", "Tank.vle", Registration(list, sections));
  }
  std::string addTank() { return addTank("Tank = \"Tank\"", Section("Tank", GText(1))); }

  static nlohmann::json ask(const std::string& text, const Environment& extra = {}) {
    JsonResult result = VltctlJson({"why", text}, extra);
    if (result.items.size() != 1) {
      ADD_FAILURE() << result.err;
      return {};
    }
    nlohmann::json item = result.items[0];
    EXPECT_EQ(result.exitCode, item["verdict"] == "registered" ? kGood : kNotFound);
    // The remedy: what to do next.
    EXPECT_EQ(item["next"].is_null(), item["verdict"] == "registered");
    return item;
  }
  static void expect(const std::string& verdict, const std::string& text) {
    EXPECT_EQ(ask(text)["verdict"], verdict) << text;
  }
};

TEST_F(SnapshotWhy, Registered) {
  std::string file = addTank();
  start();
  for (const std::string& text : {std::string("Tank"), GText(1), "{" + GText(1) + "}", file,
                                  i.root() + "/Experts/Tank.vle"}) {
    expect("registered", text);
  }
  expect("registered", "vltdd");
}

TEST_F(SnapshotWhy, NotYetScanned) {
  expect("no-file", "Tank");
  std::string file = addTank();
  expect("not-yet-scanned", "Tank");
  start();
  expect("registered", "Tank");
  Installation::touch(file, Installation::kInstalled + 1);
  expect("not-yet-scanned", "Tank");
}

TEST_F(SnapshotWhy, NoFile) {
  start();
  expect("no-file", "Tank");
  expect("no-file", GText(1));
  fs::create_directories(i.root() + "/Experts/Tank.vle");
  nlohmann::json item = ask("Tank");
  EXPECT_EQ(item["verdict"], "no-file");
  EXPECT_EQ(item["where"], i.root() + "/Experts/Tank.vle/Resources/Info.vlr");
  expect("no-file", i.root() + "/Experts/Tank.vle");
}

TEST_F(SnapshotWhy, WrongPlace) {
  const std::string text = Registration("Tank = Tank", Section("Tank", GText(1)));
  i.addBundle("Data Dictionaries", "Tank.vle", text);
  start();
  expect("wrong-place", "Tank");
  expect("wrong-place", GText(1));
  i.removeBundle("Data Dictionaries", "Tank.vle");
  i.addBundle(".", "Tank.vle", text);
  expect("wrong-place", "Tank");
  expect("wrong-place", i.root() + "/Tank.vle");
}

TEST_F(SnapshotWhy, WrongSuffix) {
  i.addBundle("Experts", "Tank.bundle", Registration("Tank = Tank", Section("Tank", GText(1))));
  start();
  expect("wrong-suffix", "Tank");
  expect("wrong-suffix", i.root() + "/Experts/Tank.bundle");
}

TEST_F(SnapshotWhy, SetAside) {
  std::string file = i.addBundle("Experts", "Tank.vle", "\xFF\xFE[\1");
  nlohmann::json before = ask("Tank");
  EXPECT_EQ(before["verdict"], "set-aside");
  EXPECT_EQ(before["where"], file);
  start();
  nlohmann::json after = ask("Tank");
  EXPECT_EQ(after["verdict"], "set-aside");
  EXPECT_TRUE(after["where"].get<std::string>().starts_with(file + "_")) << after;
  EXPECT_NE(after["what"].get<std::string>().find("UTF-16"), std::string::npos) << after;
}

TEST_F(SnapshotWhy, Closed) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
  addTank();
  start();
  std::string closed = i.root() + "/Experts/Tank.vle";
  ASSERT_EQ(chmod(fs::path(i.root()).parent_path().c_str(), 0755), 0);
  ASSERT_EQ(chmod(closed.c_str(), 0700), 0);
  Child other([&] {
    if (setresgid(65534, 65534, 65534) != 0 || setresuid(65534, 65534, 65534) != 0) return 2;
    JsonResult result = VltctlJson({"why", closed, "--root", i.root()});
    EXPECT_EQ(result.items.at(0)["verdict"], "closed");
    EXPECT_EQ(result.items.at(0)["where"], closed);
    EXPECT_NE(result.items.at(0)["what"].get<std::string>().find("0700"), std::string::npos);
    return 0;
  });
  EXPECT_EQ(other.wait(), 0);
}

TEST_F(SnapshotWhy, NotListed) {
  addTank("Other = Other", Section("Tank", GText(1)) + Section("Other", GText(2)));
  start();
  expect("not-listed", "Tank");
  expect("not-listed", GText(1));
  expect("registered", "Other");
}

TEST_F(SnapshotWhy, NoSection) {
  addTank("Tank = Tank", "");
  start();
  expect("no-section", "Tank");
}

TEST_F(SnapshotWhy, KeyAndValueDiffer) {
  addTank("Tank = \"Tanker\"", Section("Tanker", GText(1)));
  start();
  expect("key-and-value-differ", "Tank");
  expect("key-and-value-differ", "Tanker");
}

TEST_F(SnapshotWhy, GuidNull) {
  addTank("Tank = Tank", Section("Tank", "no guid"));
  start();
  expect("guid-null", "Tank");
}

TEST_F(SnapshotWhy, GuidTakenBy) {
  addTank("Tank = Tank\nThief = Thief", Section("Tank", GText(1)) + Section("Thief", GText(1)));
  start();
  nlohmann::json item = ask("Tank");
  EXPECT_EQ(item["verdict"], "guid-taken-by");
  EXPECT_NE(item["what"].get<std::string>().find("Thief"), std::string::npos);
  expect("registered", "Thief");
}

TEST_F(SnapshotWhy, OverlaidBy) {
  std::string one = addTank();
  std::string other = i.addBundle("Experts", "Other.vle",
                                  Registration("Tank = Tank", Section("Tank", GText(1), "Other")));
  start();
  nlohmann::json first = ask(one), second = ask(other);
  // Which one counts depends on the order of the directory; it is exactly one.
  EXPECT_NE(first["verdict"], second["verdict"]);
  const nlohmann::json& overlaid = first["verdict"] == "registered" ? second : first;
  EXPECT_EQ(overlaid["verdict"], "overlaid-by");
  EXPECT_EQ(overlaid["where"], first["verdict"] == "registered" ? one : other);
}

TEST_F(SnapshotWhy, StampEqualButChanged) {
  std::string file = addTank();
  start();
  expect("registered", "Tank");
  EXPECT_EQ(addTank("Tank = Tank", Section("Tank", GText(1), "Changed")), file);
  expect("stamp-equal-but-changed", "Tank");
}

TEST_F(SnapshotWhy, ErasedWith) {
  std::string file = addTank();
  start();
  i.removeBundle("Experts", "Tank.vle");
  nlohmann::json item = ask("Tank");
  EXPECT_EQ(item["verdict"], "erased-with");
  EXPECT_EQ(item["where"], file);
  expect("erased-with", GText(1));
}

TEST_F(SnapshotWhy, Ghost) {
  ExpectStart([](IvltRegistrar& registrar) {
    Offered offered(vltComponentObjectExpert, L"Called", G(5), L"/nowhere/Called.vle");
    EXPECT_EQ(registrar.RegisterComponent(&offered.value), S_OK);
  });
  expect("ghost", "Called");
  fs::create_directories(i.root() + "/Experts/Called.vle");
  expect("registered", GText(5));
}

TEST_F(SnapshotWhy, Locale) {
  i.addBundle("Experts", "Tank.vle",
              Registration("T\xC3\xA4nk = \"T\xC3\xA4nk\"", Section("T\xC3\xA4nk", GText(1))));
  ASSERT_EQ(Vltctl({"list", "--live"}, {{"LC_ALL", "C.UTF-8"}}).exitCode, kGood);
  EXPECT_EQ(ask(GText(1), {{"LC_ALL", "C.UTF-8"}})["verdict"], "registered");
  ProgramResult result = RunProgram(
      {"env", "-u", "LANG", "-u", "LC_ALL", "-u", "LC_CTYPE", kVltctl, "why", GText(1), "--json"});
  EXPECT_EQ(Document(result.out)["items"].at(0)["verdict"], "locale") << result.out;
}

TEST_F(SnapshotWhy, OtherArchitecture) {
  addTank();
  start();
  std::string library = i.root() + "/Experts/Tank.vle/libTank.so";
  std::string bytes = ReadBytes(VLT_TEST_LIBRARY);
  WriteBytes(library, bytes);
  expect("registered", "Tank");
  bytes[18] = static_cast<char>(bytes[18] + 1);  // e_machine
  WriteBytes(library, bytes);
  expect("other-architecture", "Tank");
}

TEST_F(SnapshotWhy, ProcessOlderThanFile) {
  Signal ready, end;
  Child holder([&] {
    IvltRegistrar* registrar = nullptr;
    if (GetRegistrar(&registrar) != "ok") return 1;
    ready.notify();
    end.await(10 * kDeadlineMs);
    registrar->Release();
    return 0;
  });
  ASSERT_TRUE(ready.await());
  addTank();
  nlohmann::json item = ask("Tank");
  EXPECT_EQ(item["verdict"], "process-older-than-file");
  EXPECT_NE(item["what"].get<std::string>().find(std::to_string(holder.pid())), std::string::npos);
  end.notify();
  EXPECT_EQ(holder.wait(), 0);
  expect("not-yet-scanned", "Tank");
}

}  // namespace
}  // namespace vlt::test

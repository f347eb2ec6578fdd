// list, show, classes and scan as readers: beside a registrar that another process holds, on trees
// that may only be read, as another user, and without a trace.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

using nlohmann::json;
namespace fs = std::filesystem;

std::string B(uint32_t n) { return "{" + GText(n) + "}"; }

class SnapshotCommands : public testing::Test {
 protected:
  SnapshotCommands() {
    m_core = i.addDictionary("Core", "Core Dictionary", GText(1), 7, "co");
    m_tank = i.addObjectExpert("Tank", "Tank", GText(2), B(2) + ":1:" + B(9));
    i.addObjectExpert("Tanker", "Tanker", GText(3));
    i.addResourceExpert("Serial", "Serial", GText(4), "PNP", B(4) + ":1:" + B(9));
    ExpectStart([](IvltRegistrar&) {});
  }

  static json names(const std::vector<std::string>& arguments) {
    JsonResult result = VltctlJson(arguments);
    EXPECT_EQ(result.exitCode, kGood) << result.err;
    json out = json::array();
    for (const json& item : result.items) out.push_back(item["name"]);
    return out;
  }

  Installation i;
  std::string m_core, m_tank;
};

// Holds the registrar in another process, for a scope.
class Holder {
 public:
  Holder()
      : m_child([this] {
          IvltRegistrar* registrar = nullptr;
          if (GetRegistrar(&registrar) != "ok") return 1;
          m_ready.notify();
          m_end.await(10 * kDeadlineMs);
          registrar->Release();
          return 0;
        }) {
    EXPECT_TRUE(m_ready.await());
  }
  ~Holder() { end(); }
  void end() {
    if (!m_child) return;
    m_end.notify();
    EXPECT_EQ(m_child->wait(), 0);
    m_child.reset();
  }
  pid_t pid() const { return m_child->pid(); }

 private:
  Signal m_ready, m_end;
  std::optional<Child> m_child;
};

// ---- Beside others

TEST_F(SnapshotCommands, NothingWaitsForTheHolderOfTheRegistrar) {
  Holder holder;
  for (const std::vector<std::string>& command : {std::vector<std::string>{"list"},
                                                  {"show", "Tank"},
                                                  {"classes", GText(9)},
                                                  {"scan", "--dry-run"},
                                                  {"why", "Tank"}}) {
    auto start = std::chrono::steady_clock::now();
    ProgramResult result = Vltctl(command);
    auto taken = std::chrono::steady_clock::now() - start;
    EXPECT_EQ(result.exitCode, kGood) << command[0] << result.err;
    EXPECT_EQ(result.err, "") << command[0];
    EXPECT_LT(std::chrono::duration<double>(taken).count(), 5) << command[0];
  }
}

TEST_F(SnapshotCommands, LiveIsRefusedWhileAnotherProcessHoldsTheRegistrar) {
  Holder holder;
  JsonResult result = VltctlJson({"list", "--live"});
  EXPECT_EQ(result.exitCode, kBusy);
  EXPECT_EQ(result.problems.at(0)["code"], "busy");
  std::string pid = "(pid " + std::to_string(holder.pid()) + ")";
  EXPECT_NE(result.err.find(pid), std::string::npos) << result.err;
  EXPECT_EQ(Vltctl({"show", GText(1), "--live", "--wait", "0"}).exitCode, kBusy);
  EXPECT_EQ(Vltctl({"list", "--live", "--wait", "x"}).exitCode, kUsage);
}

TEST_F(SnapshotCommands, LiveWaitsAsLongAsItIsAsked) {
  Holder holder;
  Child waiter([] { return Vltctl({"list", "--live", "--wait", "25"}).exitCode; });
  EXPECT_EQ(Vltctl({"list", "--live", "--wait", "1"}).exitCode, kBusy);
  EXPECT_TRUE(waiter.running());
  holder.end();
  EXPECT_EQ(waiter.wait(), kGood);
}

// ---- Without a trace

TEST_F(SnapshotCommands, NothingIsOpenedForWritingMadeOrLocked) {
  if (RunProgram({"strace", "-V"}).exitCode != 0) GTEST_SKIP() << "NOT TESTED: no strace";
  TempDir dir;
  for (const std::vector<std::string>& command : {std::vector<std::string>{"list", "--long"},
                                                  {"show", "Tank"},
                                                  {"classes", GText(9)},
                                                  {"scan", "--dry-run"},
                                                  {"why", "Tank"},
                                                  {"why", "Nothing"}}) {
    std::vector<std::string> traced = {"strace", "-f", "-o", dir / "trace", kVltctl};
    traced.insert(traced.end(), command.begin(), command.end());
    ProgramResult result = RunProgram(traced);
    EXPECT_LE(result.exitCode, kNotFound) << result.err;
    std::string trace = ReadBytes(dir / "trace");
    EXPECT_NE(trace.find("vlt.vlr"), std::string::npos);
    EXPECT_EQ(Changes(trace), std::vector<std::string>{}) << command[0];
    EXPECT_EQ(trace.find("libvltutils"), std::string::npos) << command[0];
    size_t opened = trace.find("vlt.vlr");
    EXPECT_EQ(trace.find("PROT_EXEC", opened), std::string::npos) << command[0];
  }
}

TEST_F(SnapshotCommands, AnotherUserReadsATreeThatMayOnlyBeRead) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
  ASSERT_EQ(chmod(fs::path(i.root()).parent_path().c_str(), 0755), 0);
  std::string before = RunProgram({"find", i.root(), "-printf", "%p %i %m %s %T@ %C@\\n"}).out;
  for (const auto& entry : fs::recursive_directory_iterator(i.root())) {
    chmod(entry.path().c_str(), entry.is_directory() ? 0555 : 0444);
  }
  ASSERT_EQ(chmod(i.root().c_str(), 0555), 0);
  std::string closed = RunProgram({"find", i.root(), "-printf", "%p %i %m %s %T@ %C@\\n"}).out;
  ASSERT_NE(before, closed);
  Child other([&] {
    if (setresgid(65534, 65534, 65534) != 0 || setresuid(65534, 65534, 65534) != 0) return 2;
    EXPECT_EQ(names({"list", "--root", i.root()}).size(), 5u);
    EXPECT_EQ(Vltctl({"show", "Tank", "--root", i.root()}).exitCode, kGood);
    EXPECT_EQ(Vltctl({"scan", "--dry-run", "--root", i.root()}).exitCode, kGood);
    return 0;
  });
  EXPECT_EQ(other.wait(), 0);
  EXPECT_EQ(RunProgram({"find", i.root(), "-printf", "%p %i %m %s %T@ %C@\\n"}).out, closed);
}

// ---- Arguments

TEST_F(SnapshotCommands, ListChoosesByTypeClassAndName) {
  EXPECT_EQ(names({"list"}), (json{"Core Dictionary", "vltdd", "Tank", "Tanker", "Serial"}));
  EXPECT_EQ(names({"list", "--type", "object-expert"}), (json{"Tank", "Tanker"}));
  EXPECT_EQ(names({"list", "--class", GText(9)}), (json{"Tank", "Serial"}));
  EXPECT_EQ(names({"list", "--name", "Tank*"}), (json{"Tank", "Tanker"}));
  EXPECT_EQ(names({"list", "--name", "Tank?"}), json::array());
  EXPECT_EQ(names({"list", "--name", "*e*", "--type", "resource-expert"}), (json{"Serial"}));
  EXPECT_EQ(Vltctl({"list", "--class", "x"}).exitCode, kUsage);
  EXPECT_NE(Vltctl({"list", "--long"}).out.find(m_tank), std::string::npos);
}

TEST_F(SnapshotCommands, ShowTakesNamesGuidsPathsAndUniqueBeginnings) {
  for (const std::string& text :
       {std::string("Tank"), GText(2), B(2), GText(2).substr(0, 8), m_tank,
        i.root() + "/Experts/Tank.vle", i.root() + "/Experts/Tank.vle/"}) {
    EXPECT_EQ(names({"show", text}), (json{"Tank"})) << text;
  }
  EXPECT_EQ(names({"show", "ser"}), (json{"Serial"}));
  JsonResult several = VltctlJson({"show", "tan"});
  EXPECT_EQ(several.exitCode, kNotFound);
  EXPECT_EQ(several.problems.at(0)["code"], "ambiguous");
  EXPECT_EQ(Vltctl({"show", "nothing"}).exitCode, kNotFound);
}

TEST_F(SnapshotCommands, ShowHasWhatBelongsToTheComponent) {
  fs::create_directories(i.root() + "/Data Dictionaries/Last/Core.framework");
  WriteBytes(i.root() + "/Data Dictionaries/Core.framework/libCore.so", "x");
  json core = VltctlJson({"show", "Core"}).items.at(0);
  EXPECT_EQ(core["registrationFile"], m_core);
  EXPECT_EQ(core["stamp"], "2026-01-01T00:00:00Z");
  EXPECT_EQ(core["registrationState"], "unchanged");
  EXPECT_EQ(core["library"], i.root() + "/Data Dictionaries/Core.framework/libCore.so");
  EXPECT_EQ(core["previousVersion"], i.root() + "/Data Dictionaries/Last/Core.framework");
  EXPECT_EQ(VltctlJson({"show", "Tank"}).items.at(0)["classes"], (json{B(9)}));
}

TEST_F(SnapshotCommands, ScriptsAskByTheExitCode) {
  const struct {
    std::vector<std::string> arguments;
    int code;
  } rows[] = {{{"show", "Tank", "--exists"}, kGood},
              {{"show", "nothing", "--exists"}, kNotFound},
              {{"show", "Core", "--at-least", "7"}, kGood},
              {{"show", "Core", "--at-least", "8"}, kNotFound},
              {{"show", "Tank", "--at-least", "0"}, kNotFound},
              {{"show", "Core", "--at-least", "x"}, kUsage}};
  for (const auto& row : rows) {
    ProgramResult result = Vltctl(row.arguments);
    EXPECT_EQ(result.exitCode, row.code) << json(row.arguments);
    EXPECT_EQ(result.out, "");
  }
}

TEST_F(SnapshotCommands, AChangedTreeIsNoted) {
  Installation::touch(m_core, Installation::kInstalled + 1);
  i.removeBundle("Experts", "Tank.vle");
  i.addObjectExpert("New", "New", GText(5));
  ProgramResult result = Vltctl({"list"});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.err,
            "vltctl: 3 registration files changed since the database was saved; 'vltctl scan "
            "--dry-run' lists them\n");
  JsonResult scan = VltctlJson({"scan", "--dry-run"});
  EXPECT_EQ(scan.exitCode, kGood);
  EXPECT_EQ(scan.items.at(0)["removed"], (json{"Tank"}));
  EXPECT_EQ(scan.items.at(0)["added"], (json{"New"}));
  EXPECT_EQ(scan.items.at(0)["saves"], 3);
  ProgramResult text = Vltctl({"scan", "--dry-run"});
  EXPECT_NE(text.out.find("REMOVED  object expert Tank " + B(2)), std::string::npos) << text.out;
}

TEST_F(SnapshotCommands, AnImageIsListedWhereItIs) {
  TempDir elsewhere;
  fs::rename(i.root(), elsewhere / "image");
  ProgramResult result = Vltctl({"list", "--root", elsewhere / "image"});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.err, "");
  EXPECT_EQ(names({"list", "--root", elsewhere / "image"}).size(), 5u);
  EXPECT_EQ(Vltctl({"list", "--root", elsewhere / "image", "--live"}).exitCode, kUsage);
}

}  // namespace
}  // namespace vlt::test

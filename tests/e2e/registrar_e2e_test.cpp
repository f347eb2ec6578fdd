// The registration database byte for byte, over three starts, each in a process of its own.
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "tests/e2e/Start.h"
#include "tests/support/SaveCounter.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

// A sample component and the text that its section must have.
struct Sample {
  std::string directory, bundle, name;
  std::vector<std::string> lines;  // in the registration file
  std::string section;             // in the database, header and all
};

std::string FileOf(const Installation& i, const Sample& s) {
  return i.root() + "/" + s.directory + "/" + s.bundle + "/Resources/Info.vlr";
}

void Install(Installation& i, const Sample& s) {
  std::string text = "; a comment, which goes nowhere\n[KORComponents]\n" + s.name + " = \"" +
                     s.name + "\"\n\n[" + s.name + "]\n";
  for (const std::string& line : s.lines) text += line + "\n";
  i.addBundle(s.directory, s.bundle, text);
}

Sample Dictionary(const std::string& root, const std::string& name, uint32_t guid,
                  const std::string& schema, const std::string& prefix) {
  return {"Data Dictionaries",
          name + ".framework",
          name + " Dictionary",
          {"Identifier = {" + GText(guid) + "}", "FileName = " + name, "SchemaVersion = " + schema,
           "Prefix = \"" + prefix + "\""},
          "[" + name + " Dictionary]\nIdentifier = \"" + GText(guid) + "\"\nFileName = \"" + root +
              "/Data Dictionaries/" + name + ".framework\"\nSchemaVersion = \"" + schema +
              "\"\nPrefix = \"" + prefix + "\"\nFragmentRegistered = 23\n"};
}

Sample ObjectExpert(const std::string& root, const std::string& name, uint32_t guid,
                    uint32_t bindingClass) {
  std::string classes = "{" + GText(guid) + "}:1:{" + GText(bindingClass) + "}";
  return {"Experts",
          name + ".vle",
          name,
          {"Identifier=" + GText(guid), "FileName=\"" + name + ".vle\"",
           "BINDING_CLASSES=\"" + classes + "\""},
          "[" + name + "]\nIdentifier = \"" + GText(guid) + "\"\nFileName = \"" + root +
              "/Experts/" + name + ".vle\"\nBINDING_CLASSES = \"" + classes + "\"\n"};
}

Sample ResourceExpert(const std::string& root, const std::string& name, uint32_t guid) {
  return {"Experts",
          name + ".vle",
          name,
          {"Identifier = \"" + GText(guid) + "\"", "FileName = \"/opt/" + name + ".vle\"",
           R"(PnP = "PCI\\VEN_\"1\"")"},
          "[" + name + "]\nIdentifier = \"" + GText(guid) + "\"\nFileName = \"/opt/" + name +
              ".vle\"\nPnP = \"PCI\\\\VEN_\\\"1\\\"\"\n"};
}

// The samples in the order in which a start meets them: dictionaries first, and within a directory
// as the system lists it.
std::vector<Sample> InScanOrder(const Installation& i, const std::vector<Sample>& samples) {
  std::vector<Sample> order;
  for (const char* directory : {"Data Dictionaries", "Experts"}) {
    for (const auto& entry : fs::directory_iterator(i.root() + "/" + directory)) {
      for (const Sample& s : samples) {
        if (s.directory == directory && entry.path().filename() == s.bundle) order.push_back(s);
      }
    }
  }
  EXPECT_EQ(order.size(), samples.size());
  return order;
}

// The database put together by hand: its sections in the order of their birth, and which of them
// are new in the last save, since an empty line is around those.
class Expected {
 public:
  explicit Expected(const Installation& i) : m_root(i.root()) {
    m_kor = "[KOR]\nConfigFile = \"" + m_root + "/Data/config3.vlt\"\nSchemaVersion = 0\n";
    m_vltdd = "[vltdd]\nIdentifier = \"790F6A90-E0D8-11D3-AA15-005004D131EE\"\nFileName = \"" +
              m_root + "/Data Dictionaries/vltdd.framework\"\nSchemaVersion = 0\n" +
              "FragmentRegistered = 0\nLastInstalledSchemaVersion = 0\nPrefix = \"vl\"\n";
  }

  void list(const std::vector<std::string>& names) {
    m_components = "[KORComponents]\nvltdd = \"vltdd\"\n";
    for (const std::string& name : names) m_components += name + " = \"" + name + "\"\n";
  }
  void contents(const std::vector<std::pair<std::string, std::string>>& items) {
    m_contents = "[VLRContentsSection]\n";
    for (const auto& [name, file] : items) m_contents += name + " = \"" + file + "\"\n";
  }
  void registrations(const std::vector<std::pair<std::string, time_t>>& items) {
    m_registrations = "[Registration]\n";
    for (const auto& [file, time] : items) {
      m_registrations += file + " = \"" + Installation::stamp(time) + "\"\n";
    }
  }

  const std::string& kor() const { return m_kor; }
  const std::string& components() const { return m_components; }
  const std::string& vltdd() const { return m_vltdd; }
  const std::string& contents() const { return m_contents; }
  const std::string& registrations() const { return m_registrations; }

 private:
  std::string m_root, m_kor, m_components, m_vltdd, m_contents, m_registrations;
};

struct Place {
  std::string path;
  int mode;
};

void ExpectModes(const Installation& i, const std::vector<Place>& places) {
  for (const Place& place : places)
    EXPECT_EQ(ModeOf(i.root() + place.path), place.mode) << place.path;
}

std::vector<std::string> Below(const std::string& directory) {
  std::vector<std::string> names;
  for (const auto& entry : fs::directory_iterator(directory))
    names.push_back(entry.path().filename());
  std::sort(names.begin(), names.end());
  return names;
}

// A start by the command-line client, as a user makes it.
void Start() {
  ProgramResult result = RunProgram({std::string(VLT_TEST_BIN) + "/vltctl", "list", "--live"});
  EXPECT_EQ(result.exitCode, 0) << result.err;
}

TEST(RegistrarE2e, TheDatabaseByteForByteOverThreeStarts) {
  Installation i;
  ScopedUmask mask(027);
  const Sample core = Dictionary(i.root(), "Core", 1, "7", "co");
  const Sample units = Dictionary(i.root(), "Units", 2, "12", "un");
  const Sample tank = ObjectExpert(i.root(), "Tank", 3, 99);
  const Sample valve = ObjectExpert(i.root(), "Valve", 4, 99);
  const Sample serial = ResourceExpert(i.root(), "Serial", 5);
  const Sample late = ObjectExpert(i.root(), "Late", 6, 98);
  const std::vector<Sample> first = {core, units, tank, valve, serial};
  for (const Sample& s : first) Install(i, s);
  const std::vector<Sample> order = InScanOrder(i, first);

  // ---- First start: everything is new, each file is a save of its own, so that only the section
  // of the last component is new in the last save.
  Start();
  Expected e(i);
  std::vector<std::string> names;
  std::vector<std::pair<std::string, std::string>> contents;
  std::vector<std::pair<std::string, time_t>> registrations;
  for (const Sample& s : order) {
    names.push_back(s.name);
    contents.push_back({s.name, FileOf(i, s)});
    registrations.push_back({FileOf(i, s), Installation::kInstalled});
  }
  e.list(names);
  e.contents(contents);
  e.registrations(registrations);
  // The contents come to be with the first merge, before the component's own section.
  std::string expected =
      e.kor() + e.components() + e.vltdd() + e.contents() + order[0].section + e.registrations();
  for (size_t n = 1; n + 1 < order.size(); ++n) expected += order[n].section;
  expected += "\n" + order.back().section + "\n";
  EXPECT_EQ(ReadBytes(i.database()), expected);
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
  EXPECT_EQ(ReadBytes(i.sidecar()).size(), 16u);
  EXPECT_EQ(Below(i.root()), (std::vector<std::string>{"Data", "Data Dictionaries", "Experts",
                                                       "vlt.vl5", "vlt.vlr"}));
  ExpectModes(i, {{"/Data", 0777},
                  {"/vlt.vlr", 0777},
                  {"/vlt.vl5", 0777},
                  // Made by the installer, not by the start.
                  {"/Data Dictionaries", 0750},
                  {"/Experts", 0750},
                  {"/Experts/Tank.vle", 0750}});
  for (const Sample& s : first) EXPECT_EQ(ModeOf(FileOf(i, s)), 0777);

  // ---- Second start: one file touched, one bundle removed, one added. The touched component loses
  // its places in the lists and comes back after the others, as does its section.
  Installation::touch(FileOf(i, units), Installation::kInstalled + 60);
  i.removeBundle("Experts", "Valve.vle");
  Install(i, late);
  Start();
  auto without = [](auto list, const auto& matches) {
    list.erase(std::remove_if(list.begin(), list.end(), matches), list.end());
    return list;
  };
  names = without(names, [&](const std::string& name) { return name == units.name; });
  contents = without(contents, [&](const auto& item) { return item.first == units.name; });
  for (const Sample& s : {units, late}) {
    names.push_back(s.name);
    contents.push_back({s.name, FileOf(i, s)});
  }
  for (auto& [file, time] : registrations) {
    if (file == FileOf(i, units)) time += 60;
  }
  registrations.push_back({FileOf(i, late), Installation::kInstalled});
  e.list(names);
  e.contents(contents);
  e.registrations(registrations);
  expected = e.kor() + e.components() + e.vltdd() + e.contents();
  if (order[0].name != units.name) expected += order[0].section;
  expected += e.registrations();
  for (size_t n = 1; n < order.size(); ++n) {
    if (order[n].name != units.name) expected += order[n].section;
  }
  // What has vanished goes after the last save, and so is in the file until the next.
  expected += units.section + "\n" + late.section + "\n";
  EXPECT_EQ(ReadBytes(i.database()), expected);
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
  ExpectStart([&](IvltRegistrar& r) {
    EXPECT_EQ(Find(r, G(4)), E_INVALIDARG);
    EXPECT_EQ(Find(r, G(6)), S_OK);
  });

  // ---- Third start: nothing has changed. The one save of every start settles the empty lines.
  Start();
  expected.erase(expected.size() - 1);
  expected.erase(expected.find("\n\n") + 1, 1);
  EXPECT_EQ(ReadBytes(i.database()), expected);
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
  ExpectModes(i, {{"/Data", 0777}, {"/vlt.vlr", 0777}, {"/vlt.vl5", 0777}});
  EXPECT_EQ(Below(i.root()), (std::vector<std::string>{"Data", "Data Dictionaries", "Experts",
                                                       "vlt.vl5", "vlt.vlr"}));

  // ---- And once more: now not a byte differs, and the file is saved once.
  SaveCounter saves(i.root(), "vlt.vlr");
  Start();
  EXPECT_EQ(saves.count(), 1);
  EXPECT_EQ(ReadBytes(i.database()), expected);

  // ---- A save that a client asks for takes the vanished component out of the file.
  ExpectStart([&](IvltRegistrar& r) { EXPECT_EQ(r.SetSchemaVersion(1), S_OK); });
  DatabaseText after(i.database());
  EXPECT_FALSE(after.has(valve.name));
  EXPECT_FALSE(after.raw("KORComponents", valve.name));
  EXPECT_FALSE(after.raw("Registration", FileOf(i, valve)));
  EXPECT_FALSE(after.raw("VLRContentsSection", valve.name));
}

TEST(RegistrarE2e, AnEmptyRootIsFilledWithModesForAll) {
  Installation i;
  ScopedUmask mask(077);
  ASSERT_EQ(rmdir(i.root().c_str()), 0);
  Start();
  // The root itself is made for its database, and so is open too.
  EXPECT_EQ(ModeOf(i.root()), 0777);
  ExpectModes(i, {{"/Data", 0777},
                  {"/Data Dictionaries", 0777},
                  {"/Experts", 0777},
                  {"/vlt.vlr", 0777},
                  {"/vlt.vl5", 0777}});
  Expected e(i);
  e.list({});
  EXPECT_EQ(ReadBytes(i.database()), e.kor() + "\n" + e.components() + "\n" + e.vltdd() + "\n");
}

TEST(RegistrarE2e, ClientsGetEveryComponentBack) {
  Installation i;
  i.addDictionary("Core", "Core", GText(1), 7, "co");
  i.addObjectExpert("Tank", "Tank", GText(3), "{" + GText(3) + "}:1:{" + GText(99) + "}");
  i.addResourceExpert("Serial", "Serial", GText(5), "PNP");
  for (int start = 0; start < 2; ++start) {
    ExpectStart([&](IvltRegistrar& r) {
      EXPECT_EQ(Names(r, vltComponentDataDictionary),
                (std::vector<std::wstring>{L"Core", L"vltdd"}));
      EXPECT_EQ(Names(r, vltComponentObjectExpert), (std::vector<std::wstring>{L"Tank"}));
      EXPECT_EQ(Names(r, vltComponentResourceExpert), (std::vector<std::wstring>{L"Serial"}));
      EXPECT_TRUE(Names(r, vltComponentUIProvider).empty());
      EXPECT_EQ(Bound(r, vltComponentObjectExpert, G(99)).size(), 1u);
    });
  }
}

// ---- Two processes

TEST(RegistrarE2e, ASecondProcessWaitsUntilTheFirstIsKilled) {
  Installation i;
  i.addDictionary("Core", "Core", GText(1), 7, "co");
  Signal held, never, second;
  Child first([&] {
    IvltRegistrar* r = nullptr;
    if (GetRegistrar(&r) != "ok") return 1;
    held.notify();
    return never.await(60000) ? 2 : 3;
  });
  ASSERT_TRUE(held.await());
  Child waiting([&] {
    IvltRegistrar* r = nullptr;
    if (GetRegistrar(&r) != "ok") return 1;
    int found = Find(*r, G(1)) == S_OK ? 0 : 2;
    second.notify();
    r->Release();
    return found;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(waiting.pid(), SYS_flock); }));
  EXPECT_FALSE(second.await(0));
  EXPECT_TRUE(waiting.running());
  first.kill(SIGKILL);
  EXPECT_EQ(first.wait(), 128 + SIGKILL);
  EXPECT_TRUE(second.await());
  EXPECT_EQ(waiting.wait(), 0);
  ExpectWhole(i);
}

// A client that forks and goes on in the child neither frees nor keeps the parent's lock.
TEST(RegistrarE2e, AForkedChildDoesNotFreeItsParentsDatabase) {
  Installation i;
  Signal held, end;
  Child first([&] {
    IvltRegistrar* r = nullptr;
    if (GetRegistrar(&r) != "ok") return 1;
    if (Child([&] { return r->Release() == 1 ? 0 : 1; }).wait() != 0) return 2;
    held.notify();
    return end.await() ? 0 : 3;
  });
  ASSERT_TRUE(held.await());
  Child waiting([&] {
    IvltRegistrar* r = nullptr;
    return GetRegistrar(&r) == "ok" ? 0 : 1;
  });
  EXPECT_TRUE(Eventually([&] { return BlockedIn(waiting.pid(), SYS_flock); }));
  end.notify();
  EXPECT_EQ(first.wait(), 0);
  EXPECT_EQ(waiting.wait(), 0);
}

// A program started by the holder does not inherit the lock.
TEST(RegistrarE2e, AnExecutedProgramDoesNotKeepTheDatabase) {
  Installation i;
  TempDir dir;
  Child first([&] {
    IvltRegistrar* r = nullptr;
    if (GetRegistrar(&r) != "ok") return 1;
    // Outlives its parent; ends when it is asked to, or after a while.
    if (fork() == 0) {
      for (int fd : {0, 1, 2}) close(fd);  // no process is to wait for its output
      execlp("sleep", "sleep", "5", static_cast<char*>(nullptr));
      _exit(127);
    }
    return 0;
  });
  EXPECT_EQ(first.wait(), 0);
  Child second([&] {
    IvltRegistrar* r = nullptr;
    return GetRegistrar(&r) == "ok" ? 0 : 1;
  });
  EXPECT_EQ(second.wait(3000), 0);
}

TEST(RegistrarE2e, ProcessesThatStartTogetherAllGetTheComponents) {
  Installation i;
  for (int n = 0; n < 10; ++n)
    i.addObjectExpert("E" + std::to_string(n), "E" + std::to_string(n), GText(n + 1));
  std::vector<Child> clients;
  for (int n = 0; n < 8; ++n) {
    clients.emplace_back([&] {
      IvltRegistrar* r = nullptr;
      if (GetRegistrar(&r) != "ok") return 1;
      return Names(*r, vltComponentObjectExpert).size() == 10 ? 0 : 2;
    });
  }
  for (Child& client : clients) EXPECT_EQ(client.wait(), 0);
  ExpectWhole(i);
}

}  // namespace
}  // namespace vlt::test

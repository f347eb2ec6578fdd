#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <stdexcept>

#include "source/Snapshot/snapshot.hpp"
#include "tests/support/TestRegistrar.h"

namespace vlt::snapshot {
namespace {

using namespace vlt::test;

// Dictionary, object expert and resource expert, registered by one start.
struct Sample : Installation {
  std::string dictionary = addDictionary("Core", "Core", GText(1), 7, "co");
  std::string object = addObjectExpert("Tank", "Tank", GText(2), B(2) + ":1:" + B(9));
  std::string resource =
      addResourceExpert("Serial", "Serial", GText(3), "PNP", B(3) + ":1:" + B(9));

  Sample() { EXPECT_EQ(StartOnce(*this), 0); }
  static std::string B(uint32_t n) { return "{" + GText(n) + "}"; }
};

std::vector<std::string> NamesOf(const Snapshot& snapshot) {
  std::vector<std::string> names;
  for (const Component& component : snapshot.components) names.push_back(component.name);
  return names;
}

FileState StateOf(const Snapshot& snapshot, const std::string& path) {
  for (const RegistrationFile& file : snapshot.files) {
    if (file.path == path) return file.state;
  }
  ADD_FAILURE() << path << " is not among the files";
  return FileState::Unchanged;
}

TEST_IN_CHILD(Snapshot, HasTheFieldsOfEveryType) {
  Sample s;
  Snapshot found = Read(s.root());
  EXPECT_EQ(found.database.state, DatabaseState::Sound);
  EXPECT_EQ(found.changes(), 0u);
  ASSERT_EQ(NamesOf(found), (std::vector<std::string>{"Core", "Tank", "Serial", "vltdd"}));
  const Component& core = *found.find(GText(1));
  EXPECT_EQ(core.type, Type::Dictionary);
  EXPECT_EQ(core.guid, Sample::B(1));
  EXPECT_EQ(core.file, s.root() + "/Data Dictionaries/Core.framework");
  EXPECT_EQ(core.schemaVersion, 7u);
  EXPECT_EQ(core.fragmentRegistered, 23u);
  EXPECT_EQ(core.lastInstalledSchemaVersion, 0xFFFFFFFF);
  EXPECT_EQ(core.prefix, "co");
  EXPECT_EQ(core.registrationFile, s.dictionary);
  const Component& serial = *found.find(Sample::B(3));
  EXPECT_EQ(serial.type, Type::ResourceExpert);
  EXPECT_EQ(serial.pnp, "PNP");
  EXPECT_EQ(serial.recordVersion, 3u);
  EXPECT_EQ(serial.classes, std::vector<std::string>{Sample::B(9)});
  EXPECT_EQ(found.boundTo(Type::ObjectExpert, GText(9)), std::vector<std::string>{Sample::B(2)});
  EXPECT_EQ(found.boundTo(Type::ResourceExpert, GText(9)), std::vector<std::string>{Sample::B(3)});
  EXPECT_EQ(found.boundTo(Type::ResourceExpert, GText(8)), std::vector<std::string>{});
  EXPECT_EQ(found.find(GText(8)), nullptr);
  EXPECT_EQ(found.find("no GUID"), nullptr);
  EXPECT_EQ(found.configurationFile, s.root() + "/Data/config3.vlt");
}

TEST_IN_CHILD(Snapshot, TheInstallationInForceIsThatOfThePreference) {
  Sample s;
  EXPECT_EQ(NamesOf(Read()), NamesOf(Read(s.root())));
  EXPECT_THROW(Read(""), std::runtime_error);
}

TEST_IN_CHILD(Snapshot, WithoutADirectoryInForceItThrows) {
  Installation i;
  Installation::setDir("");
  EXPECT_THROW(Read(), std::runtime_error);
}

TEST_IN_CHILD(Snapshot, FilesAreComparedAndNothingIsMerged) {
  Sample s;
  std::string added = s.addObjectExpert("New", "New", GText(4));
  Installation::touch(s.object, Installation::kInstalled + 1);
  s.removeBundle("Experts", "Serial.vle");
  Snapshot found = Read(s.root());
  EXPECT_EQ(StateOf(found, s.dictionary), FileState::Unchanged);
  EXPECT_EQ(StateOf(found, s.object), FileState::Changed);
  EXPECT_EQ(StateOf(found, added), FileState::New);
  EXPECT_EQ(StateOf(found, s.resource), FileState::Vanished);
  EXPECT_EQ(found.changes(), 3u);
  // A registrar that starts drops what has vanished, whatever it merges.
  EXPECT_EQ(NamesOf(found), (std::vector<std::string>{"Core", "Tank", "vltdd"}));
}

TEST_IN_CHILD(Snapshot, AMissingOrUnusableDatabaseHasNoComponents) {
  Sample s;
  struct {
    const char* database;
    const char* sidecar;
    DatabaseState state;
    size_t components;
  } rows[] = {{"\xFF\xFE[\1", "0000000000000000", DatabaseState::Unparsable, 0},
              {"[KORComponents]\nA=A\n", "short", DatabaseState::SidecarShort, 0},
              {"[KORComponents]\nA=A\n", "0000000000000000", DatabaseState::DigestDiffers, 2}};
  for (const auto& row : rows) {
    WriteBytes(s.database(), row.database);
    WriteBytes(s.sidecar(), row.sidecar);
    Snapshot found = Read(s.root());
    EXPECT_EQ(found.database.state, row.state);
    EXPECT_EQ(found.components.size(), row.components) << row.database;
  }
  unlink(s.database().c_str());
  unlink(s.sidecar().c_str());
  EXPECT_EQ(Read(s.root()).database.state, DatabaseState::Missing);
}

TEST_IN_CHILD(Snapshot, AnImageIsReadWhereItIs) {
  Sample s;
  TempDir elsewhere;
  std::string image = elsewhere / "image";
  std::filesystem::rename(s.root(), image);
  Snapshot found = Read(image);
  EXPECT_EQ(found.changes(), 0u);
  EXPECT_EQ(NamesOf(found), (std::vector<std::string>{"Core", "Tank", "Serial", "vltdd"}));
  EXPECT_EQ(found.find(GText(1))->registrationFile,
            image + "/Data Dictionaries/Core.framework/Resources/Info.vlr");
  EXPECT_EQ(found.boundTo(Type::ObjectExpert, GText(9)).size(), 1u);
}

TEST_IN_CHILD(Snapshot, ADirectoryThatCannotBeReadIsNamed) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs root, to become a user without rights";
  Sample s;
  std::filesystem::path root = s.root();
  ASSERT_EQ(chmod(root.parent_path().c_str(), 0755), 0);
  ASSERT_EQ(chmod((s.root() + "/Experts").c_str(), 0700), 0);
  ASSERT_EQ(seteuid(65534), 0);
  Snapshot found = Read(s.root());
  ASSERT_EQ(found.problems.size(), 1u);
  EXPECT_EQ(found.problems[0].path, s.root() + "/Experts/");
  EXPECT_EQ(found.problems[0].error, EACCES);
  EXPECT_EQ(found.components.size(), 4u);
  ASSERT_EQ(seteuid(0), 0);
}

TEST_IN_CHILD(Snapshot, PreviousDictionariesAreListed) {
  Sample s;
  std::string last = s.root() + "/Data Dictionaries/Last/";
  std::filesystem::create_directories(last + "Old.framework");
  EXPECT_EQ(Read(s.root()).previousDictionaries, std::vector<std::string>{last + "Old.framework"});
}

TEST_IN_CHILD(Snapshot, ReadingLeavesTheTreeAsItWas) {
  Sample s;
  ASSERT_EQ(chmod(s.database().c_str(), 0400), 0);
  auto state = [&] {
    return RunProgram({"find", s.root(), "-printf", "%p %y %i %m %s %T@ %C@\n"}).out;
  };
  std::string before = state();
  ASSERT_NE(before.find("vlt.vlr"), std::string::npos);
  EXPECT_EQ(Read(s.root()).components.size(), 4u);
  EXPECT_EQ(state(), before);
}

TEST(SnapshotGuid, TextsOfEveryFormAreOne) {
  EXPECT_EQ(ParseGuid("0000000a-1111-4222-8333-444444444444"),
            "{0000000A-1111-4222-8333-444444444444}");
  EXPECT_EQ(ParseGuid("{0000000A-1111-4222-8333-444444444444}"),
            "{0000000A-1111-4222-8333-444444444444}");
  EXPECT_FALSE(ParseGuid("0000000A"));
  EXPECT_FALSE(ParseGuid(""));
}

}  // namespace
}  // namespace vlt::snapshot

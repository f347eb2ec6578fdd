#include <gtest/gtest.h>

#include "source/Snapshot/snapshot.hpp"
#include "tests/support/TestRegistrar.h"

namespace vlt::snapshot {
namespace {

using namespace vlt::test;

std::vector<std::string> NamesOf(const std::vector<Component>& components) {
  std::vector<std::string> names;
  for (const Component& component : components) names.push_back(component.name);
  return names;
}

using Strings = std::vector<std::string>;

TEST_IN_CHILD(Start, TheFirstOneMakesTheDatabase) {
  Installation i;
  std::string file = i.addObjectExpert("Tank", "Tank", GText(1));
  Start start = RehearseStart(i.root());
  EXPECT_TRUE(start.scans);
  EXPECT_EQ(NamesOf(start.added), (Strings{"Tank", "vltdd"}));
  EXPECT_EQ(start.saves, 4u);  // two settings, the built-in dictionary, one file
  ASSERT_EQ(start.files.size(), 1u);
  EXPECT_EQ(start.files[0].path, file);
  EXPECT_EQ(start.files[0].state, FileState::New);
  EXPECT_FALSE(start.leavesErasedOnDisk);
  EXPECT_FALSE(Exists(i.database()));
}

TEST_IN_CHILD(Start, WithoutAChangeItWritesTheSameAgain) {
  Installation i;
  i.addObjectExpert("Tank", "Tank", GText(1));
  ASSERT_EQ(StartOnce(i), 0);
  ASSERT_EQ(StartOnce(i), 0);
  Start start = RehearseStart(i.root());
  EXPECT_EQ(start.saves, 1u);
  EXPECT_TRUE(start.items.empty());
  EXPECT_TRUE(start.added.empty() && start.changed.empty() && start.removed.empty());
  EXPECT_EQ(start.text, ReadBytes(i.database()));
}

TEST_IN_CHILD(Start, WhatVanishedIsRemovedInMemoryOnly) {
  Installation i;
  std::string file = i.addObjectExpert("Tank", "Tank", GText(1));
  ASSERT_EQ(StartOnce(i), 0);
  i.removeBundle("Experts", "Tank.vle");
  Start start = RehearseStart(i.root());
  EXPECT_EQ(NamesOf(start.removed), Strings{"Tank"});
  EXPECT_TRUE(start.leavesErasedOnDisk);
  ASSERT_EQ(start.files.size(), 1u);
  EXPECT_EQ(start.files[0].path, file);
  EXPECT_EQ(start.files[0].state, FileState::Vanished);
}

TEST_IN_CHILD(Start, AChangedKeyIsNamedWithBothValues) {
  Installation i;
  i.addDictionary("Core", "Core", GText(1), 7, "old");
  ASSERT_EQ(StartOnce(i), 0);
  Installation::touch(i.addDictionary("Core", "Core", GText(1), 7, "new"),
                      Installation::kInstalled + 1);
  Start start = RehearseStart(i.root());
  EXPECT_EQ(NamesOf(start.changed), Strings{"Core"});
  for (const ItemChange& change : start.items) {
    if (change.item != "Prefix") continue;
    EXPECT_EQ(change.before, "old");
    EXPECT_EQ(change.after, "new");
    return;
  }
  FAIL() << "no change of Prefix";
}

TEST_IN_CHILD(Start, AFileThatCannotBeParsedIsSetAside) {
  Installation i;
  std::string file = i.addBundle("Experts", "x.vle", "\xFF\xFE[\1");
  Start start = RehearseStart(i.root());
  EXPECT_EQ(start.setAside, Strings{file});
  EXPECT_TRUE(Exists(file));
}

TEST_IN_CHILD(Start, WithAShortSidecarItDoesNotScan) {
  Installation i;
  i.addObjectExpert("Tank", "Tank", GText(1));
  ASSERT_EQ(StartOnce(i), 0);
  WriteBytes(i.sidecar(), "short");
  Start start = RehearseStart(i.root());
  EXPECT_FALSE(start.scans);
  EXPECT_EQ(start.saves, 0u);
}

}  // namespace
}  // namespace vlt::snapshot

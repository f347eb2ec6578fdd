#include "source/Pharlap/DatabaseSaves.h"

#include <gtest/gtest.h>

#include <memory>

#include "source/vlIniMgr.h"
#include "tests/support/TempDir.h"

namespace {

using namespace vlt::test;

struct DatabaseSavesTest : testing::Test {
  TempDir dir;
  std::string file = dir / "vlt.vlr", second = DurableCopy::NameFor(file);
  CvlIniMgr database = CvlIniMgr::OpenForUpdate(file);
  std::unique_ptr<DatabaseSaves> saves = std::make_unique<DatabaseSaves>(file, database);

  void expect(IniDurability durability, bool covered) const {
    EXPECT_EQ(database.durability(), durability);
    EXPECT_EQ(Exists(second), covered);
  }
};

TEST_F(DatabaseSavesTest, OutsideAScanEachIsDurable) {
  EXPECT_TRUE(saves->prepare());
  EXPECT_TRUE(saves->prepare());
  expect(IniDurability::Synced, false);
}

TEST_F(DatabaseSavesTest, OfAScanAreCoveredFromTheSecondOn) {
  {
    DatabaseSaves::ScanScope scan(*saves);
    expect(IniDurability::Synced, false);
    EXPECT_TRUE(saves->prepare());
    expect(IniDurability::ContentOnly, false);
    EXPECT_TRUE(saves->prepare());
    expect(IniDurability::None, true);
    EXPECT_TRUE(saves->prepare());
    expect(IniDurability::None, true);
  }
  expect(IniDurability::Synced, false);
}

TEST_F(DatabaseSavesTest, AreCoveredFromTheFirstOnAfterAScanThatWasKilled) {
  WriteBytes(second, "");
  DatabaseSaves::ScanScope scan(*saves);
  expect(IniDurability::None, true);
  EXPECT_TRUE(saves->prepare());
  expect(IniDurability::None, true);
}

TEST_F(DatabaseSavesTest, WithoutASecondNameEachHasItsContentsOnDisk) {
  dir.makeDir("vlt.vlr.durable");
  DatabaseSaves::ScanScope scan(*saves);
  for (int save = 0; save < 3; ++save) {
    EXPECT_TRUE(saves->prepare());
    EXPECT_EQ(database.durability(), IniDurability::ContentOnly);
  }
}

TEST_F(DatabaseSavesTest, ASecondNameThatWasLeftGoesWithTheNextSave) {
  WriteBytes(second, "");
  EXPECT_TRUE(saves->prepare());
  expect(IniDurability::Synced, false);
}

}  // namespace

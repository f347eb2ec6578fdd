// verify --content: registration files that say something else than the database, although no start
// would read them again.
#include <gtest/gtest.h>

#include <filesystem>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;
using nlohmann::json;

class VltctlContent : public testing::Test {
 protected:
  VltctlContent() {
    m_tank = m_installation.addObjectExpert("Tank", "Tank", GText(1));
    m_truck = m_installation.addObjectExpert("Truck", "Truck", GText(2));
    m_installation.addDictionary("Core", "Core", GText(3), 7, "co");
    ExpectStart("ok");
  }
  // Another content with the time that the file had.
  static void change(const std::string& file, const std::string& from, const std::string& to) {
    fs::file_time_type time = fs::last_write_time(file);
    std::string text = ReadBytes(file);
    size_t at = text.find(from);
    ASSERT_NE(at, std::string::npos) << text;
    WriteBytes(file, text.replace(at, from.size(), to));
    fs::last_write_time(file, time);
  }
  static JsonResult ask() { return VltctlJson({"verify", "--content"}); }

  Installation m_installation;
  std::string m_tank, m_truck;
};

TEST_F(VltctlContent, WhatAStartHasReadIsInTheDatabase) {
  JsonResult result = ask();
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.items, json::array());
  EXPECT_EQ(Vltctl({"verify", "--content"}).out,
            "3 registration files compared: the database has what they say\n");
}

TEST_F(VltctlContent, AValueThatWasChangedUnderTheSameTimeIsShown) {
  change(m_tank, GText(1), GText(9));
  JsonResult result = ask();
  EXPECT_EQ(result.exitCode, kNotFound);
  ASSERT_EQ(result.items.size(), 1u);
  const json& item = result.items[0];
  EXPECT_EQ(item["file"], m_tank);
  EXPECT_EQ(item["section"], "Tank");
  EXPECT_EQ(item["key"], "Identifier");
  EXPECT_NE(item["inFile"].get<std::string>().find(GText(9)), std::string::npos) << item;
  EXPECT_NE(item["inDatabase"].get<std::string>().find(GText(1)), std::string::npos) << item;
  // What the remedy says is true.
  fs::last_write_time(m_tank, fs::last_write_time(m_tank) + std::chrono::seconds(2));
  ExpectStart("ok");
  EXPECT_EQ(ask().exitCode, kGood);
}

TEST_F(VltctlContent, AComponentThatWasAddedUnderTheSameTimeIsShown) {
  change(m_truck, "[KORComponents]\n", "[KORComponents]\nVan = Van\n");
  change(m_truck, "[Truck]",
         "[Van]\nIdentifier = \"" + GText(8) + "\"\nFileName = \"Van\"\n[Truck]");
  JsonResult result = ask();
  EXPECT_EQ(result.exitCode, kNotFound);
  ASSERT_FALSE(result.items.empty());
  for (const json& item : result.items) {
    EXPECT_EQ(item["section"], "Van");
    EXPECT_EQ(item["inDatabase"], json());
  }
}

TEST_F(VltctlContent, AFileThatTheNextStartReadsIsNoDifference) {
  m_installation.addObjectExpert("Bus", "Bus", GText(7));
  ProgramResult result = Vltctl({"verify", "--content"});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.out, "3 registration files compared: the database has what they say\n");
  EXPECT_NE(result.err.find("1 registration file changed since"), std::string::npos) << result.err;
}

// Both bring it, and the one that was merged last counts: no start would change that.
TEST_F(VltctlContent, AnOverlaidComponentIsNoDifference) {
  m_installation.addBundle("Experts", "Other.vle",
                           "[KORComponents]\nTank = \"Tank\"\n[Tank]\nIdentifier = \"" + GText(1) +
                               "\"\nFileName = \"Other\"\n");
  ExpectStart("ok");
  EXPECT_EQ(ask().items, json::array());
}

TEST_F(VltctlContent, WithoutADatabaseThereIsNothingToCompare) {
  fs::remove(m_installation.database());
  EXPECT_EQ(ask().exitCode, kDataUnusable);
}

TEST_F(VltctlContent, GoesWithoutFiles) {
  EXPECT_EQ(Vltctl({"verify", "--content", "--all"}).exitCode, kUsage);
  EXPECT_EQ(Vltctl({"verify", "--content", m_tank}).exitCode, kUsage);
}

}  // namespace
}  // namespace vlt::test

#include "source/Database/Scan.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "source/Database/databaseText.h"
#include "source/vlIniMgr.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/osdep/DateTime.h"

namespace registrar {
namespace {

using vlt::test::TempDir;
using vlt::test::WriteBytes;

zt::fnd::AbsTime Seconds(time_t seconds) {
  timeval time = {};
  time.tv_sec = seconds;
  return zt::fnd::osdep::TimevalToAbsTime(time);
}

std::unique_ptr<CvlIniMgr> Open(const std::string& file) {
  return std::unique_ptr<CvlIniMgr>(new CvlIniMgr(CvlIniMgr::OpenForUpdate(file)));
}

struct ScanTest : testing::Test {
  TempDir dir;
  std::unique_ptr<CvlIniMgr> database = Open(dir / "vlt.vlr");
  std::unique_ptr<Scan> scan = std::make_unique<Scan>(*database);

  std::string value(const char* section, const char* item) const {
    std::string text;
    return database->GetItem(section, item, &text) < 0 ? "none" : text;
  }
  std::string addFile(const std::string& name, const std::string& text) {
    WriteBytes(dir / name, text);
    return dir / name;
  }
  void merge(const std::string& file) {
    std::unique_ptr<CvlIniMgr> fragment = Open(file);
    scan->beginFile();
    for (int n = 1; n <= fragment->GetNumberOfSections(); ++n) {
      std::string section;
      ASSERT_EQ(fragment->GetNthSectionName(n, &section), S_OK);
      if (!Scan::isMerged(*fragment, section)) continue;
      scan->mergeSection(*fragment, L"/root/", file, section, true);
    }
  }
};

TEST_F(ScanTest, AFileIsUpToDateWithItsStampOnly) {
  EXPECT_FALSE(scan->isUpToDate("/a", Seconds(1000000)));
  scan->setStamp("/a", Seconds(1000000));
  EXPECT_TRUE(scan->isUpToDate("/a", Seconds(1000000)));
  EXPECT_FALSE(scan->isUpToDate("/a", Seconds(999999)));
  EXPECT_FALSE(scan->isUpToDate("/b", Seconds(1000000)));
}

TEST_F(ScanTest, StampsAreComparedAsNumbers) {
  scan->setStamp("/a", Seconds(1000000));
  const std::string stamp = value("Registration", "/a");
  const std::string low = stamp.substr(0, stamp.find(' ')), high = stamp.substr(low.size() + 1);
  auto isUpToDate = [&](const std::string& stored) {
    database->SetItem("Registration", "/a", stored.c_str(), true);
    return scan->isUpToDate("/a", Seconds(1000000));
  };
  for (const std::string& same :
       {stamp, low + "  " + high, low + "\t" + high, "0" + low + " " + high, "+" + low + " " + high,
        stamp + " and more", stamp + "x"}) {
    EXPECT_TRUE(isUpToDate(same)) << same;
  }
  for (const std::string& other : {low, low + high, low + " ", low + "," + high, stamp + "0",
                                   high + " " + low, "-" + stamp, std::string(), "x" + stamp}) {
    EXPECT_FALSE(isUpToDate(other)) << other;
  }
}

// A number that cannot be read leaves the 0 that it is compared with.
TEST_F(ScanTest, AStampWhoseUpperHalfIsZeroIsComparedAsWell) {
  const zt::fnd::AbsTime first = Seconds(-11644473599);  // one second into 1601
  scan->setStamp("/a", first);
  const std::string stamp = value("Registration", "/a");
  ASSERT_EQ(stamp, "10000000 0");
  EXPECT_TRUE(scan->isUpToDate("/a", first));
  for (const char* other : {"10000000 99999999999", "10000000 ", "10000000", "10000000 x"}) {
    database->SetItem("Registration", "/a", other, true);
    EXPECT_FALSE(scan->isUpToDate("/a", first)) << other;
  }
}

TEST_F(ScanTest, AFileThatWasSeenIsPresent) {
  scan->isUpToDate("/seen", Seconds(1));
  EXPECT_TRUE(scan->isPresent("/seen"));
  EXPECT_FALSE(scan->isPresent("/unseen"));
  EXPECT_TRUE(scan->isPresent(addFile("there", "")));
}

TEST(ScanFilesSeen, AreFoundInAnyOrder) {
  FilesSeen seen;
  EXPECT_FALSE(seen.has("/a"));
  const std::vector<std::string> files = {"/a", "/b", "/c", "/d", "/e", ""};
  for (const std::string& file : files) seen.add(file);
  for (const char* wanted : {"/a", "/a", "/b", "/e", "/a", "/d", "/e", "", "/c"}) {
    EXPECT_TRUE(seen.has(wanted)) << wanted;
    EXPECT_FALSE(seen.has("/x"));
  }
  seen.add("/x");
  EXPECT_TRUE(seen.has("/x"));
  EXPECT_TRUE(seen.has("/b"));
  EXPECT_FALSE(seen.has("/B"));
}

TEST_F(ScanTest, MergesWhatAComponentBringsAndErasesItAgain) {
  std::string file = addFile("a.vlr",
                             "[KORComponents]\nC = \"C\"\n[C]\nFileName = \"c\"\n"
                             "Identifier = \"{00000000-0000-0000-0000-000000000001}\"\n"
                             "SchemaVersion = 7\n[KOR]\nConfigFile = \"kept\"\n");
  merge(file);
  EXPECT_EQ(value("KORComponents", "C"), "C");
  EXPECT_EQ(value("C", "FileName"), "/root/Data Dictionaries/c.framework");
  EXPECT_EQ(value("C", "Identifier"), "00000000-0000-0000-0000-000000000001");
  EXPECT_EQ(value("C", "FragmentRegistered"), "23");
  EXPECT_EQ(value("VLRContentsSection", "C"), file);
  scan->eraseComponentsOf(file);
  EXPECT_LT(database->SectionExists("C"), 0);
  EXPECT_EQ(value("KORComponents", "C"), "none");
  EXPECT_EQ(value("VLRContentsSection", "C"), "none");
}

TEST_F(ScanTest, AComponentNamedLikeASectionOfTheDatabaseIsNotMerged) {
  std::string file = addFile("a.vlr",
                             "[KORComponents]\nKOR = \"KOR\"\n[KOR]\nConfigFile = \"mine\"\n"
                             "[Other]\nx = \"1\"\n");
  merge(file);
  EXPECT_EQ(value("KOR", "ConfigFile"), "none");
  EXPECT_EQ(value("Other", "x"), "1");
}

TEST_F(ScanTest, ErasingByARelativePathIsReported) {
  database->SetItem("Registration", "Info.vlr", "1 2", true);
  scan->erase("C", "/gone/Info.vlr");
  EXPECT_EQ(value("Registration", "Info.vlr"), "none");
  EXPECT_FALSE(scan->droppedPlanted());
  scan->erase("C", "Info.vlr");
  EXPECT_TRUE(scan->droppedPlanted());
}

TEST(ScanFileName, IsPutWhereItsKindIs) {
  struct {
    bool isDictionary;
    const char* name;
    const char* path;
  } rows[] = {{true, "Foo", "/r/Data Dictionaries/Foo.framework"},
              {false, "Foo", "/r/Experts/Foo.vle"},
              {false, "Foo.bar", "/r/Experts/Foo.bar"},
              {false, "sub/Foo", "sub/Foo.vle"},
              {true, "/abs/Foo.framework", "/abs/Foo.framework"}};
  for (const auto& row : rows) {
    EXPECT_EQ(ProcessFileName(row.isDictionary, L"/r/", row.name), row.path);
  }
}

}  // namespace
}  // namespace registrar

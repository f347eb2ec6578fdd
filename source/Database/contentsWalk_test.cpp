#include "source/Database/contentsWalk.h"

#include <gtest/gtest.h>

#include <utility>

#include "source/vlIniMgr.h"
#include "tests/support/TempDir.h"

namespace vlt::test {
namespace {

struct Row {
  const char* component;
  const char* file;
  int first, last;
};

// Puts the items into the section in memory, where nothing joins them, and compares the walk.
void ExpectWalk(const std::vector<std::pair<const char*, const char*>>& items,
                const std::vector<Row>& expected) {
  TempDir dir;
  CvlIniMgr ini = CvlIniMgr::OpenForUpdate(dir / "x.ini");
  for (const auto& [name, value] : items) ini.SetItem("VLRContentsSection", name, value, true);
  std::vector<ContentsItem> found = ReadContents(ini);
  ASSERT_EQ(found.size(), expected.size());
  for (size_t n = 0; n < found.size(); ++n) {
    EXPECT_EQ(found[n].component, expected[n].component) << n;
    EXPECT_EQ(found[n].file, expected[n].file) << n;
    EXPECT_EQ(found[n].first, expected[n].first) << n;
    EXPECT_EQ(found[n].last, expected[n].last) << n;
  }
}

TEST(contentsWalk, AnEmptyOrMissingSectionHasNoItems) { ExpectWalk({}, {}); }

TEST(contentsWalk, OrdinaryItemsStandForThemselves) {
  ExpectWalk({{"a", "/1"}, {"a longer component name", "/2"}, {"b", ""}},
             {{"a", "/1", 0, 0}, {"a longer component name", "/2", 1, 1}, {"b", "", 2, 2}});
}

TEST(contentsWalk, NamesBelowElevenCharactersAreNeverPieces) {
  ExpectWalk({{"x Line0001", "/1"}, {"x Line0002", "/2"}},
             {{"x Line0001", "/1", 0, 0}, {"x Line0002", "/2", 1, 1}});
}

TEST(contentsWalk, ElevenCharactersAreEnough) {
  ExpectWalk({{"xx Line0001", "/1"}, {"xx Line0002", "/2"}}, {{"xx", "/1/2", 0, 1}});
}

TEST(contentsWalk, PiecesOfOneNameAreJoinedUntilAnotherItemComes) {
  ExpectWalk({{"before", "/b"},
              {"name Line0001", "/n"},
              {"name Line0002", "1"},
              {"name Line0003", "2"},
              {"other Line0001", "/o"},
              {"after", "/a"},
              {"name Line0004", "/late"}},
             {{"before", "/b", 0, 0},
              {"name", "/n12", 1, 3},
              {"other", "/o", 4, 4},
              {"after", "/a", 5, 5},
              {"name", "/late", 6, 6}});
}

TEST(contentsWalk, TheNameOfARunIsExactInCase) {
  ExpectWalk({{"name Line0001", "/1"}, {"Name Line0002", "/2"}},
             {{"name", "/1", 0, 0}, {"Name", "/2", 1, 1}});
}

// Only the four letters count: neither the blank before them nor the digits after them.
TEST(contentsWalk, AnyFourCharactersMayFollowTheMark) {
  ExpectWalk({{"name_LineABCD", "/1"}, {"name line0002", "/2"}, {"name Line00001", "/3"}},
             {{"name", "/1", 0, 0}, {"name line0002", "/2", 1, 1}, {"name Line00001", "/3", 2, 2}});
}

// ---- The files that the items hold

class contentsWalkFiles : public testing::Test {
 protected:
  void set(const char* item, const char* file) {
    ini.SetItem("VLRContentsSection", item, file, true);
    files.add(ini, item);
  }
  void learn() { files.learn(ReadContents(ini)); }

  TempDir dir;
  CvlIniMgr ini{(dir / "x.ini").c_str(), false, nullptr, false, true};
  ContentsFiles files;
};

TEST_F(contentsWalkFiles, BeforeAWalkAnyFileMayBeThere) {
  EXPECT_TRUE(files.mayHave("/1"));
  set("a", "/1");
  EXPECT_TRUE(files.mayHave("/2"));
}

TEST_F(contentsWalkFiles, AWalkKnowsThemInAnyCase) {
  ini.SetItem("VLRContentsSection", "a", "/One", true);
  learn();
  EXPECT_TRUE(files.mayHave("/oNE"));
  EXPECT_FALSE(files.mayHave("/On"));
  EXPECT_FALSE(files.mayHave("/two"));
}

TEST_F(contentsWalkFiles, WhatIsSetBehindTheWalkIsKnownAsItIsKept) {
  learn();
  set("  a ", "/o\\n\te");
  EXPECT_TRUE(files.mayHave("/O\\n\tE"));
  EXPECT_FALSE(files.mayHave("/two"));
  set("a", "/two");  // the same item
  EXPECT_TRUE(files.mayHave("/two"));
}

TEST_F(contentsWalkFiles, AfterOtherChangesAnyFileMayBeThere) {
  learn();
  files.forget();
  EXPECT_TRUE(files.mayHave("/1"));
}

// A change may join pieces to a file that no item has.
TEST_F(contentsWalkFiles, WithPiecesAnyFileMayBeThere) {
  ini.SetItem("VLRContentsSection", "name Line0002", "/1", true);
  learn();
  EXPECT_TRUE(files.mayHave("/2"));
  set("b", "/3");
  EXPECT_TRUE(files.mayHave("/2"));
}

TEST_F(contentsWalkFiles, APieceThatComesMakesAnyFilePossible) {
  learn();
  set("name Line0002 ", "/1");
  EXPECT_TRUE(files.mayHave("/2"));
}

}  // namespace
}  // namespace vlt::test

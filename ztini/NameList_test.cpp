#include "ztini/NameList.h"

#include <gtest/gtest.h>

#include <deque>
#include <string>
#include <vector>

#include "tests/support/FailingAlloc.h"
#include "ztini/StringTools.h"

namespace {

using ztini::NameFold;
using ztini::NameList;
using ztini::NameMatch;
using ztini::NameNode;

class NameListTest : public testing::Test {
 protected:
  ~NameListTest() override {
    for (NameNode& node : m_nodes) std::free(node.name);
  }
  NameNode* add(const std::string& name) {
    m_nodes.push_back(NameNode{ztini_StrDup(name.c_str())});
    EXPECT_TRUE(list.reserve(1));
    list.append(&m_nodes.back());
    return &m_nodes.back();
  }
  NameNode* find(const char* name) { return list.find(name, NameMatch::IgnoreCase); }

  NameFold fold;
  NameList list{&fold};

 private:
  std::deque<NameNode> m_nodes;
};

TEST_F(NameListTest, FindsTheFirstOfEqualNamesWhenShortAndWhenLong) {
  NameNode* first = add("x");
  NameNode* second = add("X");
  EXPECT_EQ(find(" x "), first);
  for (int i = 0; i < 100; ++i) add("n" + std::to_string(i));
  EXPECT_EQ(find("X"), first);
  list.remove(first);
  EXPECT_EQ(find("x"), second);
  NameNode* third = add("x");
  list.remove(second);
  EXPECT_EQ(find("x"), third);
}

TEST_F(NameListTest, ExactMatchIsCaseSensitiveAndLooksAtWhiteSpace) {
  NameNode* upper = add("ABC");
  NameNode* lower = add("abc");
  for (int rounds = 0; rounds < 2; ++rounds) {
    EXPECT_EQ(list.find("abc", NameMatch::Exact), lower);
    EXPECT_EQ(list.find("ABC", NameMatch::Exact), upper);
    EXPECT_EQ(list.find("Abc", NameMatch::Exact), nullptr);
    EXPECT_EQ(list.find("abc ", NameMatch::Exact), nullptr);
    for (int i = 0; i < 50; ++i) add("n" + std::to_string(i));
  }
}

TEST_F(NameListTest, PositionsFollowRemovals) {
  std::vector<NameNode*> all;
  for (int i = 0; i < 40; ++i) all.push_back(add(std::to_string(i)));
  list.remove(all[0]);
  list.remove(all[20]);
  EXPECT_EQ(list.positionOf(all[1]), 1);
  EXPECT_EQ(list.positionOf(all[19]), 19);
  EXPECT_EQ(list.positionOf(all[21]), 20);
  EXPECT_EQ(list.positionOf(all[39]), 38);
  EXPECT_EQ(list.positionOf(all[20]), 0);
  EXPECT_EQ(list.at(0), all[39]);
  EXPECT_EQ(list.at(-1), all[1]);
  EXPECT_EQ(list.at(39), nullptr);
}

TEST_F(NameListTest, RenameMovesTheNodeToItsNewChain) {
  std::vector<NameNode*> all;
  for (int i = 0; i < 40; ++i) all.push_back(add("n" + std::to_string(i)));
  EXPECT_EQ(find("n5"), all[5]);
  list.rename(all[3], ztini_StrDup("N5"));
  EXPECT_EQ(find("n5"), all[3]);  // earlier in the list than the old bearer of the name
  EXPECT_EQ(find("n3"), nullptr);
  list.rename(all[3], ztini_StrDup("other"));
  EXPECT_EQ(find("n5"), all[5]);
  EXPECT_EQ(find("OTHER"), all[3]);
}

TEST_F(NameListTest, NullNameIsNotFound) {
  add("x");
  EXPECT_EQ(find(nullptr), nullptr);
}

TEST_F(NameListTest, WithoutMemoryForTheIndexItScans) {
  std::vector<NameNode*> all;
  for (int i = 0; i < 60; ++i) all.push_back(add("n" + std::to_string(i)));
  char* name = ztini_StrDup("n7");
  ztini::test::FailFromAllocation fail(1);
  for (int i = 0; i < 60; ++i) {
    EXPECT_EQ(find(("N" + std::to_string(i)).c_str()), all[static_cast<size_t>(i)]);
  }
  EXPECT_TRUE(fail.failed());
  list.remove(all[7]);
  EXPECT_EQ(find("n7"), nullptr);
  list.rename(all[8], name);
  EXPECT_EQ(find("n7"), all[8]);
}

TEST_F(NameListTest, AnIndexThatCannotGrowIsReplacedByAScan) {
  std::vector<NameNode> extra(200);
  for (int i = 0; i < 30; ++i) add("n" + std::to_string(i));
  EXPECT_NE(find("n1"), nullptr);  // builds the index
  for (size_t i = 0; i < extra.size(); ++i) {
    extra[i].name = ztini_StrDup(("e" + std::to_string(i)).c_str());
  }
  for (NameNode& node : extra) {
    ASSERT_TRUE(list.reserve(1));
    ztini::test::FailFromAllocation fail(1);
    list.append(&node);
    EXPECT_EQ(find(node.name), &node);
  }
  EXPECT_EQ(find("e0"), &extra[0]);
  EXPECT_EQ(find("n29"), list.at(30));
  for (NameNode& node : extra) free(node.name);
}

TEST_F(NameListTest, CompactionForgetsTheIndex) {
  std::vector<NameNode*> all;
  for (int i = 0; i < 40; ++i) all.push_back(add("n" + std::to_string(i)));
  EXPECT_EQ(find("n30"), all[30]);
  NameNode** nodes = list.nodes();
  nodes[1] = nodes[39];
  list.keepFirst(2);
  EXPECT_EQ(list.count(), 2);
  EXPECT_EQ(find("n39"), all[39]);
  EXPECT_EQ(find("n30"), nullptr);
  EXPECT_EQ(list.positionOf(all[39]), 2);
}

TEST_F(NameListTest, SeekReportsTheMissingIndexOfALongListOnly) {
  std::vector<NameNode*> all;
  for (int i = 0; i < 15; ++i) all.push_back(add("n" + std::to_string(i)));
  NameNode* found = nullptr;
  {
    ztini::test::FailFromAllocation fail(1);
    EXPECT_TRUE(list.seek("N3", NameMatch::IgnoreCase, &found));
    EXPECT_EQ(found, all[3]);
  }
  add("n15");
  {
    ztini::test::FailFromAllocation fail(1);
    EXPECT_FALSE(list.seek("n3", NameMatch::IgnoreCase, &found));
    EXPECT_EQ(found, nullptr);
  }
  EXPECT_TRUE(list.seek("n3", NameMatch::IgnoreCase, &found));
  EXPECT_EQ(found, all[3]);
  EXPECT_TRUE(list.seek("none", NameMatch::IgnoreCase, &found));
  EXPECT_EQ(found, nullptr);
  EXPECT_TRUE(list.seek(nullptr, NameMatch::IgnoreCase, &found));
}

TEST_F(NameListTest, RecordsAreNumberedAgainWhenTheNumbersRunOut) {
  std::vector<NameNode*> all;
  for (int i = 0; i < 40; ++i) all.push_back(add(i % 10 == 3 ? "same" : "n" + std::to_string(i)));
  all.back()->sequence = ztini::NameIndex::kNoSequence - 2;
  EXPECT_EQ(find("n38"), all[38]);  // builds the index
  list.remove(all[5]);
  for (int i = 40; i < 60; ++i) all.push_back(add("n" + std::to_string(i)));
  EXPECT_LT(all.back()->sequence, 100u);
  EXPECT_EQ(find("n59"), all[59]);
  EXPECT_EQ(find("n39"), all[39]);
  EXPECT_EQ(find("same"), all[3]);
  list.remove(all[3]);
  EXPECT_EQ(find("SAME"), all[13]);
  EXPECT_EQ(list.positionOf(all[59]), 58);
}

TEST_F(NameListTest, LentRecordsAreInOrderAndAnswerAsAppendedOnes) {
  NameNode nodes[3] = {
      {.name = ztini_StrDup("a")}, {.name = ztini_StrDup("b")}, {.name = ztini_StrDup("c")}};
  NameNode* lent[] = {&nodes[0], &nodes[1], &nodes[2]};
  EXPECT_TRUE(list.ownsNoBlock());
  list.lend(lent, 3);
  EXPECT_TRUE(list.ownsNoBlock());
  EXPECT_EQ(find("B"), &nodes[1]);
  EXPECT_EQ(list.positionOf(&nodes[2]), 3);
  list.remove(&nodes[0]);
  EXPECT_EQ(list.positionOf(&nodes[2]), 2);
  EXPECT_EQ(list.positionOf(add("d")), 3);
  EXPECT_TRUE(list.ownsNoBlock());
  EXPECT_EQ(list.positionOf(add("e")), 4);
  EXPECT_FALSE(list.ownsNoBlock());
  EXPECT_EQ(find("c"), &nodes[2]);
  for (NameNode& node : nodes) free(node.name);
}

TEST_F(NameListTest, AnIndexIsABlock) {
  for (int i = 0; i < 20; ++i) add("n" + std::to_string(i));
  std::vector<NameNode*> lent(list.nodes(), list.nodes() + list.count());
  NameList other(&fold);
  other.lend(lent.data(), static_cast<uint32_t>(lent.size()));
  EXPECT_TRUE(other.ownsNoBlock());
  EXPECT_EQ(other.find("n7", NameMatch::IgnoreCase), lent[7]);
  EXPECT_FALSE(other.ownsNoBlock());
}

}  // namespace

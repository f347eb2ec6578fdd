#include "ztini/NameIndex.h"

#include <gtest/gtest.h>

#include <deque>
#include <string>
#include <vector>

#include "ztini/FailingAlloc.h"

namespace {

using ztini::NameFold;
using ztini::NameIndex;
using ztini::NameNode;

// Nodes with stable addresses, in sequence order.
class Nodes {
 public:
  NameNode* add(const std::string& name) {
    m_names.push_back(name);
    m_nodes.push_back(NameNode{m_names.back().data(), m_nodes.size(), nullptr, nullptr});
    return &m_nodes.back();
  }

 private:
  std::deque<std::string> m_names;
  std::deque<NameNode> m_nodes;
};

std::vector<NameNode*> Chain(const NameIndex& index, const NameFold& fold, const char* name) {
  std::vector<NameNode*> nodes;
  for (NameNode* node = index.chain(fold, name); node; node = node->nextSame) nodes.push_back(node);
  return nodes;
}

using Expected = std::vector<NameNode*>;

TEST(IniNameIndex, FindsNamesThroughGrowth) {
  NameFold fold;
  Nodes nodes;
  NameIndex index;
  ASSERT_TRUE(index.create(0));
  std::vector<NameNode*> all;
  for (int i = 0; i < 1000; ++i) {
    all.push_back(nodes.add("Name" + std::to_string(i)));
    ASSERT_TRUE(index.insert(fold, all.back()));
  }
  for (int i = 0; i < 1000; ++i) {
    const std::string query = "  nAME" + std::to_string(i) + "\t";
    ASSERT_EQ(index.chain(fold, query.c_str()), all[static_cast<size_t>(i)]) << query;
  }
  EXPECT_EQ(index.chain(fold, "Name1000"), nullptr);
}

TEST(IniNameIndex, EqualNamesChainInSequenceOrderHoweverTheyCome) {
  NameFold fold;
  Nodes nodes;
  NameNode *a = nodes.add("x"), *b = nodes.add("X"), *c = nodes.add("x"), *d = nodes.add("X");
  NameIndex index;
  ASSERT_TRUE(index.create(0));
  for (NameNode* node : {c, a, d, b}) ASSERT_TRUE(index.insert(fold, node));
  EXPECT_EQ(Chain(index, fold, "x"), (Expected{a, b, c, d}));
  index.remove(fold, b);
  EXPECT_EQ(Chain(index, fold, "x"), (Expected{a, c, d}));
  index.remove(fold, a);
  EXPECT_EQ(Chain(index, fold, "x"), (Expected{c, d}));
  index.remove(fold, d);
  EXPECT_EQ(Chain(index, fold, "x"), (Expected{c}));
  ASSERT_TRUE(index.insert(fold, b));
  EXPECT_EQ(Chain(index, fold, "x"), (Expected{b, c}));
  index.remove(fold, b);
  index.remove(fold, c);
  EXPECT_EQ(Chain(index, fold, "x"), Expected{});
}

TEST(IniNameIndex, RemovalKeepsTheOthersReachable) {
  NameFold fold;
  Nodes nodes;
  NameIndex index;
  ASSERT_TRUE(index.create(0));
  std::vector<NameNode*> all;
  for (int i = 0; i < 3000; ++i) {
    all.push_back(nodes.add(std::to_string(i)));
    ASSERT_TRUE(index.insert(fold, all.back()));
  }
  for (size_t i = 0; i < all.size(); i += 3) index.remove(fold, all[i]);
  for (size_t i = 0; i < all.size(); ++i) {
    NameNode* expected = i % 3 == 0 ? nullptr : all[i];
    ASSERT_EQ(index.chain(fold, all[i]->name), expected) << i;
  }
}

TEST(IniNameIndex, WithoutMemoryItReportsAndEmptiesItself) {
  NameFold fold;
  Nodes nodes;
  NameIndex index;
  {
    ztini::test::FailFromAllocation fail(1);
    EXPECT_FALSE(index.create(10));
  }
  ASSERT_TRUE(index.create(0));
  ztini::test::FailFromAllocation fail(1);
  bool inserted = true;
  for (int i = 0; inserted && i < 100; ++i) {
    inserted = index.insert(fold, nodes.add(std::to_string(i)));
  }
  EXPECT_FALSE(inserted);
  EXPECT_FALSE(index.built());
}

}  // namespace

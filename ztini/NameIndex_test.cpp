#include "ztini/NameIndex.h"

#include <gtest/gtest.h>

#include <deque>
#include <string>
#include <vector>

#include "tests/support/FailingAlloc.h"

namespace {

using ztini::NameFold;
using ztini::NameIndex;
using ztini::NameNode;
using ztini::NodesInOrder;

// Nodes with stable addresses, in sequence order.
class Nodes {
 public:
  NameNode* add(const std::string& name) {
    m_names.push_back(name);
    m_nodes.push_back(NameNode{m_names.back().data(), static_cast<uint32_t>(m_nodes.size())});
    m_order.push_back(&m_nodes.back());
    return &m_nodes.back();
  }
  NodesInOrder order() { return {m_order.data(), static_cast<uint32_t>(m_order.size())}; }
  // Leaves a gap in the numbers.
  void erase(size_t place) { m_order.erase(m_order.begin() + static_cast<ptrdiff_t>(place)); }

 private:
  std::deque<std::string> m_names;
  std::deque<NameNode> m_nodes;
  std::vector<NameNode*> m_order;
};

std::vector<NameNode*> Chain(const NameIndex& index, const NameFold& fold, NodesInOrder order,
                             const char* name) {
  std::vector<NameNode*> nodes;
  for (NameNode* node = index.chain(fold, order, name).first; node;
       node = index.nextSame(order, node)) {
    nodes.push_back(node);
  }
  return nodes;
}

using Expected = std::vector<NameNode*>;

TEST(NameIndex, FindsNamesThroughGrowth) {
  NameFold fold;
  Nodes nodes;
  NameIndex index;
  ASSERT_TRUE(index.create(fold, 0));
  std::vector<NameNode*> all;
  for (int i = 0; i < 1000; ++i) {
    all.push_back(nodes.add("Name" + std::to_string(i)));
    ASSERT_TRUE(index.insert(fold, nodes.order(), all.back()));
  }
  for (int i = 0; i < 1000; ++i) {
    const std::string query = "  nAME" + std::to_string(i) + "\t";
    ASSERT_EQ(index.chain(fold, nodes.order(), query.c_str()).first, all[static_cast<size_t>(i)])
        << query;
  }
  EXPECT_EQ(index.chain(fold, nodes.order(), "Name1000").first, nullptr);
}

TEST(NameIndex, EqualNamesChainInSequenceOrderHoweverTheyCome) {
  NameFold fold;
  Nodes nodes;
  NameNode *a = nodes.add("x"), *b = nodes.add("X"), *c = nodes.add("x"), *d = nodes.add("X");
  NameIndex index;
  ASSERT_TRUE(index.create(fold, 0));
  for (NameNode* node : {c, a, d, b}) ASSERT_TRUE(index.insert(fold, nodes.order(), node));
  EXPECT_EQ(Chain(index, fold, nodes.order(), "x"), (Expected{a, b, c, d}));
  index.remove(fold, nodes.order(), b);
  EXPECT_EQ(Chain(index, fold, nodes.order(), "x"), (Expected{a, c, d}));
  index.remove(fold, nodes.order(), a);
  EXPECT_EQ(Chain(index, fold, nodes.order(), "x"), (Expected{c, d}));
  index.remove(fold, nodes.order(), d);
  EXPECT_EQ(Chain(index, fold, nodes.order(), "x"), (Expected{c}));
  ASSERT_TRUE(index.insert(fold, nodes.order(), b));
  EXPECT_EQ(Chain(index, fold, nodes.order(), "x"), (Expected{b, c}));
  index.remove(fold, nodes.order(), b);
  index.remove(fold, nodes.order(), c);
  EXPECT_EQ(Chain(index, fold, nodes.order(), "x"), Expected{});
}

TEST(NameIndex, RemovalKeepsTheOthersReachable) {
  NameFold fold;
  Nodes nodes;
  NameIndex index;
  ASSERT_TRUE(index.create(fold, 0));
  std::vector<NameNode*> all;
  for (int i = 0; i < 3000; ++i) {
    all.push_back(nodes.add(std::to_string(i)));
    ASSERT_TRUE(index.insert(fold, nodes.order(), all.back()));
  }
  for (size_t i = 0; i < all.size(); i += 3) index.remove(fold, nodes.order(), all[i]);
  for (size_t i = 0; i < all.size(); ++i) {
    NameNode* expected = i % 3 == 0 ? nullptr : all[i];
    ASSERT_EQ(index.chain(fold, nodes.order(), all[i]->name).first, expected) << i;
  }
}

TEST(NameIndex, WithoutMemoryItReportsAndEmptiesItself) {
  NameFold fold;
  Nodes nodes;
  NameIndex index;
  {
    ztini::test::FailFromAllocation fail(1);
    EXPECT_FALSE(index.create(fold, 10));
  }
  ASSERT_TRUE(index.create(fold, 0));
  ztini::test::FailFromAllocation fail(1);
  bool inserted = true;
  for (int i = 0; inserted && i < 100; ++i) {
    NameNode* node = nodes.add(std::to_string(i));
    inserted = index.insert(fold, nodes.order(), node);
  }
  EXPECT_FALSE(inserted);
  EXPECT_FALSE(index.built());
}

TEST(NameIndex, EqualNamesWithoutMemoryForTheirChainEmptyTheIndex) {
  NameFold fold;
  Nodes nodes;
  NameNode *a = nodes.add("x"), *b = nodes.add("X");
  NameIndex index;
  ASSERT_TRUE(index.create(fold, 0));
  ASSERT_TRUE(index.insert(fold, nodes.order(), a));
  {
    ztini::test::FailFromAllocation fail(1);
    EXPECT_FALSE(index.insert(fold, nodes.order(), b));
  }
  EXPECT_FALSE(index.built());
  ASSERT_TRUE(index.create(fold, 0));
  for (NameNode* node : {a, b}) ASSERT_TRUE(index.insert(fold, nodes.order(), node));
  EXPECT_EQ(Chain(index, fold, nodes.order(), "x"), (Expected{a, b}));
}

TEST(NameIndex, ChainsAreReusedWhenTheirNodesGo) {
  NameFold fold;
  Nodes nodes;
  NameIndex index;
  ASSERT_TRUE(index.create(fold, 0));
  for (int i = 0; i < 40; ++i) nodes.add("x");
  const NodesInOrder order = nodes.order();
  for (uint32_t i = 0; i < 40; ++i) ASSERT_TRUE(index.insert(fold, order, order.begin[i]));
  ztini::test::FailFromAllocation fail(1);
  for (int round = 0; round < 100; ++round) {
    for (uint32_t i = 1; i < 40; i += 2) index.remove(fold, order, order.begin[i]);
    ASSERT_EQ(Chain(index, fold, order, "X").size(), 20u);
    for (uint32_t i = 39; i < 40; i -= 2) ASSERT_TRUE(index.insert(fold, order, order.begin[i]));
    ASSERT_EQ(Chain(index, fold, order, "X"), Expected(order.begin, order.begin + 40));
  }
}

TEST(NameIndex, PlacesFollowGapsInTheNumbers) {
  Nodes nodes;
  for (int i = 0; i < 10; ++i) nodes.add("x");
  for (size_t place : {0, 3, 3, 6}) nodes.erase(place);  // 1 2 3 6 7 8
  const struct {
    uint32_t sequence, place;
  } rows[] = {{0, 6}, {1, 0}, {2, 1}, {3, 2}, {4, 6},  {5, 6},
              {6, 3}, {7, 4}, {8, 5}, {9, 6}, {10, 6}, {NameIndex::kNoSequence, 6}};
  for (const auto& row : rows) {
    EXPECT_EQ(nodes.order().placeOf(row.sequence), row.place) << row.sequence;
  }
  EXPECT_EQ(NodesInOrder().placeOf(0), 0u);
}

}  // namespace

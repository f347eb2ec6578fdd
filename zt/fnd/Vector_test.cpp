#include "zt/fnd/Vector.h"

#include <gtest/gtest.h>

#include <string>

#include "zt/fnd/String.h"

namespace zt::fnd {
namespace {

TEST(Vector, EmptyHasNoBlock) {
  Vector<int> v;
  EXPECT_EQ(v.size(), 0u);
  EXPECT_EQ(v.capacity(), 0u);
  EXPECT_EQ(v.begin(), nullptr);
  EXPECT_EQ(v.begin(), v.end());
}

TEST(Vector, CapacitiesRunOneThreeSevenFifteen) {
  Vector<int> v;
  const unsigned int expected[] = {1, 3, 3, 7, 7, 7, 7, 15};
  for (unsigned int i = 0; i < 8; ++i) {
    v.push_back(static_cast<int>(i));
    EXPECT_EQ(expected[i], v.capacity()) << i;
    EXPECT_EQ(i + 1, v.size());
  }
  for (unsigned int i = 0; i < 8; ++i) EXPECT_EQ(static_cast<int>(i), v[i]);
}

TEST(Vector, NextCapacityAtTheEdgesOfThirtyTwoBits) {
  EXPECT_EQ(1u, vector_detail::NextCapacity(0));
  EXPECT_EQ(0xFFFFFFFDu, vector_detail::NextCapacity(0x7FFFFFFEu));
  EXPECT_THROW(vector_detail::NextCapacity(0x7FFFFFFFu), exception::OutOfRange);
  EXPECT_EQ(vector_detail::NextCapacity(0x80000000u), 0x80000001u);
  EXPECT_EQ(vector_detail::NextCapacity(0xFFFFFFFDu), 0xFFFFFFFEu);
  EXPECT_THROW(vector_detail::NextCapacity(0xFFFFFFFEu), exception::OutOfRange);
  EXPECT_THROW(vector_detail::NextCapacity(0xFFFFFFFFu), exception::OutOfRange);
}

struct Huge {
  unsigned char bytes[0x40000000];
};

TEST(Vector, BlockOfMoreThanThirtyTwoBitsIsOutOfRange) {
  EXPECT_THROW(vector_detail::Builder<Huge>(4), exception::OutOfRange);
  EXPECT_THROW(vector_detail::Builder<std::string>(0xFFFFFFFDu), exception::OutOfRange);
}

TEST(Vector, CopyHasACapacityOfItsSizeAndItsOwnElements) {
  Vector<std::string> v;
  for (const char* s : {"a", "b", "c", "d"}) v.push_back(s);
  Vector<std::string> copy(v);
  EXPECT_EQ(copy.capacity(), 4u);
  copy[0] = "changed";
  EXPECT_EQ(v[0], "a");
  EXPECT_EQ(Vector<std::string>(Vector<std::string>()).capacity(), 0u);
}

TEST(Vector, AssignmentReplacesAndToleratesItself) {
  Vector<std::string> v, w;
  v.push_back("a");
  w.push_back("x");
  w.push_back("y");
  v = w;
  EXPECT_EQ(v.size(), 2u);
  EXPECT_EQ(v[1], "y");
  Vector<std::string>& self = v;
  v = self;
  EXPECT_EQ(v[0], "x");
}

TEST(Vector, SwapExchangesAllAndClearFrees) {
  Vector<int> v, w;
  v.push_back(1);
  v.swap(w);
  EXPECT_EQ(v.size(), 0u);
  ASSERT_EQ(w.size(), 1u);
  EXPECT_EQ(w[0], 1);
  w.clear();
  EXPECT_EQ(w.capacity(), 0u);
  EXPECT_EQ(w.begin(), nullptr);
  w.push_back(2);
  EXPECT_EQ(w.capacity(), 1u);
}

TEST(Vector, PushBackOfAnOwnElementSurvivesTheMove) {
  Vector<std::string> v;
  v.push_back("a text that is long enough for a block of its own");
  v.push_back(v[0]);
  EXPECT_EQ(v[0], v[1]);
}

TEST(Vector, ElementsAreMadeInPlaceFromTheVectorsOwn) {
  Vector<String> v;
  v.emplace_back(3u, L'a');
  for (int i = 0; i < 20; ++i) v.emplace_back(v[0], v[v.size() - 1]);
  EXPECT_EQ(v.size(), 21u);
  EXPECT_EQ(v[20], String(63u, L'a'));
}

TEST(Vector, OfStringsGrowsWithoutACopyOfEach) {
  static_assert(kIsRelocatable<std::pair<String, int>> && !kIsRelocatable<std::string>);
  Vector<std::pair<String, int>> v;
  v.push_back({String(L"the first"), 0});
  const wchar_t* const text = v[0].first.c_str();
  for (int i = 1; i < 100; ++i) v.push_back(v[static_cast<unsigned>(i) / 2]);
  EXPECT_EQ(v[0].first.c_str(), text);
  for (const auto& [string, number] : v) EXPECT_EQ(string, L"the first");
}

// Element whose nth copy throws, counting how many live.
struct Fragile {
  static inline int alive = 0, copiesLeft = 0;
  int value;
  explicit Fragile(int v) : value(v) { ++alive; }
  Fragile(const Fragile& other) : value(other.value) {
    if (copiesLeft-- == 0) throw std::string("no copy");
    ++alive;
  }
  Fragile& operator=(const Fragile&) = default;
  ~Fragile() { --alive; }
};

TEST(Vector, FailedPushBackLeavesTheOldBlock) {
  {
    Vector<Fragile> v;
    Fragile::copiesLeft = 100;
    for (int i = 0; i < 3; ++i) v.push_back(Fragile(i));  // full now
    const Fragile* block = v.begin();
    for (int failing = 0; failing < 4; ++failing) {
      Fragile::copiesLeft = failing;
      EXPECT_THROW(v.push_back(Fragile(9)), std::string) << failing;
      EXPECT_EQ(Fragile::alive, 3);
      EXPECT_EQ(v.size(), 3u);
      EXPECT_EQ(v.capacity(), 3u);
      EXPECT_EQ(block, v.begin());
    }
    Fragile::copiesLeft = 1;
    EXPECT_THROW(Vector<Fragile>{v}, std::string);
    EXPECT_EQ(Fragile::alive, 3);
  }
  EXPECT_EQ(Fragile::alive, 0);
}

}  // namespace
}  // namespace zt::fnd

#include "source/GuidMap.h"

#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <optional>
#include <random>
#include <vector>

#include "tests/support/FailingHeap.h"

namespace {

GUID Id(uint32_t n) { return {n, 0, 0, {}}; }

// Each step done to a std::map as well.
class Beside {
 public:
  void put(const GUID& id, int value) { m_map[id] = m_plain[id] = value; }
  void erase(const GUID& id) {
    auto found = m_map.find(id);
    ASSERT_EQ(found != m_map.end(), m_plain.count(id) == 1);
    if (found == m_map.end()) return;
    m_map.erase(found);
    m_plain.erase(id);
  }
  void clear() {
    m_map.clear();
    m_plain.clear();
  }
  void expectSame(const GUID& id) {
    auto found = m_map.find(id);
    auto plain = m_plain.find(id);
    ASSERT_EQ(found != m_map.end(), plain != m_plain.end()) << id.Data1;
    if (found == m_map.end()) return;
    EXPECT_TRUE(found->first == id);
    EXPECT_EQ(found->second, plain->second);
  }
  void expectSameOrder() {
    ASSERT_EQ(m_map.size(), m_plain.size());
    auto plain = m_plain.begin();
    for (const auto& [id, value] : m_map) {
      EXPECT_TRUE(id == plain->first);
      EXPECT_EQ(value, plain->second);
      ++plain;
    }
  }

 private:
  GuidMap<int> m_map;
  std::map<GUID, int> m_plain;
};

TEST(GuidMap, AnswersAsTheOrderedMapWhateverIsDone) {
  std::mt19937 random(1);
  for (int round = 0; round < 20; ++round) {
    Beside both;
    for (int step = 0; step < 3000; ++step) {
      const GUID id = {static_cast<uint32_t>(random() % 300),
                       0,
                       static_cast<uint16_t>(random() % 2),
                       {static_cast<unsigned char>(random() % 2)}};
      switch (random() % 16) {
        case 0:
          both.erase(id);
          break;
        case 1:
        case 2:
        case 3:
          both.put(id, step);
          break;
        default:
          both.expectSame(id);
      }
      if (step == 2000 && round % 4 == 0) both.clear();
    }
    both.expectSameOrder();
  }
}

TEST(GuidMap, FindsEachOfManyAndNoOther) {
  Beside both;
  for (uint32_t n = 0; n < 5000; ++n) {
    both.put(Id(n * 3), static_cast<int>(n));
    both.expectSame(Id(n));
  }
  for (uint32_t n = 0; n < 15000; ++n) both.expectSame(Id(n));
  both.expectSameOrder();
}

// The slot is made of bits 32 and up of a product: what differs in the half that is multiplied away
// shares one.
TEST(GuidMap, IdentifiersOfOneSlotAreAllFound) {
  constexpr uint64_t kOdd = 0x9E3779B97F4A7C15;
  Beside both;
  std::vector<GUID> ids;
  for (uint64_t n = 0; n < 500; ++n) {
    const uint64_t half[] = {n * kOdd, n};
    GUID id;
    memcpy(&id, half, sizeof id);
    ids.push_back(id);
    both.put(id, static_cast<int>(n));
    both.expectSame(ids[n / 2]);
  }
  for (const GUID& id : ids) both.expectSame(id);
  both.expectSame(Id(7));
  both.expectSameOrder();
}

TEST(GuidMap, WithoutMemoryForTheTableTheMapAnswers) {
  GuidMap<int> map;
  for (uint32_t n = 0; n < 100; ++n) map[Id(n)] = static_cast<int>(n);
  for (bool fails : {true, false}) {
    for (uint32_t n = 0; n < 200; ++n) {
      std::optional<vlt::test::FailAllocation> failure;
      if (fails) failure.emplace(1);
      auto found = map.find(Id(n));
      ASSERT_TRUE(!fails || failure->happened());
      failure.reset();
      ASSERT_EQ(found != map.end(), n < 100);
      if (n < 100) {
        EXPECT_EQ(found->second, static_cast<int>(n));
      }
    }
  }
}

}  // namespace

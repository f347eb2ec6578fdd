#include "ztini/Arena.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "tests/support/FailingAlloc.h"

namespace {

using ztini::Arena;

TEST(Arena, RecordsAreAlignedAndTextsAreWhole) {
  Arena arena;
  std::vector<char*> records, texts;
  for (int i = 0; i < 5000; ++i) {
    records.push_back(static_cast<char*>(arena.record(1 + static_cast<size_t>(i) % 50)));
    ASSERT_NE(records.back(), nullptr);
    ASSERT_EQ(reinterpret_cast<uintptr_t>(records.back()) % alignof(void*), 0u);
    memset(records.back(), 0x55, 1 + static_cast<size_t>(i) % 50);
    const std::string text(static_cast<size_t>(i) % 70, 'x');
    texts.push_back(arena.text(text.c_str(), text.size()));
    ASSERT_NE(texts.back(), nullptr);
  }
  for (size_t i = 0; i < texts.size(); ++i) {
    ASSERT_EQ(texts[i], std::string(i % 70, 'x')) << i;
    for (size_t at = 0; at < 1 + i % 50; ++at) ASSERT_EQ(records[i][at], 0x55) << i;
  }
}

TEST(Arena, OnePieceMayBeOfAnySize) {
  Arena arena;
  for (size_t size = 1; size < (size_t(4) << 20); size = size * 3 + 1) {
    const std::string text(size, 't');
    EXPECT_EQ(arena.text("small", 5), std::string("small"));
    char* copy = arena.text(text.c_str(), text.size());
    ASSERT_NE(copy, nullptr);
    EXPECT_TRUE(copy == text) << size;
    void* record = arena.record(size);
    ASSERT_NE(record, nullptr);
    memset(record, 1, size);
    EXPECT_TRUE(copy == text) << size;
  }
  EXPECT_EQ(arena.record(SIZE_MAX), nullptr);
  EXPECT_EQ(arena.record(SIZE_MAX - 64), nullptr);
}

TEST(Arena, WithoutMemoryItGivesNullAndStaysUsable) {
  Arena arena;
  {
    ztini::test::FailFromAllocation fail(1);
    EXPECT_EQ(arena.record(8), nullptr);
    EXPECT_EQ(arena.text("a", 1), nullptr);
    EXPECT_EQ(arena.record(100000), nullptr);
  }
  EXPECT_NE(arena.record(8), nullptr);
  ztini::test::FailFromAllocation fail(1);
  EXPECT_EQ(arena.text("within the block", 16), std::string("within the block"));
  EXPECT_EQ(arena.record(100000), nullptr);
  arena.clear();
  EXPECT_EQ(arena.text("a", 1), nullptr);
}

TEST(Arena, WhatWasExpectedLiesInOneBlock) {
  Arena arena;
  arena.expect(100000);
  ztini::test::FailFromAllocation fail(1);
  for (int i = 0; i < 100000 / 40; ++i) ASSERT_NE(arena.record(40), nullptr) << i;
  EXPECT_EQ(arena.record(40), nullptr);
}

TEST(Arena, WithoutMemoryForWhatIsExpectedBlocksGrow) {
  Arena arena;
  {
    ztini::test::FailOneAllocation fail(1);
    arena.expect(100000);
  }
  for (int i = 0; i < 100000 / 40; ++i) ASSERT_NE(arena.record(40), nullptr) << i;
}

TEST(Arena, ReservedRecordsNeedNoMemory) {
  Arena arena;
  EXPECT_TRUE(arena.reserve(200));
  {
    ztini::test::FailFromAllocation fail(1);
    EXPECT_NE(arena.record(40), nullptr);
    EXPECT_NE(arena.record(160), nullptr);
    arena.clear();
    EXPECT_FALSE(arena.reserve(200));
  }
  EXPECT_TRUE(arena.reserve(200));
}

}  // namespace

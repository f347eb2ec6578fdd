#include "ztini/List.h"

#include <gtest/gtest.h>

#include <memory>
#include <vector>

#include "tests/support/FailingAlloc.h"

namespace {

using ztini::test::FailFromAllocation;

struct DisposeList {
  void operator()(ztini_List list) const { ztini_ListDispose(list); }
};
using Owned = std::unique_ptr<ztini_ListRecord, DisposeList>;

Owned ListOf(const std::vector<int32_t>& items) {
  Owned list(ztini_ListNew(sizeof(int32_t)));
  for (int32_t item : items) EXPECT_EQ(ztini_ListInsertItem(list.get(), &item, 0), 1);
  return list;
}

std::vector<int32_t> Items(const Owned& list) {
  std::vector<int32_t> items;
  for (int32_t at = 1; at <= ztini_ListNumItems(list.get()); ++at) {
    items.push_back(*static_cast<int32_t*>(ztini_ListItem(list.get(), at)));
  }
  return items;
}

using Ints = std::vector<int32_t>;

TEST(List, NewListIsEmptyWithoutCapacity) {
  Owned list(ztini_ListNew(8));
  EXPECT_EQ(ztini_ListNumItems(list.get()), 0);
  EXPECT_EQ(list->capacity, 0u);
  EXPECT_EQ(list->itemSize, 8u);
  Owned huge(ztini_ListNew(UINT32_MAX));
  EXPECT_EQ(huge->itemSize, UINT32_MAX);
}

TEST(List, GetKnowsZeroAsLastAndMinusOneAsFirst) {
  Owned list = ListOf({10, 20, 30});
  const struct {
    int32_t position, expected;
  } rows[] = {{1, 10}, {2, 20}, {3, 30}, {0, 30}, {-1, 10}, {4, 777}, {5, 777}, {-2, 777}};
  for (const auto& row : rows) {
    int32_t out = 777;
    ztini_ListGetItem(list.get(), &out, row.position);
    EXPECT_EQ(out, row.expected) << row.position;
  }
}

TEST(List, InsertPlacesBeforeAtTheEndAndAtTheFront) {
  const struct {
    int32_t position, result;
    Ints expected;
  } rows[] = {
      {1, 1, {9, 10, 20, 30}}, {2, 1, {10, 9, 20, 30}}, {3, 1, {10, 20, 9, 30}},
      {4, 1, {10, 20, 30, 9}}, {0, 1, {10, 20, 30, 9}}, {-1, 1, {9, 10, 20, 30}},
      {5, 0, {10, 20, 30}},    {-2, 0, {10, 20, 30}},
  };
  for (const auto& row : rows) {
    Owned list = ListOf({10, 20, 30});
    const int32_t nine = 9;
    EXPECT_EQ(ztini_ListInsertItem(list.get(), &nine, row.position), row.result) << row.position;
    EXPECT_EQ(Items(list), row.expected) << row.position;
  }
}

TEST(List, SeveralItemsAreInsertedAtOnceAndANullSourceGivesZeros) {
  Owned list = ListOf({1, 2});
  const int32_t two[] = {8, 9};
  EXPECT_EQ(ztini_ListInsertItems(list.get(), two, 2, 2), 1);
  EXPECT_EQ(ztini_ListInsertItems(list.get(), nullptr, -1, 2), 1);
  EXPECT_EQ(Items(list), (Ints{0, 0, 1, 8, 9, 2}));
}

TEST(List, RemoveTakesTheItemOut) {
  const struct {
    int32_t position, out;
    Ints expected;
  } rows[] = {
      {1, 10, {20, 30, 40}},      {2, 20, {10, 30, 40}},       {3, 30, {10, 20, 40}},
      {4, 40, {10, 20, 30}},      {0, 40, {10, 20, 30}},       {-1, 10, {20, 30, 40}},
      {5, 777, {10, 20, 30, 40}}, {-2, 777, {10, 20, 30, 40}},
  };
  for (const auto& row : rows) {
    Owned list = ListOf({10, 20, 30, 40});
    int32_t out = 777;
    ztini_ListRemoveItem(list.get(), &out, row.position);
    EXPECT_EQ(out, row.out) << row.position;
    EXPECT_EQ(Items(list), row.expected) << row.position;
  }
}

TEST(List, FindStartsAtTheGivenPosition) {
  Owned list = ListOf({5, 6, 5, 7});
  const struct {
    int32_t item, start, expected;
  } rows[] = {{5, 1, 1}, {5, 2, 3}, {5, -1, 1}, {7, 0, 4},
              {5, 0, 0}, {8, 1, 0}, {5, 5, 0},  {5, 9, 0}};
  for (const auto& row : rows) {
    EXPECT_EQ(ztini_ListFindItem(list.get(), &row.item, row.start, nullptr), row.expected)
        << row.item << " from " << row.start;
  }
}

TEST(List, FindUsesTheCompareFunction) {
  Owned list = ListOf({15, 26, 37});
  const int32_t six = 6;
  const auto sameUnits = [](const void* left, const void* right) {
    return *static_cast<const int32_t*>(left) % 10 - *static_cast<const int32_t*>(right) % 10;
  };
  EXPECT_EQ(ztini_ListFindItem(list.get(), &six, 1, sameUnits), 2);
}

TEST(List, NullArgumentsAndEmptyListsDoNothing) {
  int32_t item = 3;
  EXPECT_EQ(ztini_ListInsertItem(nullptr, &item, 1), 0);
  EXPECT_EQ(ztini_ListFindItem(nullptr, &item, 1, nullptr), 0);
  EXPECT_EQ(ztini_ListNumItems(nullptr), 0);
  EXPECT_EQ(ztini_ListItem(nullptr, 1), nullptr);
  ztini_ListGetItem(nullptr, &item, 1);
  ztini_ListRemoveItem(nullptr, &item, 1);
  Owned list = ListOf({});
  for (int32_t position : {0, -1, 1}) {
    ztini_ListGetItem(list.get(), &item, position);
    ztini_ListRemoveItem(list.get(), &item, position);
    EXPECT_EQ(ztini_ListFindItem(list.get(), &item, position, nullptr), 0);
  }
  EXPECT_EQ(item, 3);
  EXPECT_EQ(ztini_ListFindItem(list.get(), nullptr, 1, nullptr), 0);
  EXPECT_EQ(ztini_ListNew(0), nullptr);
}

TEST(List, FailedInsertLeavesTheListAsItWas) {
  Owned list = ListOf({1, 2, 3, 4});
  const int32_t nine = 9;
  {
    FailFromAllocation fail(1);
    EXPECT_EQ(ztini_ListInsertItems(list.get(), &nine, 2, 1), 0);
    EXPECT_EQ(ztini_ListNew(4), nullptr);
  }
  EXPECT_EQ(Items(list), (Ints{1, 2, 3, 4}));
}

TEST(List, ReservedRoomMakesInsertIndependentOfMemory) {
  Owned list = ListOf({1});
  EXPECT_EQ(ztini_ListReserve(list.get(), 1000), 1);
  FailFromAllocation fail(1);
  for (int32_t item = 2; item <= 1001; ++item) {
    ASSERT_EQ(ztini_ListInsertItem(list.get(), &item, 0), 1);
  }
}

TEST(List, OneItemOfAPointersSizeNeedsNoBlock) {
  Owned list(ztini_ListNew(sizeof(void*))), wide(ztini_ListNew(sizeof(void*) + 1));
  const char* texts[] = {"a", "b", "c"};
  {
    FailFromAllocation fail(1);
    for (int round = 0; round < 3; ++round) {
      EXPECT_EQ(ztini_ListInsertItem(list.get(), &texts[0], 0), 1);
      EXPECT_EQ(list->capacity, 0u);
      EXPECT_EQ(ztini_ListFindItem(list.get(), &texts[0], 1, nullptr), 1);
      const char* out = nullptr;
      ztini_ListRemoveItem(list.get(), &out, 1);
      EXPECT_EQ(out, texts[0]);
      EXPECT_EQ(ztini_ListNumItems(list.get()), 0);
    }
    EXPECT_EQ(ztini_ListInsertItem(list.get(), &texts[1], 0), 1);
    EXPECT_EQ(ztini_ListInsertItem(list.get(), &texts[2], 0), 0);
    EXPECT_EQ(ztini_ListReserve(wide.get(), 1), 0);
  }
  EXPECT_EQ(ztini_ListInsertItem(list.get(), &texts[2], 0), 1);
  EXPECT_EQ(ztini_ListInsertItem(list.get(), &texts[0], -1), 1);
  for (int32_t at = 1; at <= 3; ++at) {
    EXPECT_EQ(*static_cast<const char**>(ztini_ListItem(list.get(), at)), texts[at - 1]);
  }
}

TEST(List, ImpossibleSizesAreRefused) {
  Owned list(ztini_ListNew(UINT32_MAX));
  EXPECT_EQ(ztini_ListReserve(list.get(), UINT32_MAX), 0);
  EXPECT_EQ(ztini_ListInsertItems(list.get(), nullptr, 0, UINT32_MAX), 0);
}

TEST(List, MixedUseAgreesWithAVector) {
  Owned list = ListOf({});
  Ints model;
  uint32_t random = 1;
  for (int32_t step = 0; step < 20000; ++step) {
    random = random * 1664525u + 1013904223u;
    const int32_t count = static_cast<int32_t>(model.size());
    const int32_t at = static_cast<int32_t>((random >> 16) % static_cast<uint32_t>(count + 1));
    if (random >> 31 || model.empty()) {
      ASSERT_EQ(ztini_ListInsertItem(list.get(), &step, at + 1), 1);
      model.insert(model.begin() + at, step);
    } else {
      const int32_t victim = at % count;
      ztini_ListRemoveItem(list.get(), nullptr, victim + 1);
      model.erase(model.begin() + victim);
    }
  }
  EXPECT_EQ(Items(list), model);
}

TEST(List, ALentBlockIsChangedInPlaceAndLeftWhenTheListGrows) {
  int32_t block[] = {1, 2, 3};
  Owned list(ztini_ListNew(sizeof block[0]));
  ztini_ListLend(list.get(), block, 3);
  EXPECT_EQ(Items(list), (Ints{1, 2, 3}));
  const int32_t nine = 9;
  ztini_ListRemoveItem(list.get(), nullptr, 1);
  EXPECT_EQ(ztini_ListInsertItem(list.get(), &nine, 2), 1);
  EXPECT_EQ(Items(list), (Ints{2, 9, 3}));
  EXPECT_EQ(block[1], 9);
  {
    FailFromAllocation fail(1);
    EXPECT_EQ(ztini_ListInsertItem(list.get(), &nine, -1), 0);
  }
  EXPECT_EQ(Items(list), (Ints{2, 9, 3}));
  EXPECT_EQ(ztini_ListInsertItem(list.get(), &nine, -1), 1);
  block[0] = block[1] = block[2] = 0;
  EXPECT_EQ(Items(list), (Ints{9, 2, 9, 3}));
  // Freed by the list are its own blocks only: others are no malloc blocks.
  ztini_ListLend(list.get(), block, 3);
  ztini_ListClear(list.get());
  EXPECT_EQ(ztini_ListNumItems(list.get()), 0);
  ztini_ListLend(list.get(), block, 2);
  EXPECT_EQ(Items(list), (Ints{0, 0}));
}

}  // namespace

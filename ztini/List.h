#pragma once

#include <cstdint>

// A growable array of items of one size, copied in and out as bytes.
//
// Positions are 1-based. Beside 1 to count:
//   position   get, remove   find (start)         insert
//   0          last item     start at the last    at the end
//   -1         first item    start at the first   at the front
//   count+1    nothing       nothing              at the end
// Any other position, and a null list, does nothing (get, remove) or gives 0 (find, insert).
//
// Growth is geometric; removal moves the shorter side, so that emptying a list from either end is
// linear. A list without a block (capacity 0) still holds one item that is no larger than a
// pointer.
struct ztini_ListRecord {
  union {
    char* block = nullptr;
    char only[sizeof(char*)];  // the one item of a list without a block
  };
  uint32_t itemSize = 0;
  uint32_t capacity : 31 = 0;
  // The block is another owner's; a larger one is the list's own.
  uint32_t blockIsLent : 1 = 0;
  uint32_t first = 0;  // place of item 1 in the block
  uint32_t count = 0;
};
using ztini_List = ztini_ListRecord*;

// 0 when the items are equal.
using ztini_ListCompareFunction = int (*)(const void* left, const void* right);

// An empty list; null when memory runs out or the size is 0. Free with ztini_ListDispose.
ztini_List ztini_ListNew(uint32_t itemSize);
void ztini_ListDispose(ztini_List list);

// Fills an empty list with `count` items, at least one, in a block that outlives the list and stays
// the caller's. The list changes the block as its own, and leaves it when it grows.
void ztini_ListLend(ztini_List list, void* block, uint32_t count);

// Frees the items of a record that its owner holds by value; it is empty afterwards.
void ztini_ListClear(ztini_List list);

int32_t ztini_ListNumItems(const ztini_ListRecord* list);

// Makes space for so many more items, so that inserting them cannot fail. 1, or 0 out of memory.
int32_t ztini_ListReserve(ztini_List list, uint32_t extra);

// Copies items from `source`, which must not lie in the list; a null source gives zero-filled
// items. 1, or 0 with the list unchanged.
int32_t ztini_ListInsertItem(ztini_List list, const void* source, int32_t position);
int32_t ztini_ListInsertItems(ztini_List list, const void* source, int32_t position,
                              uint32_t number);

// Copies the item out; `out` stays as it is when there is none.
void ztini_ListGetItem(const ztini_ListRecord* list, void* out, int32_t position);

// The item in place, null when there is none; valid until the next insert or remove.
void* ztini_ListItem(const ztini_ListRecord* list, int32_t position);

// Removes the item, and copies it to `out` if that is not null.
void ztini_ListRemoveItem(ztini_List list, void* out, int32_t position);

// Position of the first item equal to `item` at or after `start`, or 0. A null `compare` compares
// the bytes.
int32_t ztini_ListFindItem(const ztini_ListRecord* list, const void* item, int32_t start,
                           ztini_ListCompareFunction compare);

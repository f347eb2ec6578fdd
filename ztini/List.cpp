// A block with a gap at its front: item 1 lies at `first`, so that removing from either end moves
// nothing. The gap is taken back when a reservation needs it. One item that is no larger than a
// pointer lies in the record itself, in the place of the block's address.
#include "ztini/List.h"

#include <climits>
#include <cstring>

#include "ztini/Alloc.h"

namespace {

constexpr uint32_t kMostItems = INT32_MAX - 1;  // count + 1 is still a position
constexpr uint32_t kFirstCapacity = 3;  // three pointers fill the smallest malloc block but one

// How many bytes MemBlockCompare looks at: a compare function receives the two items only. Of each
// thread, because documents of different threads share nothing else.
thread_local size_t gListMemBlockCompareSize = 0;

int MemBlockCompare(const void* left, const void* right) {
  return memcmp(left, right, gListMemBlockCompareSize);
}

char* Place(const ztini_ListRecord* list, uint32_t index) {
  if (!list->capacity) return const_cast<char*>(list->only);
  return list->block + static_cast<size_t>(list->first + index) * list->itemSize;
}

void MoveItems(const ztini_ListRecord* list, char* to, const char* from, uint32_t number) {
  if (number) memmove(to, from, static_cast<size_t>(number) * list->itemSize);
}

// The position of an existing item as a 1-based one, or 0.
int32_t ExistingPosition(const ztini_ListRecord* list, int32_t position) {
  if (!list || !list->count) return 0;
  const int32_t count = static_cast<int32_t>(list->count);
  if (position == 0) return count;
  if (position == -1) return 1;
  return position >= 1 && position <= count ? position : 0;
}

int32_t InsertPosition(const ztini_ListRecord* list, int32_t position) {
  const int32_t end = static_cast<int32_t>(list->count) + 1;
  if (position == 0) return end;
  if (position == -1) return 1;
  return position >= 1 && position <= end ? position : 0;
}

void MoveToFront(ztini_List list) {
  if (list->first) MoveItems(list, list->block, Place(list, 0), list->count);
  list->first = 0;
}

bool Grow(ztini_List list, uint32_t needed) {
  // By a quarter: most lists of a large document are short, and what they leave free adds up.
  uint64_t capacity = list->capacity + static_cast<uint64_t>(list->capacity) / 4 + 1;
  if (capacity < kFirstCapacity) capacity = kFirstCapacity;
  if (capacity > kMostItems) capacity = kMostItems;
  if (capacity < needed) capacity = needed;
  // On 32 bits, where a count that fits may still be too many bytes.
  if (capacity > SIZE_MAX / list->itemSize) return false;
  const size_t bytes = static_cast<size_t>(capacity) * list->itemSize;
  const bool ownsBlock = list->capacity && !list->blockIsLent;
  void* block = ztini::Reallocate(ownsBlock ? list->block : nullptr, bytes);
  if (!block) return false;
  // Before `block` is set, which lies over the one item.
  if (!ownsBlock && list->count)
    memcpy(block, Place(list, 0), size_t(list->count) * list->itemSize);
  list->block = static_cast<char*>(block);
  list->blockIsLent = 0;
  list->capacity = static_cast<uint32_t>(capacity);
  return true;
}

}  // namespace

ztini_List ztini_ListNew(uint32_t itemSize) {
  if (!itemSize) return nullptr;
  ztini_List list = ztini::New<ztini_ListRecord>();
  if (list) list->itemSize = itemSize;
  return list;
}

void ztini_ListDispose(ztini_List list) {
  if (!list) return;
  ztini_ListClear(list);
  ztini::Delete(list);
}

void ztini_ListClear(ztini_List list) {
  if (!list) return;
  if (list->capacity && !list->blockIsLent) free(list->block);
  list->block = nullptr;
  list->blockIsLent = 0;
  list->capacity = list->first = list->count = 0;
}

void ztini_ListLend(ztini_List list, void* block, uint32_t count) {
  ztini_ListClear(list);
  list->block = static_cast<char*>(block);
  list->blockIsLent = 1;
  list->capacity = list->count = count;
}

int32_t ztini_ListNumItems(const ztini_ListRecord* list) {
  return list ? static_cast<int32_t>(list->count) : 0;
}

int32_t ztini_ListReserve(ztini_List list, uint32_t extra) {
  if (!list || extra > kMostItems - list->count) return 0;
  const uint32_t needed = list->count + extra;
  if (list->first + needed <= list->capacity) return 1;
  if (!list->capacity && needed <= 1 && list->itemSize <= sizeof list->only) return 1;
  // Half the block free at the front pays for the move; less would move on every few inserts.
  if (needed <= list->capacity && list->first >= list->capacity / 2) {
    MoveToFront(list);
    return 1;
  }
  MoveToFront(list);
  return Grow(list, needed) ? 1 : 0;
}

int32_t ztini_ListInsertItem(ztini_List list, const void* source, int32_t position) {
  return ztini_ListInsertItems(list, source, position, 1);
}

int32_t ztini_ListInsertItems(ztini_List list, const void* source, int32_t position,
                              uint32_t number) {
  // The position is checked before memory is asked for, and both before anything moves.
  const int32_t at = list ? InsertPosition(list, position) : 0;
  if (!at || !ztini_ListReserve(list, number)) return 0;
  const uint32_t index = static_cast<uint32_t>(at) - 1;
  if (!number) return 1;
  MoveItems(list, Place(list, index + number), Place(list, index), list->count - index);
  const size_t bytes = static_cast<size_t>(number) * list->itemSize;
  if (source) {
    memcpy(Place(list, index), source, bytes);
  } else {
    memset(Place(list, index), 0, bytes);
  }
  list->count += number;
  return 1;
}

void* ztini_ListItem(const ztini_ListRecord* list, int32_t position) {
  const int32_t at = ExistingPosition(list, position);
  return at ? Place(list, static_cast<uint32_t>(at) - 1) : nullptr;
}

void ztini_ListGetItem(const ztini_ListRecord* list, void* out, int32_t position) {
  const void* item = ztini_ListItem(list, position);
  if (item && out) memcpy(out, item, list->itemSize);
}

void ztini_ListRemoveItem(ztini_List list, void* out, int32_t position) {
  const int32_t at = ExistingPosition(list, position);
  if (!at) return;
  const uint32_t index = static_cast<uint32_t>(at) - 1;
  const uint32_t after = list->count - index - 1;
  if (out) memcpy(out, Place(list, index), list->itemSize);
  if (index < after) {
    MoveItems(list, Place(list, 1), Place(list, 0), index);
    ++list->first;
  } else {
    MoveItems(list, Place(list, index), Place(list, index + 1), after);
  }
  if (!--list->count) list->first = 0;
}

int32_t ztini_ListFindItem(const ztini_ListRecord* list, const void* item, int32_t start,
                           ztini_ListCompareFunction compare) {
  const int32_t begin = ExistingPosition(list, start);
  if (!begin || !item) return 0;
  if (!compare) {
    // Before each search, as lists of other sizes may have been searched since.
    gListMemBlockCompareSize = list->itemSize;
    compare = MemBlockCompare;
  }
  for (int32_t at = begin; at <= static_cast<int32_t>(list->count); ++at) {
    if (compare(item, Place(list, static_cast<uint32_t>(at) - 1)) == 0) return at;
  }
  return 0;
}

#pragma once

#include <cstdint>

#include "ztini/List.h"
#include "ztini/NameFold.h"
#include "ztini/NameIndex.h"

namespace ztini {

enum class NameMatch { IgnoreCase, Exact };

// Named records in order, with look-up by name.
//
// Holds pointers and owns none of the records. Short lists are scanned; longer ones get an index,
// built at the first look-up and kept up from then on. If there is no memory for the index, look-up
// scans, with the same results. Records are only ever appended, so their sequence numbers ascend,
// and a record's position is found by bisection.
class NameList {
 public:
  // The fold is shared by all lists of a document and outlives them.
  explicit NameList(NameFold* fold);
  ~NameList() { ztini_ListClear(&m_list); }
  NameList(const NameList&) = delete;
  NameList& operator=(const NameList&) = delete;

  int32_t count() const { return static_cast<int32_t>(m_list.count); }

  // By position as in List.h; null when there is none.
  NameNode* at(int32_t position) const;

  // The records as an array of count() pointers; valid until the list changes.
  NameNode** nodes() const;

  // First in order with this name, or null.
  NameNode* find(const char* name, NameMatch match);

  // 1-based position of a record of the list.
  int32_t positionOf(const NameNode* node) const;

  // Makes sure that the next append needs no memory. False without memory.
  bool reserveOne() { return ztini_ListReserve(&m_list, 1) != 0; }

  // Adds at the end; room must have been reserved.
  void append(NameNode* node);

  // Takes a record of the list out; it is the caller's afterwards.
  void remove(NameNode* node);

  // Gives a record of the list another name, which it takes over; the old one is freed.
  void rename(NameNode* node, char* name);

  // After the array was compacted in place: keeps the first `count` and looks at all names anew.
  void keepFirst(int32_t count);

 private:
  bool useIndex();
  bool indexIsCurrent() const { return m_index.built() && m_generation == m_fold->generation(); }
  void build();
  void addToIndex(NameNode* node);
  NameNode* scan(const char* name, NameMatch match) const;

  ztini_ListRecord m_list;
  NameIndex m_index;
  NameFold* m_fold;
  uint64_t m_nextSequence = 0;
  uint32_t m_generation = 0;  // of the fold when the index was built
  int32_t m_buildFrom;        // no index below this count
};

}  // namespace ztini

#pragma once

#include <cstdint>

#include "ztini/List.h"
#include "ztini/NameFold.h"
#include "ztini/NameIndex.h"

namespace ztini {

enum class NameMatch { IgnoreCase, Exact };

// Whether the caller has just refreshed the fold of the list: one call on a document then asks for
// the locale once.
enum class FoldState { Unknown, Fresh };

// Named records in order, with look-up by name.
//
// Holds pointers and owns none of the records. Short lists are scanned; longer ones get an index,
// built at the first look-up and kept up from then on. Without memory for the index, find() scans,
// with the same results, and seek() reports it: whoever asks once per line of a file must not pay
// for the whole list each time. Records are only ever appended, so their sequence numbers ascend,
// and a record's position is found by bisection.
class NameList {
 public:
  // The fold is shared by all lists of a document and outlives them.
  explicit NameList(NameFold* fold);
  ~NameList();
  NameList(const NameList&) = delete;
  NameList& operator=(const NameList&) = delete;

  int32_t count() const { return static_cast<int32_t>(m_list.count); }

  // By position as in List.h; null when there is none.
  NameNode* at(int32_t position) const;

  // The records as an array of count() pointers; valid until the list changes.
  NameNode** nodes() const;

  // First in order with this name, or null. Takes time linear in count() while there is no memory
  // for the index of a long list; each call tries to build it.
  // `hash`: of the name under a fresh fold, if the caller knows it.
  NameNode* find(const char* name, NameMatch match, FoldState fold = FoldState::Unknown,
                 NameHash hash = {});

  // As find(), into `found`, but never scans a long list: false, with null, without memory for its
  // index. *hash, if asked for, is set where the index was asked.
  bool seek(const char* name, NameMatch match, NameNode** found,
            FoldState fold = FoldState::Unknown, NameHash* hash = nullptr);

  // Whether find() compares the names one by one.
  bool isScanned() const { return !m_index && count() < kIndexFrom; }

  // Whether the index knows that no other record has the name of this one of the list.
  bool isKnownAsOnlyOne(const NameNode* node) const { return indexIsCurrent() && !node->twin; }

  // 1-based position of a record of the list.
  int32_t positionOf(const NameNode* node) const;

  // Makes sure that the next `records` appends need no memory. False without memory.
  bool reserve(uint32_t records) {
    return spaceAtEnd() >= records || ztini_ListReserve(&m_list, records) != 0;
  }

  // Adds at the end; space must have been reserved. `hash`: of its name, where seek() has given it.
  void append(NameNode* node, NameHash hash = {}) {
    if (m_index || spaceAtEnd() == 0 || !m_list.count) return appendAnywhere(node, hash);
    NameNode** end = reinterpret_cast<NameNode**>(m_list.block) + m_list.first + m_list.count;
    const uint32_t last = end[-1]->sequence;
    if (last + 1 >= NameIndex::kNoSequence) return appendAnywhere(node, hash);
    node->sequence = last + 1;
    *end = node;
    ++m_list.count;
  }

  // The records of an empty list, as an array that outlives the list and stays the caller's.
  void lend(NameNode** nodes, uint32_t count);

  // Whether nothing is lost with an object that is not destroyed.
  bool ownsNoBlock() const { return !m_index && (!m_list.capacity || m_list.blockIsLent); }

  // Takes a record of the list out; it is the caller's afterwards.
  void remove(NameNode* node);

  // Gives a record of the list another name, a malloc block that it takes over; the old one is
  // freed if it is one, too.
  void rename(NameNode* node, char* name);

  // After the array was compacted in place: keeps the first `count` and drops the index, as any
  // name may have changed.
  void keepFirst(int32_t count);

 private:
  enum class Way { Scan, Index, OutOfMemory };

  uint32_t spaceAtEnd() const {
    return m_list.capacity ? m_list.capacity - m_list.first - m_list.count : 0;
  }
  void appendAnywhere(NameNode* node, NameHash hash);

  // Below this a scan is as quick as the hash, and most sections have fewer items.
  static constexpr int32_t kIndexFrom = 16;

  Way wayToFind(FoldState fold);
  bool indexIsCurrent() const { return m_index && m_index->generation() == m_fold->generation(); }
  bool build();
  void dropIndex();
  NodesInOrder inOrder() const { return {nodes(), m_list.count}; }
  uint32_t nextSequence();
  NameNode* scan(const char* name, NameMatch match) const;
  NameNode* findInIndex(const char* name, NameMatch match, NameHash hash) const;

  ztini_ListRecord m_list;
  NameIndex* m_index = nullptr;  // null: none; otherwise it is built
  NameFold* m_fold;
};

// Gives the record another name, a malloc block; the old one is freed if it is one, too. Of a
// record of a list only when the list's keepFirst() follows.
void ReplaceName(NameNode* node, char* name);

}  // namespace ztini

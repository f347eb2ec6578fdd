#pragma once

#include <cstddef>
#include <cstdint>

#include "ztini/NameFold.h"

namespace ztini {

// What sections and items have in common: a name, and a place among their like.
struct NameNode {
  char* name = nullptr;          // owned by the record
  uint64_t sequence = 0;         // grows along the list; set by NameList
  NameNode* nextSame = nullptr;  // of the index: the next in order with the same name
  NameNode* prevSame = nullptr;  // the one before; of the first, the last
};

// Hash table from name to the chain of nodes that have it, in list order.
//
// Open addressing, one slot a name: any number of equal names takes one slot, and appending to
// their chain is constant. Names are the same here after folding and trimming, which is never
// narrower than the engine's comparison; callers confirm. The table holds only for one generation
// of the fold. Never throws: without memory it empties itself and its owner scans instead.
class NameIndex {
 public:
  NameIndex() = default;
  ~NameIndex() { clear(); }
  NameIndex(const NameIndex&) = delete;
  NameIndex& operator=(const NameIndex&) = delete;

  bool built() const { return m_slots != nullptr; }

  // Forgets all nodes and frees the table; the nodes are not touched.
  void clear();

  // Makes an empty table with room for so many names. False without memory.
  bool create(size_t names);

  // Adds a node at its place in the order. False without memory; the index is then cleared.
  bool insert(const NameFold& fold, NameNode* node);

  // Takes out a node that is in the index, before its name changes or goes.
  void remove(const NameFold& fold, NameNode* node);

  // First in order of the nodes with this name, or null.
  NameNode* chain(const NameFold& fold, const char* name) const;

 private:
  struct Slot {
    NameNode* head;  // null: free
    uint32_t hash;
  };

  size_t find(const NameFold& fold, const char* name, uint32_t hash) const;
  bool grow();
  void freeSlot(size_t at);

  Slot* m_slots = nullptr;
  size_t m_mask = 0;  // number of slots, a power of two, less 1
  size_t m_used = 0;
};

}  // namespace ztini

#pragma once

#include <cstddef>
#include <cstdint>

#include "ztini/NameFold.h"
#include "ztini/NameHash.h"

namespace ztini {

// What sections and items have in common: a name, and a place among their like. A file of 64 MiB
// makes millions of them, so every byte counts.
struct NameNode {
  char* name = nullptr;
  uint32_t sequence = 0;  // ascends along the list; set by NameList
  // Of the index: the node's record among equal names, 0 while it is the only one. A field of bits,
  // so that it shares a word with what the owner of the node has to know.
  uint32_t twin : 29 = 0;
  uint32_t nameInArena : 1 = 0;   // else a malloc block of the record
  uint32_t valueInArena : 1 = 0;  // the same of an item's value, or all that a section's items have
  uint32_t recordInArena : 1 = 0;  // the same of the record itself
};

// The nodes of a list as the index sees them: sequence numbers ascend, perhaps with gaps.
struct NodesInOrder {
  NameNode** begin = nullptr;
  uint32_t count = 0;

  // Place of the node with this number, or `count`. Constant time before the first gap, else by
  // bisection.
  uint32_t placeOf(uint32_t sequence) const {
    if (!count || sequence < begin[0]->sequence) return count;
    // Every gap before the node moves it towards the front, nothing moves it the other way. Without
    // gaps the number is the place.
    const uint32_t last = sequence - begin[0]->sequence;
    return last < count && begin[last]->sequence == sequence ? last : search(sequence, last);
  }

  // The node with this number, which is in the list.
  NameNode* bySequence(uint32_t sequence) const { return begin[placeOf(sequence)]; }

 private:
  uint32_t search(uint32_t sequence, uint32_t last) const;
};

// The hash of a name under a fold, or nothing: whoever asks for a name and then adds it hashes it
// once.
struct NameHash {
  NameHash() = default;
  NameHash(const NameFold& fold, TrimmedName name);

  uint32_t value = 0;
  bool isKnown = false;
};

// Hash table from name to the chain of nodes that have it, in list order.
//
// Open addressing, one slot of 8 bytes a name: any number of equal names takes one slot, and
// appending to their chain is constant. Slots and chains name nodes by their sequence numbers, so
// every call gets the nodes as well; those in the index must be among them, with the numbers that
// they had when they were inserted. Names are the same here after folding and trimming, which is
// never narrower than the engine's comparison; callers confirm. The table holds only for one
// generation of the fold. Never throws: without memory it empties itself.
class NameIndex {
 public:
  // No node has this sequence number.
  static constexpr uint32_t kNoSequence = UINT32_MAX;

  NameIndex() = default;
  ~NameIndex() { clear(); }
  NameIndex(const NameIndex&) = delete;
  NameIndex& operator=(const NameIndex&) = delete;

  bool built() const { return m_slots != nullptr; }

  // The fold's generation when the table was made.
  uint32_t generation() const { return m_generation; }

  // Forgets all nodes and frees the table; the nodes are not touched.
  void clear();

  // Makes an empty table with space for so many names. False without memory.
  bool create(const NameFold& fold, size_t names);

  // Adds a node at its place in the order. False without memory; the index is then cleared. `hash`: of
  // its name, if the caller knows it.
  bool insert(const NameFold& fold, NodesInOrder nodes, NameNode* node, NameHash hash = {});

  // Takes out a node that is in the index, before its name changes or goes.
  void remove(const NameFold& fold, NodesInOrder nodes, NameNode* node);

  // First in order of the nodes with this name, or null.
  struct Chain {
    NameNode* first;
    bool isExact;  // its name is the same byte by byte
  };
  Chain chain(const NameFold& fold, NodesInOrder nodes, const char* name, NameHash hash = {}) const;

  // The next node in order with the same name, or null.
  NameNode* nextSame(NodesInOrder nodes, const NameNode* node) const;

 private:
  struct Slot {
    uint32_t hash;
    uint32_t head;  // kNoSequence: free
  };
  // A node among others of its name. Chains are rings backwards: the first one's `prev` is the
  // last.
  struct Twin {
    uint32_t sequence;
    uint32_t next;  // 0 after the last; of an unused record, the next unused one
    uint32_t prev;
  };

  // Of a name: its slot with its chain, or the free one where it belongs with none.
  struct Place {
    size_t slot;
    Chain chain;
  };

  Place find(const NameFold& fold, NodesInOrder nodes, const char* name, uint32_t hash) const;
  bool allocateSlots(size_t slots);
  bool full() const { return (m_used + 1) * 8 > (m_mask + 1) * 7; }
  bool grow();
  void freeSlot(size_t at);
  bool addTwin(Slot* slot, NodesInOrder nodes, NameNode* node);
  bool reserveTwins();
  void giveTwin(NameNode* node);
  void linkInOrder(Slot* slot, uint32_t first, uint32_t added);
  void unlink(Slot* slot, uint32_t first, uint32_t gone);

  Slot* m_slots = nullptr;
  size_t m_mask = 0;  // number of slots, a power of two, less 1
  size_t m_used = 0;
  Twin* m_twins = nullptr;  // from 1; 0 is no twin
  uint32_t m_twinCapacity = 0;
  uint32_t m_twinEnd = 1;     // after the last one ever used
  uint32_t m_unusedTwin = 0;  // first of the unused ones before that
  uint32_t m_generation = 0;
};

}  // namespace ztini

// Open addressing with linear probing. A slot keeps 32 bits of the hash and the sequence number of
// the first node with its name, so that most probes are decided without touching a node. Nodes of
// one name are linked in rings of "twins", which exist only for names that occur more than once:
// usual files have none.
//
// Everything is named by number and not by pointer: half the size, and the list may move its array.
#include "ztini/NameIndex.h"

#include <algorithm>
#include <cstring>

#include "ztini/Alloc.h"

namespace ztini {
namespace {

constexpr size_t kFewestSlots = 16;
constexpr uint32_t kFirstTwins = 8;
constexpr uint32_t kMostTwins = (uint32_t(1) << 29) - 1;  // NameNode::twin

uint32_t ShortHash(const NameFold& fold, const char* name) {
  return static_cast<uint32_t>(HashName(fold, Trimmed(fold, name)));
}

uint32_t ShortHash(const NameFold& fold, const char* name, NameHash known) {
  return known.isKnown ? known.value : ShortHash(fold, name);
}

}  // namespace

NameHash::NameHash(const NameFold& fold, TrimmedName name)
    : value(static_cast<uint32_t>(HashName(fold, name))), isKnown(true) {}

// Its place is `last` or before.
uint32_t NodesInOrder::search(uint32_t sequence, uint32_t last) const {
  NameNode** end = begin + std::min(last, count);
  NameNode** at = std::lower_bound(begin, end, sequence, [](const NameNode* node, uint32_t wanted) {
    return node->sequence < wanted;
  });
  return at < end && (*at)->sequence == sequence ? static_cast<uint32_t>(at - begin) : count;
}

void NameIndex::clear() {
  free(m_slots);
  free(m_twins);
  m_slots = nullptr;
  m_twins = nullptr;
  m_mask = m_used = 0;
  m_twinCapacity = m_unusedTwin = 0;
  m_twinEnd = 1;
}

bool NameIndex::create(const NameFold& fold, size_t names) {
  clear();
  size_t slots = kFewestSlots;
  // Three quarters full at most when it is made, seven eighths before it grows.
  while (slots - slots / 4 < names) {
    if (slots > SIZE_MAX / 2) return false;
    slots *= 2;
  }
  m_generation = fold.generation();
  return allocateSlots(slots);
}

bool NameIndex::allocateSlots(size_t slots) {
  if (slots > SIZE_MAX / sizeof(Slot)) return false;
  m_slots = static_cast<Slot*>(Allocate(slots * sizeof(Slot)));
  if (!m_slots) return false;
  // All ones: every head is kNoSequence.
  memset(m_slots, 0xff, slots * sizeof(Slot));
  m_mask = slots - 1;
  return true;
}

bool NameIndex::grow() {
  Slot* old = m_slots;
  const size_t slots = m_mask + 1;
  if (!allocateSlots(slots * 2)) {
    m_slots = old;
    return false;
  }
  for (size_t i = 0; i < slots; ++i) {
    if (old[i].head == kNoSequence) continue;
    size_t at = old[i].hash & m_mask;
    while (m_slots[at].head != kNoSequence) at = (at + 1) & m_mask;
    // The hash is in the slot, so that no name is read again.
    m_slots[at] = old[i];
  }
  free(old);
  return true;
}

// In line: every look-up comes here.
inline NameIndex::Place NameIndex::find(const NameFold& fold, NodesInOrder nodes, const char* name,
                                        uint32_t hash) const {
  size_t at = hash & m_mask;
  for (; m_slots[at].head != kNoSequence; at = (at + 1) & m_mask) {
    const Slot& slot = m_slots[at];
    if (slot.hash != hash) continue;
    // The first node has the name of its whole chain.
    NameNode* first = nodes.bySequence(slot.head);
    const bool isExact = strcmp(first->name, name) == 0;
    if (isExact || SameFoldedName(fold, first->name, name)) return {at, {first, isExact}};
  }
  return {at, {nullptr, false}};
}

bool NameIndex::insert(const NameFold& fold, NodesInOrder nodes, NameNode* node, NameHash known) {
  if (full() && !grow()) {
    clear();
    return false;
  }
  node->twin = 0;
  const uint32_t hash = ShortHash(fold, node->name, known);
  Slot* slot = &m_slots[find(fold, nodes, node->name, hash).slot];
  if (slot->head == kNoSequence) {
    *slot = {hash, node->sequence};
    ++m_used;
    return true;
  }
  if (addTwin(slot, nodes, node)) return true;
  clear();
  return false;
}

bool NameIndex::addTwin(Slot* slot, NodesInOrder nodes, NameNode* node) {
  if (!reserveTwins()) return false;
  NameNode* first = nodes.bySequence(slot->head);
  if (!first->twin) giveTwin(first);
  giveTwin(node);
  linkInOrder(slot, first->twin, node->twin);
  return true;
}

// Makes space for two.
bool NameIndex::reserveTwins() {
  if (m_twinEnd + 1 < m_twinCapacity) return true;
  if (m_twinCapacity > kMostTwins / 2) return false;
  const uint32_t capacity = m_twinCapacity ? m_twinCapacity * 2 : kFirstTwins;
  void* twins = Reallocate(m_twins, capacity * sizeof(Twin));
  if (!twins) return false;
  m_twins = static_cast<Twin*>(twins);
  m_twinCapacity = capacity;
  return true;
}

// As the only one of a chain.
void NameIndex::giveTwin(NameNode* node) {
  uint32_t twin = m_unusedTwin;
  if (twin) {
    m_unusedTwin = m_twins[twin].next;
  } else {
    twin = m_twinEnd++;
  }
  m_twins[twin] = {node->sequence, 0, twin};
  node->twin = twin & kMostTwins;
}

void NameIndex::linkInOrder(Slot* slot, uint32_t first, uint32_t added) {
  Twin& node = m_twins[added];
  const uint32_t last = m_twins[first].prev;
  if (node.sequence < m_twins[first].sequence) {
    node.next = first;
    node.prev = last;
    m_twins[first].prev = added;
    slot->head = node.sequence;
    return;
  }
  // From the end, since nearly every node is appended there; only a renamed one may belong earlier.
  uint32_t before = last;
  while (m_twins[before].sequence > node.sequence) before = m_twins[before].prev;
  node.next = m_twins[before].next;
  node.prev = before;
  m_twins[node.next ? node.next : first].prev = added;
  m_twins[before].next = added;
}

void NameIndex::remove(const NameFold& fold, NodesInOrder nodes, NameNode* node) {
  const size_t at = find(fold, nodes, node->name, ShortHash(fold, node->name)).slot;
  Slot* slot = &m_slots[at];
  if (slot->head == kNoSequence) return;
  const uint32_t gone = node->twin;
  node->twin = 0;
  if (gone && m_twins[gone].prev != gone) {
    unlink(slot, nodes.bySequence(slot->head)->twin, gone);
  } else {
    freeSlot(at);
  }
  if (!gone) return;
  m_twins[gone].next = m_unusedTwin;
  m_unusedTwin = gone;
}

// The chain keeps at least one node. The first node has lost its twin number already when it is the
// one that goes.
void NameIndex::unlink(Slot* slot, uint32_t first, uint32_t gone) {
  const Twin& node = m_twins[gone];
  if (slot->head == node.sequence) {
    m_twins[node.next].prev = node.prev;
    slot->head = m_twins[node.next].sequence;
    return;
  }
  m_twins[node.prev].next = node.next;
  m_twins[node.next ? node.next : first].prev = node.prev;
}

// Moves later slots of the same run back over the gap, so that probing never needs marks for
// slots that were used once.
void NameIndex::freeSlot(size_t at) {
  size_t gap = at;
  for (size_t next = (at + 1) & m_mask; m_slots[next].head != kNoSequence;
       next = (next + 1) & m_mask) {
    const size_t home = m_slots[next].hash & m_mask;
    // Its home lies after the gap: moved there, it would not be found any more.
    if (((next - home) & m_mask) < ((next - gap) & m_mask)) continue;
    m_slots[gap] = m_slots[next];
    gap = next;
  }
  m_slots[gap].head = kNoSequence;
  --m_used;
}

NameIndex::Chain NameIndex::chain(const NameFold& fold, NodesInOrder nodes, const char* name,
                                  NameHash known) const {
  return find(fold, nodes, name, ShortHash(fold, name, known)).chain;
}

NameNode* NameIndex::nextSame(NodesInOrder nodes, const NameNode* node) const {
  const uint32_t next = node->twin ? m_twins[node->twin].next : 0;
  return next ? nodes.bySequence(m_twins[next].sequence) : nullptr;
}

}  // namespace ztini

#include "ztini/NameIndex.h"

#include <cstring>

#include "ztini/Alloc.h"
#include "ztini/NameHash.h"

namespace ztini {
namespace {

uint32_t ShortHash(const NameFold& fold, const char* name) {
  return static_cast<uint32_t>(HashName(fold, name));
}

// Chains are rings backwards: the first one's prevSame is the last.
void LinkInOrder(NameNode** head, NameNode* node) {
  NameNode* first = *head;
  NameNode* last = first->prevSame;
  if (node->sequence < first->sequence) {
    node->nextSame = first;
    node->prevSame = last;
    first->prevSame = node;
    *head = node;
    return;
  }
  NameNode* before = last;
  while (before->sequence > node->sequence) before = before->prevSame;
  node->nextSame = before->nextSame;
  node->prevSame = before;
  (node->nextSame ? node->nextSame : first)->prevSame = node;
  before->nextSame = node;
}

// The chain keeps at least one node.
void Unlink(NameNode** head, NameNode* node) {
  NameNode* first = *head;
  if (node == first) {
    node->nextSame->prevSame = node->prevSame;
    *head = node->nextSame;
    return;
  }
  node->prevSame->nextSame = node->nextSame;
  (node->nextSame ? node->nextSame : first)->prevSame = node->prevSame;
}

}  // namespace

void NameIndex::clear() {
  std::free(m_slots);
  m_slots = nullptr;
  m_mask = m_used = 0;
}

bool NameIndex::create(size_t names) {
  clear();
  size_t slots = 16;
  while (slots / 2 < names) {
    if (slots > SIZE_MAX / 2 / sizeof(Slot)) return false;
    slots *= 2;
  }
  m_slots = static_cast<Slot*>(Allocate(slots * sizeof(Slot)));
  if (!m_slots) return false;
  memset(m_slots, 0, slots * sizeof(Slot));
  m_mask = slots - 1;
  return true;
}

bool NameIndex::grow() {
  Slot* old = m_slots;
  const size_t slots = m_mask + 1;
  const size_t used = m_used;
  m_slots = nullptr;
  if (!create(slots)) {
    std::free(old);
    return false;
  }
  for (size_t i = 0; i < slots; ++i) {
    if (!old[i].head) continue;
    size_t at = old[i].hash & m_mask;
    while (m_slots[at].head) at = (at + 1) & m_mask;
    m_slots[at] = old[i];
  }
  m_used = used;
  std::free(old);
  return true;
}

size_t NameIndex::find(const NameFold& fold, const char* name, uint32_t hash) const {
  size_t at = hash & m_mask;
  while (m_slots[at].head) {
    if (m_slots[at].hash == hash && SameFoldedName(fold, m_slots[at].head->name, name)) break;
    at = (at + 1) & m_mask;
  }
  return at;
}

bool NameIndex::insert(const NameFold& fold, NameNode* node) {
  if ((m_used + 1) * 4 > (m_mask + 1) * 3 && !grow()) {
    clear();
    return false;
  }
  const uint32_t hash = ShortHash(fold, node->name);
  Slot& slot = m_slots[find(fold, node->name, hash)];
  if (slot.head) {
    LinkInOrder(&slot.head, node);
    return true;
  }
  node->nextSame = nullptr;
  node->prevSame = node;
  slot = {node, hash};
  ++m_used;
  return true;
}

void NameIndex::remove(const NameFold& fold, NameNode* node) {
  const size_t at = find(fold, node->name, ShortHash(fold, node->name));
  if (!m_slots[at].head) return;
  if (m_slots[at].head == node && !node->nextSame) {
    freeSlot(at);
  } else {
    Unlink(&m_slots[at].head, node);
  }
}

// Moves later slots of the same run back over the gap, so that probing never needs marks for
// slots that were used once.
void NameIndex::freeSlot(size_t at) {
  size_t gap = at;
  for (size_t next = (at + 1) & m_mask; m_slots[next].head; next = (next + 1) & m_mask) {
    const size_t home = m_slots[next].hash & m_mask;
    if (((next - home) & m_mask) < ((next - gap) & m_mask)) continue;
    m_slots[gap] = m_slots[next];
    gap = next;
  }
  m_slots[gap].head = nullptr;
  --m_used;
}

NameNode* NameIndex::chain(const NameFold& fold, const char* name) const {
  return m_slots[find(fold, name, ShortHash(fold, name))].head;
}

}  // namespace ztini

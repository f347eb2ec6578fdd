// The order of a list is its array of pointers; the index finds a record by name and names it by
// its sequence number, by which the array is searched. The index is an addition that may be dropped
// at any time: when memory runs out, when the locale has changed, or when the array was changed as
// a whole. The next look-up then scans or builds it again.
#include "ztini/NameList.h"

#include <cstdlib>
#include <cstring>

#include "ztini/Alloc.h"
#include "ztini/NameCompare.h"

namespace ztini {
namespace {

bool Matches(const NameFold& fold, NameMatch match, const char* stored, const char* name) {
  if (strcmp(stored, name) == 0) return true;
  return match == NameMatch::IgnoreCase && CompareNames(fold, stored, name) == 0;
}

}  // namespace

NameList::NameList(NameFold* fold) : m_fold(fold) { m_list.itemSize = sizeof(NameNode*); }

NameList::~NameList() {
  dropIndex();
  ztini_ListClear(&m_list);
}

NameNode* NameList::at(int32_t position) const {
  void* item = ztini_ListItem(&m_list, position);
  return item ? *static_cast<NameNode**>(item) : nullptr;
}

NameNode** NameList::nodes() const {
  if (m_list.capacity) return reinterpret_cast<NameNode**>(m_list.block) + m_list.first;
  return static_cast<NameNode**>(ztini_ListItem(&m_list, -1));
}

NameNode* NameList::find(const char* name, NameMatch match, FoldState fold, NameHash hash) {
  if (!name) return nullptr;
  return wayToFind(fold) == Way::Index ? findInIndex(name, match, hash) : scan(name, match);
}

bool NameList::seek(const char* name, NameMatch match, NameNode** found, FoldState fold,
                    NameHash* hash) {
  *found = nullptr;
  if (!name) return true;
  const Way way = wayToFind(fold);
  if (way == Way::OutOfMemory) return false;
  if (way == Way::Scan) {
    *found = scan(name, match);
    return true;
  }
  const NameHash computed(*m_fold, Trimmed(*m_fold, name));
  if (hash) *hash = computed;
  *found = findInIndex(name, match, computed);
  return true;
}

NameNode* NameList::findInIndex(const char* name, NameMatch match, NameHash hash) const {
  const auto [first, isExact] = m_index->chain(*m_fold, inOrder(), name, hash);
  if (isExact) return first;
  NameNode* node = first;
  while (node && !Matches(*m_fold, match, node->name, name)) {
    node = m_index->nextSame(inOrder(), node);
  }
  return node;
}

NameNode* NameList::scan(const char* name, NameMatch match) const {
  NameNode** node = nodes();
  for (NameNode** end = node + m_list.count; node < end; ++node) {
    if (Matches(*m_fold, match, (*node)->name, name)) return *node;
  }
  return nullptr;
}

NameList::Way NameList::wayToFind(FoldState fold) {
  if (fold == FoldState::Unknown) m_fold->refresh();
  // Built under another locale, in which other names are equal.
  if (m_index && !indexIsCurrent()) dropIndex();
  if (m_index) return Way::Index;
  if (count() < kIndexFrom) return Way::Scan;
  return build() ? Way::Index : Way::OutOfMemory;
}

bool NameList::build() {
  m_index = New<NameIndex>();
  bool good = m_index && m_index->create(*m_fold, m_list.capacity);
  NameNode** all = nodes();
  for (uint32_t i = 0; good && i < m_list.count; ++i) {
    good = m_index->insert(*m_fold, inOrder(), all[i]);
  }
  if (!good) dropIndex();
  return good;
}

void NameList::dropIndex() {
  Delete(m_index);
  m_index = nullptr;
}

int32_t NameList::positionOf(const NameNode* node) const {
  const uint32_t place = inOrder().placeOf(node->sequence);
  return place < m_list.count && nodes()[place] == node ? static_cast<int32_t>(place) + 1 : 0;
}

// The last one's and 1. When the numbers run out, all records are numbered again.
uint32_t NameList::nextSequence() {
  if (!m_list.count) return 0;
  NameNode** all = nodes();
  const uint32_t last = all[m_list.count - 1]->sequence;
  if (last + 1 < NameIndex::kNoSequence) return last + 1;
  dropIndex();
  for (uint32_t i = 0; i < m_list.count; ++i) all[i]->sequence = i;
  return m_list.count;
}

void NameList::appendAnywhere(NameNode* node, NameHash hash) {
  node->sequence = nextSequence();
  if (m_list.first + m_list.count < m_list.capacity) {
    nodes()[m_list.count++] = node;
  } else {
    ztini_ListInsertItem(&m_list, &node, 0);
  }
  if (!m_index) return;
  // Out of memory is no failure here: the record is in the list, and the index is built again when
  // it is needed.
  if (!indexIsCurrent() || !m_index->insert(*m_fold, inOrder(), node, hash)) dropIndex();
}

void NameList::lend(NameNode** nodes, uint32_t count) {
  for (uint32_t i = 0; i < count; ++i) nodes[i]->sequence = i;
  ztini_ListLend(&m_list, nodes, count);
}

void NameList::remove(NameNode* node) {
  const int32_t position = positionOf(node);
  if (!position) return;
  if (indexIsCurrent()) {
    m_index->remove(*m_fold, inOrder(), node);
  } else {
    dropIndex();
  }
  ztini_ListRemoveItem(&m_list, nullptr, position);
}

void NameList::rename(NameNode* node, char* name) {
  const bool indexed = indexIsCurrent();
  if (indexed) {
    m_index->remove(*m_fold, inOrder(), node);
  } else {
    dropIndex();
  }
  ReplaceName(node, name);
  if (indexed && !m_index->insert(*m_fold, inOrder(), node)) dropIndex();
}

void NameList::keepFirst(int32_t count) {
  m_list.count = static_cast<uint32_t>(count);
  if (!count) m_list.first = 0;
  dropIndex();
}

void ReplaceName(NameNode* node, char* name) {
  if (!node->nameInArena) free(node->name);
  node->name = name;
  node->nameInArena = 0;
}

}  // namespace ztini

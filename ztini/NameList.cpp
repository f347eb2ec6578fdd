#include "ztini/NameList.h"

#include <climits>
#include <cstdlib>
#include <cstring>

#include "ztini/NameCompare.h"

namespace ztini {
namespace {

// Below this a scan is as quick as the hash, and most sections have fewer items.
constexpr int32_t kIndexFrom = 16;

bool Matches(const NameFold& fold, NameMatch match, const char* stored, const char* name) {
  return match == NameMatch::Exact ? strcmp(stored, name) == 0
                                   : CompareNames(fold, stored, name) == 0;
}

}  // namespace

NameList::NameList(NameFold* fold) : m_fold(fold), m_buildFrom(kIndexFrom) {
  m_list.itemSize = sizeof(NameNode*);
}

NameNode* NameList::at(int32_t position) const {
  void* item = ztini_ListItem(&m_list, position);
  return item ? *static_cast<NameNode**>(item) : nullptr;
}

NameNode** NameList::nodes() const { return static_cast<NameNode**>(ztini_ListItem(&m_list, -1)); }

NameNode* NameList::find(const char* name, NameMatch match) {
  if (!name) return nullptr;
  m_fold->refresh();
  if (!useIndex()) return scan(name, match);
  NameNode* node = m_index.chain(*m_fold, name);
  while (node && !Matches(*m_fold, match, node->name, name)) node = node->nextSame;
  return node;
}

NameNode* NameList::scan(const char* name, NameMatch match) const {
  NameNode** node = nodes();
  for (NameNode** end = node + m_list.count; node < end; ++node) {
    if (Matches(*m_fold, match, (*node)->name, name)) return *node;
  }
  return nullptr;
}

bool NameList::useIndex() {
  if (m_index.built() && !indexIsCurrent()) m_index.clear();
  if (!m_index.built() && count() >= m_buildFrom) build();
  return m_index.built();
}

void NameList::build() {
  m_generation = m_fold->generation();
  bool good = m_index.create(m_list.count);
  NameNode** all = nodes();
  for (uint32_t i = 0; good && i < m_list.count; ++i) good = m_index.insert(*m_fold, all[i]);
  // Without memory the next try waits until the list has doubled, or every look-up would fail at
  // the same place first.
  m_buildFrom = good ? kIndexFrom : count() > INT32_MAX / 2 ? INT32_MAX : count() * 2;
}

void NameList::addToIndex(NameNode* node) {
  if (!m_index.built()) return;
  if (!indexIsCurrent()) {
    m_index.clear();
  } else if (!m_index.insert(*m_fold, node)) {
    m_buildFrom = count() > INT32_MAX / 2 ? INT32_MAX : count() * 2;
  }
}

int32_t NameList::positionOf(const NameNode* node) const {
  NameNode** all = nodes();
  uint32_t low = 0, high = m_list.count;
  while (low < high) {
    const uint32_t middle = low + (high - low) / 2;
    if (all[middle]->sequence < node->sequence) {
      low = middle + 1;
    } else {
      high = middle;
    }
  }
  return low < m_list.count && all[low] == node ? static_cast<int32_t>(low) + 1 : 0;
}

void NameList::append(NameNode* node) {
  node->sequence = m_nextSequence++;
  ztini_ListInsertItem(&m_list, &node, 0);
  addToIndex(node);
}

void NameList::remove(NameNode* node) {
  const int32_t position = positionOf(node);
  if (!position) return;
  if (indexIsCurrent()) {
    m_index.remove(*m_fold, node);
  } else {
    m_index.clear();
  }
  ztini_ListRemoveItem(&m_list, nullptr, position);
}

void NameList::rename(NameNode* node, char* name) {
  const bool indexed = indexIsCurrent();
  if (indexed) {
    m_index.remove(*m_fold, node);
  } else {
    m_index.clear();
  }
  std::free(node->name);
  node->name = name;
  if (indexed) addToIndex(node);
}

void NameList::keepFirst(int32_t count) {
  m_list.count = static_cast<uint32_t>(count);
  if (!count) m_list.first = 0;
  m_index.clear();
  m_buildFrom = kIndexFrom;
}

}  // namespace ztini

#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <map>
#include <new>
#include <vector>

#include "zt/fnd/Guid.h"

// An ordered map by identifier whose look-ups take the same time however many there are.
//
// Beside the map lies a hash table of its entries, made by the first look-up: a map that is only
// filled and walked has none. It is an addition: without memory for it, and for identifiers whose
// places in it are taken, which may be chosen by whoever writes registration files, the map answers.
//
//   GuidMap<int> map;
//   map[identifier] = 1;
//   auto found = map.find(identifier);  // map.end() if it is not there
//
// Iterators stay good as those of std::map. Threads: one at a time.
template <class Value>
class GuidMap {
 public:
  using Ordered = std::map<GUID, Value>;
  using iterator = typename Ordered::iterator;

  iterator begin() { return m_ordered.begin(); }
  iterator end() { return m_ordered.end(); }
  size_t size() const { return m_ordered.size(); }

  iterator find(const GUID& identifier) {
    if (m_slots.empty() && !makeSlots()) return m_ordered.find(identifier);
    size_t slot = slotOf(identifier);
    for (unsigned n = 0; n < kMostProbes; ++n, slot = (slot + 1) & mask()) {
      if (m_slots[slot] == end()) return end();
      if (m_slots[slot]->first == identifier) return m_slots[slot];
    }
    return m_ordered.find(identifier);
  }

  // A new value if there is none.
  Value& operator[](const GUID& identifier) {
    auto [entry, isNew] = m_ordered.try_emplace(identifier);
    if (isNew && !m_slots.empty()) {
      if (size() * 2 > m_slots.size()) {
        m_slots.clear();
      } else {
        put(entry);
      }
    }
    return entry->second;
  }

  void erase(iterator entry) {
    m_ordered.erase(entry);
    // An entry after it may have been put behind it.
    m_slots.clear();
  }
  void clear() {
    m_slots.clear();
    m_ordered.clear();
  }

 private:
  // Fewer are found as quickly in order.
  static constexpr size_t kSlotsFrom = 16;
  static constexpr unsigned kMostProbes = 16;

  size_t mask() const { return m_slots.size() - 1; }

  size_t slotOf(const GUID& identifier) const {
    static_assert(sizeof identifier == 16);
    constexpr uint64_t kOdd = 0x9E3779B97F4A7C15;
    uint64_t half[2];
    memcpy(half, &identifier, sizeof half);
    const uint64_t mixed = (half[0] ^ half[1] * kOdd) * kOdd;
    return static_cast<size_t>(mixed >> 32) & mask();
  }

  // An entry that finds all its places taken is found in the map.
  void put(iterator entry) {
    size_t slot = slotOf(entry->first);
    for (unsigned n = 0; n < kMostProbes; ++n, slot = (slot + 1) & mask()) {
      if (m_slots[slot] != end()) continue;
      m_slots[slot] = entry;
      return;
    }
  }

  // For all entries, half of them empty at least. False if there is none to be made.
  bool makeSlots() {
    if (size() < kSlotsFrom) return false;
    size_t slots = kSlotsFrom * 2;
    while (slots < size() * 2) slots *= 2;
    try {
      m_slots.assign(slots * 2, end());
    } catch (const std::bad_alloc&) {
      return false;
    }
    for (iterator entry = begin(); entry != end(); ++entry) put(entry);
    return true;
  }

  Ordered m_ordered;
  std::vector<iterator> m_slots;  // a power of two, end() where there is none; empty: not made
};

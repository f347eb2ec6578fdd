#pragma once

#include <malloc.h>

#include <cstddef>
#include <cstdlib>

#include "ztini/Alloc.h"

namespace ztini::test {

// The INI engine asks for memory through a function of its own, so its tests refuse there, in every
// build. One object at a time; single-threaded tests only.
class FailingRealloc {
 public:
  FailingRealloc(const FailingRealloc&) = delete;
  FailingRealloc& operator=(const FailingRealloc&) = delete;

  // True once an allocation was refused.
  bool failed() const { return s_failed; }

 protected:
  FailingRealloc(int number, bool withAllThatFollow) : m_before(g_realloc) {
    s_left = number;
    s_withAllThatFollow = withAllThatFollow;
    s_failed = false;
    g_realloc = [](void* block, size_t size) {
      return Refuses() ? nullptr : std::realloc(block, size);
    };
  }
  ~FailingRealloc() { g_realloc = m_before; }

 private:
  static bool Refuses() {
    if (s_failed) return s_withAllThatFollow;
    return s_failed = --s_left <= 0;
  }

  inline static int s_left = 0;
  inline static bool s_withAllThatFollow = false, s_failed = false;
  ReallocFunction m_before;
};

// While an object lives, the allocation of the given number (from 1) and every later one fails.
class FailFromAllocation : public FailingRealloc {
 public:
  explicit FailFromAllocation(int number) : FailingRealloc(number, true) {}
};

// As FailFromAllocation, but the allocation of that number alone fails.
class FailOneAllocation : public FailingRealloc {
 public:
  explicit FailOneAllocation(int number) : FailingRealloc(number, false) {}
};

// For tests: counts what the engine allocates while an object lives. What is freed stays counted; a
// block that grows counts once, with its last size.
class CountAllocations {
 public:
  CountAllocations() : m_before(g_realloc) {
    s_bytes = s_blocks = 0;
    g_realloc = [](void* block, size_t size) -> void* {
      const size_t before = block ? malloc_usable_size(block) : 0;
      if (!block) ++s_blocks;
      if (size > before) s_bytes += size - before;
      return std::realloc(block, size);
    };
  }
  ~CountAllocations() { g_realloc = m_before; }
  CountAllocations(const CountAllocations&) = delete;
  CountAllocations& operator=(const CountAllocations&) = delete;

  size_t bytes() const { return s_bytes; }
  size_t blocks() const { return s_blocks; }

 private:
  inline static size_t s_bytes = 0;
  inline static size_t s_blocks = 0;
  ReallocFunction m_before;
};

}  // namespace ztini::test

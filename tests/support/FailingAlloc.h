#pragma once

#include <malloc.h>

#include <cstddef>
#include <cstdlib>

#include "ztini/Alloc.h"

namespace ztini::test {

// For tests: while an object lives, the allocation of the given number (from 1) and every later
// one fails. One object at a time; single-threaded tests only.
class FailFromAllocation {
 public:
  explicit FailFromAllocation(int number) : m_before(g_realloc) {
    s_left = number;
    s_failed = false;
    g_realloc = [](void* block, size_t size) -> void* {
      if (--s_left > 0) return std::realloc(block, size);
      s_left = 0;
      s_failed = true;
      return nullptr;
    };
  }
  ~FailFromAllocation() { g_realloc = m_before; }
  FailFromAllocation(const FailFromAllocation&) = delete;
  FailFromAllocation& operator=(const FailFromAllocation&) = delete;

  // True once an allocation was refused.
  bool failed() const { return s_failed; }

 private:
  inline static int s_left = 0;
  inline static bool s_failed = false;
  ReallocFunction m_before;
};

// As FailFromAllocation, but the allocation of that number alone fails.
class FailOneAllocation {
 public:
  explicit FailOneAllocation(int number) : m_before(g_realloc) {
    s_left = number;
    g_realloc = [](void* block, size_t size) -> void* {
      return s_left > 0 && --s_left == 0 ? nullptr : std::realloc(block, size);
    };
  }
  ~FailOneAllocation() { g_realloc = m_before; }
  FailOneAllocation(const FailOneAllocation&) = delete;
  FailOneAllocation& operator=(const FailOneAllocation&) = delete;

  // True once the allocation was refused.
  bool failed() const { return s_left == 0; }

 private:
  inline static int s_left = 0;
  ReallocFunction m_before;
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

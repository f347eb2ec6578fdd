#pragma once

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

}  // namespace ztini::test

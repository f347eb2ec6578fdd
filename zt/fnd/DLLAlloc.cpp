#include "zt/fnd/DLLAlloc.h"

#include <cstdlib>
#include <new>

namespace zt::fnd {

void* DLLMallocNoThrow(unsigned long size) noexcept { return malloc(size); }

void* DLLMalloc(unsigned long size) {
  void* block = DLLMallocNoThrow(size);
  if (!block) throw std::bad_alloc();
  return block;
}

void* DLLReallocNoThrow(void* block, unsigned long size) noexcept {
  // By the C standard realloc() may keep or free the block for a size of 0; here it always goes.
  if (size == 0 && block) {
    free(block);
    return nullptr;
  }
  return realloc(block, size);
}

void* DLLRealloc(void* block, unsigned long size) {
  void* moved = DLLReallocNoThrow(block, size);
  // Null is the right answer for a size of 0.
  if (!moved && size > 0) throw std::bad_alloc();
  return moved;
}

void DLLFree(void* block) noexcept { free(block); }

bool MakeDLLMallocThrow(bool) noexcept { return false; }

}  // namespace zt::fnd

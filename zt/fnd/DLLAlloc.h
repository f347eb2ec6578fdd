#pragma once

#include <cstddef>

// The allocator of blocks that may cross a shared-library boundary: allocated in one module, freed
// in another. Every block is malloc's. Threads: any.
namespace zt::fnd {

// malloc. A null result raises std::bad_alloc, or is returned as it is.
void* DLLMalloc(unsigned long size);
void* DLLMallocNoThrow(unsigned long size) noexcept;

// realloc, except that size 0 with a block frees it and returns null. On failure the old block is
// kept; DLLRealloc then raises std::bad_alloc. A null result for size 0 is no failure.
void* DLLRealloc(void* block, unsigned long size);
void* DLLReallocNoThrow(void* block, unsigned long size) noexcept;

// free; null does nothing.
void DLLFree(void* block) noexcept;

// Does nothing and returns false: whether an allocation throws is decided by its name.
bool MakeDLLMallocThrow(bool doThrow) noexcept;

// Base of objects whose storage comes from DLLMalloc and goes by DLLFree.
class DLLAlloced {
 public:
  static void* operator new(size_t size) { return DLLMalloc(static_cast<unsigned long>(size)); }
  static void* operator new(size_t, void* place) noexcept { return place; }
  static void operator delete(void* block) noexcept { DLLFree(block); }
  static void operator delete(void*, void*) noexcept {}

 protected:
  ~DLLAlloced() = default;
};

}  // namespace zt::fnd

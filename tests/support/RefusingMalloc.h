#pragma once

// The malloc that FailingHeap.h steers. For ONE source of a program: the program's own malloc stands
// before the C library's for every library of the process, so whatever the code under test asks for
// passes here.
#include <stdlib.h>

#include "tests/support/FailingHeap.h"
#include "tests/support/Sanitizer.h"

#if !VLT_ADDRESS_SANITIZER && !VLT_THREAD_SANITIZER  // which have a malloc of their own
extern "C" {
void* __libc_malloc(size_t);
void* __libc_calloc(size_t, size_t);
void* __libc_realloc(void*, size_t);
void __libc_free(void*);

__attribute__((visibility("default"))) void* malloc(size_t sizeBytes) {
  using namespace vlt::test::heap;
  return Refuse() ? nullptr : Counted(__libc_malloc(sizeBytes));
}
__attribute__((visibility("default"))) void* calloc(size_t count, size_t sizeBytes) {
  using namespace vlt::test::heap;
  return Refuse() ? nullptr : Counted(__libc_calloc(count, sizeBytes));
}
__attribute__((visibility("default"))) void* realloc(void* old, size_t sizeBytes) {
  using namespace vlt::test::heap;
  if (Refuse()) return nullptr;
  void* block = __libc_realloc(old, sizeBytes);
  return old ? block : Counted(block);
}
__attribute__((visibility("default"))) void free(void* block) {
  if (block) --vlt::test::heap::g_live;
  __libc_free(block);
}
}
#endif

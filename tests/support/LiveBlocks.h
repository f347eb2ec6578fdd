#pragma once

#include <stddef.h>

#include "tests/support/FailingHeap.h"
#include "tests/support/Sanitizer.h"

// Present under the sanitizers only, whose malloc is their own.
extern "C" int __sanitizer_install_malloc_and_free_hooks(void (*onMalloc)(const volatile void*,
                                                                          size_t),
                                                         void (*onFree)(const volatile void*))
    __attribute__((weak));

namespace vlt::test::heap {

// Blocks of the heap that are alive, in every build. Only differences mean something, and only while no
// other thread allocates. For a program with RefusingMalloc.h.
inline long LiveBlocks() {
  static const bool hooked =
      __sanitizer_install_malloc_and_free_hooks && __sanitizer_install_malloc_and_free_hooks(
                                                       [](const volatile void* block, size_t) {
                                                         if (block) ++g_live;
                                                       },
                                                       [](const volatile void* block) {
                                                         if (block) --g_live;
                                                       });
  static_cast<void>(hooked);
  return g_live;
}

}  // namespace vlt::test::heap

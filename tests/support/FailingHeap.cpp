#include "tests/support/FailingHeap.h"

#include <stddef.h>
#include <stdlib.h>

#include <cstddef>
#include <cstdlib>
#include <new>

// Present under the sanitizers only, whose malloc is their own.
extern "C" int __sanitizer_install_malloc_and_free_hooks(void (*onMalloc)(const volatile void*,
                                                                          size_t),
                                                         void (*onFree)(const volatile void*))
    __attribute__((weak));

namespace vlt::test {
namespace {

thread_local int s_countdown = 0;  // 0: nothing fails

bool FailsNow() { return s_countdown > 0 && --s_countdown == 0; }

}  // namespace

long heap::LiveBlocks() {
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

FailAllocation::FailAllocation(int nth) { s_countdown = nth; }
FailAllocation::~FailAllocation() { s_countdown = 0; }
bool FailAllocation::happened() const { return s_countdown == 0; }

static void* Allocate(std::size_t size) noexcept {
  return FailsNow() ? nullptr : std::malloc(size == 0 ? 1 : size);
}

static void* AllocateOrThrow(std::size_t size) {
  void* block = Allocate(size);
  if (!block) throw std::bad_alloc();
  return block;
}

}  // namespace vlt::test

void* operator new(std::size_t size) { return vlt::test::AllocateOrThrow(size); }
void* operator new[](std::size_t size) { return vlt::test::AllocateOrThrow(size); }
void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
  return vlt::test::Allocate(size);
}
void* operator new[](std::size_t size, const std::nothrow_t&) noexcept {
  return vlt::test::Allocate(size);
}
void operator delete(void* block) noexcept { std::free(block); }
void operator delete[](void* block) noexcept { std::free(block); }
void operator delete(void* block, std::size_t) noexcept { std::free(block); }
void operator delete[](void* block, std::size_t) noexcept { std::free(block); }
void operator delete(void* block, const std::nothrow_t&) noexcept { std::free(block); }
void operator delete[](void* block, const std::nothrow_t&) noexcept { std::free(block); }

#if !VLT_ADDRESS_SANITIZER && !VLT_THREAD_SANITIZER  // which have a malloc of their own
extern "C" {
void* __libc_malloc(size_t);
void* __libc_calloc(size_t, size_t);
void* __libc_realloc(void*, size_t);
void* __libc_memalign(size_t, size_t);
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
// Where libc++abi gets the memory of exceptions. Never refused: the reserve of its version 14 is not
// aligned, and a throw that uses it crashes.
__attribute__((visibility("default"))) int posix_memalign(void** block, size_t alignment,
                                                          size_t sizeBytes) {
  void* found = vlt::test::heap::Counted(__libc_memalign(alignment, sizeBytes));
  if (!found) return ENOMEM;
  *block = found;
  return 0;
}
__attribute__((visibility("default"))) void free(void* block) {
  if (block) --vlt::test::heap::g_live;
  __libc_free(block);
}
}
#endif

// Blocks too large for the address space come back null under AddressSanitizer too.
extern "C" __attribute__((visibility("default"))) const char* __asan_default_options();
extern "C" const char* __asan_default_options() { return "allocator_may_return_null=1"; }
extern "C" __attribute__((visibility("default"))) const char* __tsan_default_options();
extern "C" const char* __tsan_default_options() { return "allocator_may_return_null=1"; }

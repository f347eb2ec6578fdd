#include "tests/support/AllocFailure.h"

#include <cstddef>
#include <cstdlib>
#include <new>

namespace vlt::test {
namespace {

thread_local int s_countdown = 0;  // 0: nothing fails

bool FailsNow() { return s_countdown > 0 && --s_countdown == 0; }

}  // namespace

FailAllocation::FailAllocation(int nth) { s_countdown = nth; }
FailAllocation::~FailAllocation() { s_countdown = 0; }
bool FailAllocation::happened() const { return s_countdown == 0; }

static void* Allocate(std::size_t size) noexcept {
  return FailsNow() ? nullptr : std::malloc(size == 0 ? 1 : size);
}

static void* AllocateOrThrow(std::size_t size) {
  void* block = Allocate(size);
  if (block == nullptr) throw std::bad_alloc();
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

// Blocks too large for the address space come back null under AddressSanitizer too.
extern "C" __attribute__((visibility("default"))) const char* __asan_default_options();
extern "C" const char* __asan_default_options() { return "allocator_may_return_null=1"; }
extern "C" __attribute__((visibility("default"))) const char* __tsan_default_options();
extern "C" const char* __tsan_default_options() { return "allocator_may_return_null=1"; }

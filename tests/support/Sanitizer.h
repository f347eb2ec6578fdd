#pragma once

// Which sanitizer this build runs under; g++ and clang say it in two ways.
#if defined(__SANITIZE_ADDRESS__)
#define VLT_ADDRESS_SANITIZER 1
#elif defined(__SANITIZE_THREAD__)
#define VLT_THREAD_SANITIZER 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define VLT_ADDRESS_SANITIZER 1
#elif __has_feature(thread_sanitizer)
#define VLT_THREAD_SANITIZER 1
#endif
#endif
#ifndef VLT_ADDRESS_SANITIZER
#define VLT_ADDRESS_SANITIZER 0
#endif
#ifndef VLT_THREAD_SANITIZER
#define VLT_THREAD_SANITIZER 0
#endif

namespace vlt::test {

// A sanitizer brings a malloc of its own, reserves the address space, and ends the process where
// memory runs out.
inline constexpr bool kCanLimitMemory = !VLT_ADDRESS_SANITIZER && !VLT_THREAD_SANITIZER;

// AddressSanitizer does not hold its allocator while a process forks: a child that is made while
// another thread allocates may wait indefinitely at its own first allocation.
inline constexpr bool kCanForkWhileThreadsAllocate = !VLT_ADDRESS_SANITIZER;

}  // namespace vlt::test

#pragma once

#include <stddef.h>
#include <stdint.h>
#include <string.h>

namespace vlt::test {

// Place of a virtual operation in its dispatch table, by the pointer form of the platform's C++ ABI: one
// and the offset in bytes.
template <class Member>
size_t SlotOf(Member member) {
  uintptr_t words[2];
  static_assert(sizeof member == sizeof words);
  memcpy(words, &member, sizeof words);
  return (words[0] - 1) / sizeof(void*);
}

}  // namespace vlt::test

#pragma once

#include <stddef.h>
#include <stdint.h>
#include <string.h>

namespace vlt::test {

// Place of a virtual operation in its dispatch table, by the form that the platform's C++ ABI gives
// to pointers to members. The offset in bytes is in the first word; what marks the operation as
// virtual is its lowest bit, or, where code may begin at odd addresses (ARM), that of the second.
template <class Member>
size_t SlotOf(Member member) {
  uintptr_t words[2];
  static_assert(sizeof member == sizeof words);
  memcpy(words, &member, sizeof words);
  uintptr_t offset = words[1] & 1 ? words[0] : words[0] - 1;
  return offset / sizeof(void*);
}

}  // namespace vlt::test

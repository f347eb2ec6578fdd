#pragma once

#include <cstddef>
#include <cstdint>

#include "ztini/NameFold.h"

namespace ztini {

// A name without the white space around it.
struct TrimmedName {
  const char* begin;
  size_t length;
};
TrimmedName Trimmed(const NameFold& fold, const char* name);

// Hash of a name after folding, so that names that compare equal have one hash.
//
// Under a key of 128 bits drawn once per process: names come from files that others write, and a
// file made of colliding names must not turn every look-up into a scan. What protects is that the
// writer of a file sees neither the key nor a hash, as neither leaves the process: with the key,
// colliding names could be computed.
uint64_t HashName(const NameFold& fold, TrimmedName name);

// True if both names are the same after folding and without surrounding white space.
bool SameFoldedName(const NameFold& fold, const char* left, const char* right);

}  // namespace ztini

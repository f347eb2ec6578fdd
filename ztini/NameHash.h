#pragma once

#include <cstdint>

#include "ztini/NameFold.h"

namespace ztini {

// Hash of a name after folding and without surrounding white space, so that names that compare
// equal have one hash.
//
// SipHash-1-3 under a key drawn once per process: names come from files that others write, and a
// file made of colliding names must not turn every look-up into a scan.
uint64_t HashName(const NameFold& fold, const char* name);

// True if both names are the same after folding and without surrounding white space.
bool SameFoldedName(const NameFold& fold, const char* left, const char* right);

}  // namespace ztini

#pragma once

#include <cstddef>
#include <cstdint>

#include "ztini/Alloc.h"
#include "ztini/ztini.h"

namespace ztini {

// IniRead over a file that is in memory as a whole: the bytes [begin, end) of the block, of which
// text.get()[end] is there to be written. Names and values stay where they are, so the document
// takes the block over. 0 or kIniOutOfMemory.
int32_t IniReadText(IniStructForwardReferenceTag* doc, OwnedText text, size_t begin, size_t end);

}  // namespace ztini

#pragma once

#include <cstdint>

#include "ztini/TextBuffer.h"
#include "ztini/ztini.h"

namespace ztini {

// Appends the bytes of the document's file: the byte order mark, if asked for, and the text. 0,
// kIniOutOfMemory, or what IniWrite returns. Of an empty buffer: whoever makes the result the
// document's `rendering` has the next one made from it. *unchangedBytes, if asked for, is how many
// bytes, about, both begin with.
int32_t IniRender(IniStructForwardReferenceTag* doc, TextBuffer* text,
                  size_t* unchangedBytes = nullptr);

}  // namespace ztini

#pragma once

#include <cstdint>

#include "ztini/TextBuffer.h"
#include "ztini/ztini.h"

namespace ztini {

// Appends the bytes of the document's file: the byte order mark, if asked for, and the text. 0,
// kIniOutOfMemory, or what IniWrite returns. Of an empty buffer: whoever makes the result the
// document's `rendering` has the next one made from it. *unchangedBytes, if asked for, is how many
// bytes, about, it shares with the beginning of the text that it was made from; all of them where
// the two are the same and that text was the document's source.
int32_t IniRender(IniStructForwardReferenceTag* doc, TextBuffer* text,
                  size_t* unchangedBytes = nullptr);

// The bytes of the file that the document has just been read from, for its first IniRender: what that
// makes is compared with them, and kept from the first difference on only. Others do no harm. Gone
// with that, with new write options, and when the document is read again.
void IniKeepSource(IniStructForwardReferenceTag* doc, TextBuffer bytes);

}  // namespace ztini

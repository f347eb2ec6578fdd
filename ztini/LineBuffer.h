#pragma once

#include <cstddef>
#include <cstdint>

#include "ztini/Alloc.h"
#include "ztini/ztini.h"

namespace ztini {

// Puts lines together from the pieces that a line function gives.
//
// The capacity starts at 256 bytes, doubles when a line does not fit, and never shrinks. The
// function is asked for what fits, one byte less than the capacity; a line that fills this exactly
// goes on in another call.
class LineBuffer {
 public:
  // False without memory.
  bool open();

  // Reads one line. 0 or a negative status; a line that is not `complete` is no line.
  int32_t next(IniLineInputFunction input, void* context);

  // The caller may cut the text in place.
  char* text() const { return m_text.get(); }
  int32_t lineNumber() const { return m_lineNumber; }
  bool complete() const { return m_endOfLine != 0; }
  bool atEnd() const { return m_endOfFile != 0; }

 private:
  bool grow();

  OwnedText m_text;
  size_t m_capacity = 0;
  int32_t m_lineNumber = 0;
  int32_t m_endOfFile = 0;
  int32_t m_endOfLine = 0;
};

}  // namespace ztini

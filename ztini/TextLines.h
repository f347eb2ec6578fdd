#pragma once

#include <cstddef>
#include <cstdint>

namespace ztini {

// Cuts a text in memory into lines: the same ones that IniRead gets of IniLineFileInputFunction.
//
// That function is asked for as many bytes as a buffer takes, which begins with 256 and doubles in
// the middle of a line that does not fit. The next request does not know that it is inside a line:
// a terminator there that differs from the last line's is skipped, and an end of the text there
// drops the line. Files with such lines exist, so the same happens here.
class TextLines {
 public:
  // *end must be there to be written.
  TextLines(char* begin, char* end);

  // False after the last line.
  bool next();

  // The present line; *end() may be written.
  char* begin() const { return m_begin; }
  char* end() const { return m_end; }
  int32_t lineNumber() const { return m_lineNumber; }

 private:
  char* terminatorFrom(char* at) const;
  bool nextLong();
  bool finishAt(char* end, char* next);

  char* m_cursor;
  char* m_textEnd;
  bool m_onlyLineFeeds;
  size_t m_capacity = 256;  // of the buffer that the lines would be read into
  char m_lastTerminator = 0;
  char* m_begin = nullptr;
  char* m_end = nullptr;
  int32_t m_lineNumber = 0;
};

}  // namespace ztini

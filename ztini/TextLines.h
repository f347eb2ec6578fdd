#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

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
  bool next() {
    if (m_cursor == m_textEnd) return false;
    char* begin = m_cursor;
    // The second half of a pair.
    if (IsTerminator(*begin) && *begin != m_lastTerminator) ++begin;
    char* end = m_onlyLineFeeds ? lineFeedFrom(begin) : terminatorFrom(begin);
    // The buffer never shrinks, so that the capacity is kept from line to line: a long line changes
    // how later ones are cut.
    if (static_cast<size_t>(end - begin) >= m_capacity - 1) return nextLong();
    if (end == m_textEnd) {
      m_cursor = m_textEnd;
      // Only the second half of a pair was left.
      if (begin == end) return false;
      m_begin = begin;
      return finishAt(end, end);
    }
    m_begin = begin;
    m_lastTerminator = *end;
    return finishAt(end, end + 1);
  }

  // The present line; *end() may be written.
  char* begin() const { return m_begin; }
  char* end() const { return m_end; }
  int32_t lineNumber() const { return m_lineNumber; }

 private:
  static bool IsTerminator(char c) { return c == '\r' || c == '\n' || c == '\0'; }

  char* lineFeedFrom(char* at) const {
    void* found = memchr(at, '\n', static_cast<size_t>(m_textEnd - at));
    return found ? static_cast<char*>(found) : m_textEnd;
  }
  char* terminatorFrom(char* at) const;
  bool nextLong();
  bool finishAt(char* end, char* next) {
    m_end = end;
    m_cursor = next;
    if (m_lineNumber < INT32_MAX) ++m_lineNumber;
    return true;
  }

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

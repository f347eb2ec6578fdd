// The common file has line feeds only, which is found out once; its lines are then found by memchr.
// A short line stays where it is in the text. A line that would not fit the buffer of the
// line-by-line way is taken byte by byte by nextLong(), which repeats what the requests of that way
// would skip, and closes the text up in place.
#include "ztini/TextLines.h"

#include <climits>
#include <cstring>

namespace ztini {
TextLines::TextLines(char* begin, char* end) : m_cursor(begin), m_textEnd(end) {
  const size_t size = static_cast<size_t>(end - begin);
  m_onlyLineFeeds = !memchr(begin, '\r', size) && !memchr(begin, '\0', size);
}

char* TextLines::terminatorFrom(char* at) const {
  while (at < m_textEnd && !IsTerminator(*at)) ++at;
  return at;
}

// Request by request. What is skipped inside the line is closed up.
bool TextLines::nextLong() {
  char* at = m_cursor;
  char* out = m_begin = at;
  size_t request = m_capacity - 1, stored = 0;
  bool first = true;
  for (;;) {
    if (stored == request) {
      request = m_capacity;  // the new half
      m_capacity *= 2;
      stored = 0;
      first = true;
    }
    if (at == m_textEnd) {
      m_cursor = at;
      return stored != 0 && finishAt(out, at);
    }
    const char c = *at++;
    if (!IsTerminator(c)) {
      *out++ = c;
      ++stored;
    } else if (!first || c == m_lastTerminator) {
      m_lastTerminator = c;
      return finishAt(out, at);
    }
    first = false;
  }
}

}  // namespace ztini

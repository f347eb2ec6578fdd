// The common file has line feeds only, which is found out once; its lines are then found by memchr.
// A short line stays where it is in the text. A line that would not fit the buffer of the
// line-by-line way is taken byte by byte by nextLong(), which repeats what the requests of that way
// would skip, and closes the text up in place.
#include "ztini/TextLines.h"

#include <climits>
#include <cstring>

namespace ztini {
namespace {

bool IsTerminator(char c) { return c == '\r' || c == '\n' || c == '\0'; }

}  // namespace

TextLines::TextLines(char* begin, char* end) : m_cursor(begin), m_textEnd(end) {
  const size_t size = static_cast<size_t>(end - begin);
  m_onlyLineFeeds = !memchr(begin, '\r', size) && !memchr(begin, '\0', size);
}

char* TextLines::terminatorFrom(char* at) const {
  if (m_onlyLineFeeds) {
    void* found = memchr(at, '\n', static_cast<size_t>(m_textEnd - at));
    return found ? static_cast<char*>(found) : m_textEnd;
  }
  while (at < m_textEnd && !IsTerminator(*at)) ++at;
  return at;
}

bool TextLines::finishAt(char* end, char* next) {
  m_end = end;
  m_cursor = next;
  if (m_lineNumber < INT32_MAX) ++m_lineNumber;
  return true;
}

bool TextLines::next() {
  if (m_cursor == m_textEnd) return false;
  char* begin = m_cursor;
  // The second half of a pair.
  if (IsTerminator(*begin) && *begin != m_lastTerminator) ++begin;
  char* end = terminatorFrom(begin);
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

#pragma once

#include <cstddef>
#include <cstring>
#include <string_view>
#include <utility>

#include "ztini/Alloc.h"

namespace ztini {

// Text that grows without throwing: a failure is remembered, appending after it does nothing, and
// ok() reports it once at the end. The text may hold zeros; a terminator always follows it.
// Threads: one.
class TextBuffer {
 public:
  TextBuffer() = default;
  TextBuffer(TextBuffer&& other) noexcept { *this = std::move(other); }
  TextBuffer& operator=(TextBuffer&& other) noexcept {
    m_text = std::move(other.m_text);
    m_length = std::exchange(other.m_length, 0);
    m_capacity = std::exchange(other.m_capacity, 0);
    m_good = std::exchange(other.m_good, true);
    return *this;
  }

  // Empty again, without its block.
  void reset() { *this = TextBuffer(); }
  // Empties the text and keeps its block. A failure stays.
  void clear() { cut(0); }
  TextBuffer& append(std::string_view text) {
    if (!m_good || text.size() >= m_capacity - m_length) return appendGrowing(text);
    memcpy(m_text.get() + m_length, text.data(), text.size());
    m_length += text.size();
    m_text.get()[m_length] = 0;
    return *this;
  }
  TextBuffer& append(char c) { return append(std::string_view(&c, 1)); }
  // "%04d": four digits, more from 10000.
  TextBuffer& appendNumber(unsigned number);

  // Only the first so many bytes, at most all, stay.
  void cut(size_t length) {
    m_length = length;
    if (m_text) m_text.get()[length] = 0;
  }
  // A text of so many bytes, which the caller writes; null, with the text empty, without memory.
  char* fill(size_t sizeBytes);

  // Makes space for a text of so many bytes in all. Without memory for it, appending tries again.
  void reserve(size_t sizeBytes) {
    if (m_good) fit(sizeBytes, sizeBytes + 1);
  }

  // False once memory ran out.
  bool ok() const { return m_good; }

  // Terminated; valid until the next append.
  const char* text() const { return m_text ? m_text.get() : ""; }
  size_t size() const { return m_length; }
  std::string_view view() const { return {text(), m_length}; }

 private:
  TextBuffer& appendGrowing(std::string_view text);
  bool fit(size_t length, size_t capacity);

  OwnedText m_text;
  size_t m_length = 0;
  size_t m_capacity = 0;
  bool m_good = true;
};

}  // namespace ztini

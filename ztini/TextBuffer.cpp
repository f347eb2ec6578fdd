#include "ztini/TextBuffer.h"

#include <cstdint>
#include <cstdio>
#include <cstring>

namespace ztini {

bool TextBuffer::fit(size_t length) {
  if (length < m_capacity) return true;
  if (length > SIZE_MAX / 2) return false;
  const size_t capacity = length * 2 < 256 ? 256 : length * 2;
  void* text = Reallocate(m_text.get(), capacity);
  if (!text) return false;
  // realloc has taken the old block.
  (void)m_text.release();
  m_text.reset(static_cast<char*>(text));
  m_capacity = capacity;
  return true;
}

TextBuffer& TextBuffer::appendGrowing(std::string_view text) {
  m_good = m_good && text.size() <= SIZE_MAX - m_length && fit(m_length + text.size());
  if (!m_good) return *this;
  memcpy(m_text.get() + m_length, text.data(), text.size());
  m_length += text.size();
  m_text.get()[m_length] = 0;
  return *this;
}

TextBuffer& TextBuffer::appendNumber(unsigned number) {
  char digits[16];
  snprintf(digits, sizeof digits, "%04u", number);
  return append(digits);
}

}  // namespace ztini

#include "ztini/TextBuffer.h"

#include <cstdint>
#include <cstdio>
#include <cstring>

namespace ztini {

constexpr size_t kLeastBlock = 256;

// Makes space for a text of this length, in a block of `capacity` bytes where it needs a new one.
bool TextBuffer::fit(size_t length, size_t capacity) {
  if (length < m_capacity) return true;
  if (length > SIZE_MAX / 2) return false;
  void* text = Reallocate(m_text.get(), capacity);
  if (!text) return false;
  // realloc has taken the old block.
  (void)m_text.release();
  m_text.reset(static_cast<char*>(text));
  m_capacity = capacity;
  m_text.get()[m_length] = 0;
  return true;
}

char* TextBuffer::fill(size_t sizeBytes) {
  reset();
  m_good = fit(sizeBytes, sizeBytes + 1);
  if (!m_good) return nullptr;
  cut(sizeBytes);
  return m_text.get();
}

TextBuffer& TextBuffer::appendGrowing(std::string_view text) {
  m_good = m_good && text.size() <= SIZE_MAX - m_length;
  if (!m_good) return *this;
  const size_t length = m_length + text.size();
  // Doubling, as a rendered file is appended in small pieces.
  m_good = fit(length, length < kLeastBlock / 2 ? kLeastBlock : length * 2);
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

#pragma once

#include <cstddef>
#include <cstring>
#include <string_view>

#include "ztini/Alloc.h"

namespace ztini {

// Text that grows without throwing. Appending after a failure does nothing; ok() reports it at the
// end.
class TextBuffer {
 public:
  void clear() {
    m_length = 0;
    if (m_text) m_text.get()[0] = 0;
  }
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

  // False once memory ran out.
  bool ok() const { return m_good; }

  // Terminated; valid until the next append.
  const char* text() const { return m_text ? m_text.get() : ""; }
  size_t size() const { return m_length; }

 private:
  TextBuffer& appendGrowing(std::string_view text);
  bool fit(size_t length);

  OwnedText m_text;
  size_t m_length = 0;
  size_t m_capacity = 0;
  bool m_good = true;
};

}  // namespace ztini

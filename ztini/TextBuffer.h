#pragma once

#include <cstddef>
#include <string_view>

#include "ztini/Alloc.h"

namespace ztini {

// Text that grows without throwing. Appending after a failure does nothing; ok() tells at the end.
class TextBuffer {
 public:
  void clear() { m_length = 0; }
  TextBuffer& append(std::string_view text);
  TextBuffer& append(char c) { return append(std::string_view(&c, 1)); }
  // "%04d": four digits, more from 10000.
  TextBuffer& appendNumber(unsigned number);

  // False once memory ran out.
  bool ok() const { return m_good; }

  // Terminated; valid until the next append.
  const char* text() const { return m_text ? m_text.get() : ""; }
  size_t size() const { return m_length; }

 private:
  bool fit(size_t length);

  OwnedText m_text;
  size_t m_length = 0;
  size_t m_capacity = 0;
  bool m_good = true;
};

}  // namespace ztini

#pragma once

#include <cstdint>

namespace ztini {

// toupper and isspace of one locale as tables, with a cheap way to see that the locale in force
// still is that one.
//
// Names compare in the process locale, which may change between two calls on a document. An index
// over names holds only as long as the tables that it was built with; the generation shows it.
class NameFold {
 public:
  NameFold();

  // Brings the tables up to the locale in force. While the global locale keeps its name this is
  // one string comparison.
  void refresh();

  // Grows by 1 whenever the tables changed.
  uint32_t generation() const { return m_generation; }

  // True if upper() changes a to z only, into A to Z: in nearly every locale.
  bool foldsAsciiOnly() const { return m_foldsAsciiOnly; }

  unsigned char upper(char c) const { return m_upper[static_cast<unsigned char>(c)]; }
  bool isSpace(char c) const { return m_space[static_cast<unsigned char>(c)]; }

 private:
  void take();
  bool stillRight() const;
  void remember(const char* localeName);

  unsigned char m_upper[256];
  bool m_space[256];
  bool m_foldsAsciiOnly = false;
  char m_localeName[64];  // "" while unknown: then the tables are compared each time
  uint32_t m_generation = 0;
};

}  // namespace ztini

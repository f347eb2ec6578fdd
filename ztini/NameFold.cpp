#include "ztini/NameFold.h"

#include <clocale>
#include <cstring>

#include "ztini/NameCompare.h"

namespace ztini {
namespace {

// Null while the thread has a locale of its own: its handle proves nothing, since a freed one may
// come back with other contents.
const char* GlobalLocaleName() {
  return uselocale(locale_t{}) == LC_GLOBAL_LOCALE ? setlocale(LC_CTYPE, nullptr) : nullptr;
}

}  // namespace

NameFold::NameFold() {
  take();
  remember(GlobalLocaleName());
}

void NameFold::refresh() {
  const char* name = GlobalLocaleName();
  // The C library's name of the global locale changes with its contents, so that equal names mean
  // equal tables.
  if (name && *m_localeName && strcmp(name, m_localeName) == 0) return;
  // A locale with another name may fold the same way: indexes then stay good.
  if (!stillRight()) {
    take();
    ++m_generation;
  }
  remember(name);
}

void NameFold::take() {
  m_foldsAsciiOnly = true;
  for (int c = 0; c < 256; ++c) {
    m_upper[c] = LocaleFold::upper(static_cast<char>(c));
    m_space[c] = LocaleFold::isSpace(static_cast<char>(c));
    const int plain = c >= 'a' && c <= 'z' ? c - 'a' + 'A' : c;
    m_foldsAsciiOnly = m_foldsAsciiOnly && m_upper[c] == plain;
  }
}

bool NameFold::stillRight() const {
  for (int c = 0; c < 256; ++c) {
    if (m_upper[c] != LocaleFold::upper(static_cast<char>(c))) return false;
    if (m_space[c] != LocaleFold::isSpace(static_cast<char>(c))) return false;
  }
  return true;
}

void NameFold::remember(const char* localeName) {
  const bool fits = localeName && strlen(localeName) < sizeof m_localeName;
  strcpy(m_localeName, fits ? localeName : "");
}

}  // namespace ztini

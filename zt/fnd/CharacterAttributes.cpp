#include "zt/fnd/CharacterAttributes.h"

#include <exception>

#include "zt/fnd/Exception.h"

namespace zt::fnd {
namespace {

std::locale NamedLocale(const char* name) {
  if (!name) ZT_RAISE(exception::InvalidArgument2("no locale name"));
  try {
    return std::locale(name);
  } catch (const std::exception& e) {
    // Callers know the foundation's exceptions only; the library's reason goes along as text.
    ZT_RAISE(exception::InvalidArgument2(e.what()));
  }
}

}  // namespace

// The standard library's own "C" locale is made once under its guard, and outlives every static.
template <class T>
CharacterAttributes<T>::CharacterAttributes() : m_locale(std::locale::classic()) {}

template <class T>
CharacterAttributes<T>::CharacterAttributes(const char* name) : m_locale(NamedLocale(name)) {}

template class CharacterAttributes<char>;
template class CharacterAttributes<wchar_t>;

}  // namespace zt::fnd

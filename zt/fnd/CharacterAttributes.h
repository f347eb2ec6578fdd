#pragma once

#include <locale>

namespace zt::fnd {

// Properties of characters under one C++ locale, whatever the host's C locale is.
// T is char or wchar_t. Threads: a plain value.
template <class T>
class CharacterAttributes {
 public:
  // The locale "C", which folds ASCII only.
  CharacterAttributes();

  // A locale by name; "" is that of the environment. Throws InvalidArgument2 with the reason as
  // text for a name that the standard library does not know, and for null.
  explicit CharacterAttributes(const char* name);

  T toUpper(T c) const { return std::use_facet<std::ctype<T>>(m_locale).toupper(c); }

 private:
  std::locale m_locale;
};

extern template class CharacterAttributes<char>;
extern template class CharacterAttributes<wchar_t>;

}  // namespace zt::fnd

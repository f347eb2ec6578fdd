#pragma once

// Bodies of the string template: search and comparison. Only StringBase.cpp includes this.

#include <algorithm>
#include <cstring>
#include <cwchar>

#include "zt/fnd/String.h"
#include "zt/fnd/Utf8StringCompare.h"
#include "zt/fnd/osdep/StringCompare.h"

namespace zt::fnd {
namespace string_detail {

inline const wchar_t* FindChar(const wchar_t* s, wchar_t c, size_t n) {
  return n == 0 ? nullptr : wmemchr(s, c, n);
}

template <class Byte>
const Byte* FindChar(const Byte* s, Byte c, size_t n) {
  return n == 0 ? nullptr : static_cast<const Byte*>(memchr(s, static_cast<unsigned char>(c), n));
}

template <class T>
bool SameChars(const T* a, const T* b, size_t n) {
  return n == 0 || memcmp(a, b, n * sizeof(T)) == 0;
}

inline int CaseCompare(const wchar_t* a, const wchar_t* b) {
  return osdep::StringCaseCompare(a, b);
}
inline int CaseCompare(const char* a, const char* b) { return osdep::StringCaseCompare(a, b); }
inline int CaseCompare(const unsigned char* a, const unsigned char* b) {
  return Utf8StringCaseInsensitiveCompare(a, b);
}

inline int ExactCompare(const wchar_t* a, const wchar_t* b) {
  return osdep::StringExactCompare(a, b);
}
inline int ExactCompare(const char* a, const char* b) { return osdep::StringExactCompare(a, b); }
inline int ExactCompare(const unsigned char* a, const unsigned char* b) {
  return Utf8StringExactCompare(a, b);
}

// First position from `pos` on whose being one of `set` equals `wanted`.
template <class S>
uint32_t ScanForward(const S& text, const S& set, uint32_t pos, bool wanted) {
  for (; pos < text.length(); ++pos) {
    if ((set.find(text[pos], 0) != S::npos) == wanted) return pos;
  }
  return S::npos;
}

// The same, downward from the smaller of `pos` and the last position.
template <class S>
uint32_t ScanBackward(const S& text, const S& set, uint32_t pos, bool wanted) {
  if (text.empty()) return S::npos;
  for (uint32_t i = std::min(text.length() - 1, pos) + 1; i-- > 0;) {
    if ((set.find(text[i], 0) != S::npos) == wanted) return i;
  }
  return S::npos;
}

}  // namespace string_detail

template <class T, class O, class E>
bool StringBase<T, O, E>::hasEmbeddedNull() const noexcept {
  return find(T(), 0) != npos;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::find(T c, size_type pos) const -> size_type {
  if (pos >= length()) return npos;
  const T* const hit = string_detail::FindChar(m_begin + pos, c, length() - pos);
  return hit ? static_cast<size_type>(hit - m_begin) : npos;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::find(const StringBase& s, size_type pos) const -> size_type {
  if (pos >= length()) return npos;
  if (s.empty()) return pos;
  if (s.length() > length()) return npos;
  const size_type last = length() - s.length();
  while (pos <= last) {
    const T* const hit = string_detail::FindChar(m_begin + pos, s[0], last - pos + 1);
    if (!hit) return npos;
    if (string_detail::SameChars(hit, s.m_begin, s.length())) {
      return static_cast<size_type>(hit - m_begin);
    }
    pos = static_cast<size_type>(hit - m_begin) + 1;
  }
  return npos;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::rfind(T c, size_type pos) const -> size_type {
  if (empty()) return npos;
  for (size_type i = std::min(pos, length() - 1) + 1; i-- > 0;) {
    if (m_begin[i] == c) return i;
  }
  return npos;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::rfind(const StringBase& s, size_type pos) const -> size_type {
  if (s.length() > length()) return npos;
  for (size_type i = std::min(length() - s.length(), pos) + 1; i-- > 0;) {
    if (string_detail::SameChars(m_begin + i, s.m_begin, s.length())) return i;
  }
  return npos;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::find_first_of(const StringBase& s, size_type pos) const -> size_type {
  return string_detail::ScanForward(*this, s, pos, true);
}

template <class T, class O, class E>
auto StringBase<T, O, E>::find_first_not_of(const StringBase& s, size_type pos) const -> size_type {
  return string_detail::ScanForward(*this, s, pos, false);
}

template <class T, class O, class E>
auto StringBase<T, O, E>::find_last_of(T c, size_type pos) const -> size_type {
  return find_last_of(StringBase(1, c), pos);
}

template <class T, class O, class E>
auto StringBase<T, O, E>::find_last_of(const StringBase& s, size_type pos) const -> size_type {
  return string_detail::ScanBackward(*this, s, pos, true);
}

template <class T, class O, class E>
auto StringBase<T, O, E>::find_last_not_of(T c, size_type pos) const -> size_type {
  return find_last_not_of(StringBase(1, c), pos);
}

template <class T, class O, class E>
auto StringBase<T, O, E>::find_last_not_of(const StringBase& s, size_type pos) const -> size_type {
  return string_detail::ScanBackward(*this, s, pos, false);
}

template <class T, class O, class E>
int StringBase<T, O, E>::compare(const T* s) const {
  return string_detail::CaseCompare(m_begin, s);
}

template <class T, class O, class E>
int StringBase<T, O, E>::compare(size_type pos, size_type n, const T* s, size_type n2) const {
  const StringBase other = n2 == npos ? StringBase(s) : StringBase(s, n2);
  return substr(pos, n).compare(other);
}

template <class T, class O, class E>
int StringBase<T, O, E>::exactCompare(const T* s) const {
  return string_detail::ExactCompare(m_begin, s);
}

// Compares on the side that holds every character of both: a locale or ASCII string goes wide.
template <class T, class O, class E>
int StringBase<T, O, E>::compareOther(const O* s) const {
  if constexpr (kIsWide || kIsUtf8) {
    return compare(StringBase(s));
  } else if constexpr (kIsAscii) {
    return String(nullptr, *this).compare(s);
  } else {
    return String(*this).compare(s);
  }
}

}  // namespace zt::fnd

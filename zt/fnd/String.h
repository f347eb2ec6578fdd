#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "zt/fnd/Relocatable.h"
#include "zt/fnd/StringFwd.h"

namespace zt::fnd {

// What a string does with its block after it became shorter.
enum class BufferStrategy : int32_t {
  Keep = 0,     // the capacity stays
  Release = 1,  // a block used to less than half is cut to the exact size
};

// The tagged conversions: which string is built from which.
template <class To, class From>
inline constexpr bool kConvertsByTag = false;
template <>
inline constexpr bool kConvertsByTag<Utf8String, String> = true;
template <>
inline constexpr bool kConvertsByTag<String, Utf8String> = true;
template <>
inline constexpr bool kConvertsByTag<AsciiString, String> = true;
template <>
inline constexpr bool kConvertsByTag<String, AsciiString> = true;
template <>
inline constexpr bool kConvertsByTag<Utf8String, AsciiString> = true;  // copies the bytes

// Text of 32-bit length in one heap block of its own.
//
// The block comes from DLLMalloc and goes back by DLLFree, so that a string may be made in one
// module and destroyed in another. There is no sharing and no small buffer: three pointers, one
// block. The block always holds one character more than capacity(), for the terminator.
//
// Case: compare() and the operators ==, != and < ignore case, under the host's C locale; ordered
// containers keyed by a string therefore fold. exactCompare() and every search see case. Comparison
// works on terminated text and stops at the first embedded zero; everything else is by length.
//
// Conversion: a string is built from, assigned from and appended from its other character type, by
// the encoding that its template arguments select. Text that the encoding cannot hold becomes "?";
// malformed UTF-8 raises InvalidSequence.
//
// Null pointers count as empty text. Throws OutOfRange where a length or byte count passes 32 bits,
// OutOfRange2 "String offset out of range" where an operation checks its position, std::bad_alloc.
// A failed operation leaves the string valid, and unchanged unless said otherwise.
// Threads: a plain value.
template <class T, class Other, class Encoding>
class StringBase {
  static constexpr bool kIsWide = std::is_same_v<T, wchar_t>;
  static constexpr bool kIsUtf8 = std::is_same_v<T, unsigned char>;
  static constexpr bool kIsAscii = std::is_same_v<T, char> && std::is_same_v<Encoding, char>;

 public:
  using value_type = T;
  using size_type = uint32_t;
  using iterator = T*;
  using const_iterator = const T*;
  // The string type that converts without a tag.
  using Partner = std::conditional_t<kIsWide, AnsiString, String>;

  // "not found", and "up to the end".
  static constexpr size_type npos = 0xFFFFFFFFu;

  StringBase();
  StringBase(const T* s);
  StringBase(const T* s, size_type n);
  StringBase(const T* first, const T* last);
  // n times the character.
  StringBase(size_type n, T c);
  StringBase(const StringBase& other);  // capacity equals length
  StringBase(StringBase&& other);  // leaves `other` empty; allocates, as no string lacks a block
  StringBase(const StringBase& other, size_type pos, size_type n);  // checks pos, cuts n
  StringBase(const StringBase& a, const StringBase& b);             // concatenation, one allocation

  // Conversion. The capacity is the upper bound of the conversion and can exceed the length.
  StringBase(const Other* s);
  StringBase(const Other* s, size_type n);
  StringBase(const Other* first, const Other* last);
  StringBase(const Partner& other);

  // Conversion between encodings. The first argument is ignored: it only selects the overload.
  template <class From>
  requires kConvertsByTag<StringBase, From> StringBase(const void*, const From& other) {
    convertFrom(other);
  }

  ~StringBase();

  // Access. Pointers stay good until the next change of the string.
  const T* c_str() const noexcept { return m_begin; }
  // Writing through a pointer or [] changes characters only; a zero written there does not shorten
  // the text.
  T* begin() noexcept { return m_begin; }
  const T* begin() const noexcept { return m_begin; }
  T* end() noexcept { return m_end; }
  const T* end() const noexcept { return m_end; }
  T& operator[](size_type i) noexcept { return m_begin[i]; }  // not checked
  const T& operator[](size_type i) const noexcept { return m_begin[i]; }
  size_type length() const noexcept { return static_cast<size_type>(m_end - m_begin); }
  size_type size() const noexcept { return length(); }
  size_type capacity() const noexcept { return static_cast<size_type>(m_capacityEnd - m_begin); }
  bool empty() const noexcept { return m_begin == m_end; }
  // True if a zero comes before the end: comparison then sees a part of the text only.
  bool hasEmbeddedNull() const noexcept;
  // Kept for callers; nothing is left to check.
  void checkInvariants() const noexcept {}

  // Assignment. Keeps the block when the capacity is at least n and at most 2n, else cuts or grows
  // it to exactly n. A text that starts at begin() is taken to be the string itself: nothing
  // happens. From `Other`: the new block is complete before the old one goes.
  StringBase& assign(const T* s, size_type n);
  StringBase& assign(const Other* s, size_type n);
  StringBase& operator=(const StringBase& other);
  StringBase& operator=(StringBase&& other) noexcept;  // swaps
  StringBase& operator=(const T* s);
  StringBase& operator=(const Other* s);

  // Growth. Without space the capacity becomes twice the new length, or exactly the new length
  // where doubling is impossible. A string may be appended to itself. With `pos`: takes min(n,
  // s.length()) characters from `pos` on, which is not checked; what lies beyond the end of `s` is
  // taken as zeros.
  StringBase& append(const StringBase& s);
  StringBase& append(const StringBase& s, size_type pos, size_type n);
  StringBase& append(const T* s);
  StringBase& append(const T* s, size_type n);
  StringBase& append(size_type n, T c);
  StringBase& append(const Partner& s);
  StringBase& append(const Partner& s, size_type pos, size_type n);
  StringBase& append(const Other* s);
  StringBase& append(const Other* s, size_type n);
  StringBase& operator+=(T c);
  StringBase& operator+=(const T* s) { return append(s); }
  StringBase& operator+=(const StringBase& s) { return append(s); }
  StringBase& operator+=(const Other* s) { return append(s); }
  StringBase& operator+=(const Partner& s) { return append(s); }
  // Makes the capacity at least n; never shrinks.
  void reserve(size_type n);

  // Editing. erase() and replace() check their positions and cut their counts. The pointer form of
  // erase() returns the erased place in the block, which may have moved. If only giving memory back
  // fails, the text is already edited when std::bad_alloc leaves.
  StringBase& erase(size_type pos = 0, size_type n = npos,
                    BufferStrategy strategy = BufferStrategy::Release);
  template <std::same_as<T*> P>  // not for a literal 0, which means a position
  T* erase(P first, P last, BufferStrategy strategy = BufferStrategy::Release) {
    const size_type pos = static_cast<size_type>(first - m_begin);
    erase(pos, static_cast<size_type>(last - first), strategy);
    return m_begin + pos;
  }
  void resize(size_type n, T c = T(), BufferStrategy strategy = BufferStrategy::Release);
  // Throws BoundExceeded2 "Resulting string too large".
  StringBase& replace(size_type pos, size_type n, const StringBase& s);
  StringBase& replace(size_type pos, size_type n, const StringBase& s, size_type pos2,
                      size_type n2);
  // Exchanges the blocks: pointers into a text follow it.
  void swap(StringBase& other) noexcept;
  // The position is not checked (beyond the end: empty); pos + n past 32 bits raises OutOfRange.
  StringBase substr(size_type pos = 0, size_type n = npos) const;
  // Copies at most n characters from `pos` on, without terminator; returns how many. Checks pos.
  size_type copy(T* dest, size_type n, size_type pos = 0) const;

  // Search, exact. The forward searches find nothing from a position at or beyond the end, not even
  // the empty pattern.
  // Each gives a position from 0, or npos.
  size_type find(T c, size_type pos = 0) const;
  size_type find(const StringBase& s, size_type pos = 0) const;
  size_type rfind(T c, size_type pos = npos) const;
  size_type rfind(const StringBase& s, size_type pos = npos) const;
  size_type find_first_of(const StringBase& s, size_type pos = 0) const;
  size_type find_first_not_of(const StringBase& s, size_type pos = 0) const;
  size_type find_last_of(T c, size_type pos = npos) const;
  size_type find_last_of(const StringBase& s, size_type pos = npos) const;
  size_type find_last_not_of(T c, size_type pos = npos) const;
  size_type find_last_not_of(const StringBase& s, size_type pos = npos) const;

  // Comparison: below 0, 0, above 0. A Utf8String can raise InvalidSequence.
  int compare(const StringBase& s) const { return compare(s.c_str()); }
  int compare(const T* s) const;
  int compare(size_type pos, size_type n, const T* s, size_type n2 = npos) const;
  int exactCompare(const StringBase& s) const { return exactCompare(s.c_str()); }
  int exactCompare(const T* s) const;

  // Wire form: a 32-bit little-endian length, then the text. String and Utf8String write UTF-8
  // without terminator; the locale and ASCII strings write their bytes with the terminator, which
  // the length counts. The size is 0xFFFFFFFF where it does not fit 32 bits.
  // Throws BufferOverflow (no space below limit) or DeserializationError (truncated, unterminated);
  // the cursor and the string are then unchanged.
  size_type serializationSize() const;
  void serialize(unsigned char*& cursor, const unsigned char* limit) const;
  void deserialize(const unsigned char*& cursor, const unsigned char* limit);

  friend bool operator==(const StringBase& a, const StringBase& b) { return a.compare(b) == 0; }
  friend bool operator==(const StringBase& a, const T* b) { return a.compare(b) == 0; }
  friend bool operator==(const StringBase& a, const Other* b) { return a.compareOther(b) == 0; }
  friend bool operator!=(const StringBase& a, const StringBase& b) { return a.compare(b) != 0; }
  friend bool operator!=(const StringBase& a, const T* b) { return a.compare(b) != 0; }
  friend bool operator!=(const StringBase& a, const Other* b) { return a.compareOther(b) != 0; }
  friend bool operator<(const StringBase& a, const StringBase& b) { return a.compare(b) < 0; }
  friend bool operator<(const StringBase& a, const T* b) { return a.compare(b) < 0; }
  friend bool operator<(const StringBase& a, const Other* b) { return a.compareOther(b) < 0; }
  friend bool operator<(const T* a, const StringBase& b) { return b.compare(a) > 0; }
  friend bool operator<(const Other* a, const StringBase& b) { return b.compareOther(a) > 0; }
  friend bool operator>(const StringBase& a, const T* b) requires kIsUtf8 {
    return a.compare(b) > 0;
  }

  // A new string; the second operand is converted where it is of the other kind.
  friend StringBase operator+(const StringBase& a, const StringBase& b) { return StringBase(a, b); }
  friend StringBase operator+(const StringBase& a, const T* b) { return concatenate(a, b); }
  friend StringBase operator+(const StringBase& a, T b) { return concatenate(a, b); }
  friend StringBase operator+(const StringBase& a, const Other* b) { return concatenate(a, b); }
  friend StringBase operator+(const StringBase& a, const Partner& b) { return concatenate(a, b); }

  friend void swap(StringBase& a, StringBase& b) noexcept { a.swap(b); }

 private:
  template <class Codec, class C>
  void construct(const C* first, const C* last);
  template <class From>
  void convertFrom(const From& other);
  void construct(const T* s, size_type n);
  int compareOther(const Other* s) const;
  void grow(size_type required);
  void makeRoom(size_type more);
  void fitBuffer(size_type n);
  void checkOffset(size_type pos) const;
  void setLength(size_type n) noexcept;
  template <class U>
  static StringBase concatenate(const StringBase& a, U&& b) {
    StringBase result(a);
    result += b;
    return result;
  }

  T* m_begin;
  T* m_end;
  T* m_capacityEnd;
};

template <class T, class Other, class Encoding>
inline StringBase<T, Other, Encoding>& StringBase<T, Other, Encoding>::operator+=(T c) {
  if (m_end == m_capacityEnd) makeRoom(1);
  *m_end = c;
  *++m_end = T();
  return *this;
}

extern template class StringBase<wchar_t, char, wchar_t>;
extern template class StringBase<char, wchar_t, wchar_t>;
extern template class StringBase<char, wchar_t, char>;
extern template class StringBase<unsigned char, wchar_t, wchar_t>;

// A wide and a locale string compare on the wide side, which holds every character of both.
inline bool operator==(const String& a, const AnsiString& b) { return a.compare(b) == 0; }
inline bool operator==(const AnsiString& a, const String& b) { return b.compare(a) == 0; }
inline bool operator!=(const String& a, const AnsiString& b) { return a.compare(b) != 0; }
inline bool operator!=(const AnsiString& a, const String& b) { return b.compare(a) != 0; }
inline bool operator<(const String& a, const AnsiString& b) { return a.compare(b) < 0; }
inline bool operator<(const AnsiString& a, const String& b) { return b.compare(a) > 0; }

template <class T, class Other, class Encoding>
inline constexpr bool kIsRelocatable<StringBase<T, Other, Encoding>> = true;

static_assert(sizeof(String) == 3 * sizeof(void*), "a string is three pointers");

}  // namespace zt::fnd

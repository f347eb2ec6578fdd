#pragma once

// Bodies of the string template: blocks, construction, assignment, growth, editing. Only
// StringBase.cpp, which instantiates the four strings, and its tests include this.

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <cwchar>
#include <functional>
#include <utility>

#include "zt/fnd/DLLAlloc.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/NumericCast.h"
#include "zt/fnd/SafeInteger.h"
#include "zt/fnd/String.h"
#include "zt/fnd/StringCodec.h"

namespace zt::fnd {
namespace string_detail {

inline constexpr uint64_t kMax32 = 0xFFFFFFFFu;

// Bytes of a block for n characters and the terminator.
template <class T>
uint32_t BlockBytes(uint32_t n) {
  const uint64_t bytes = (static_cast<uint64_t>(n) + 1) * sizeof(T);
  if (n == kMax32 || bytes > kMax32) ZT_RAISE(exception::OutOfRange());
  return static_cast<uint32_t>(bytes);
}

inline uint32_t Sum(uint32_t a, uint32_t b) { return SafeInteger<uint32_t>::Add(a, b); }

// Characters of a range; a null or reversed one is judged here for all callers.
template <class C>
uint32_t RangeLength(const C* first, const C* last) {
  return first ? NumericCast<uint32_t>(last - first) : 0;
}

inline size_t RawLength(const wchar_t* s) { return wcslen(s); }
inline size_t RawLength(const char* s) { return strlen(s); }
inline size_t RawLength(const unsigned char* s) { return strlen(reinterpret_cast<const char*>(s)); }

template <class C>
uint32_t TextLength(const C* s) {
  return s ? NumericCast<uint32_t>(RawLength(s)) : 0;
}

// A fresh block of n characters and the terminator; goes back unless released.
template <class T>
class Block {
 public:
  explicit Block(uint32_t n) : m_p(static_cast<T*>(DLLMalloc(BlockBytes<T>(n)))) {}
  ~Block() { DLLFree(m_p); }
  Block(const Block&) = delete;
  Block& operator=(const Block&) = delete;
  T* get() const { return m_p; }
  T* release() { return std::exchange(m_p, nullptr); }

 private:
  T* m_p;
};

// Keeps the block for a new length n when its capacity is at least n and at most 2n; otherwise
// reallocates to exactly n. Nothing has changed when it throws.
template <class T>
void ReallocBuffer(T*& begin, T*& capacityEnd, uint32_t n) {
  const uint64_t capacity = static_cast<uint64_t>(capacityEnd - begin);
  if (capacity >= n && capacity <= 2 * static_cast<uint64_t>(n)) return;
  begin = static_cast<T*>(DLLRealloc(begin, BlockBytes<T>(n)));
  capacityEnd = begin + n;
}

// Twice the required length where memory allows, otherwise the required length alone, so that
// an append fails only if its result cannot be. Nothing has changed when it throws.
template <class T>
void Grow(uint32_t required, T*& begin, T*& end, T*& capacityEnd) {
  const ptrdiff_t length = end - begin;
  uint64_t capacity = 2 * static_cast<uint64_t>(required);
  const uint64_t bytes = (capacity + 1) * sizeof(T);
  void* block = nullptr;
  if (bytes <= kMax32) block = DLLReallocNoThrow(begin, static_cast<uint32_t>(bytes));
  if (!block) {
    capacity = required;
    block = DLLRealloc(begin, BlockBytes<T>(required));
  }
  begin = static_cast<T*>(block);
  end = begin + length;
  capacityEnd = begin + capacity;
}

template <class T>
void CopyChars(T* dest, const T* src, uint32_t n) {
  if (n != 0) memcpy(dest, src, static_cast<size_t>(n) * sizeof(T));
}

template <class T>
void MoveChars(T* dest, const T* src, uint32_t n) {
  if (n != 0) memmove(dest, src, static_cast<size_t>(n) * sizeof(T));
}

// Where s lies inside [begin, end], as an offset; -1 if it does not.
template <class T>
ptrdiff_t OffsetWithin(const T* s, const T* begin, const T* end) {
  const std::less<const T*> before;
  return before(s, begin) || before(end, s) ? -1 : s - begin;
}

}  // namespace string_detail

// ---- construction

template <class T, class O, class E>
void StringBase<T, O, E>::construct(const T* s, size_type n) {
  if (!s) n = 0;
  string_detail::Block<T> block(n);
  string_detail::CopyChars(block.get(), s, n);
  m_begin = block.release();
  m_capacityEnd = m_begin + n;
  setLength(n);
}

// Converts in one pass into a block of the upper bound; the length is what came out.
template <class T, class O, class E>
template <class Codec, class C>
void StringBase<T, O, E>::construct(const C* first, const C* last) {
  if (string_detail::RangeLength(first, last) == 0) return construct(nullptr, 0);
  const size_type required = Codec::requiredLength(first, last);
  string_detail::Block<T> block(required);
  T* const stop = Codec::convert(first, last, block.get(), block.get() + required);
  const size_type n = static_cast<size_type>(stop - block.get());
  m_begin = block.release();
  m_capacityEnd = m_begin + required;
  setLength(n);
}

template <class T, class O, class E>
StringBase<T, O, E>::StringBase() {
  construct(nullptr, 0);
}
template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const T* s) {
  construct(s, string_detail::TextLength(s));
}
template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const T* s, size_type n) {
  construct(s, n);
}
template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const T* first, const T* last) {
  construct(first, string_detail::RangeLength(first, last));
}

template <class T, class O, class E>
StringBase<T, O, E>::StringBase(size_type n, T c) {
  string_detail::Block<T> block(n);
  std::fill_n(block.get(), n, c);
  m_begin = block.release();
  m_capacityEnd = m_begin + n;
  setLength(n);
}

template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const StringBase& other) {
  construct(other.m_begin, other.length());
}
template <class T, class O, class E>
StringBase<T, O, E>::StringBase(StringBase&& other) : StringBase() {
  swap(other);
}

template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const StringBase& other, size_type pos, size_type n) {
  other.checkOffset(pos);
  construct(other.m_begin + pos, std::min(n, other.length() - pos));
}

template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const StringBase& a, const StringBase& b) {
  const size_type n = string_detail::Sum(a.length(), b.length());
  string_detail::Block<T> block(n);
  string_detail::CopyChars(block.get(), a.m_begin, a.length());
  string_detail::CopyChars(block.get() + a.length(), b.m_begin, b.length());
  m_begin = block.release();
  m_capacityEnd = m_begin + n;
  setLength(n);
}

template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const O* s) : StringBase(s, string_detail::TextLength(s)) {}
template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const O* s, size_type n) {
  construct<StringCodec<StringBase, Partner>>(s, s ? s + n : s);
}
template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const O* first, const O* last) {
  construct<StringCodec<StringBase, Partner>>(first, last);
}
template <class T, class O, class E>
StringBase<T, O, E>::StringBase(const Partner& other) : StringBase(other.begin(), other.end()) {}

template <class T, class O, class E>
template <class From>
void StringBase<T, O, E>::convertFrom(const From& other) {
  construct<StringCodec<StringBase, From>>(other.begin(), other.end());
}

template <class T, class O, class E>
StringBase<T, O, E>::~StringBase() {
  DLLFree(m_begin);
}

// ---- private helpers

template <class T, class O, class E>
void StringBase<T, O, E>::setLength(size_type n) noexcept {
  m_end = m_begin + n;
  *m_end = T();
}

template <class T, class O, class E>
void StringBase<T, O, E>::checkOffset(size_type pos) const {
  if (pos > length()) ZT_RAISE(exception::OutOfRange2("String offset out of range"));
}

template <class T, class O, class E>
void StringBase<T, O, E>::grow(size_type required) {
  string_detail::Grow(required, m_begin, m_end, m_capacityEnd);
}

template <class T, class O, class E>
void StringBase<T, O, E>::makeRoom(size_type more) {
  const size_type required = string_detail::Sum(length(), more);
  if (required > capacity()) grow(required);
}

// Applies the buffer rule for a length of n; a longer text is cut to n.
template <class T, class O, class E>
void StringBase<T, O, E>::fitBuffer(size_type n) {
  const size_type kept = std::min(length(), n);
  string_detail::ReallocBuffer(m_begin, m_capacityEnd, n);
  setLength(kept);
}

// ---- assignment

template <class T, class O, class E>
auto StringBase<T, O, E>::assign(const T* s, size_type n) -> StringBase& {
  if (s == m_begin) return *this;
  if (!s) n = 0;
  if (string_detail::OffsetWithin<T>(s, m_begin, m_end) >= 0) {
    // A part of the string itself: it moves down before the block may go.
    string_detail::MoveChars(m_begin, s, n);
    setLength(n);
    fitBuffer(n);
    return *this;
  }
  fitBuffer(n);
  string_detail::CopyChars(m_begin, s, n);
  setLength(n);
  return *this;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::assign(const O* s, size_type n) -> StringBase& {
  StringBase(s, n).swap(*this);
  return *this;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::operator=(const StringBase& other) -> StringBase& {
  return assign(other.m_begin, other.length());
}

template <class T, class O, class E>
auto StringBase<T, O, E>::operator=(StringBase&& other) noexcept -> StringBase& {
  swap(other);
  return *this;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::operator=(const T* s) -> StringBase& {
  return assign(s, string_detail::TextLength(s));
}

template <class T, class O, class E>
auto StringBase<T, O, E>::operator=(const O* s) -> StringBase& {
  return assign(s, string_detail::TextLength(s));
}

// ---- growth

template <class T, class O, class E>
auto StringBase<T, O, E>::append(const StringBase& s) -> StringBase& {
  return append(s.m_begin, s.length());
}

template <class T, class O, class E>
auto StringBase<T, O, E>::append(const StringBase& s, size_type pos, size_type n) -> StringBase& {
  n = std::min(n, s.length());
  const size_type there = pos < s.length() ? std::min(n, s.length() - pos) : 0;
  makeRoom(n);  // for both halves, so that neither can fail alone
  append(s.m_begin + (there == 0 ? 0 : pos), there);
  return append(n - there, T());
}

template <class T, class O, class E>
auto StringBase<T, O, E>::append(const T* s) -> StringBase& {
  return append(s, string_detail::TextLength(s));
}

template <class T, class O, class E>
auto StringBase<T, O, E>::append(const T* s, size_type n) -> StringBase& {
  if (!s || n == 0) return *this;
  const ptrdiff_t own = string_detail::OffsetWithin<T>(s, m_begin, m_end);
  makeRoom(n);
  if (own >= 0) s = m_begin + own;  // the block may have moved
  string_detail::MoveChars(m_end, s, n);
  setLength(length() + n);
  return *this;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::append(size_type n, T c) -> StringBase& {
  if (n == 0) return *this;
  makeRoom(n);
  std::fill_n(m_end, n, c);
  setLength(length() + n);
  return *this;
}

template <class T, class O, class E>
auto StringBase<T, O, E>::append(const Partner& s) -> StringBase& {
  return append(s.begin(), s.length());
}

template <class T, class O, class E>
auto StringBase<T, O, E>::append(const Partner& s, size_type pos, size_type n) -> StringBase& {
  n = std::min(n, s.length());
  if (pos <= s.length() - n) return append(s.begin() + pos, n);
  Partner padded;
  padded.append(s, pos, n);
  return append(padded);
}

template <class T, class O, class E>
auto StringBase<T, O, E>::append(const O* s) -> StringBase& {
  return append(s, string_detail::TextLength(s));
}

// Converts straight into the tail. A conversion that raises has written there, so the old end gets
// its terminator back.
template <class T, class O, class E>
auto StringBase<T, O, E>::append(const O* s, size_type n) -> StringBase& {
  if (!s || n == 0) return *this;
  using Codec = StringCodec<StringBase, Partner>;
  makeRoom(Codec::requiredLength(s, s + n));
  try {
    m_end = Codec::convert(s, s + n, m_end, m_capacityEnd);
  } catch (...) {
    *m_end = T();
    throw;
  }
  *m_end = T();
  return *this;
}

template <class T, class O, class E>
void StringBase<T, O, E>::reserve(size_type n) {
  if (n <= capacity()) return;
  const size_type size = length();
  m_begin = static_cast<T*>(DLLRealloc(m_begin, string_detail::BlockBytes<T>(n)));
  m_end = m_begin + size;
  m_capacityEnd = m_begin + n;
}

// ---- editing

template <class T, class O, class E>
auto StringBase<T, O, E>::erase(size_type pos, size_type n, BufferStrategy strategy)
    -> StringBase& {
  checkOffset(pos);
  n = std::min(n, length() - pos);
  string_detail::MoveChars(m_begin + pos, m_begin + pos + n, length() - pos - n);
  setLength(length() - n);
  if (strategy == BufferStrategy::Release) fitBuffer(length());
  return *this;
}

template <class T, class O, class E>
void StringBase<T, O, E>::resize(size_type n, T c, BufferStrategy strategy) {
  if (n > length()) {
    append(n - length(), c);
  } else if (n < length()) {
    erase(n, npos, strategy);
  }
}

template <class T, class O, class E>
auto StringBase<T, O, E>::replace(size_type pos, size_type n, const StringBase& s) -> StringBase& {
  return replace(pos, n, s, 0, npos);
}

template <class T, class O, class E>
auto StringBase<T, O, E>::replace(size_type pos, size_type n, const StringBase& s, size_type pos2,
                                  size_type n2) -> StringBase& {
  checkOffset(pos);
  s.checkOffset(pos2);
  if (&s == this) return replace(pos, n, StringBase(s), pos2, n2);
  n = std::min(n, length() - pos);
  n2 = std::min(n2, s.length() - pos2);
  const uint64_t total = static_cast<uint64_t>(length() - n) + n2;
  if (total >= npos) ZT_RAISE(exception::BoundExceeded2("Resulting string too large"));
  const size_type size = static_cast<size_type>(total);
  const size_type tail = length() - pos - n;
  if (n2 > n) fitBuffer(size);
  string_detail::MoveChars(m_begin + pos + n2, m_begin + pos + n, tail);
  string_detail::CopyChars(m_begin + pos, s.m_begin + pos2, n2);
  setLength(size);
  if (n2 <= n) fitBuffer(size);
  return *this;
}

template <class T, class O, class E>
void StringBase<T, O, E>::swap(StringBase& other) noexcept {
  std::swap(m_begin, other.m_begin);
  std::swap(m_end, other.m_end);
  std::swap(m_capacityEnd, other.m_capacityEnd);
}

template <class T, class O, class E>
auto StringBase<T, O, E>::substr(size_type pos, size_type n) const -> StringBase {
  if (n != npos) string_detail::Sum(pos, n);
  return StringBase(*this, std::min(pos, length()), n);
}

template <class T, class O, class E>
auto StringBase<T, O, E>::copy(T* dest, size_type n, size_type pos) const -> size_type {
  checkOffset(pos);
  n = std::min(n, length() - pos);
  string_detail::CopyChars(dest, m_begin + pos, n);
  return n;
}

}  // namespace zt::fnd

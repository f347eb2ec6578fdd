#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>
#include <utility>

#include "zt/fnd/DLLAlloc.h"
#include "zt/fnd/Relocatable.h"
#include "zt/fnd/SafeInteger.h"

namespace zt::fnd {

// Growable array in one block from DLLMalloc; 32-bit size.
//
// Without space the capacity c becomes 2c + 1 (or c + 1 with c's top bit set). A copy has a
// capacity equal to its size. Throws OutOfRange where a capacity or its byte size passes 32 bits,
// std::bad_alloc, and what copying an element throws; a failed call changes nothing. Threads: a
// plain value.
template <class T>
class Vector {
  static_assert(alignof(T) <= alignof(std::max_align_t), "the block is aligned as malloc aligns");

 public:
  using value_type = T;
  using iterator = T*;
  using const_iterator = const T*;

  // Empty, without a block. A move leaves the source as that.
  Vector() noexcept = default;
  Vector(const Vector& other);
  Vector(Vector&& other) noexcept { swap(other); }
  Vector& operator=(Vector other) noexcept {
    swap(other);
    return *this;
  }
  ~Vector() { clear(); }

  // Access; begin() and end() are null without a block. Pointers stay good until the next
  // push_back, swap or clear.
  T* begin() noexcept { return m_begin; }
  const T* begin() const noexcept { return m_begin; }
  T* end() noexcept { return m_end; }
  const T* end() const noexcept { return m_end; }
  uint32_t size() const noexcept { return static_cast<uint32_t>(m_end - m_begin); }
  uint32_t capacity() const noexcept { return static_cast<uint32_t>(m_capacityEnd - m_begin); }
  bool empty() const noexcept { return m_begin == m_end; }
  T& operator[](unsigned int i) noexcept { return m_begin[i]; }  // not checked
  const T& operator[](unsigned int i) const noexcept { return m_begin[i]; }

  // Appends a copy. `value` may be an element of this array.
  void push_back(const T& value) { emplace_back(value); }
  // Appends an element made of the arguments, which may refer to elements of this array.
  template <class... Arguments>
  void emplace_back(Arguments&&... arguments);

  // Exchanges the blocks; pointers to elements stay good and follow them.
  void swap(Vector& other) noexcept {
    std::swap(m_begin, other.m_begin);
    std::swap(m_end, other.m_end);
    std::swap(m_capacityEnd, other.m_capacityEnd);
  }

  // Destroys the elements and frees the block.
  void clear() noexcept;

 private:
  // Throws OutOfRange.
  uint32_t calculateNewCapacity() const;

  T* m_begin = nullptr;
  T* m_end = nullptr;
  T* m_capacityEnd = nullptr;
};

namespace vector_detail {

// The capacity that follows c. Throws OutOfRange.
inline uint32_t NextCapacity(uint32_t c) {
  bool overflow;
  SafeInteger<uint32_t> doubled(c);
  doubled.multiplyByTwoNoThrow(overflow);
  uint32_t next = doubled.get() + 1;
  if (next == 0xFFFFFFFFu || next < c) ZT_RAISE(exception::OutOfRange());
  return next;
}

// A raw block under construction: owns the memory and the elements built in it so far.
template <class T>
class Builder {
 public:
  explicit Builder(uint32_t capacity)
      : m_begin(static_cast<T*>(
            DLLMalloc(SafeInteger<uint32_t>::Multiply(capacity, NarrowSize(sizeof(T)))))),
        m_end(m_begin) {}
  ~Builder() {
    std::destroy(m_begin, m_end);
    DLLFree(m_begin);
  }
  Builder(const Builder&) = delete;
  Builder& operator=(const Builder&) = delete;

  // The element counts as built only when it is complete.
  template <class... Arguments>
  void add(Arguments&&... arguments) {
    ::new (static_cast<void*>(m_end)) T(std::forward<Arguments>(arguments)...);
    ++m_end;
  }

  // Moves the elements, as bytes, to `to`.
  void relocateTo(T* to) noexcept {
    const size_t count = static_cast<size_t>(m_end - m_begin);
    memcpy(static_cast<void*>(to), static_cast<const void*>(m_begin), count * sizeof(T));
    m_end = m_begin;
  }

  // Exchanges the block with another one; its old elements go with the builder.
  void exchange(T*& begin, T*& end) noexcept {
    std::swap(m_begin, begin);
    std::swap(m_end, end);
  }

 private:
  static constexpr uint32_t NarrowSize(size_t size) { return static_cast<uint32_t>(size); }

  T* m_begin;
  T* m_end;
};

}  // namespace vector_detail

template <class T>
Vector<T>::Vector(const Vector& other) {
  if (other.empty()) return;
  // Complete before it becomes this vector's: an element whose copy throws takes the whole block
  // with it.
  vector_detail::Builder<T> block(other.size());
  for (const T& value : other) block.add(value);
  block.exchange(m_begin, m_end);
  m_capacityEnd = m_end;
}

template <class T>
uint32_t Vector<T>::calculateNewCapacity() const {
  return vector_detail::NextCapacity(capacity());
}

template <class T>
template <class... Arguments>
void Vector<T>::emplace_back(Arguments&&... arguments) {
  if (m_end != m_capacityEnd) {
    ::new (static_cast<void*>(m_end)) T(std::forward<Arguments>(arguments)...);
    ++m_end;
    return;
  }
  const uint32_t newCapacity = calculateNewCapacity();
  if constexpr (kIsRelocatable<T>) {
    // Before the block moves, as the arguments may lie in it.
    vector_detail::Builder<T> last(1);
    last.add(std::forward<Arguments>(arguments)...);
    const uint32_t oldSize = size();
    const auto bytes =
        SafeInteger<uint32_t>::Multiply(newCapacity, static_cast<uint32_t>(sizeof(T)));
    m_begin = static_cast<T*>(DLLRealloc(m_begin, bytes));
    m_end = m_begin + oldSize;
    last.relocateTo(m_end);
    ++m_end;
  } else {
    vector_detail::Builder<T> block(newCapacity);
    for (const T& old : *this) block.add(old);
    // Before the old block goes, as the arguments may lie in it.
    block.add(std::forward<Arguments>(arguments)...);
    block.exchange(m_begin, m_end);
  }
  m_capacityEnd = m_begin + newCapacity;
}

template <class T>
void Vector<T>::clear() noexcept {
  std::destroy(m_begin, m_end);
  DLLFree(m_begin);
  m_begin = m_end = m_capacityEnd = nullptr;
}

}  // namespace zt::fnd

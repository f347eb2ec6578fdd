#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstring>
#include <type_traits>

#include "zt/fnd/Exception.h"

// Byte order of numbers in files and wire forms. The host is little-endian, so that little-endian
// forms are plain copies, which the compiler makes one instruction. Functions of the other order
// are needed for UUIDs and for file formats that state an order. Nothing here throws but where that
// is documented. Threads: pure functions.
namespace zt::fnd {

static_assert(std::endian::native == std::endian::little, "the wire routines copy host numbers");

namespace big_endian {

// Copy n bytes in reverse order; the two ranges do not overlap.
inline void CopyToBigEndian(unsigned int n, unsigned char* dest, const unsigned char* src) {
  std::reverse_copy(src, src + n, dest);
}
inline void CopyFromBigEndian(unsigned int n, unsigned char* dest, const unsigned char* src) {
  std::reverse_copy(src, src + n, dest);
}

// The value with its bytes reversed.
template <class T>
T ToBigEndian(T value) {
  static_assert(std::is_trivially_copyable_v<T>);
  unsigned char bytes[sizeof(T)];
  memcpy(bytes, &value, sizeof value);
  std::reverse(bytes, bytes + sizeof bytes);
  memcpy(&value, bytes, sizeof value);
  return value;
}
template <class T>
T FromBigEndian(T value) {
  return ToBigEndian(value);
}

}  // namespace big_endian

namespace little_endian {

// The value as it is, for code that names the order it means.
template <class T>
T ToLittleEndian(T value) {
  return value;
}
template <class T>
T FromLittleEndian(T value) {
  return value;
}

// Writes the value at the cursor, which may be unaligned, and moves it on. Without space below
// `limit` throws BufferOverflow, with nothing written and the cursor unchanged.
template <class T>
void SerializeRaw(const T& value, unsigned char*& cursor, const unsigned char* limit) {
  static_assert(std::is_trivially_copyable_v<T>);
  if (limit - cursor < static_cast<ptrdiff_t>(sizeof(T))) throw exception::BufferOverflow();
  memcpy(cursor, &value, sizeof(T));
  cursor += sizeof(T);
}

// Reads a value from the cursor and moves it on. With too few bytes below `limit` throws
// DeserializationError; value and cursor are then unchanged.
template <class T>
void DeserializeRaw(T& value, const unsigned char*& cursor, const unsigned char* limit) {
  static_assert(std::is_trivially_copyable_v<T>);
  if (limit - cursor < static_cast<ptrdiff_t>(sizeof(T))) {
    throw exception::DeserializationError();
  }
  memcpy(&value, cursor, sizeof(T));
  cursor += sizeof(T);
}

}  // namespace little_endian
}  // namespace zt::fnd

#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstring>
#include <type_traits>

#include "zt/fnd/Exception.h"

// Byte order of numbers in files and wire forms: little-endian on every host, so that files and
// streams of all hosts are the same. A plain copy where the host is little-endian, which the
// compiler makes one instruction. Functions of the other order are needed for UUIDs and for file
// formats that state an order. Nothing here throws but where that is documented. Threads: pure
// functions.
namespace zt::fnd {

namespace byte_order_detail {

inline constexpr bool kLittleHost = std::endian::native == std::endian::little;
static_assert(kLittleHost || std::endian::native == std::endian::big);

// A number: the bytes of a structure have an order each of its own.
template <class T>
T Reversed(T value) {
  static_assert(std::is_arithmetic_v<T> || std::is_enum_v<T>);
  unsigned char bytes[sizeof(T)];
  memcpy(bytes, &value, sizeof value);
  std::reverse(bytes, bytes + sizeof bytes);
  memcpy(&value, bytes, sizeof value);
  return value;
}

}  // namespace byte_order_detail

namespace big_endian {

// Copy the n bytes of a number of the host, to or from big-endian; the two ranges do not overlap.
inline void CopyToBigEndian(unsigned int n, unsigned char* dest, const unsigned char* src) {
  if constexpr (byte_order_detail::kLittleHost) {
    std::reverse_copy(src, src + n, dest);
  } else {
    std::copy(src, src + n, dest);
  }
}
inline void CopyFromBigEndian(unsigned int n, unsigned char* dest, const unsigned char* src) {
  CopyToBigEndian(n, dest, src);
}

// The value whose bytes in memory are in big-endian order, and back.
template <class T>
T ToBigEndian(T value) {
  if constexpr (byte_order_detail::kLittleHost) return byte_order_detail::Reversed(value);
  return value;
}
template <class T>
T FromBigEndian(T value) {
  return ToBigEndian(value);
}

}  // namespace big_endian

namespace little_endian {

// The value whose bytes in memory are in little-endian order, and back.
template <class T>
T ToLittleEndian(T value) {
  if constexpr (!byte_order_detail::kLittleHost) return byte_order_detail::Reversed(value);
  return value;
}
template <class T>
T FromLittleEndian(T value) {
  return ToLittleEndian(value);
}

// Every number of a file goes through these two, or through the cursors below. The bytes may be
// unaligned.
template <class T>
void Put(unsigned char* to, T value) {
  value = ToLittleEndian(value);
  memcpy(to, &value, sizeof value);
}
template <class T>
T Get(const unsigned char* from) {
  T value;
  memcpy(&value, from, sizeof value);
  return FromLittleEndian(value);
}

// Writes the value at the cursor, which may be unaligned, and moves it on. Without space below
// `limit` throws BufferOverflow, with nothing written and the cursor unchanged.
template <class T>
void SerializeRaw(const T& value, unsigned char*& cursor, const unsigned char* limit) {
  if (limit - cursor < static_cast<ptrdiff_t>(sizeof(T))) throw exception::BufferOverflow();
  Put(cursor, value);
  cursor += sizeof(T);
}

// Reads a value from the cursor and moves it on. With too few bytes below `limit` throws
// DeserializationError; value and cursor are then unchanged.
template <class T>
void DeserializeRaw(T& value, const unsigned char*& cursor, const unsigned char* limit) {
  if (limit - cursor < static_cast<ptrdiff_t>(sizeof(T))) {
    throw exception::DeserializationError();
  }
  value = Get<T>(cursor);
  cursor += sizeof(T);
}

}  // namespace little_endian
}  // namespace zt::fnd

#pragma once

// Bodies of the string template: the wire form. Only StringBase.cpp includes this.
//
// The bounds checks here raise without a stamp, as those of all wire forms do.

#include <cstdint>
#include <cstring>
#include <functional>

#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/Utf8ToWide.h"
#include "zt/fnd/WideToUtf8.h"

namespace zt::fnd {
namespace string_detail {

inline constexpr uint32_t kLengthField = 4;

// Bytes from the cursor to the limit; a limit before the cursor leaves none.
inline uint64_t Remaining(const unsigned char* cursor, const unsigned char* limit) {
  return std::less<>()(cursor, limit) ? static_cast<uint64_t>(limit - cursor) : 0;
}

// Reads the length field and checks that so many bytes follow. Moves the cursor past the field.
inline uint32_t TakeLength(const unsigned char*& cursor, const unsigned char* limit) {
  if (Remaining(cursor, limit) < kLengthField) throw exception::DeserializationError();
  uint32_t n = 0;
  little_endian::DeserializeRaw<uint32_t>(n, cursor, limit);
  if (n > Remaining(cursor, limit)) throw exception::DeserializationError();
  return n;
}

inline uint32_t FitOrAllOnes(uint64_t size) {
  return size > UINT32_MAX ? UINT32_MAX : static_cast<uint32_t>(size);
}

}  // namespace string_detail

template <class T, class O, class E>
auto StringBase<T, O, E>::serializationSize() const -> size_type {
  using string_detail::kLengthField;
  if constexpr (kIsWide) {
    // The limit leaves space for the length field below 32 bits.
    return kLengthField + GetUtf8EncodingBytesWithBufferLimit(m_begin, m_end, 0xFFFFFFFBu);
  } else {
    const uint64_t terminator = kIsUtf8 ? 0 : 1;
    return string_detail::FitOrAllOnes(kLengthField + terminator + length());
  }
}

// The length is written last, so that nothing has moved when the text does not fit after all.
template <class T, class O, class E>
void StringBase<T, O, E>::serialize(unsigned char*& cursor, const unsigned char* limit) const {
  using string_detail::kLengthField;
  const uint32_t size = serializationSize();
  if (size == npos || size > string_detail::Remaining(cursor, limit)) {
    throw exception::BufferOverflow();
  }
  unsigned char* const body = cursor + kLengthField;
  unsigned char* const stop = cursor + size;
  if constexpr (kIsWide) {
    WideToUtf8(m_begin, m_end, body, stop);
  } else {
    memcpy(body, m_begin, size - kLengthField);
  }
  little_endian::SerializeRaw<uint32_t>(size - kLengthField, cursor, limit);
  cursor = stop;
}

template <class T, class O, class E>
void StringBase<T, O, E>::deserialize(const unsigned char*& cursor, const unsigned char* limit) {
  const unsigned char* body = cursor;
  const uint32_t n = string_detail::TakeLength(body, limit);
  if constexpr (kIsWide) {
    const size_type count = GetUtf8StringLength(body, body + n);  // raises before anything changes
    fitBuffer(count);
    if (count != 0) Utf8ToWide(body, body + n, m_begin, m_begin + count);
    setLength(count);
  } else if constexpr (kIsUtf8) {
    assign(body, n);
  } else {
    if (n == 0 || body[n - 1] != 0) throw exception::DeserializationError();
    assign(reinterpret_cast<const T*>(body), n - 1);
  }
  cursor = body + n;
}

}  // namespace zt::fnd

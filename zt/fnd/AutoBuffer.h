#pragma once

#include <cstdint>

#include "zt/fnd/osdep/AtomicInt.h"

namespace zt::fnd {

class AutoBuffer;

// View of bytes that it does not own.
class BufferWrapper {
 public:
  BufferWrapper() noexcept : m_data(nullptr), m_length(0) {}
  BufferWrapper(const void* data, unsigned int length) noexcept
      : m_data(static_cast<const unsigned char*>(data)), m_length(length) {}
  BufferWrapper(const AutoBuffer& buffer) noexcept;

  const unsigned char* Data() const noexcept { return m_data; }
  unsigned int Len() const noexcept { return m_length; }

 private:
  const unsigned char* m_data;
  uint32_t m_length;
};

// Byte order of unsigned bytes, a prefix before the longer: -1, 0 or 1.
int CompareBuffers(const BufferWrapper& a, const BufferWrapper& b) noexcept;

// What the copies of an AutoBuffer share.
struct AutoBufferGuts {
  osdep::AtomicInt references{1};
  unsigned char* data = nullptr;
  uint32_t capacity = 0;  // bytes allocated at `data`
  unsigned char* end = nullptr;
};

// Byte buffer of 32-bit length whose copies share one block until one of them is written to.
//
// Bytes given to a writing operation may lie inside the buffer itself.
// Throws OutOfRange where a length passes 32 bits, std::bad_alloc; the buffer then keeps its bytes.
// Threads: copies that share a block may live in different threads. One object is the caller's to
// guard.
class AutoBuffer {
 public:
  AutoBuffer() noexcept : m_guts(nullptr) {}
  explicit AutoBuffer(unsigned int n);  // empty, with n bytes reserved
  AutoBuffer(const AutoBuffer& other);  // shares
  AutoBuffer(const BufferWrapper& bytes);
  ~AutoBuffer() { Free(); }
  AutoBuffer& operator=(const AutoBuffer& other);  // shares
  AutoBuffer& operator=(const BufferWrapper& bytes);

  // Null and 0 without a block. Who writes through Data() has made space by Skip() before, which
  // also unshares; the pointer is good until the next change.
  unsigned char* Data() const noexcept { return m_guts ? m_guts->data : nullptr; }
  unsigned int Len() const noexcept {
    return m_guts ? static_cast<unsigned int>(m_guts->end - m_guts->data) : 0;
  }
  unsigned int Capacity() const noexcept { return m_guts ? m_guts->capacity : 0; }

  void Free() noexcept;  // empty, without a block
  // Empty. Keeps the block if it is not shared.
  void Erase() noexcept;
  // Makes the capacity at least n, and exactly n if it has to grow.
  void Reserve(unsigned int n);

  // Append n bytes, also in reverse order. Where the new length passes the capacity, that becomes
  // the new length plus a tenth of it, at least plus 128. Append of 0 bytes does nothing at all.
  void Append(const void* bytes, unsigned int n);
  void appendReverseByteOrder(const void* bytes, unsigned int n);
  // Lengthens by n uninitialised bytes; a capacity that has to grow becomes exact.
  void Skip(unsigned int n);
  // Shortens by n, or to empty.
  void UnAppend(unsigned int n);
  // Overwrites at `offset`, growing the block as Append does. The length stays: bytes beyond it
  // appear only when Skip() extends over them.
  void Modify(unsigned int offset, const void* bytes, unsigned int n);

  bool operator<(const AutoBuffer& other) const noexcept {
    return CompareBuffers(*this, other) < 0;
  }

  // Wire form: a 32-bit little-endian length, then the bytes. The cursor moves past the form.
  // serialize throws BufferOverflow, deserialize DeserializationError if the form does not fit
  // below `limit`; cursor and buffer are then unchanged. deserialize replaces the bytes.
  unsigned int serializationSize() const;
  void serialize(unsigned char*& cursor, const unsigned char* limit) const;
  void deserialize(const unsigned char*& cursor, const unsigned char* limit);

  // The same form in a ring of bytes: what reaches ringEnd goes on at ringBegin, and so does a
  // cursor that lands there. A form larger than the ring, or a cursor outside of it, throws as
  // above, with nothing changed.
  void circularSerialize(unsigned char* ringBegin, unsigned char* ringEnd,
                         unsigned char*& cursor) const;
  void circularDeserialize(const unsigned char* ringBegin, const unsigned char* ringEnd,
                           const unsigned char*& cursor);
  // Writes only the 4-byte length, byte by byte. The ring has at least 4 bytes.
  static void circularSerializeLength(uint32_t length, unsigned char* ringBegin,
                                      unsigned char* ringEnd, unsigned char*& cursor);
  // Size of the form at the cursor, length field included. Throws as circularDeserialize does.
  static unsigned int GetCircularDeserializationSize(const unsigned char* ringBegin,
                                                     const unsigned char* ringEnd,
                                                     const unsigned char* cursor);
  // Moves a cursor of the ring to the next byte.
  template <class Byte>
  static void circularIncrement(Byte* ringBegin, Byte* ringEnd, Byte*& cursor) noexcept {
    if (++cursor == ringEnd) cursor = ringBegin;
  }

 private:
  enum class Growth { Exact, ByATenth };

  bool shared() const { return m_guts && m_guts->references > 1; }
  void makeOwn();
  void makeOwnWithRoom(uint32_t required, Growth growth);
  const unsigned char* prepare(const void* bytes, uint32_t required);
  void replaceWith(const unsigned char* bytes, uint32_t n);

  AutoBufferGuts* m_guts;
};

inline BufferWrapper::BufferWrapper(const AutoBuffer& buffer) noexcept
    : m_data(buffer.Data()), m_length(buffer.Len()) {}

}  // namespace zt::fnd

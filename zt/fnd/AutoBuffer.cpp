// A buffer is one pointer to a counted block, the guts. Copies share the guts; makeOwn() is called
// first by every operation that writes, and clones them where they are shared. The count is atomic,
// so that two threads may hold copies, but nothing else is: a clone reads the block without a lock,
// which is safe because shared guts are never written.
//
// An operation computes the new length first, in arithmetic that throws, then makes space, and only
// then writes. So a failure leaves the bytes as they were.
#include "zt/fnd/AutoBuffer.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <new>
#include <utility>

#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/SafeInteger.h"

namespace zt::fnd {
namespace {

// Bytes; below it a tenth is so little that small appends would reallocate each time.
constexpr uint32_t kSmallestGrowth = 128;

using Size = SafeInteger<uint32_t>;

// memcpy that takes null for no bytes.
void CopyBytes(unsigned char* dest, const unsigned char* src, size_t n) {
  if (n > 0) memmove(dest, src, n);
}

void FreeGuts(AutoBufferGuts* guts) noexcept {
  free(guts->data);
  guts->~AutoBufferGuts();
  free(guts);
}

AutoBufferGuts* NewGuts(uint32_t capacity) {
  // malloc and not new: the guts may be freed by another module, with another operator delete.
  void* place = malloc(sizeof(AutoBufferGuts));
  if (!place) throw std::bad_alloc();
  AutoBufferGuts* guts = new (place) AutoBufferGuts;
  if (capacity == 0) return guts;
  guts->data = static_cast<unsigned char*>(malloc(capacity));
  if (!guts->data) {
    FreeGuts(guts);
    throw std::bad_alloc();
  }
  guts->end = guts->data;
  guts->capacity = capacity;
  return guts;
}

// The clone claims the capacity of its source, so it has to have all of it.
AutoBufferGuts* CloneGuts(const AutoBufferGuts& source) {
  AutoBufferGuts* guts = NewGuts(source.capacity);
  size_t used = static_cast<size_t>(source.end - source.data);
  CopyBytes(guts->data, source.data, used);
  if (used > 0) guts->end = guts->data + used;
  return guts;
}

void ReleaseGuts(AutoBufferGuts* guts) noexcept {
  if (guts && guts->references.decrement() == 0) FreeGuts(guts);
}

void ReallocData(AutoBufferGuts* guts, uint32_t capacity) {
  size_t used = static_cast<size_t>(guts->end - guts->data);
  void* moved = realloc(guts->data, capacity);
  if (!moved) throw std::bad_alloc();
  guts->data = static_cast<unsigned char*>(moved);
  guts->end = guts->data + used;
  guts->capacity = capacity;
}

uint32_t GrownByATenth(uint32_t required) {
  // Where the sum wraps, the required length alone may still be allocated.
  uint32_t grown = required + std::max(kSmallestGrowth, required / 10);
  return grown < required ? required : grown;
}

}  // namespace

int CompareBuffers(const BufferWrapper& a, const BufferWrapper& b) noexcept {
  size_t common = std::min(a.Len(), b.Len());
  int order = common > 0 ? memcmp(a.Data(), b.Data(), common) : 0;
  if (order != 0) return order < 0 ? -1 : 1;
  if (a.Len() == b.Len()) return 0;
  return a.Len() < b.Len() ? -1 : 1;
}

AutoBuffer::AutoBuffer(unsigned int n) : m_guts(NewGuts(n)) {}

AutoBuffer::AutoBuffer(const AutoBuffer& other) : m_guts(other.m_guts) {
  if (m_guts) m_guts->references.increment();
}

AutoBuffer::AutoBuffer(const BufferWrapper& bytes) : AutoBuffer() {
  replaceWith(bytes.Data(), bytes.Len());
}

AutoBuffer& AutoBuffer::operator=(const AutoBuffer& other) {
  // Self-assignment, and copies that share the block already.
  if (m_guts == other.m_guts) return *this;
  if (other.m_guts) other.m_guts->references.increment();
  AutoBufferGuts* old = std::exchange(m_guts, other.m_guts);
  ReleaseGuts(old);
  return *this;
}

AutoBuffer& AutoBuffer::operator=(const BufferWrapper& bytes) {
  replaceWith(bytes.Data(), bytes.Len());
  return *this;
}

void AutoBuffer::Free() noexcept { ReleaseGuts(std::exchange(m_guts, nullptr)); }

void AutoBuffer::Erase() noexcept {
  if (shared()) {
    Free();
  } else if (m_guts) {
    m_guts->end = m_guts->data;
  }
}

void AutoBuffer::makeOwn() {
  if (!m_guts) {
    m_guts = NewGuts(0);
  } else if (shared()) {
    AutoBufferGuts* own = CloneGuts(*m_guts);
    ReleaseGuts(std::exchange(m_guts, own));
  }
}

void AutoBuffer::makeOwnWithRoom(uint32_t required, Growth growth) {
  makeOwn();
  if (required <= m_guts->capacity) return;
  ReallocData(m_guts, growth == Growth::Exact ? required : GrownByATenth(required));
}

// Makes space, and returns where the given bytes lie afterwards: the block may have moved, with
// them inside.
const unsigned char* AutoBuffer::prepare(const void* bytes, uint32_t required) {
  const unsigned char* source = static_cast<const unsigned char*>(bytes);
  const unsigned char* old = Data();
  std::less<> before;
  // std::less, as comparing pointers into different objects by < is undefined. The capacity counts
  // and not the length: Modify leaves bytes beyond the end that a caller may pass.
  bool inside = old && !before(source, old) && before(source, old + Capacity());
  makeOwnWithRoom(required, Growth::ByATenth);
  return inside ? Data() + (source - old) : source;
}

void AutoBuffer::Reserve(unsigned int n) { makeOwnWithRoom(n, Growth::Exact); }

void AutoBuffer::Append(const void* bytes, unsigned int n) {
  if (n == 0) return;
  const unsigned char* source = prepare(bytes, Size::Add(Len(), n));
  CopyBytes(m_guts->end, source, n);
  m_guts->end += n;
}

void AutoBuffer::appendReverseByteOrder(const void* bytes, unsigned int n) {
  if (n == 0) return;
  const unsigned char* source = prepare(bytes, Size::Add(Len(), n));
  std::reverse_copy(source, source + n, m_guts->end);
  m_guts->end += n;
}

void AutoBuffer::Skip(unsigned int n) {
  makeOwnWithRoom(Size::Add(Len(), n), Growth::Exact);
  if (n > 0) m_guts->end += n;
}

void AutoBuffer::UnAppend(unsigned int n) {
  if (!m_guts) return;
  makeOwn();
  m_guts->end -= std::min(n, Len());
}

void AutoBuffer::Modify(unsigned int offset, const void* bytes, unsigned int n) {
  const unsigned char* source = prepare(bytes, Size::Add(offset, n));
  if (n > 0) CopyBytes(m_guts->data + offset, source, n);
}

// Takes the bytes as the whole contents; reuses an own block that is large enough.
void AutoBuffer::replaceWith(const unsigned char* bytes, uint32_t n) {
  if (!m_guts || shared() || m_guts->capacity < n) {
    AutoBufferGuts* fresh = NewGuts(n);
    CopyBytes(fresh->data, bytes, n);
    ReleaseGuts(std::exchange(m_guts, fresh));
  } else {
    CopyBytes(m_guts->data, bytes, n);
  }
  m_guts->end = n > 0 ? m_guts->data + n : m_guts->data;
}

unsigned int AutoBuffer::serializationSize() const { return Size::Add(Len(), 4); }

// The bounds checks of wire forms throw unstamped.
void AutoBuffer::serialize(unsigned char*& cursor, const unsigned char* limit) const {
  // Compared without adding to the cursor: a pointer past its array is undefined.
  ptrdiff_t room = limit - cursor;
  if (room < 4 || static_cast<size_t>(room - 4) < Len()) throw exception::BufferOverflow();
  little_endian::SerializeRaw<uint32_t>(Len(), cursor, limit);
  CopyBytes(cursor, Data(), Len());
  cursor += Len();
}

void AutoBuffer::deserialize(const unsigned char*& cursor, const unsigned char* limit) {
  const unsigned char* body = cursor;
  uint32_t length;
  little_endian::DeserializeRaw(length, body, limit);
  if (static_cast<size_t>(limit - body) < length) throw exception::DeserializationError();
  replaceWith(body, length);
  cursor = body + length;
}

}  // namespace zt::fnd

#include <algorithm>
#include <cstring>

#include "zt/fnd/AutoBuffer.h"
#include "zt/fnd/Exception.h"

// The wire form of a buffer inside a ring of bytes.
namespace zt::fnd {
namespace {

// The length goes byte by byte, as it may itself be cut by the end of the ring; the body is at most
// two copies. A cursor at the end of the ring is the same place as one at its beginning, and both
// are accepted.
constexpr ptrdiff_t kLengthBytes = 4;

bool FitsRing(const unsigned char* begin, const unsigned char* end, const unsigned char* cursor) {
  return end - begin >= kLengthBytes && cursor >= begin && cursor <= end;
}

// True if a form of this length is no larger than the ring, which has at least 4 bytes.
bool BodyFitsRing(const unsigned char* begin, const unsigned char* end, uint32_t length) {
  return length <= static_cast<size_t>(end - begin - kLengthBytes);
}

// How many of n bytes lie between the cursor and the end of the ring.
size_t BeforeWrap(const unsigned char* cursor, const unsigned char* end, size_t n) {
  return std::min(n, static_cast<size_t>(end - cursor));
}

template <class Byte>
Byte* Advance(Byte* begin, Byte* end, Byte* cursor, size_t n) {
  size_t first = BeforeWrap(cursor, end, n);
  if (first < n) return begin + (n - first);
  return cursor + first == end ? begin : cursor + first;
}

uint32_t ReadLength(const unsigned char* begin, const unsigned char* end,
                    const unsigned char*& cursor) {
  if (!FitsRing(begin, end, cursor)) throw exception::DeserializationError();
  if (cursor == end) cursor = begin;
  uint32_t length = 0;
  for (int i = 0; i < kLengthBytes; ++i) {
    length |= static_cast<uint32_t>(*cursor) << (8 * i);
    AutoBuffer::circularIncrement(begin, end, cursor);
  }
  // The length is the other side's word. Without this test the body would be read from beyond the
  // ring.
  if (!BodyFitsRing(begin, end, length)) throw exception::DeserializationError();
  return length;
}

}  // namespace

void AutoBuffer::circularSerializeLength(uint32_t length, unsigned char* ringBegin,
                                         unsigned char* ringEnd, unsigned char*& cursor) {
  if (!FitsRing(ringBegin, ringEnd, cursor)) throw exception::BufferOverflow();
  if (cursor == ringEnd) cursor = ringBegin;
  for (int i = 0; i < kLengthBytes; ++i) {
    *cursor = static_cast<unsigned char>(length >> (8 * i));
    circularIncrement(ringBegin, ringEnd, cursor);
  }
}

void AutoBuffer::circularSerialize(unsigned char* ringBegin, unsigned char* ringEnd,
                                   unsigned char*& cursor) const {
  if (!FitsRing(ringBegin, ringEnd, cursor) || !BodyFitsRing(ringBegin, ringEnd, Len())) {
    throw exception::BufferOverflow();
  }
  circularSerializeLength(Len(), ringBegin, ringEnd, cursor);
  size_t first = BeforeWrap(cursor, ringEnd, Len());
  if (first > 0) memcpy(cursor, Data(), first);
  if (first < Len()) memcpy(ringBegin, Data() + first, Len() - first);
  cursor = Advance(ringBegin, ringEnd, cursor, Len());
}

void AutoBuffer::circularDeserialize(const unsigned char* ringBegin, const unsigned char* ringEnd,
                                     const unsigned char*& cursor) {
  const unsigned char* body = cursor;
  uint32_t length = ReadLength(ringBegin, ringEnd, body);
  size_t first = BeforeWrap(body, ringEnd, length);
  // Space before the old contents go, so that a failed allocation changes nothing.
  if (shared() || Capacity() < length) *this = AutoBuffer(length);
  Erase();
  if (length > 0) {
    Append(body, static_cast<unsigned int>(first));
    Append(ringBegin, static_cast<unsigned int>(length - first));
  }
  cursor = Advance(ringBegin, ringEnd, body, length);
}

unsigned int AutoBuffer::GetCircularDeserializationSize(const unsigned char* ringBegin,
                                                        const unsigned char* ringEnd,
                                                        const unsigned char* cursor) {
  return ReadLength(ringBegin, ringEnd, cursor) + static_cast<unsigned int>(kLengthBytes);
}

}  // namespace zt::fnd

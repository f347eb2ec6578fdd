#pragma once

#include <string.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>

#include "fuzz/Input.h"
#include "source/Common/ZtUtils/General/ztStream.h"

// Inputs as a row of values, and byte streams over them.

namespace fuzz {

// Takes values off an input. Behind its end there are zeros.
class Cursor {
 public:
  Cursor(const uint8_t* data, size_t sizeBytes) : m_at(data), m_left(sizeBytes) {}

  template <class T>
  T number() {
    T value = 0;
    take(&value, sizeof value);
    return value;
  }
  uint8_t byte() { return number<uint8_t>(); }
  std::string text(size_t most) {
    std::string bytes(std::min(most, m_left), '\0');
    take(bytes.data(), bytes.size());
    return bytes;
  }
  std::string rest() { return text(m_left); }
  size_t left() const { return m_left; }

 private:
  void take(void* to, size_t count) {
    size_t there = std::min(count, m_left);
    if (there > 0) memcpy(to, m_at, there);
    m_at += there;
    m_left -= there;
  }

  const uint8_t* m_at;
  size_t m_left;
};

// A number as it is in a stream of that byte order: 0 is this machine's, any other the reverse.
template <class T>
std::string InOrder(T value, uint8_t order) {
  std::string bytes(reinterpret_cast<const char*>(&value), sizeof value);
  if (order != 0) std::reverse(bytes.begin(), bytes.end());
  return bytes;
}

inline std::string Header(uint8_t order, int32_t major, int32_t minor, int32_t sequence) {
  return std::string(1, static_cast<char>(order)) + InOrder(major, order) + InOrder(minor, order) +
         InOrder(sequence, order);
}

using MemoryPtr = CztComPtr<CztMemoryStream>;

inline MemoryPtr NewMemory() {
  auto stream = MemoryPtr::Attach(CztMemoryStream::CreateStream());
  Demand(static_cast<bool>(stream));
  return stream;
}

// Holds the bytes, with the cursor at the start; nothing is loaded.
inline MemoryPtr MemoryOf(const std::string& bytes) {
  MemoryPtr stream = NewMemory();
  auto size = static_cast<unsigned int>(bytes.size());
  Demand(stream->Write(bytes.data(), size, nullptr) == S_OK);
  stream->Seek(0, ztSeekBegin, nullptr);
  return stream;
}

inline int64_t Position(IztStream* stream) {
  int64_t position = -1;
  stream->Seek(0, ztSeekCurrent, &position);
  return position;
}

// All bytes of the stream; the cursor is then at their end.
inline std::string Contents(IztStream* stream) {
  int64_t size = 0;
  stream->Seek(0, ztSeekEnd, &size);
  stream->Seek(0, ztSeekBegin, nullptr);
  Demand(size >= 0);
  std::string bytes(static_cast<size_t>(size), '\0');
  unsigned int got = 0;
  if (size > 0) stream->Read(bytes.data(), static_cast<unsigned int>(size), &got);
  Demand(got == bytes.size());
  return bytes;
}

}  // namespace fuzz

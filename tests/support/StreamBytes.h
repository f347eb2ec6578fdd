#pragma once

// Streams in tests: bytes by hand, memory streams over them, and a foreign byte stream that records
// and fails.

#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>
#include <new>
#include <string>
#include <utility>
#include <vector>

#include "source/Common/ZtUtils/General/ztStream.h"
#include "zt/fnd/Exception.h"

namespace vlt::test {

inline std::string Hexed(const std::string& bytes) {
  std::string text;
  for (unsigned char c : bytes) {
    char digits[4];
    snprintf(digits, sizeof digits, "%02X ", c);
    text += digits;
  }
  return text;
}

// The bytes of "00 01 AB"; blanks count for nothing.
inline std::string FromHex(const std::string& hex) {
  std::string bytes;
  std::string digits;
  for (char c : hex) {
    if (isxdigit(static_cast<unsigned char>(c))) digits += c;
  }
  for (size_t i = 0; i + 1 < digits.size(); i += 2) {
    bytes += static_cast<char>(strtoul(digits.substr(i, 2).c_str(), nullptr, 16));
  }
  return bytes;
}

enum class Order { Little, Big };

inline std::string Number(uint64_t value, size_t sizeBytes, Order order = Order::Little) {
  std::string bytes;
  for (size_t i = 0; i < sizeBytes; ++i) {
    size_t byte = order == Order::Little ? i : sizeBytes - 1 - i;
    bytes += byte < sizeof value ? static_cast<char>(value >> (8 * byte)) : '\0';
  }
  return bytes;
}

// A number in the width that readers give to lengths.
inline std::string LongNumber(uint64_t value, Order order = Order::Little) {
  return Number(value, sizeof(unsigned long), order);
}

inline std::string Header(uint32_t major = 0, uint32_t minor = 0, uint32_t sequence = 0,
                          Order order = Order::Little) {
  return std::string(1, order == Order::Little ? 0 : 1) + Number(major, 4, order) +
         Number(minor, 4, order) + Number(sequence, 4, order);
}

inline const std::string kMarkerBytes = FromHex("A1BB00D3 D6C3CF47 B752CB9F FD8ABCCC");

// Whose width the length of a name has.
enum class Width { Writer, Reader };

using SubStream = std::pair<std::wstring, std::string>;

inline std::string AreaEntry(const SubStream& s, Width width = Width::Reader,
                             Order order = Order::Little) {
  std::string name;
  for (wchar_t character : s.first) name += Number(static_cast<uint32_t>(character), 4);
  return Number(s.first.size(), width == Width::Writer ? 4 : sizeof(unsigned long), order) + name +
         Number(s.second.size(), 4, order) + s.second;
}

inline std::string Trailer(int64_t offset) {
  return kMarkerBytes + Number(static_cast<uint64_t>(offset), 8);
}

// The area of these sub-streams after `offset` bytes of data.
inline std::string Area(const std::vector<SubStream>& subStreams, int64_t offset,
                        Width width = Width::Reader, Order order = Order::Little) {
  std::string bytes = Header(1, 0, 0, order) + Number(subStreams.size(), 4, order);
  for (const SubStream& s : subStreams) bytes += AreaEntry(s, width, order);
  return bytes + Trailer(offset);
}

// Data with its area after it.
inline std::string WithArea(const std::string& data, const std::vector<SubStream>& subStreams,
                            Width width = Width::Reader, Order order = Order::Little) {
  return data + Area(subStreams, static_cast<int64_t>(data.size()), width, order);
}

using MemoryPtr = CztComPtr<CztMemoryStream>;

inline MemoryPtr NewMemory() { return MemoryPtr::Attach(CztMemoryStream::CreateStream()); }

inline void Put(IztStream* stream, const std::string& bytes) {
  unsigned int done = 0;
  EXPECT_EQ(stream->Write(bytes.data(), static_cast<unsigned int>(bytes.size()), &done), S_OK);
  EXPECT_EQ(done, bytes.size());
}

// Memory stream that holds the bytes, with the cursor at the start; nothing is loaded.
inline MemoryPtr MemoryOf(const std::string& bytes) {
  MemoryPtr stream = NewMemory();
  if (!bytes.empty()) Put(stream.get(), bytes);
  stream->Seek(0, ztSeekBegin, nullptr);
  return stream;
}

inline unsigned char* MallocCopy(const std::string& bytes) {
  auto* block = static_cast<unsigned char*>(malloc(bytes.empty() ? 1 : bytes.size()));
  memcpy(block, bytes.data(), bytes.size());
  return block;
}

// Memory stream that owns a copy of the bytes, with their sub-streams loaded.
inline MemoryPtr Attached(const std::string& bytes) {
  MemoryPtr stream = NewMemory();
  EXPECT_EQ(stream->AttachBuffer(MallocCopy(bytes), bytes.size(), false), S_OK);
  return stream;
}

inline int64_t Position(IztStream* stream) {
  int64_t position = -99;
  stream->Seek(0, ztSeekCurrent, &position);
  return position;
}

// All bytes of the stream; the cursor stays where it was.
inline std::string Contents(IztStream* stream) {
  int64_t cursor = 0, size = 0;
  stream->Seek(0, ztSeekCurrent, &cursor);
  stream->Seek(0, ztSeekEnd, &size);
  std::string bytes(static_cast<size_t>(size), '\0');
  stream->Seek(0, ztSeekBegin, nullptr);
  if (size > 0) {
    EXPECT_EQ(stream->Read(bytes.data(), static_cast<unsigned int>(size), nullptr), S_OK);
  }
  stream->Seek(cursor, ztSeekBegin, nullptr);
  return bytes;
}

inline unsigned Count(IztStream2* stream) {
  unsigned count = 99;
  EXPECT_EQ(stream->NumSubStreams(&count), S_OK);
  return count;
}

inline CztComPtr<IztStream> Made(IztStream2* stream, const wchar_t* name,
                                 const std::string& bytes = "") {
  CztComPtr<IztStream> out;
  EXPECT_EQ(stream->CreateSubStream(name, out.out()), S_OK);
  if (out && !bytes.empty()) Put(out.get(), bytes);
  return out;
}

inline CztComPtr<IztStream> Opened(IztStream2* stream, const wchar_t* name) {
  CztComPtr<IztStream> out;
  stream->OpenSubStream(name, out.out());
  return out;
}

inline std::string ContentsOf(IztStream2* stream, const wchar_t* name) {
  CztComPtr<IztStream> found = Opened(stream, name);
  return found ? Contents(found.get()) : "(missing)";
}

// A sub-stream with its own IztStream2.
inline CztComPtr<IztStream2> Nested(const CztComPtr<IztStream>& stream) {
  return CztComPtr<IztStream2>::Attach(
      ZtTryQueryInterface<IztStream2>(IID_IztStream2, stream.get()));
}

enum class Thrown { Nothing, Stream, EndOfStream, Version, OutOfRange, BadAlloc };

template <class Body>
Thrown WhatThrows(Body body) {
  try {
    body();
    return Thrown::Nothing;
  } catch (const CztEndOfStreamException& e) {
    EXPECT_TRUE(e.what().empty());
    return Thrown::EndOfStream;
  } catch (const CztStreamVersionException& e) {
    EXPECT_TRUE(e.what().empty());
    return Thrown::Version;
  } catch (const CztStreamException& e) {
    EXPECT_TRUE(e.what().empty());
    return Thrown::Stream;
  } catch (const zt::fnd::exception::OutOfRange&) {
    return Thrown::OutOfRange;
  } catch (const std::bad_alloc&) {
    return Thrown::BadAlloc;
  }
}

// A byte stream of another maker: no sub-streams. Keeps each Write as a piece of its own; the nth
// call of Read or Write, counted from 1, gives a failure. A Read that fails passes over its bytes.
class ForeignStream : public IztStream {
 public:
  std::vector<std::string> pieces;
  std::string input;
  int failAt = 0;
  HRESULT failure = E_FAIL;
  int references = 1;

  virtual ~ForeignStream() = default;
  HRESULT QueryInterface(const GUID& iid, void** out) override {
    *out = nullptr;
    if (memcmp(&iid, &IID_IztStream, sizeof iid) != 0) return E_NOINTERFACE;
    *out = this;
    ++references;
    return S_OK;
  }
  uint32_t AddRef() override { return static_cast<uint32_t>(++references); }
  uint32_t Release() override { return static_cast<uint32_t>(--references); }
  HRESULT Read(void* buffer, unsigned int count, unsigned int* done) override {
    size_t there = std::min<size_t>(count, input.size() - m_cursor);
    if (++m_calls == failAt) {
      m_cursor += there;
      return failure;
    }
    memcpy(buffer, input.data() + m_cursor, there);
    m_cursor += there;
    if (done) *done = static_cast<unsigned int>(there);
    return there < count ? ZT_E_END_OF_STREAM : S_OK;
  }
  HRESULT Write(const void* buffer, unsigned int count, unsigned int* done) override {
    if (++m_calls == failAt) return failure;
    pieces.emplace_back(static_cast<const char*>(buffer), count);
    if (done) *done = count;
    return S_OK;
  }
  HRESULT Seek(int64_t, ztSeekMode, int64_t*) override { return E_NOTIMPL; }
  HRESULT SetSize(uint64_t) override { return E_NOTIMPL; }
  HRESULT Flush() override { return S_OK; }
  int calls() const { return m_calls; }

 private:
  int m_calls = 0;
  size_t m_cursor = 0;
};

}  // namespace vlt::test

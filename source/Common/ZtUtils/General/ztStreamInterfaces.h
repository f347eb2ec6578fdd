#pragma once

#include "ztcom/ztcore/ztunknown.h"

// Fewer bytes came than were asked for; what came is in the buffer.
#define ZT_E_END_OF_STREAM (static_cast<HRESULT>(0x80030012))
// The stream is not open for this kind of access.
#define ZT_E_ACCESS_DENIED (static_cast<HRESULT>(0x80070005))

// Where a Seek counts from. Other values may be passed.
enum ztSeekMode : int32_t { ztSeekBegin = 0, ztSeekCurrent = 1, ztSeekEnd = 2 };

// A row of bytes with a cursor. The pointers for counts and positions may be null.
struct IztStream : IUnknown {
  // 0 when all bytes came, ZT_E_END_OF_STREAM when fewer did. *done is the number that came.
  virtual HRESULT Read(void* buffer, unsigned int count, unsigned int* done) = 0;
  virtual HRESULT Write(const void* buffer, unsigned int count, unsigned int* done) = 0;
  virtual HRESULT Seek(int64_t offset, ztSeekMode mode, int64_t* position) = 0;
  // Cuts the stream, or lengthens it with zeros; the cursor moves only if it would lie outside.
  virtual HRESULT SetSize(uint64_t size) = 0;
  virtual HRESULT Flush() = 0;

 protected:
  ~IztStream() = default;
};

// A stream that carries named sub-streams. They live in memory while the stream is open and are
// written after its own data by WriteSubStreamInfo. Names ignore case.
//
// Results beside those documented: E_POINTER for a null out-pointer, E_OUTOFMEMORY.
struct IztStream2 : IztStream {
  // Takes the sub-streams that follow the stream's data into memory, once in the object's
  // life: 0 done (or done before), 1 there are none. With `writable` they are cut off the stream,
  // to be written again; without, they stay and the stream never writes any.
  // Throws CztStreamException or CztEndOfStreamException for damaged ones, std::bad_alloc. Its
  // bytes are then as before; it counts as loaded, without sub-streams, and what follows the data
  // is data from then on.
  virtual HRESULT LoadSubStreamInfo(int writable) = 0;
  // Appends the sub-streams to the stream and forgets them, once in the object's life; later calls
  // do nothing. A failure leaves the stream's own data alone.
  virtual HRESULT WriteSubStreamInfo() = 0;
  // 0 and a reference, or 1 and null. The cursor is where it was left.
  virtual HRESULT OpenSubStream(const wchar_t* name, IztStream** out) = 0;
  // The same, making the sub-stream if it is missing. A null name counts as empty. Works on streams
  // that are not writable too, although nothing will be written.
  virtual HRESULT CreateSubStream(const wchar_t* name, IztStream** out) = 0;
  // 0, 1 if there is none, E_FAIL if the stream is not writable.
  virtual HRESULT DeleteSubStream(const wchar_t* name) = 0;
  // Puts the cursor to the start, here and in every sub-stream at any depth.
  virtual HRESULT ResetStreams() = 0;
  // Empties the stream, drops the sub-streams, and lets them be loaded and written once more.
  // E_FAIL if the stream is not writable.
  virtual HRESULT ClearStreams() = 0;
  virtual HRESULT NumSubStreams(unsigned int* count) = 0;
  // Names in order. The caller frees each with ZtSysFreeString and the array with ZtTaskMemFree;
  // null for a count of 0.
  virtual HRESULT GetSubStreamInfo(wchar_t*** names, unsigned int* count) = 0;

 protected:
  ~IztStream2() = default;
};

struct IztStream3 : IztStream2 {
  // Appends contents at the target's cursor, and copies the sub-streams into sub-streams of the
  // target. E_FAIL if the target is no IztStream2, E_OUTOFMEMORY if it takes less than all. The
  // cursor of this stream stays at its end. The target is no part of this stream.
  virtual HRESULT Clone(IztStream* target) = 0;

 protected:
  ~IztStream3() = default;
};

inline constexpr GUID IID_IztStream = {
    0xB623A19F, 0xD1BE, 0x42EA, {0x9E, 0xD8, 0x97, 0xBC, 0xF9, 0x74, 0x4A, 0x4E}};
inline constexpr GUID IID_IztStream2 = {
    0xA851BC68, 0x3977, 0x4917, {0x9D, 0x4B, 0x22, 0xE8, 0xF7, 0x3A, 0x43, 0xD8}};
inline constexpr GUID IID_IztStream3 = {
    0x5FB022CF, 0xDBC1, 0x4E79, {0xA3, 0x28, 0xE9, 0x78, 0xDA, 0x30, 0x7F, 0xEB}};

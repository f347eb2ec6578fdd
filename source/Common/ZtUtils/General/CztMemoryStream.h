#pragma once

#include "source/Common/ZtUtils/General/CztStreamBaseImp.h"

// Stream over a heap block of malloc, up to 4 GiB.
//
// The block starts with 64 bytes and doubles. An attached block is either owned from then on, or
// only read. Results: E_INVALIDARG for sizes beyond 32 bits, a null buffer, a cursor in front of
// the start, and for Read while there is no block; E_FAIL when memory is out and for changes to a
// read-only block. A failed call changes nothing.
class CztMemoryStream : public CztSubStream {
 public:
  // New stream with one reference; null when memory is out.
  static CztMemoryStream* CreateStream();

  HRESULT Read(void* buffer, unsigned int count, unsigned int* done) override;
  HRESULT Write(const void* buffer, unsigned int count, unsigned int* done) override;
  // Stops at the end of the data. A position in front of the start is kept, and cannot be read or
  // written. An unknown mode leaves the cursor.
  HRESULT Seek(int64_t offset, ztSeekMode mode, int64_t* position) override;
  // Makes the block exactly that large; 0 frees it.
  HRESULT SetSize(uint64_t size) override;
  HRESULT Flush() override { return S_OK; }

  unsigned char* GetBuffer() const override { return m_begin; }

  // Writes the sub-streams and returns the block, whose owner frees it with free(). The size is
  // known to who calls WriteSubStreamInfo and seeks to the end before.
  unsigned char* DetachBuffer();

  // Replaces the block, the old one is freed if owned, and loads sub-streams as LoadSubStreamInfo
  // does. With readOnly the block must outlive the stream; without, it came from malloc and belongs
  // to the stream from now on, also when an exception leaves. E_INVALIDARG, and nothing happens,
  // for a size beyond 32 bits or a null with a size.
  HRESULT AttachBuffer(unsigned char* buffer, unsigned long size, bool readOnly);

  HRESULT attachNested(unsigned char* buffer, uint32_t size, unsigned depth) override;

  uint32_t capacity() const { return m_capacity; }
  uint32_t size() const { return m_size; }

 protected:
  CztMemoryStream() = default;
  ~CztMemoryStream();
  CztSubStream* newSubStream() override { return CreateStream(); }

 private:
  HRESULT writeAny(const void* buffer, unsigned int count, unsigned int* done);
  HRESULT growTo(uint64_t size);
  HRESULT resizeBlock(uint32_t capacity);
  void dropBlock();
  void takeBlock(unsigned char* buffer, uint32_t size, bool readOnly);

  bool m_external = false;
  unsigned char* m_begin = nullptr;
  uint32_t m_capacity = 0;
  uint32_t m_size = 0;
  int64_t m_cursor = 0;
};

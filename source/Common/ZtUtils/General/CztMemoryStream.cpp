// Three numbers describe the block: what is allocated, what is data, and the cursor, which is
// signed, since a Seek may put it in front of the start. Sizes are 32-bit numbers, as the counts of
// the interface are; sums of them are made in 64 bits.
#include "source/Common/ZtUtils/General/CztMemoryStream.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

namespace {

constexpr uint64_t kFirstBlock = 64;
constexpr uint64_t kLargestBlock = UINT32_MAX;

// A sum that wraps would turn a seek far forward into one in front of the start.
int64_t SaturatedSum(int64_t a, int64_t b) {
  int64_t sum;
  if (!__builtin_add_overflow(a, b, &sum)) return sum;
  return b > 0 ? INT64_MAX : INT64_MIN;
}

}  // namespace

CztMemoryStream* CztMemoryStream::CreateStream() {
  CZTComObject<CztMemoryStream>* stream = nullptr;
  if (CZTComObject<CztMemoryStream>::CreateInstance(&stream) < 0) return nullptr;
  return ZtAddRef(stream);
}

CztMemoryStream::~CztMemoryStream() { dropBlock(); }

HRESULT CztMemoryStream::Read(void* buffer, unsigned int count, unsigned int* done) {
  if (done) *done = 0;
  if (!m_begin || m_cursor < 0 || (!buffer && count > 0)) return E_INVALIDARG;
  // Never negative: a Seek stops at the end of the data, and SetSize moves the cursor with it.
  auto there = static_cast<unsigned int>(std::min<int64_t>(count, m_size - m_cursor));
  if (there > 0) memcpy(buffer, m_begin + m_cursor, there);
  m_cursor += there;
  if (done) *done = there;
  return there < count ? ZT_E_END_OF_STREAM : S_OK;
}

HRESULT CztMemoryStream::Write(const void* buffer, unsigned int count, unsigned int* done) {
  const int64_t end = m_cursor + int64_t{sizeof(uint32_t)};
  // What streams are mostly made of, where there is space; a call of memcpy would take longer.
  if (count != sizeof(uint32_t) || !buffer || m_external || m_cursor < 0 || end > m_capacity)
      [[unlikely]] {
    return writeAny(buffer, count, done);
  }
  memcpy(m_begin + m_cursor, buffer, sizeof(uint32_t));
  m_cursor = end;
  // A branch: the larger of the two without one would wait for the size of the write before.
  if (end > m_size) m_size = static_cast<uint32_t>(end);
  if (done) *done = sizeof(uint32_t);
  return S_OK;
}

// Out of line, so that the usual write saves no registers.
[[gnu::noinline]] HRESULT CztMemoryStream::writeAny(const void* buffer, unsigned int count,
                                                    unsigned int* done) {
  if (done) *done = 0;
  if (m_external) return E_FAIL;
  if (m_cursor < 0 || (!buffer && count > 0)) return E_INVALIDARG;
  uint64_t end = static_cast<uint64_t>(m_cursor) + count;
  if (end > m_capacity) {
    HRESULT result = growTo(end);
    if (result < 0) return result;
  }
  if (count > 0) memcpy(m_begin + m_cursor, buffer, count);
  m_cursor = static_cast<int64_t>(end);
  m_size = std::max(m_size, static_cast<uint32_t>(end));
  if (done) *done = count;
  return S_OK;
}

HRESULT CztMemoryStream::growTo(uint64_t size) {
  if (size <= m_capacity) return S_OK;
  uint64_t capacity = m_capacity > 0 ? uint64_t{m_capacity} * 2 : kFirstBlock;
  // In 64 bits: a size below 2^33 cannot make the doubling wrap.
  while (capacity < size) capacity *= 2;
  if (capacity > kLargestBlock) return E_INVALIDARG;
  return resizeBlock(static_cast<uint32_t>(capacity));
}

HRESULT CztMemoryStream::resizeBlock(uint32_t capacity) {
  void* block = realloc(m_begin, capacity);
  // A heap may refuse to shrink a block, which is then longer than it is taken for: taking back
  // what was written does not fail for that.
  if (!block && m_begin && capacity <= m_capacity) block = m_begin;
  if (!block) return E_FAIL;
  m_begin = static_cast<unsigned char*>(block);
  m_capacity = capacity;
  return S_OK;
}

HRESULT CztMemoryStream::Seek(int64_t offset, ztSeekMode mode, int64_t* position) {
  if (mode >= ztSeekBegin && mode <= ztSeekEnd) {
    const int64_t origins[] = {0, m_cursor, m_size};
    m_cursor = std::min<int64_t>(SaturatedSum(origins[mode], offset), m_size);
  }
  if (position) *position = m_cursor;
  return S_OK;
}

HRESULT CztMemoryStream::SetSize(uint64_t size) {
  if (m_external) return E_FAIL;
  if (size > kLargestBlock) return E_INVALIDARG;
  if (size == 0) {
    dropBlock();
    return S_OK;
  }
  HRESULT result = resizeBlock(static_cast<uint32_t>(size));
  if (result < 0) return result;
  // Between the data's end and the capacity lies what the heap held.
  if (m_capacity > m_size) memset(m_begin + m_size, 0, m_capacity - m_size);
  m_size = m_capacity;
  m_cursor = std::min<int64_t>(m_cursor, m_size);
  return S_OK;
}

unsigned char* CztMemoryStream::DetachBuffer() {
  WriteSubStreamInfo();  // A failure leaves the data alone, which is returned then.
  unsigned char* block = m_begin;
  takeBlock(nullptr, 0, m_external);
  return block;
}

HRESULT CztMemoryStream::AttachBuffer(unsigned char* buffer, unsigned long size, bool readOnly) {
  if (size > kLargestBlock || (!buffer && size > 0)) return E_INVALIDARG;
  // A caller may attach the block that the stream has: it must not be freed.
  if (buffer != m_begin) dropBlock();
  takeBlock(buffer, static_cast<uint32_t>(size), readOnly);
  loadSubStreams(!readOnly, 0);
  return S_OK;
}

HRESULT CztMemoryStream::attachNested(unsigned char* buffer, uint32_t size, unsigned depth) {
  dropBlock();
  takeBlock(buffer, size, false);
  return loadSubStreams(true, depth);
}

void CztMemoryStream::dropBlock() {
  if (!m_external) free(m_begin);
  takeBlock(nullptr, 0, m_external);
}

void CztMemoryStream::takeBlock(unsigned char* buffer, uint32_t size, bool readOnly) {
  m_external = readOnly;
  m_begin = buffer;
  m_capacity = m_size = size;
  m_cursor = 0;
}

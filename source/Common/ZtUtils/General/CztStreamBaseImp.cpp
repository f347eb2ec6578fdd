// Sub-streams live in an area after the stream's own data: they are taken into memory, and the area
// cut off, when the stream is loaded; they are appended again when it is written. Between the two
// the stream is its data alone, and its end is where a user expects it. A stream that may not be
// changed keeps its area, and then never writes one, or the file would have two.
//
// Loading is all or nothing. Everything is read and checked into a map of its own, and only then
// merged and the area cut, so that a damaged file stays as it was, every byte of it data. The depth
// of areas within areas is limited, as each costs a frame of the stack and the nesting is the
// file's word.
#include "source/Common/ZtUtils/General/CztStreamBaseImp.h"

#include <climits>
#include <memory>
#include <new>
#include <utility>
#include <vector>

#include "source/Common/ZtUtils/General/ztStreamException.h"
#include "zt/fnd/Exception.h"
#include "ztcom/ztcore/ztmemmgr.h"

namespace {

using zt::fnd::String;

// Runs a step that throws, for operations that report by their result.
template <class Step>
HRESULT Guarded(Step step) {
  try {
    return step();
  } catch (const std::bad_alloc&) {
    // Interface operations do not throw: their callers may be across a module boundary.
    return E_OUTOFMEMORY;
  } catch (const CztStreamException&) {
    // Likewise; the byte stream did not take or give what the typed stream asked.
    return E_FAIL;
  } catch (const zt::fnd::exception::OutOfRange&) {
    // Likewise; a text or size beyond 32 bits.
    return E_INVALIDARG;
  }
}

// Puts the cursor back at the end of the scope, an exception's way out included.
class CursorKeeper {
 public:
  explicit CursorKeeper(IztStream* stream) : m_stream(stream) {
    m_stream->Seek(0, ztSeekCurrent, &m_cursor);
  }
  ~CursorKeeper() { m_stream->Seek(m_cursor, ztSeekBegin, nullptr); }
  CursorKeeper(const CursorKeeper&) = delete;
  CursorKeeper& operator=(const CursorKeeper&) = delete;

 private:
  IztStream* m_stream;
  int64_t m_cursor = 0;
};

// Array of system strings that goes as a whole until it is released.
class NameArray {
 public:
  explicit NameArray(size_t count)
      : m_names(static_cast<wchar_t**>(ZtTaskMemAlloc(count * sizeof(wchar_t*)))) {}
  ~NameArray() {
    for (size_t i = 0; i < m_filled; ++i) ZtSysFreeString(m_names[i]);
    ZtTaskMemFree(m_names);
  }
  NameArray(const NameArray&) = delete;
  NameArray& operator=(const NameArray&) = delete;

  explicit operator bool() const { return m_names != nullptr; }
  bool add(const String& name) {
    wchar_t* copy = ZtSysAllocString(name.c_str());
    if (copy) m_names[m_filled++] = copy;
    return copy != nullptr;
  }
  wchar_t** release() {
    wchar_t** names = m_names;
    m_names = nullptr;
    m_filled = 0;
    return names;
  }

 private:
  wchar_t** m_names;
  size_t m_filled = 0;
};

// All of `from` to the cursor of `to`; counts decide, not results.
HRESULT CopyContents(IztStream* from, IztStream* to) {
  int64_t size = 0;
  from->Seek(0, ztSeekEnd, &size);
  from->Seek(0, ztSeekBegin, nullptr);
  if (size == 0) return S_OK;
  // One Read takes 32 bits; a stream beyond that could not be held in a block either.
  if (size < 0 || size > UINT_MAX) return E_OUTOFMEMORY;
  auto count = static_cast<unsigned int>(size);
  CztOwnedBlock bytes(static_cast<unsigned char*>(malloc(count)));
  if (!bytes) return E_OUTOFMEMORY;
  unsigned int got = 0, put = 0;
  from->Read(bytes.get(), count, &got);
  if (got == count) to->Write(bytes.get(), count, &put);
  return put == count ? S_OK : E_OUTOFMEMORY;
}

}  // namespace

const GUID CztStreamBaseImp::s_SubStreamMarker = kSubStreamMarker;

const _ZTCOM_INTMAP_ENTRY* CztStreamBaseImp::_GetEntries() {
  static constexpr _ZTCOM_INTMAP_ENTRY kEntries[] = {{&IID_IztStream, 0, kZtComSimpleEntry},
                                                     {&IID_IztStream2, 0, kZtComSimpleEntry},
                                                     {&IID_IztStream3, 0, kZtComSimpleEntry},
                                                     {nullptr, 0, 0}};
  return kEntries;
}

CztStreamBaseImp::CztStreamBaseImp() = default;
CztStreamBaseImp::~CztStreamBaseImp() = default;

HRESULT CztStreamBaseImp::LoadSubStreamInfo(int writable) { return loadSubStreams(writable, 0); }

HRESULT CztStreamBaseImp::loadSubStreams(bool writable, unsigned depth) {
  if (m_subStreamsLoaded) return S_OK;
  // Before the reading: damaged sub-streams are not tried again.
  m_subStreamsLoaded = true;
  m_subStreamsWritable = writable;
  CursorKeeper cursor(this);
  int64_t size = 0, offset = -1;
  if (Seek(0, ztSeekEnd, &size) < 0 || size <= kSubStreamTrailerSize) return S_FALSE;
  if (!ReadSubStreamTrailer(this, size, &offset)) return S_FALSE;
  m_subStreamInfoOffset = offset;
  return loadArea(offset, size - kSubStreamTrailerSize, depth);
}

HRESULT CztStreamBaseImp::loadArea(int64_t offset, int64_t areaEnd, unsigned depth) {
  if (depth >= kDeepestArea) throw CztStreamException();
  std::vector<CztSubStreamBlock> blocks = ReadSubStreamArea(this, offset, areaEnd);
  HRESULT result = S_OK;
  // A nested area goes at once, or memory would hold every level's copy of the innermost data. The
  // outermost is cut when all is known to be good: it may be a file's only copy.
  if (depth > 0) result = cutArea();
  CztSubStreamMap loaded = attach(std::move(blocks), depth + 1);
  loaded.merge(m_subStreams);  // Like-named ones are replaced; nothing can fail from here on.
  m_subStreams.swap(loaded);
  return depth > 0 ? result : cutArea();
}

// Makes streams of the blocks, `depth` areas deep, with the sub-streams of their own loaded. Of two
// names that are equal the later counts. Throws what loading throws.
CztSubStreamMap CztStreamBaseImp::attach(std::vector<CztSubStreamBlock> blocks, unsigned depth) {
  CztSubStreamMap subStreams;
  for (CztSubStreamBlock& block : blocks) {
    auto stream = CztComPtr<CztSubStream>::Attach(newSubStream());
    if (!stream) throw std::bad_alloc();
    stream->attachNested(block.data.release(), block.sizeBytes, depth);
    subStreams.insert_or_assign(block.name, stream);
  }
  return subStreams;
}

HRESULT CztStreamBaseImp::cutArea() {
  if (!m_subStreamsWritable) return S_OK;
  HRESULT result = SetSize(static_cast<uint64_t>(m_subStreamInfoOffset));
  // What could not be cut off is not written a second time.
  if (result < 0) m_subStreamsWritable = false;
  return result;
}

void CztStreamBaseImp::truncateTo(int64_t size) { SetSize(static_cast<uint64_t>(size)); }

bool CztStreamBaseImp::nestsDeeperThan(unsigned levels) const {
  if (m_subStreams.empty()) return false;
  if (levels == 0) return true;
  for (const auto& [name, stream] : m_subStreams) {
    if (stream->nestsDeeperThan(levels - 1)) return true;
  }
  return false;
}

// E_INVALIDARG for a count or size beyond 31 bits, and failures of the sub-streams' own
// WriteSubStreamInfo. Throws as the typed streams do.
HRESULT CztStreamBaseImp::writeArea(int64_t start) {
  if (m_subStreams.size() > kMostOfSubStreamArea) return E_INVALIDARG;
  CztSubStreamAreaWriter area(this, m_subStreams.size());
  for (const auto& [name, stream] : m_subStreams) {
    HRESULT result = stream->WriteSubStreamInfo();
    if (result < 0) return result;
    int64_t size = 0;
    stream->Seek(0, ztSeekEnd, &size);
    if (static_cast<uint64_t>(size) > kMostOfSubStreamArea) return E_INVALIDARG;
    area.add(name, stream->GetBuffer(), size);
  }
  area.finish(start);
  return S_OK;
}

HRESULT CztStreamBaseImp::WriteSubStreamInfo() {
  if (m_subStreamsWritten) return S_OK;
  m_subStreamsWritten = true;
  if (!m_subStreamsWritable || m_subStreams.empty()) return S_OK;
  // Before the first byte: such a stream could be written but not read.
  if (nestsDeeperThan(kDeepestArea)) return E_INVALIDARG;
  int64_t start = 0;
  HRESULT result = Seek(0, ztSeekEnd, &start);
  if (result < 0) return result;
  result = Guarded([&] { return writeArea(start); });
  if (result < 0) {
    // Half of an area would be taken for data by the next reader.
    truncateTo(start);
    return result;
  }
  m_subStreams.clear();
  return S_OK;
}

HRESULT CztStreamBaseImp::OpenSubStream(const wchar_t* name, IztStream** out) {
  if (!out) return E_POINTER;
  *out = nullptr;
  return Guarded([&] {
    auto found = m_subStreams.find(String(name));
    if (found == m_subStreams.end()) return S_FALSE;
    *out = ZtAddRef(found->second.get());
    return S_OK;
  });
}

HRESULT CztStreamBaseImp::CreateSubStream(const wchar_t* name, IztStream** out) {
  HRESULT result = OpenSubStream(name, out);
  if (result != S_FALSE) return result;
  return Guarded([&] {
    auto stream = CztComPtr<CztSubStream>::Attach(newSubStream());
    if (!stream) return E_OUTOFMEMORY;
    m_subStreams.insert_or_assign(String(name), stream);
    *out = ZtAddRef(stream.get());
    return S_OK;
  });
}

HRESULT CztStreamBaseImp::DeleteSubStream(const wchar_t* name) {
  if (!m_subStreamsWritable) return E_FAIL;
  return Guarded([&] { return m_subStreams.erase(String(name)) > 0 ? S_OK : S_FALSE; });
}

HRESULT CztStreamBaseImp::ResetStreams() {
  HRESULT result = Seek(0, ztSeekBegin, nullptr);
  for (const auto& [name, stream] : m_subStreams) stream->ResetStreams();
  return result;
}

HRESULT CztStreamBaseImp::ClearStreams() {
  if (!m_subStreamsWritable) return E_FAIL;
  HRESULT result = SetSize(0);
  if (result < 0) return result;
  m_subStreams.clear();
  m_subStreamsLoaded = m_subStreamsWritten = false;
  return S_OK;
}

HRESULT CztStreamBaseImp::NumSubStreams(unsigned int* count) {
  if (!count) return E_POINTER;
  *count = static_cast<unsigned int>(m_subStreams.size());
  return S_OK;
}

HRESULT CztStreamBaseImp::GetSubStreamInfo(wchar_t*** names, unsigned int* count) {
  if (!names || !count) return E_POINTER;
  *names = nullptr;
  *count = 0;
  if (m_subStreams.empty()) return S_OK;
  NameArray array(m_subStreams.size());
  if (!array) return E_OUTOFMEMORY;
  for (const auto& [name, stream] : m_subStreams) {
    if (!array.add(name)) return E_OUTOFMEMORY;
  }
  *names = array.release();
  *count = static_cast<unsigned int>(m_subStreams.size());
  return S_OK;
}

HRESULT CztStreamBaseImp::Clone(IztStream* target) {
  if (!target) return E_FAIL;  // It does not answer to the interface, as any other that does not.
  auto streams =
      CztComPtr<IztStream2>::Attach(ZtTryQueryInterface<IztStream2>(IID_IztStream2, target));
  if (!streams) return E_FAIL;
  HRESULT result = CopyContents(this, target);
  for (auto entry = m_subStreams.begin(); result >= 0 && entry != m_subStreams.end(); ++entry) {
    CztComPtr<IztStream> copy;
    // A sub-stream of the target with this name is appended to, as the target's own contents are.
    result = streams->CreateSubStream(entry->first.c_str(), copy.out());
    if (result >= 0 && copy) result = entry->second->Clone(copy.get());
  }
  return result;
}

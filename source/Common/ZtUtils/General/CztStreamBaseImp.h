#pragma once

#include <map>
#include <vector>

#include "source/Common/ZtUtils/General/ztStreamInterfaces.h"
#include "source/Common/ZtUtils/General/ztSubStreamArea.h"
#include "zt/fnd/String.h"
#include "ztcom/ztcore/ztcom.h"

class CztSubStream;

using CztSubStreamMap = std::map<zt::fnd::String, CztComPtr<CztSubStream>>;

// The sub-streams of every stream, over the five byte operations of the class derived from it,
// which also makes them.
//
// Sub-streams are memory streams, in the order of their names, and may have sub-streams of their
// own. Areas within areas are read and written up to kDeepestArea levels: reading throws
// CztStreamException and writing gives E_INVALIDARG beyond, since each level costs stack.
class CztStreamBaseImp : public IztStream3, public CZTComObjectRootEx<CZTComMultiThreadModelNoCS> {
 public:
  // Written after the sub-streams, before the offset of their first byte.
  static const GUID s_SubStreamMarker;
  static constexpr unsigned kDeepestArea = 256;

  CztStreamBaseImp(const CztStreamBaseImp&) = delete;
  CztStreamBaseImp& operator=(const CztStreamBaseImp&) = delete;

  static const _ZTCOM_INTMAP_ENTRY* _GetEntries();

  HRESULT LoadSubStreamInfo(int writable) override;
  HRESULT WriteSubStreamInfo() override;
  HRESULT OpenSubStream(const wchar_t* name, IztStream** out) override;
  HRESULT CreateSubStream(const wchar_t* name, IztStream** out) override;
  HRESULT DeleteSubStream(const wchar_t* name) override;
  HRESULT ResetStreams() override;
  HRESULT ClearStreams() override;
  HRESULT NumSubStreams(unsigned int* count) override;
  HRESULT GetSubStreamInfo(wchar_t*** names, unsigned int* count) override;
  HRESULT Clone(IztStream* target) override;

 protected:
  CztStreamBaseImp();
  ~CztStreamBaseImp();

  // LoadSubStreamInfo of a stream that lies `depth` areas below the outermost one.
  HRESULT loadSubStreams(bool writable, unsigned depth);

  // Cuts off what a failed writing has left after the first `size` bytes.
  virtual void truncateTo(int64_t size);

  // New empty stream with one reference; null when memory is out.
  virtual CztSubStream* newSubStream() = 0;

 private:
  HRESULT loadArea(int64_t offset, int64_t areaEnd, unsigned depth);
  CztSubStreamMap attach(std::vector<CztSubStreamBlock> blocks, unsigned depth);
  HRESULT writeArea(int64_t start);
  HRESULT cutArea();
  bool nestsDeeperThan(unsigned levels) const;

  // While the stream is open; written and dropped by WriteSubStreamInfo.
  CztSubStreamMap m_subStreams;
  // Once in the object's life each, until ClearStreams.
  bool m_subStreamsLoaded = false;
  bool m_subStreamsWritten = false;
  // False: the area stays in the byte stream, and none is ever written.
  bool m_subStreamsWritable = true;
  int64_t m_subStreamInfoOffset = -1;  // of the area's header; -1 for none
};

// A stream that can be a sub-stream: its data are one block of malloc.
class CztSubStream : public CztStreamBaseImp {
 public:
  // The block, which the stream keeps; null while there is none. Good until the next change.
  virtual unsigned char* GetBuffer() const = 0;

  // For the loading of sub-streams: a block to own that lies `depth` areas deep.
  virtual HRESULT attachNested(unsigned char* buffer, uint32_t size, unsigned depth) = 0;

 protected:
  ~CztSubStream() = default;
};

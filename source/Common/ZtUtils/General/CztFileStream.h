#pragma once

#include <memory>

#include "source/Common/ZtUtils/General/CztStreamBaseImp.h"
#include "zt/fnd/osdep/BinaryFile.h"

// Stream over a file. The destructor writes the sub-streams, if the file is open for writing.
//
// Results: ZT_E_ACCESS_DENIED for a direction that was not asked for, before anything else;
// E_INVALIDARG without a file, for a null buffer and for sizes beyond 63 bits; E_FAIL when the
// system fails.
class CztFileStream : public CztStreamBaseImp {
 public:
  // New stream with one reference, or null when the file does not open. Throws as Init, and
  // E_OUTOFMEMORY as a plain int.
  static CztFileStream* CreateStream(const zt::fnd::String& name, bool truncate, bool read,
                                     bool write);

  // Opens the file; one that is open is closed first. Writing makes a missing file. A file that is
  // opened for reading and not truncated has its sub-streams loaded. False when it does not open.
  // Throws what LoadSubStreamInfo throws, CztEndOfStreamException for a directory that is to be
  // read, std::bad_alloc.
  bool Init(const zt::fnd::String& name, bool truncate, bool read, bool write);

  HRESULT Read(void* buffer, unsigned int count, unsigned int* done) override;
  // E_FAIL when fewer bytes went out than asked; *done is how many.
  HRESULT Write(const void* buffer, unsigned int count, unsigned int* done) override;
  // May go beyond the end. An unknown mode leaves the cursor and reports position 0.
  HRESULT Seek(int64_t offset, ztSeekMode mode, int64_t* position) override;
  // Size 0 opens the file again: one open for reading and writing is emptied. A write-only one
  // keeps its contents, and may be read from then on.
  HRESULT SetSize(uint64_t size) override;
  // Waits until the system has the data on disk.
  HRESULT Flush() override;

 protected:
  CztFileStream() = default;
  ~CztFileStream();
  void truncateTo(int64_t size) override;
  CztSubStream* newSubStream() override;

 private:
  HRESULT openAnew();

  zt::fnd::String m_fileName;
  std::unique_ptr<zt::fnd::osdep::BinaryFile> m_file;  // null: not open
  bool m_canRead = false;
  bool m_canWrite = false;
};

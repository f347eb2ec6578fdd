// A thin layer over BinaryFile that turns its exceptions into results, and the place where a
// stream's sub-streams meet its file: they are loaded when the file is opened for reading, and
// written by the destructor. The order in Init matters: the stream is a closed one until the file
// is open, and the sub-streams are loaded last, so that damaged ones leave an open file of which
// every byte is data.
#include "source/Common/ZtUtils/General/CztFileStream.h"

#include <errno.h>

#include <algorithm>
#include <new>
#include <utility>

#include "source/Common/ZtUtils/General/CztMemoryStream.h"
#include "source/Common/ZtUtils/General/ztStreamException.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/posix/Transfer.h"

using zt::fnd::osdep::BinaryFile;
using zt::posix::MoveAll;

namespace {

BinaryFile::Mode OpenMode(bool truncate, bool read, bool write) {
  using Mode = BinaryFile::Mode;
  auto mode = static_cast<Mode>(0);
  if (truncate) mode = mode | Mode::Truncate;
  if (read && write) return mode | Mode::ReadWrite | Mode::Create;
  if (read) return mode | Mode::Read;
  if (write) return mode | Mode::Write | Mode::Create;
  return mode;
}

// Runs what throws for failures of the system; true if it did not.
template <class Step>
bool Succeeds(Step step) {
  try {
    step();
    return true;
  } catch (const zt::fnd::osdep::OSException&) {
    // Streams report failures by results; which one the system had is not passed on.
    return false;
  }
}

// A directory opens for reading, but holds no byte. Its size is none, a small or a huge number, as
// the file system has it, so that it cannot be left to the search for the sub-streams.
bool IsDirectory(const BinaryFile& file) { return file.read(nullptr, 0) < 0 && errno == EISDIR; }

}  // namespace

CztFileStream* CztFileStream::CreateStream(const zt::fnd::String& name, bool truncate, bool read,
                                           bool write) {
  auto stream = CztComPtr<CztFileStream>::Attach(ZtATLNew<CztFileStream>());
  if (!stream->Init(name, truncate, read, write)) return nullptr;
  return ZtAddRef(stream.get());
}

CztFileStream::~CztFileStream() {
  // A destructor has no result. Who wants it calls WriteSubStreamInfo before, after which this does
  // nothing.
  if (m_canWrite && m_file) WriteSubStreamInfo();
}

CztSubStream* CztFileStream::newSubStream() { return CztMemoryStream::CreateStream(); }

bool CztFileStream::Init(const zt::fnd::String& name, bool truncate, bool read, bool write) {
  m_file.reset();
  m_fileName = name;
  m_canRead = read;
  m_canWrite = write;
  auto file = std::make_unique<BinaryFile>();
  if (!Succeeds([&] { file->open(m_fileName, OpenMode(truncate, read, write)); })) return false;
  m_file = std::move(file);
  if (read && !truncate) {
    if (IsDirectory(*m_file)) throw CztEndOfStreamException();
    LoadSubStreamInfo(write);
  }
  return true;
}

HRESULT CztFileStream::Read(void* buffer, unsigned int count, unsigned int* done) {
  if (done) *done = 0;
  if (!m_canRead) return ZT_E_ACCESS_DENIED;
  if (!m_file || !buffer) return E_INVALIDARG;
  auto got = static_cast<unsigned int>(MoveAll(count, [&](size_t from, size_t left) {
    return m_file->read(static_cast<char*>(buffer) + from, left);
  }));
  if (done) *done = got;
  return got < count ? ZT_E_END_OF_STREAM : S_OK;
}

HRESULT CztFileStream::Write(const void* buffer, unsigned int count, unsigned int* done) {
  if (done) *done = 0;
  if (!m_canWrite) return ZT_E_ACCESS_DENIED;
  if (!m_file || !buffer) return E_INVALIDARG;
  auto put = static_cast<unsigned int>(MoveAll(count, [&](size_t from, size_t left) {
    return m_file->write(static_cast<const char*>(buffer) + from, left);
  }));
  if (done) *done = put;
  return put < count ? E_FAIL : S_OK;
}

HRESULT CztFileStream::Seek(int64_t offset, ztSeekMode mode, int64_t* position) {
  if (position) *position = 0;
  if (!m_file) return E_INVALIDARG;
  // An enumeration with a fixed type may hold any number; lseek knows further modes, which are not
  // meant.
  if (mode < ztSeekBegin || mode > ztSeekEnd) return S_OK;
  int64_t now = m_file->seek(offset, static_cast<BinaryFile::Origin>(mode));
  if (now < 0) return E_FAIL;
  if (position) *position = now;
  return S_OK;
}

HRESULT CztFileStream::SetSize(uint64_t size) {
  if (!m_canWrite) return ZT_E_ACCESS_DENIED;
  if (size == 0) return openAnew();
  if (!m_file || size > INT64_MAX) return E_INVALIDARG;
  auto end = static_cast<int64_t>(size);
  int64_t old = m_file->seek(0, BinaryFile::Origin::Current);
  bool resized = Succeeds([&] {
    m_file->seek(end, BinaryFile::Origin::Begin);
    m_file->resize(end);
  });
  // The cursor is put back where it was, or to the new end if it would lie outside.
  m_file->seek(resized ? std::min(old, end) : old, BinaryFile::Origin::Begin);
  return resized ? S_OK : E_FAIL;
}

// Not SetSize, which opens the file again for size 0 and so would leave what is to go.
void CztFileStream::truncateTo(int64_t size) {
  Succeeds([&] { m_file->resize(size); });
}

HRESULT CztFileStream::openAnew() try {
  zt::fnd::String name(m_fileName);
  // The arguments are one place to the left of where one expects them, and files in the field
  // depend on it: what was only written keeps its contents, and can be read from here on.
  return Init(name, m_canRead, m_canWrite, true) ? S_OK : E_FAIL;
} catch (const CztStreamException&) {
  // The contents that were kept end in damaged sub-streams. The file is open.
  return E_FAIL;
} catch (const std::bad_alloc&) {
  // Operations of a stream report this by their result.
  return E_OUTOFMEMORY;
}

HRESULT CztFileStream::Flush() {
  if (!m_file) return E_INVALIDARG;
  return Succeeds([&] { m_file->sync(); }) ? S_OK : E_FAIL;
}

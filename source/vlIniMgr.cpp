// The object's life is one critical section among all processes: the constructor takes the file's
// lock before it reads anything, and the destructor releases it after the last write. In between
// the document is in memory, and the file on disk is what the last Write left.
//
// Whether the file still is that file is asked in two places only, with the state that fstat gives
// (m_known): after the lock was lost and taken again, and before a write in that case. Otherwise
// the lock itself answers it.
//
// Two kinds of failure are kept apart while opening. One concerns the contents: such a file is set
// aside, so that the next opening begins with an empty one. The other concerns the moment - memory,
// descriptors, rights, a failing disk - and says nothing about the file, which stays as it is.
#include "source/vlIniMgr.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <new>
#include <utility>
#include <vector>

#include "source/Common/vltFailure.h"
#include "source/Common/vltFileSecurity.h"
#include "source/Common/vltResultOf.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/BinaryFile.h"
#include "zt/fnd/osdep/LeakedInstance.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Files.h"
#include "ztini/OpenFile.h"
#include "ztini/Render.h"
#include "ztini/ztini.h"

using zt::fnd::AnsiString;
using zt::fnd::String;
using zt::fnd::osdep::LeakedInstance;
using zt::fnd::osdep::path;
using zt::fnd::osdep::PosixError;
using zt::posix::ScopedFd;

namespace {

constexpr mode_t kNewFileMode = 0666;

ScopedFd OpenForReading(const std::string& fileName) {
  return zt::posix::OpenExisting(fileName.c_str(), O_RDONLY, zt::posix::Kind::FileOrDirectory);
}

// The machine could not open or read the file now: no memory, no descriptors, no right, a failing
// disk. The one status of a parser is left over: a file in an encoding that cannot be read.
bool ConcernsTheContents(int32_t status) { return status == kIniUnsupportedEncoding; }

void SetAsideIfPossible(const std::string& fileName) {
  // The caller is about to throw anyway; a file that cannot be set aside is met again next time.
  vlt::Attempt<zt::fnd::exception::Exception>(
      [&] { CvlIniMgr::SetAside(String(fileName.c_str())); });
}

void MoveAside(const std::string& file, const std::string& stamp) {
  if (zt::posix::MoveAside(file.c_str(), stamp.c_str()) != 0) ZT_RAISE(PosixError());
}

}  // namespace

CvlIniMgr::CvlIniMgr(char const* fileName, bool lockOnly, unsigned char const* expectedChecksum,
                     bool saveOnDestroy, bool useEscapes)
    : IniDocument(useEscapes),
      m_fileName(fileName),
      m_lockOnly(lockOnly),
      m_saveOnDestroy(saveOnDestroy) {
  Initialize(expectedChecksum);
}

CvlIniMgr CvlIniMgr::OpenForUpdate(const std::string& fileName) {
  return CvlIniMgr(fileName.c_str(), false, nullptr, false, true);
}

CvlIniMgr CvlIniMgr::OpenRaw(const std::string& fileName) {
  return CvlIniMgr(fileName.c_str(), false, nullptr, false, false);
}

CvlIniMgr CvlIniMgr::OpenAndSaveAtEnd(const std::string& fileName) {
  return CvlIniMgr(fileName.c_str(), false, nullptr, true, true);
}

CvlIniMgr CvlIniMgr::LockOnly(const std::string& fileName) {
  return CvlIniMgr(fileName.c_str(), true, nullptr, false, false);
}

CvlIniMgr::~CvlIniMgr() {
  if (m_lockOnly) return;
  if (m_ini && m_saveOnDestroy) Write();
  Dispose();
  // A destructor cannot report it; the next opening sets the mode again.
  vlt::Attempt<std::exception>(
      [&] { vlrSetFileSecurity(String(m_fileName.c_str()), kSharedMode); });
}

void CvlIniMgr::Initialize(unsigned char const* digest) {
  m_lock = std::make_unique<IniFileLock>(IniFileLock::NameForFile(m_fileName.c_str()));
  if (m_lockOnly) return;
  ScopedFd fd = OpenForReading(m_fileName);
  if (fd.valid()) {
    if (!ValidateFile(fd.get(), digest, &m_validated)) CleanupAndThrow(false);
    // By the path, so that what a link leads to keeps its mode.
    zt::posix::SetSharedMode(m_fileName.c_str(), kSharedMode);
  } else if (errno == ENOENT) {
    // Only a file that is not there is a new one: one that cannot be opened just now, because of
    // missing descriptors for example, must not be begun again.
    CreateFile();
  }
  // What is read is what was validated, also if another file takes the name meanwhile.
  int32_t status = fd.valid() ? readDocument(fd.get()) : InitializeIniBindings();
  if (status != 0) CleanupAndThrow(ConcernsTheContents(status));
  ztini::IniKeepSource(m_ini, std::move(m_validated.bytes));
  m_known = fd.valid() ? StateOf(fd.get()) : stateOfFile();
}

void CvlIniMgr::CreateFile() {
  // If the directory is really missing the file cannot be made either, and that is reported.
  vlt::Attempt<zt::fnd::exception::Exception>([&] {
    String directory = path::DirName(String(m_fileName.c_str()));
    path::MakePathEndInSlash(directory);
    vltMakeSharedDirectory(directory);
  });
  m_dirty = true;
  // A file that another process has created since the check is used as it is.
  ScopedFd fd = zt::posix::CreateNew(m_fileName.c_str(), O_RDWR, kNewFileMode);
  if (fd.valid()) zt::posix::SetSharedMode(fd.get(), kSharedMode);
}

int32_t CvlIniMgr::GetFileLength(int fd) {
  struct stat info;
  // Only regular files have a length. Those that cannot be parsed for their size are not read for
  // their digest either: any user can make one that large.
  if (fstat(fd, &info) != 0 || !S_ISREG(info.st_mode)) return -1;
  if (info.st_size > ztini::kLargestFileBytes) return -1;
  return static_cast<int32_t>(info.st_size);
}

void CvlIniMgr::GetMD5Checksum(const unsigned char* data, unsigned long lengthBytes,
                               unsigned char* digest) {
  Cmd5vlt md5;
  md5.addString(data, static_cast<unsigned>(lengthBytes));
  md5.getDigest(digest);
}

// Of the whole file; false if it could not be read to its length.
bool CvlIniMgr::Digest(int fd, Digested* of) {
  const int32_t length = GetFileLength(fd);
  if (length < 0) return false;
  const auto sizeBytes = static_cast<size_t>(length);
  char* bytes = of->bytes.fill(sizeBytes);
  if (!bytes) throw std::bad_alloc();
  if (zt::fnd::osdep::BinaryFile::ReadExactSize(fd, bytes, sizeBytes) < 0) return false;
  of->sizeBytes = sizeBytes;
  GetMD5Checksum(reinterpret_cast<const unsigned char*>(bytes), sizeBytes, of->digest.data());
  return true;
}

bool CvlIniMgr::ValidateFile(int fd, unsigned char const* digest, Digested* validated) {
  if (!digest) return true;
  // What cannot be checked is not accepted.
  return vlt::Attempt<std::bad_alloc>([&] {
    Digested found;
    if (!Digest(fd, &found)) return false;
    if (memcmp(found.digest.data(), digest, found.digest.size()) != 0) return false;
    *validated = std::move(found);
    return true;
  });
}

// A start that finds nothing new saves what it has read, whose digest is known. Of a text that
// begins as the last one, the digest goes on from there.
IniSidecar::Digest CvlIniMgr::digestOf(const unsigned char* text, size_t sizeBytes,
                                       size_t unchangedBytes) {
  const Digested known = std::exchange(m_validated, Digested());
  if (sizeBytes != 0 && sizeBytes == known.sizeBytes && sizeBytes == unchangedBytes)
    return known.digest;
  if (m_beginning.sizeBytes > unchangedBytes) m_beginning = Beginning();
  auto add = [text](Cmd5vlt* md5, size_t from, size_t to) {
    md5->addString(text + from, static_cast<unsigned>(to - from));
  };
  add(&m_beginning.md5, m_beginning.sizeBytes, unchangedBytes);
  m_beginning.sizeBytes = unchangedBytes;
  Cmd5vlt md5 = m_beginning.md5;
  add(&md5, unchangedBytes, sizeBytes);
  IniSidecar::Digest digest;
  md5.getDigest(digest.data());
  return digest;
}

namespace {

struct DisposeIni {
  void operator()(IniStructForwardReferenceTag* document) const { IniDispose(document); }
};
using OwnedIni = std::unique_ptr<IniStructForwardReferenceTag, DisposeIni>;

int ErrorOf(int fd, int32_t status) {
  struct stat info;
  if (status == kIniOutOfMemory) return ENOMEM;
  if (fstat(fd, &info) != 0) return errno;
  if (S_ISDIR(info.st_mode)) return EISDIR;
  return info.st_size > ztini::kLargestFileBytes ? EFBIG : 0;
}

}  // namespace

CvlIniMgr::Finding CvlIniMgr::Inspect(const std::string& fileName, const unsigned char* digest) {
  ScopedFd fd = OpenForReading(fileName);
  if (!fd) {
    int error = errno;
    return {error == ENOENT ? Found::Missing : Found::NotReadable, error};
  }
  Digested ignored;
  if (!ValidateFile(fd.get(), digest, &ignored)) return {Found::OtherDigest};
  OwnedIni document(NewDocument());
  int32_t status = document ? IniReadFromDescriptor(document.get(), fileName.c_str(), fd.get())
                            : kIniOutOfMemory;
  if (status == 0) return {Found::Readable};
  if (ConcernsTheContents(status)) return {Found::NoIniFile};
  return {Found::NotReadable, ErrorOf(fd.get(), status)};
}

int32_t CvlIniMgr::InitializeIniBindings() {
  ScopedFd fd = OpenForReading(m_fileName);
  return readDocument(fd.get());
}

int32_t CvlIniMgr::readDocument(int fd) {
  OwnedIni fresh(NewDocument());
  if (!fresh) return kIniOutOfMemory;
  IniSetDurability(fresh.get(), m_durability);
  int32_t status = IniReadFromDescriptor(fresh.get(), m_fileName.c_str(), fd);
  // What is held stays, whatever the status: the next save would otherwise replace the file by
  // less.
  if (m_ini && status != 0) return status;
  Dispose();
  m_ini = fresh.release();
  return status;
}

void CvlIniMgr::SetDurability(IniDurability durability) {
  m_durability = durability;
  if (m_ini) IniSetDurability(m_ini, durability);
}

void CvlIniMgr::CleanupAndThrow(bool setAside) {
  if (m_ini) {
    Dispose();
    if (setAside) SetAsideIfPossible(m_fileName);
  }
  m_lock.reset();
  throw 1;
}

std::string CvlIniMgr::SidecarName(const std::string& fileName) {
  return fileName.substr(0, fileName.rfind('.')) + ".vl5";
}

void CvlIniMgr::SetAside(const String& fileName) {
  std::string file = AnsiString(fileName).c_str();
  std::string stamp = AnsiString(vlrGetCurrentLocalTime()).c_str();
  std::string sidecar = SidecarName(file);
  // A directory in the sidecar's place goes first. Left there, it would have every later opening
  // set the file aside once more.
  if (path::IsDirectory(String(sidecar.c_str()).c_str())) MoveAside(sidecar, stamp);
  if (path::DoesFileExist(fileName)) MoveAside(file, stamp);
  if (path::DoesFileExist(String(sidecar.c_str())) && zt::posix::Unlink(sidecar.c_str()) != 0) {
    ZT_RAISE(PosixError());
  }
  zt::posix::SyncDirectoryOf(file.c_str());
}

CvlIniMgr::FileState CvlIniMgr::stateOfFile() const {
  return StateOf(zt::posix::LookUp(m_fileName.c_str()).fd.get());
}

CvlIniMgr::FileState CvlIniMgr::StateOf(int fd) {
  struct stat info;
  return fd >= 0 && fstat(fd, &info) == 0 ? IniFileStateOf(info) : FileState();
}

// Whether others are kept out, at the latest from now on.
bool CvlIniMgr::ownsLock() {
  if (m_lock->excludesOthers()) return true;
  m_lockWasLost = true;
  if (m_lock->retake()) return true;
  vltTraceError("The lock of \"%s\" was lost, and another process has it: nothing is written",
                m_fileName.c_str());
  return false;
}

HRESULT CvlIniMgr::MakeSureOfLock() {
  if (!ownsLock()) return E_FAIL;
  if (!m_lockWasLost) return S_OK;
  FileState now = stateOfFile();
  if (!isUnchanged(now)) {
    // m_lockWasLost stays set, so that the next call tries again.
    if (InitializeIniBindings() != 0) return E_FAIL;
    m_known = now;
    m_dirty = false;
  }
  m_lockWasLost = false;
  return S_OK;
}

void CvlIniMgr::AbandonDocument() {
  // Reachable, so that it is not reported as a leak.
  LeakedInstance<std::vector<IniStructForwardReferenceTag*>>().push_back(m_ini);
  m_ini = nullptr;
  m_dirty = false;
  m_lockWasLost = true;
  m_known = FileState();
  // The other thread may have been taking a digest.
  m_beginning = Beginning();
  m_validated = Digested();
  InitializeIniBindings();
}

HRESULT CvlIniMgr::Write() {
  bool isInPlace;
  return m_dirty ? writeDocument(nullptr, &isInPlace) : S_OK;
}

// *digest, if asked for, is that of the bytes that were written; *isInPlace, whether they are still
// what the path leads to.
HRESULT CvlIniMgr::writeDocument(IniSidecar::Digest* digest, bool* isInPlace) {
  if (!m_ini || !ownsLock()) return E_FAIL;
  // The changes may have been made to what the file no longer is.
  if (m_lockWasLost && !isUnchanged(stateOfFile())) return E_FAIL;
  struct Wanted {
    CvlIniMgr* of;
    IniSidecar::Digest* digest;
  } wanted = {this, digest};
  IniTextFunction takeDigest = [](void* context, const char* text, size_t sizeBytes,
                                  size_t unchangedBytes) {
    auto* to = static_cast<Wanted*>(context);
    *to->digest =
        to->of->digestOf(reinterpret_cast<const unsigned char*>(text), sizeBytes, unchangedBytes);
  };
  // Of a text that is not digested nothing is known, and no later one is compared with what was
  // checked.
  if (!digest) {
    m_beginning = Beginning();
    m_validated = Digested();
  }
  int32_t status = IniWriteToFileAndTell(m_ini, m_fileName.c_str(), digest ? takeDigest : nullptr,
                                         &wanted, &m_known);
  *isInPlace = m_known.isKnown();
  if (!*isInPlace) m_known = stateOfFile();
  return status == 0 ? S_OK : E_FAIL;
}

HRESULT CvlIniMgr::DigestFile(IniSidecar::Digest* digest) const {
  ScopedFd fd = OpenForReading(m_fileName);
  if (!fd.valid()) return E_FAIL;
  // Out of memory is the one failure here that has a result of its own.
  return vlt::ResultOf<std::bad_alloc>(E_OUTOFMEMORY, [&] {
    Digested found;
    if (!Digest(fd.get(), &found)) return E_FAIL;
    *digest = found.digest;
    return S_OK;
  });
}

HRESULT CvlIniMgr::WriteAndGetDigest(IniSidecar::Digest* digest) {
  if (m_dirty) {
    bool isInPlace = false;
    HRESULT result = writeDocument(digest, &isInPlace);
    if (result < 0) return result;
    // Reading the file could only fail.
    if (isInPlace && IniIsSettled(m_ini)) {
      IniTakeAsRead(m_ini);
      return S_OK;
    }
  }
  // The digest is of the file as it is, whoever has written it: a sidecar for other bytes would be
  // a false one.
  HRESULT result = DigestFile(digest);
  if (InitializeIniBindings() != 0 && result >= 0) result = E_FAIL;
  return result;
}

HRESULT CvlIniMgr::WriteAndGetChecksum(unsigned char** digest) {
  if (!digest) return E_POINTER;
  *digest = nullptr;
  IniSidecar::Digest written;
  HRESULT result = WriteAndGetDigest(&written);
  if (result < 0) return result;
  *digest = new (std::nothrow) unsigned char[written.size()];
  if (!*digest) return E_OUTOFMEMORY;
  memcpy(*digest, written.data(), written.size());
  return result;
}

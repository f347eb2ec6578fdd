#include "source/vlIniMgr.h"

#include <errno.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <new>
#include <vector>

#include "source/Cmd5vlt.h"
#include "source/Common/vltFailure.h"
#include "source/Common/vltFileSecurity.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/BinaryFile.h"
#include "zt/fnd/osdep/Retry.h"
#include "zt/fnd/osdep/ScopedFd.h"
#include "zt/fnd/osdep/path.h"
#include "ztini/ztini.h"

using zt::fnd::AnsiString;
using zt::fnd::String;
using zt::fnd::osdep::path;
using zt::fnd::osdep::RetryEintr;
using zt::fnd::osdep::ScopedFd;

namespace {

constexpr unsigned kDigestSize = 16;
constexpr int32_t kReadOptions =
    kIniReadDoubleQuotes | kIniReadSingleQuotes | 16;  // 16 is idle here
constexpr int32_t kWriteOptions = kIniWriteSafely | kIniWriteSpaces | kIniWriteTight;
constexpr int32_t kNoLineLimit = -1;
constexpr int32_t kQuotesOn = 1;

// Never waits for the other end of a named pipe.
ScopedFd Open(const std::string& fileName, int flags) {
  return ScopedFd(RetryEintr(
      [&] { return open(fileName.c_str(), flags | O_CLOEXEC | O_NONBLOCK | O_NOCTTY, 0666); }));
}

bool IsFileOrDirectory(int fd) {
  struct stat info;
  return fstat(fd, &info) == 0 && (S_ISREG(info.st_mode) || S_ISDIR(info.st_mode));
}

// Want of memory, of descriptors or of the right to open.
bool SaysNothingOfTheFile(int32_t status) {
  return status == kIniOutOfMemory || status == kIniCannotOpen;
}

// The whole file; false if it could not be read to the told length.
bool ReadWhole(int fd, int32_t lengthBytes, std::vector<unsigned char>* data) {
  if (lengthBytes < 0) return false;
  data->resize(static_cast<size_t>(lengthBytes));
  return zt::fnd::osdep::BinaryFile::ReadExactSize(fd, data->data(), data->size()) >= 0;
}

HRESULT CopyOut(const char* value, char** out) {
  strcpy(*out, value);
  return S_OK;
}

HRESULT CopyOut(const char* value, std::string* out) {
  *out = value;
  return S_OK;
}

void SetAsideIfPossible(const std::string& fileName) {
  try {
    CvlIniMgr::SetAside(String(fileName.c_str()));
  } catch (const zt::fnd::exception::Exception&) {
    // The caller is about to throw anyway; a file that cannot be set aside is met again next time.
  }
}

bool IsNull(char** out) { return !out || !*out; }
bool IsNull(const std::string* out) { return !out; }

}  // namespace

CvlIniMgr::CvlIniMgr(char const* fileName, bool lockOnly, unsigned char const* expectedChecksum,
                     bool saveOnDestroy, bool useEscapes)
    : m_fileName(fileName),
      m_lockOnly(lockOnly),
      m_saveOnDestroy(saveOnDestroy),
      m_useEscapes(useEscapes) {
  Initialize(expectedChecksum);
}

CvlIniMgr::~CvlIniMgr() {
  if (m_lockOnly) return;
  if (m_ini && m_saveOnDestroy) Write();
  DisposeDocument();
  try {
    vlrSetFileSecurity(String(m_fileName.c_str()), kSharedMode);
  } catch (const std::exception&) {
    // A destructor has nobody to tell; the next user opens the file up.
  }
}

void CvlIniMgr::Initialize(unsigned char const* digest) {
  m_lock = std::make_unique<IniFileLock>(IniFileLock::NameForFile(m_fileName.c_str()));
  if (m_lockOnly) return;
  ScopedFd fd = Open(m_fileName, O_RDONLY);
  if (fd.valid()) {
    // A pipe or a device in the file's place is left alone.
    if (!IsFileOrDirectory(fd.get())) CleanupAndThrow(false);
    if (!ValidateFile(fd.get(), digest)) CleanupAndThrow(false);
    fd.reset();
    vlrSetFileSecurity(String(m_fileName.c_str()), kSharedMode);
  } else if (errno == ENOENT) {
    // Only a file that is not there is a new one: one that cannot be opened just now, for want of
    // descriptors say, must not be given a new beginning.
    CreateFile();
  }
  int32_t status = InitializeIniBindings();
  if (status != 0) CleanupAndThrow(!SaysNothingOfTheFile(status));
}

void CvlIniMgr::CreateFile() {
  try {
    String directory = path::DirName(String(m_fileName.c_str()));
    path::MakePathEndInSlash(directory);
    vltMakeSharedDirectory(directory);
  } catch (const zt::fnd::exception::Exception&) {
    // If the directory is really missing the file cannot be made either, and that is what tells.
  }
  m_dirty = true;
  // Not truncated: whoever was faster than this look may have put something in.
  ScopedFd fd = Open(m_fileName, O_RDWR | O_CREAT | O_NOFOLLOW);
  if (!fd.valid()) return;
  fd.reset();
  vlrSetFileSecurity(String(m_fileName.c_str()), kSharedMode);
}

int32_t CvlIniMgr::GetFileLength(int fd) {
  struct stat info;
  // Only regular files have a length; files from 2 GiB up are not for this class.
  if (fstat(fd, &info) != 0 || !S_ISREG(info.st_mode) || info.st_size > INT32_MAX) return -1;
  return static_cast<int32_t>(info.st_size);
}

void CvlIniMgr::GetMD5Checksum(const unsigned char* data, unsigned long lengthBytes,
                               unsigned char* digest) {
  Cmd5vlt md5;
  md5.addString(data, static_cast<unsigned>(lengthBytes));
  md5.getDigest(digest);
}

bool CvlIniMgr::ValidateFile(int fd, unsigned char const* digest) const {
  if (!digest) return true;
  try {
    std::vector<unsigned char> data;
    if (!ReadWhole(fd, GetFileLength(fd), &data)) return false;
    unsigned char found[kDigestSize];
    GetMD5Checksum(data.data(), data.size(), found);
    return memcmp(found, digest, kDigestSize) == 0;
  } catch (const std::bad_alloc&) {
    return false;  // What cannot be checked is not accepted.
  }
}

int32_t CvlIniMgr::InitializeIniBindings() {
  IniStructForwardReferenceTag* fresh = IniNew(0);
  if (!fresh) return kIniOutOfMemory;
  IniSetReadOptions(fresh, kReadOptions);
  IniSetWriteOptions(fresh, kNoLineLimit, ' ', kWriteOptions);
  IniSetDurability(fresh, m_durable ? IniDurability::Synced : IniDurability::None);
  int32_t status = IniReadFromFile(fresh, m_fileName.c_str());
  // What could not be read for want of memory or descriptors is no reason to forget what is known: the
  // next save would write the forgetting down.
  if (m_ini && SaysNothingOfTheFile(status)) {
    IniDispose(fresh);
    return status;
  }
  DisposeDocument();
  m_ini = fresh;
  return status;
}

void CvlIniMgr::SetDurable(bool durable) {
  m_durable = durable;
  if (m_ini) IniSetDurability(m_ini, durable ? IniDurability::Synced : IniDurability::None);
}

void CvlIniMgr::DisposeDocument() {
  IniDispose(m_ini);
  m_ini = nullptr;
}

void CvlIniMgr::CleanupAndThrow(bool setAside) {
  if (m_ini) {
    DisposeDocument();
    if (setAside) SetAsideIfPossible(m_fileName);
  }
  m_lock.reset();
  throw 1;
}

std::string CvlIniMgr::SidecarName(const std::string& fileName) {
  return fileName.substr(0, fileName.rfind('.')) + ".vl5";
}

void CvlIniMgr::SetAside(const String& fileName) {
  String badEnd = vlrGetCurrentLocalTime() + L".bad";
  String sidecar(SidecarName(AnsiString(fileName).c_str()).c_str());
  // A directory in the sidecar's place goes first. Left there, it would have every later opening set the
  // file aside once more: the empty one of this opening over the copy that is made here.
  if (path::IsDirectory(sidecar.c_str())) path::RenameFile(sidecar, sidecar + badEnd);
  if (path::DoesFileExist(fileName)) path::RenameFile(fileName, fileName + badEnd);
  if (path::DoesFileExist(sidecar)) path::RemoveFile(sidecar);
}

HRESULT CvlIniMgr::Write() {
  if (!m_dirty) return S_OK;
  if (!m_ini) return E_FAIL;
  return IniWriteToFile(m_ini, m_fileName.c_str()) == 0 ? S_OK : E_FAIL;
}

HRESULT CvlIniMgr::DigestFile(unsigned char** digest) const {
  ScopedFd fd = Open(m_fileName, O_RDONLY);
  if (!fd.valid()) return E_FAIL;
  try {
    std::vector<unsigned char> data;
    if (!ReadWhole(fd.get(), GetFileLength(fd.get()), &data)) return E_FAIL;
    *digest = new unsigned char[kDigestSize];
    GetMD5Checksum(data.data(), data.size(), *digest);
    return S_OK;
  } catch (const std::bad_alloc&) {
    return E_OUTOFMEMORY;  // The one failure here that has a result of its own.
  }
}

HRESULT CvlIniMgr::WriteAndGetChecksum(unsigned char** digest) {
  if (!digest) return E_POINTER;
  *digest = nullptr;
  HRESULT result = Write();
  if (result < 0) return result;
  result = DigestFile(digest);
  if (InitializeIniBindings() != 0 && result >= 0) result = E_FAIL;
  if (result < 0) {
    delete[] * digest;
    *digest = nullptr;
  }
  return result;
}

namespace {

// The value as stored, or decoded; null when absent.
const char* Value(IniStructForwardReferenceTag* document, const char* section, const char* item,
                  bool decoded) {
  const char* value = nullptr;
  int32_t status = decoded ? IniGetPointerToString(document, section, item, &value)
                           : IniGetPointerToRawString(document, section, item, &value);
  return status == 1 ? value : nullptr;
}

template <class Out>
HRESULT GetValue(IniStructForwardReferenceTag* document, const char* section, const char* item,
                 bool decoded, Out* out) {
  if (!section || !item || IsNull(out)) return E_POINTER;
  const char* value = Value(document, section, item, decoded);
  return value ? CopyOut(value, out) : E_FAIL;
}

template <class Out>
HRESULT GetSectionName(IniStructForwardReferenceTag* document, int n, Out* out) {
  if (IsNull(out)) return E_POINTER;
  const char* name = nullptr;
  return IniNthSectionName(document, n, &name) == 1 ? CopyOut(name, out) : E_FAIL;
}

template <class Out>
HRESULT GetItemName(IniStructForwardReferenceTag* document, const char* section, int n, Out* out) {
  if (!section || IsNull(out)) return E_POINTER;
  const char* name = nullptr;
  return IniNthItemName(document, section, n, &name) == 1 ? CopyOut(name, out) : E_FAIL;
}

}  // namespace

HRESULT CvlIniMgr::GetItem(char const* section, char const* item, char** out) const {
  return GetValue(m_ini, section, item, m_useEscapes, out);
}

HRESULT CvlIniMgr::GetItem(char const* section, char const* item, std::string* out) const {
  return GetValue(m_ini, section, item, m_useEscapes, out);
}

HRESULT CvlIniMgr::SetItem(char const* section, char const* item, char const* value, bool quote) {
  if (!section || !item || !value) return E_POINTER;
  if (IniPutStringWithOptions(m_ini, section, item, value, quote ? kQuotesOn : 0,
                              m_useEscapes ? 1 : 0) != 1) {
    return E_FAIL;
  }
  m_dirty = true;
  return S_OK;
}

HRESULT CvlIniMgr::ItemExists(char const* section, char const* item) const {
  return IniItemExists(m_ini, section, item) == 1 ? S_OK : E_FAIL;
}

HRESULT CvlIniMgr::SectionExists(char const* section) const {
  if (!section) return E_POINTER;
  return IniSectionExists(m_ini, section) == 1 ? S_OK : E_FAIL;
}

HRESULT CvlIniMgr::EraseItem(char const* section, char const* item) {
  if (!section || !item) return E_POINTER;
  if (IniRemoveItem(m_ini, section, item) != 1) return E_FAIL;
  m_dirty = true;
  return S_OK;
}

HRESULT CvlIniMgr::EraseSection(char const* section) {
  if (!section) return E_POINTER;
  if (IniRemoveSection(m_ini, section) != 1) return E_FAIL;
  m_dirty = true;
  return S_OK;
}

int CvlIniMgr::GetNumberOfSections() const { return IniNumberOfSections(m_ini); }

int CvlIniMgr::GetNumberOfItems(char const* section) const {
  return IniNumberOfItems(m_ini, section);
}

HRESULT CvlIniMgr::GetNthSectionName(int n, char** out) const {
  return GetSectionName(m_ini, n, out);
}
HRESULT CvlIniMgr::GetNthSectionName(int n, std::string* out) const {
  return GetSectionName(m_ini, n, out);
}
HRESULT CvlIniMgr::GetNthItemName(char const* section, int n, char** out) const {
  return GetItemName(m_ini, section, n, out);
}
HRESULT CvlIniMgr::GetNthItemName(char const* section, int n, std::string* out) const {
  return GetItemName(m_ini, section, n, out);
}

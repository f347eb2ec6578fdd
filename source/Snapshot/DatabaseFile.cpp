#include "source/Snapshot/DatabaseFile.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include "source/Cmd5vlt.h"
#include "source/DurableCopy.h"
#include "source/vlIniMgr.h"
#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"
#include "ztini/OpenFile.h"

using zt::posix::RetryEintr;
using zt::posix::ScopedFd;

namespace vlt::snapshot {

IniFileState DatabaseAccess::stateOf(const std::string& file) {
  struct stat info;
  return zt::posix::LookUp(file.c_str()).examine(&info) ? IniFileStateOf(info) : IniFileState();
}

int DatabaseAccess::read(const std::string& file, std::string* bytes) {
  bytes->clear();
  ScopedFd fd = zt::posix::OpenExisting(file.c_str(), O_RDONLY);
  if (!fd) return errno;
  char block[65536];
  for (;;) {
    ssize_t got = RetryEintr([&] { return ::read(fd.get(), block, sizeof block); });
    if (got < 0) return errno;
    if (got == 0) return 0;
    bytes->append(block, static_cast<size_t>(got));
    if (bytes->size() > ztini::kLargestFileBytes) return EFBIG;
  }
}

IniSidecar::State DatabaseAccess::readSidecar(const std::string& sidecar,
                                              IniSidecar::Digest* digest) {
  return IniSidecar::Read(sidecar, digest);
}

void DatabaseAccess::wait(unsigned milliseconds) {
  timespec left = {0, static_cast<long>(milliseconds) * 1000000};
  while (nanosleep(&left, &left) != 0 && errno == EINTR) {
  }
}

namespace {

constexpr unsigned kFirstWaitMs = 1;
constexpr unsigned kStepMs = 8;

IniSidecar::Digest DigestOf(const std::string& bytes) {
  Cmd5vlt md5;
  md5.addString(reinterpret_cast<const unsigned char*>(bytes.data()),
                static_cast<unsigned>(bytes.size()));
  IniSidecar::Digest digest;
  md5.getDigest(digest.data());
  return digest;
}

bool IsDirectory(const std::string& path) {
  struct stat info;
  return zt::posix::LookUp(path.c_str(), false).examine(&info) && S_ISDIR(info.st_mode);
}

bool IsRegularFile(const std::string& path) {
  struct stat info;
  return zt::posix::LookUp(path.c_str(), false).examine(&info) && S_ISREG(info.st_mode);
}

class Reader {
 public:
  Reader(const std::string& file, DatabaseAccess& access)
      : m_file(file), m_sidecar(CvlIniMgr::SidecarName(file)), m_access(access) {}

  DatabaseBytes read() {
    unsigned waited = 0;
    for (unsigned wait = kFirstWaitMs; !readOnce() && waited < kLongestWaitMs; wait *= 2) {
      if (wait > kStepMs) wait = kStepMs;
      m_access.wait(wait);
      waited += wait;
    }
    DatabaseState state = judge();
    // As the next opening takes it: the second name counts where the first one does not match.
    if (state != DatabaseState::Sound && state != DatabaseState::Unreadable)
      takeDurableCopy(&state);
    DatabaseBytes result;
    result.database.path = m_file;
    result.database.state = state;
    result.database.readFromDurableCopy = m_fromCopy;
    if (state == DatabaseState::Unreadable) {
      result.database.error = m_error;
      result.database.failedPath = m_failed;
    } else if (state != DatabaseState::SidecarShort && state != DatabaseState::SidecarDirectory) {
      result.bytes = std::move(m_bytes);
    }
    return result;
  }

 private:
  // Whether no save can have been under way.
  bool readOnce() {
    IniFileState before = m_access.stateOf(m_file);
    m_error = m_access.read(m_file, &m_bytes);
    errno = 0;
    m_sidecarState = m_access.readSidecar(m_sidecar, &m_digest);
    m_sidecarError = errno;
    if (!(before == m_access.stateOf(m_file))) return false;
    if (m_error != 0) return !zt::posix::IsPassing(m_error);
    if (m_sidecarState == IniSidecar::State::Unreadable) return false;
    return m_sidecarState != IniSidecar::State::Present || matches();
  }

  bool matches() const { return DigestOf(m_bytes) == m_digest; }

  DatabaseState judge() {
    m_failed = m_file;
    if (m_error == ENOENT) return DatabaseState::Missing;
    if (m_error != 0) return DatabaseState::Unreadable;
    switch (m_sidecarState) {
      case IniSidecar::State::Present:
        return matches() ? DatabaseState::Sound : DatabaseState::DigestDiffers;
      case IniSidecar::State::Missing:
        return DatabaseState::SidecarMissing;
      case IniSidecar::State::Short:
        return IsDirectory(m_sidecar) ? DatabaseState::SidecarDirectory
                                      : DatabaseState::SidecarShort;
      case IniSidecar::State::Unreadable:
        break;
    }
    m_failed = m_sidecar;
    m_error = m_sidecarError;
    return DatabaseState::Unreadable;
  }

  void takeDurableCopy(DatabaseState* state) {
    std::string copy = DurableCopy::NameFor(m_file);
    if (!IsRegularFile(copy)) return;
    std::string bytes;
    if (m_access.read(copy, &bytes) != 0) return;
    m_bytes = std::move(bytes);
    m_error = 0;
    m_fromCopy = true;
    *state = judge();
  }

  const std::string m_file, m_sidecar;
  DatabaseAccess& m_access;
  std::string m_bytes, m_failed;
  int m_error = 0, m_sidecarError = 0;
  IniSidecar::State m_sidecarState = IniSidecar::State::Missing;
  IniSidecar::Digest m_digest{};
  bool m_fromCopy = false;
};

}  // namespace

DatabaseBytes ReadDatabase(const std::string& file, DatabaseAccess& access) {
  return Reader(file, access).read();
}

}  // namespace vlt::snapshot

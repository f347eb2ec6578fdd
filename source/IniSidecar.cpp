// A sidecar is overwritten in place: sixteen bytes are one write inside one block of the disk, and
// readers see the old digest or the new one, never a shorter file. Only a missing one is made under
// another name and renamed, since a new file begins empty, and an empty sidecar would mean a torn
// file.
#include "source/IniSidecar.h"

#include <errno.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "source/Common/vltFileSecurity.h"
#include "zt/fnd/osdep/BinaryFile.h"
#include "zt/posix/Files.h"
#include "zt/posix/Retry.h"

using zt::fnd::osdep::BinaryFile;
using zt::posix::Kind;
using zt::posix::LastLink;
using zt::posix::RetryEintr;
using zt::posix::ScopedFd;

namespace IniSidecar {
namespace {

constexpr mode_t kNewFileMode = 0666;

// The digest, then whatever is too long goes.
bool Overwrite(int fd, off_t oldSize, const Digest& digest, bool durable) {
  if (!zt::posix::WriteAllAt(fd, digest.data(), kSizeBytes, 0)) return false;
  // After the write: cut first, it would be short for a moment.
  if (oldSize > kSizeBytes && RetryEintr([&] { return ftruncate(fd, kSizeBytes); }) != 0) {
    return false;
  }
  return !durable || zt::posix::Sync(fd);
}

// Complete under another name first, then renamed into place.
bool Create(const std::string& sidecar, const Digest& digest, bool durable) {
  std::string temporary = sidecar + ".TMP";
  // What a killed process left, maybe another user's.
  if (zt::posix::MakeRoom(temporary.c_str()) != 0) return false;
  {
    ScopedFd fd = zt::posix::CreateNew(temporary.c_str(), O_WRONLY, kNewFileMode);
    if (!fd) return false;
    // Before the rename, so that a kill right after it leaves no sidecar that others cannot write.
    zt::posix::SetSharedMode(fd.get(), kSharedMode);
    // Always synced: a rename that outlives its file's bytes in a power cut would leave a short
    // one.
    if (!Overwrite(fd.get(), 0, digest, true) ||
        zt::posix::Rename(temporary.c_str(), sidecar.c_str()) != 0) {
      zt::posix::Unlink(temporary.c_str());
      return false;
    }
  }
  return !durable || zt::posix::SyncDirectoryOf(sidecar.c_str());
}

}  // namespace

State Read(const std::string& sidecar, Digest* digest) {
  ScopedFd fd =
      zt::posix::OpenExisting(sidecar.c_str(), O_RDONLY, Kind::FileOrDirectory, LastLink::Refused);
  if (!fd) return zt::posix::IsPassing(errno) ? State::Unreadable : State::Missing;
  // A file that ends early is no failure of the system: errno is still 0 then.
  errno = 0;
  Digest found;
  long read = BinaryFile::ReadExactSize(fd.get(), found.data(), kSizeBytes);
  if (read == kSizeBytes) {
    *digest = found;
    return State::Present;
  }
  return zt::posix::IsPassing(errno) ? State::Unreadable : State::Short;
}

HRESULT Write(const std::string& sidecar, const Digest& digest, bool durable) {
  ScopedFd fd = zt::posix::OpenExisting(sidecar.c_str(), O_WRONLY, Kind::File, LastLink::Refused);
  // Whatever else is in its place - a directory, a pipe, a link - is not replaced by a save.
  if (!fd) return errno == ENOENT && Create(sidecar, digest, durable) ? S_OK : E_FAIL;
  struct stat info;
  if (fstat(fd.get(), &info) != 0) return E_FAIL;
  // A file that has a second name elsewhere is not overwritten: the new one takes this name from
  // it.
  if (info.st_nlink > 1) return Create(sidecar, digest, durable) ? S_OK : E_FAIL;
  if (!Overwrite(fd.get(), info.st_size, digest, durable)) return E_FAIL;
  // A failure is no reason to fail the save: the file may be another user's, who has set its mode.
  zt::posix::SetSharedMode(fd.get(), info, kSharedMode);
  return S_OK;
}

}  // namespace IniSidecar

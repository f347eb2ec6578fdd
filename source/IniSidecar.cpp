#include "source/IniSidecar.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <memory>

#include "source/Common/vltFileSecurity.h"
#include "zt/fnd/osdep/BinaryFile.h"
#include "zt/fnd/osdep/Retry.h"
#include "zt/fnd/osdep/ScopedFd.h"

using zt::fnd::String;
using zt::fnd::osdep::BinaryFile;
using zt::fnd::osdep::RetryEintr;
using zt::fnd::osdep::ScopedFd;

namespace IniSidecar {
namespace {

ScopedFd Open(const std::string& path, int flags) {
  return ScopedFd(RetryEintr(
      [&] { return open(path.c_str(), flags | O_CLOEXEC | O_NONBLOCK | O_NOCTTY, 0666); }));
}

bool Sync(int fd, bool durable) {
  return !durable || RetryEintr([&] { return fsync(fd); }) == 0;
}

// One pwrite, then whatever is too long goes.
bool Overwrite(int fd, const unsigned char* digest, bool durable) {
  struct stat info;
  if (RetryEintr([&] { return pwrite(fd, digest, kSizeBytes, 0); }) != kSizeBytes) return false;
  if (fstat(fd, &info) != 0) return false;
  if (info.st_size > kSizeBytes && RetryEintr([&] { return ftruncate(fd, kSizeBytes); }) != 0) {
    return false;
  }
  return Sync(fd, durable);
}

bool SyncDirectoryOf(const std::string& path, bool durable) {
  if (!durable) return true;
  std::string directory = path.substr(0, path.rfind('/') + 1);
  ScopedFd fd = Open(directory.empty() ? "." : directory, O_RDONLY | O_DIRECTORY);
  return fd.valid() && Sync(fd.get(), true);
}

// Complete under another name first, then renamed into place.
bool Create(const std::string& sidecar, const unsigned char* digest, bool durable) {
  std::string temporary = sidecar + ".TMP";
  unlink(temporary.c_str());  // What a killed process left, maybe another user's.
  {
    ScopedFd fd = Open(temporary, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW);
    // Before the rename, so that a kill right after it leaves no sidecar that others cannot write.
    if (fd.valid()) fchmod(fd.get(), kSharedMode);
    // Always synced: a rename that outlives its file's bytes in a power cut would leave a short one.
    if (!fd.valid() || !Overwrite(fd.get(), digest, true) ||
        rename(temporary.c_str(), sidecar.c_str()) != 0) {
      if (fd.valid()) unlink(temporary.c_str());
      return false;
    }
  }
  return SyncDirectoryOf(sidecar, durable);
}

}  // namespace

HRESULT Read(const std::string& sidecar, unsigned char** digest) {
  *digest = nullptr;
  ScopedFd fd = Open(sidecar, O_RDONLY);
  struct stat info;
  if (!fd.valid() || fstat(fd.get(), &info) != 0) return S_FALSE;
  // A pipe or a device is nothing that a save has left: it says nothing about the file beside it.
  if (!S_ISREG(info.st_mode) && !S_ISDIR(info.st_mode)) return S_FALSE;
  std::unique_ptr<unsigned char[]> found(new unsigned char[kSizeBytes]);
  if (BinaryFile::ReadExactSize(fd.get(), found.get(), kSizeBytes) != kSizeBytes) return E_FAIL;
  *digest = found.release();
  return S_OK;
}

HRESULT Write(const std::string& sidecar, const unsigned char* digest, bool durable) {
  ScopedFd fd = Open(sidecar, O_WRONLY | O_NOFOLLOW);
  bool written = fd.valid() ? Overwrite(fd.get(), digest, durable)
                            : errno == ENOENT && Create(sidecar, digest, durable);
  if (!written) return E_FAIL;
  vlrSetFileSecurity(String(sidecar.c_str()), kSharedMode);
  return S_OK;
}

}  // namespace IniSidecar

#include "ztini/OpenFile.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <utility>

#include "zt/posix/Files.h"

using zt::posix::ScopedFd;

namespace ztini {

Stream OpenForReading(const char* path) {
  ScopedFd fd = zt::posix::OpenExisting(path, O_RDONLY, zt::posix::Kind::FileOrDirectory);
  struct stat status;
  if (!fd || fstat(fd.get(), &status) != 0) return nullptr;
  // By the size before a byte is read. A file that grows afterwards is met by the reader, which has
  // the same limit.
  if (S_ISREG(status.st_mode) && status.st_size > kLargestFileBytes) {
    errno = EFBIG;
    return nullptr;
  }
  return StreamOver(std::move(fd), "rb");
}

Stream StreamOver(ScopedFd fd, const char* mode) {
  Stream stream(fd ? fdopen(fd.get(), mode) : nullptr);
  if (stream) fd.release();
  return stream;
}

size_t ReadBytes(void* buffer, size_t sizeBytes, FILE* stream) {
  char* bytes = static_cast<char*>(buffer);
  size_t done = 0;
  for (;;) {
    errno = 0;
    done += fread(bytes + done, 1, sizeBytes - done, stream);
    // A signal sets the stream's error flag, like a real failure; errno distinguishes them.
    if (done == sizeBytes || !ferror(stream) || errno != EINTR) return done;
    clearerr(stream);
  }
}

}  // namespace ztini

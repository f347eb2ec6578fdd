#pragma once

#include <sys/types.h>

#include <cstdint>
#include <cstdio>
#include <memory>
#include <utility>

namespace ztini {

// Opening files without waiting, without following surprises, and close-on-exec.

// Closes a descriptor that no stream has taken over.
class ScopedFd {
 public:
  explicit ScopedFd(int fd) : m_fd(fd) {}
  ~ScopedFd();
  ScopedFd(ScopedFd&& other) noexcept : m_fd(other.release()) {}
  ScopedFd& operator=(ScopedFd&& other) noexcept {
    std::swap(m_fd, other.m_fd);  // the other one closes what this one had
    return *this;
  }

  explicit operator bool() const { return m_fd >= 0; }
  int get() const { return m_fd; }
  int release();

 private:
  int m_fd;
};

struct CloseStream {
  void operator()(FILE* stream) const { fclose(stream); }
};
using Stream = std::unique_ptr<FILE, CloseStream>;

// For reading; null if it cannot be opened or is neither a regular file nor a directory (which
// fails at the first read). Never waits at a named pipe.
Stream OpenForReading(const char* path);

// An existing regular file, for reading and writing, its bytes untouched.
ScopedFd OpenExisting(const char* path);

// A regular file, made if missing, for writing; its bytes stay until Truncate.
ScopedFd OpenOrCreate(const char* path);

// A file that was not there before: fails if the path names anything, a dangling link included.
ScopedFd CreateNew(const char* path);

bool Truncate(const ScopedFd& fd);

// A stream that owns the descriptor; null without memory, with the descriptor closed.
Stream StreamOver(ScopedFd fd, const char* mode);

// fsync; a file system that has no such thing counts as done.
bool SyncDescriptor(int fd);

// fsync of the directory that holds the path. False if it cannot be opened or synced.
bool SyncDirectoryOf(const char* path);

}  // namespace ztini

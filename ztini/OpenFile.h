#pragma once

#include <cstdint>
#include <cstdio>
#include <memory>

#include "zt/posix/ScopedFd.h"

namespace ztini {

// Streams over descriptors of zt/posix/Files.h.

struct CloseStream {
  void operator()(FILE* stream) const { fclose(stream); }
};
using Stream = std::unique_ptr<FILE, CloseStream>;

// A larger file is not read: a document takes a multiple of its file's size in memory.
inline constexpr int64_t kLargestFileBytes = int64_t{256} << 20;

// For reading. Null, with errno, if it cannot be opened, is larger than kLargestFileBytes (EFBIG),
// or is neither a regular file nor a directory (which fails at the first read). Never waits.
Stream OpenForReading(const char* path);

// A stream that owns the descriptor; null without memory, with the descriptor closed.
Stream StreamOver(zt::posix::ScopedFd fd, const char* mode);

// fread that goes on after a signal. The stream's error flag is set only for real failures.
size_t ReadBytes(void* buffer, size_t sizeBytes, FILE* stream);

}  // namespace ztini

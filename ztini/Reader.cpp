// The file is taken into one block and cut up there: names and values of the document are places in
// that block, so that reading makes no block for each. The block has a byte to spare, since the
// parser terminates the last line in place.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <utility>

#include "zt/posix/Files.h"
#include "zt/posix/Transfer.h"
#include "ztini/ByteOrderMark.h"
#include "ztini/Document.h"
#include "ztini/OpenFile.h"
#include "ztini/Parser.h"
#include "ztini/StringTools.h"

namespace {

// Where the text begins, or kIniUnsupportedEncoding.
int32_t TextOffset(const char* bytes, size_t read) {
  switch (ztini::MarkIn(bytes, read)) {
    case ztini::ByteOrderMark::Wide:
      return kIniUnsupportedEncoding;
    case ztini::ByteOrderMark::Utf8:
      return ztini::kUtf8MarkSize;
    case ztini::ByteOrderMark::None:
      break;
  }
  return 0;
}

// What was read, in one block with a byte to spare.
struct Bytes {
  ztini::OwnedText block;
  size_t size = 0;
};

constexpr size_t kLeastBlock = 4096;
constexpr size_t kMostBytes = static_cast<size_t>(ztini::kLargestFileBytes);

// How many bytes to ask for first: one more than the file has, so that its end is seen at once.
size_t SizeHint(int fd) {
  struct stat status;
  if (fstat(fd, &status) != 0 || !S_ISREG(status.st_mode)) return kLeastBlock;
  if (status.st_size < 0 || status.st_size > ztini::kLargestFileBytes) return kLeastBlock;
  return static_cast<size_t>(status.st_size) + 1;
}

// The rest of a stream, from where it is.
struct StreamSource {
  FILE* file;
  size_t sizeHint() const { return SizeHint(fileno(file)); }
  bool read(char* to, size_t wanted, size_t, size_t* got) const {
    *got = ztini::ReadBytes(to, wanted, file);
    return !ferror(file);
  }
};

// The whole of what a descriptor leads to, wherever its position is.
struct FileSource {
  int fd;
  size_t hint;
  size_t sizeHint() const { return hint; }
  bool read(char* to, size_t wanted, size_t offset, size_t* got) const {
    errno = 0;
    *got = zt::posix::MoveAll(wanted, [&](size_t done, size_t rest) {
      return pread(fd, to + done, rest, static_cast<off_t>(offset + done));
    });
    return *got == wanted || errno == 0;
  }
};

template <class Source>
int32_t ReadAll(const Source& source, Bytes* bytes) {
  size_t capacity = source.sizeHint();
  for (;;) {
    void* block = ztini::Reallocate(bytes->block.get(), capacity + 1);
    if (!block) return kIniOutOfMemory;
    (void)bytes->block.release();
    bytes->block.reset(static_cast<char*>(block));
    const size_t wanted = capacity - bytes->size;
    size_t got = 0;
    const bool good = source.read(bytes->block.get() + bytes->size, wanted, bytes->size, &got);
    bytes->size += got;
    if (!good) return kIniReadFailed;
    if (got < wanted) return 0;
    // It grows while it is read.
    if (bytes->size > kMostBytes) return kIniReadFailed;
    // A stream without a size, or a file that has grown.
    capacity = capacity * 2 + kLeastBlock;
  }
}

// After a failure: the document holds the lines that came before it.
void ReadWholeLines(IniStructForwardReferenceTag* doc, Bytes bytes) {
  const char* block = bytes.block.get();
  while (bytes.size && !strchr("\r\n", block[bytes.size - 1])) --bytes.size;
  const int32_t offset = TextOffset(block, bytes.size);
  if (offset < 0) return;
  ztini::IniReadText(doc, std::move(bytes.block), static_cast<size_t>(offset), bytes.size);
}

// The block becomes the document's.
int32_t ReadBlock(IniStructForwardReferenceTag* doc, Bytes bytes) {
  const int32_t offset = TextOffset(bytes.block.get(), bytes.size < 4 ? bytes.size : 4);
  if (offset < 0) return offset;
  return ztini::IniReadText(doc, std::move(bytes.block), static_cast<size_t>(offset), bytes.size);
}

template <class Source>
int32_t ReadDocument(IniStructForwardReferenceTag* doc, const Source& source) {
  Bytes bytes;
  const int32_t status = ReadAll(source, &bytes);
  if (status < 0) {
    if (status == kIniReadFailed) ReadWholeLines(doc, std::move(bytes));
    return status;
  }
  return ReadBlock(doc, std::move(bytes));
}

}  // namespace

int32_t IniReadBytes(IniStructForwardReferenceTag* doc, const char* bytes, size_t sizeBytes) {
  if (!doc) return 0;
  Bytes copy;
  copy.block.reset(static_cast<char*>(ztini::Reallocate(nullptr, sizeBytes + 1)));
  if (!copy.block) return kIniOutOfMemory;
  copy.size = sizeBytes;
  if (sizeBytes) memcpy(copy.block.get(), bytes, sizeBytes);
  return ReadBlock(doc, std::move(copy));
}

int32_t ztini_IniReadFromFileHelper(IniStructForwardReferenceTag* doc, FILE* file) {
  if (!doc || !file) return 0;
  const int result = fseek(file, 0, SEEK_SET);
  return result < 0 ? result : ReadDocument(doc, StreamSource{file});
}

int32_t IniReadFromDescriptor(IniStructForwardReferenceTag* doc, const char* path, int fd) {
  struct stat status;
  if (!doc) return 0;
  if (!path || fstat(fd, &status) != 0) return kIniCannotOpen;
  const bool regular = S_ISREG(status.st_mode);
  if (regular && status.st_size > ztini::kLargestFileBytes) return kIniCannotOpen;
  // Before the document is emptied: without memory for the path it stays as it was.
  ztini::OwnedText name(ztini_StrDup(path));
  if (!name) return kIniOutOfMemory;
  const size_t hint = regular ? static_cast<size_t>(status.st_size) + 1 : kLeastBlock;
  const int32_t result = ReadDocument(doc, FileSource{fd, hint});
  if (result < 0) return result;
  doc->fileName = std::move(name);
  doc->fileTimestamp = status.st_mtime;
  return result;
}

int32_t IniReadFromFile(IniStructForwardReferenceTag* doc, const char* path) {
  if (!doc) return 0;
  zt::posix::ScopedFd fd;
  if (path) fd = zt::posix::OpenExisting(path, O_RDONLY, zt::posix::Kind::FileOrDirectory);
  return fd ? IniReadFromDescriptor(doc, path, fd.get()) : kIniCannotOpen;
}

int32_t IniGetFileTimestamp(const char* path, int64_t* seconds) {
  if (!path || !*path) return kIniEmptyPath;
  struct stat status;
  if (stat(path, &status) != 0) return kIniBadPath;
  if (seconds) *seconds = status.st_mtime;
  return 0;
}

int32_t IniIsFileNewer(IniStructForwardReferenceTag* doc) {
  int64_t seconds = 0;
  const int32_t status = IniGetFileTimestamp(doc ? doc->fileName.get() : nullptr, &seconds);
  if (status < 0) return status;
  // Any other time: a file that was restored from a copy is older, and not the one that was read.
  return seconds != doc->fileTimestamp ? 1 : 0;
}

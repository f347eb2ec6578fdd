#include <sys/stat.h>

#include <cstdio>
#include <cstring>
#include <utility>

#include "ztini/ByteOrderMark.h"
#include "ztini/Document.h"
#include "ztini/OpenFile.h"
#include "ztini/Parser.h"
#include "ztini/StringTools.h"

namespace {

// Where the text begins, or kIniUnsupportedEncoding.
int32_t TextOffset(const char* bytes, size_t read) {
  switch (ztini::MarkIn(bytes, read)) {
    case ztini::ByteOrderMark::kWide:
      return kIniUnsupportedEncoding;
    case ztini::ByteOrderMark::kUtf8:
      return ztini::kUtf8MarkSize;
    case ztini::ByteOrderMark::kNone:
      break;
  }
  return 0;
}

// All that is left of a stream, in one block with a byte to spare.
struct Bytes {
  ztini::OwnedText block;
  size_t size = 0;
};

constexpr size_t kLeastBlock = 4096;
constexpr size_t kMostBytes = static_cast<size_t>(ztini::kLargestFileBytes);

// How many bytes to ask for first: one more than the file has, so that its end is seen at once.
size_t SizeHint(FILE* file) {
  struct stat status;
  if (fstat(fileno(file), &status) != 0 || !S_ISREG(status.st_mode)) return kLeastBlock;
  if (status.st_size < 0 || status.st_size > ztini::kLargestFileBytes) return kLeastBlock;
  return static_cast<size_t>(status.st_size) + 1;
}

int32_t ReadRest(FILE* file, Bytes* bytes) {
  size_t capacity = SizeHint(file);
  for (;;) {
    void* block = ztini::Reallocate(bytes->block.get(), capacity + 1);
    if (!block) return kIniOutOfMemory;
    (void)bytes->block.release();
    bytes->block.reset(static_cast<char*>(block));
    const size_t wanted = capacity - bytes->size;
    const size_t got = ztini::ReadBytes(bytes->block.get() + bytes->size, wanted, file);
    bytes->size += got;
    if (ferror(file)) return kIniReadFailed;
    if (got < wanted) return 0;
    // It grows while it is read.
    if (bytes->size > kMostBytes) return kIniReadFailed;
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

}  // namespace

int32_t ztini_IniReadFromFileHelper(IniStructForwardReferenceTag* doc, FILE* file) {
  if (!doc || !file) return 0;
  const int result = fseek(file, 0, SEEK_SET);
  if (result < 0) return result;
  Bytes bytes;
  const int32_t status = ReadRest(file, &bytes);
  if (status < 0) {
    if (status == kIniReadFailed) ReadWholeLines(doc, std::move(bytes));
    return status;
  }
  const int32_t offset = TextOffset(bytes.block.get(), bytes.size < 4 ? bytes.size : 4);
  if (offset < 0) return offset;
  return ztini::IniReadText(doc, std::move(bytes.block), static_cast<size_t>(offset), bytes.size);
}

int32_t IniReadFromFile(IniStructForwardReferenceTag* doc, const char* path) {
  if (!doc) return 0;
  ztini::Stream file = path ? ztini::OpenForReading(path) : nullptr;
  if (!file) return kIniCannotOpen;
  // The whole is asked for at once; a buffer would only be copied through.
  setvbuf(file.get(), nullptr, _IONBF, 0);
  ztini::OwnedText name(ztini_StrDup(path));
  if (!name) return kIniOutOfMemory;
  struct stat status;
  const bool known = fstat(fileno(file.get()), &status) == 0;
  const int32_t result = ztini_IniReadFromFileHelper(doc, file.get());
  if (result < 0) return result;
  doc->fileName = std::move(name);
  doc->fileTimestamp = known ? status.st_mtime : 0;
  return result;
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
  return seconds != doc->fileTimestamp ? 1 : 0;
}

#include <sys/stat.h>

#include <cstring>
#include <utility>

#include "ztini/ByteOrderMark.h"
#include "ztini/Document.h"
#include "ztini/LineReader.h"
#include "ztini/OpenFile.h"
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

struct DisposeLineFile {
  void operator()(LineFile* state) const { LineFileDispose(state); }
};

}  // namespace

int32_t ztini_IniReadFromFileHelper(IniStructForwardReferenceTag* doc, FILE* file) {
  if (!doc || !file) return 0;
  int result = fseek(file, 0, SEEK_SET);
  if (result < 0) return result;
  char start[4];
  const size_t read = ztini::ReadBytes(start, sizeof start, file);
  // The bytes may hold a mark that the next read, which may succeed, would not see.
  if (ferror(file)) return kIniReadFailed;
  const int32_t offset = TextOffset(start, read);
  if (offset < 0) return offset;
  result = fseek(file, offset, SEEK_SET);
  if (result < 0) return result;
  std::unique_ptr<LineFile, DisposeLineFile> lines(LineFileNew(file));
  if (!lines) return kIniOutOfMemory;
  return IniRead(doc, IniLineFileInputFunction, lines.get());
}

int32_t IniReadFromFile(IniStructForwardReferenceTag* doc, const char* path) {
  if (!doc) return 0;
  ztini::Stream file = path ? ztini::OpenForReading(path) : nullptr;
  if (!file) return kIniCannotOpen;
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

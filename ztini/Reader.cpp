#include <sys/stat.h>

#include <cstring>
#include <utility>

#include "ztini/Document.h"
#include "ztini/LineReader.h"
#include "ztini/OpenFile.h"
#include "ztini/StringTools.h"

namespace {

// Byte order marks. The names of the 16-bit ones are the wrong way round for the bytes that they
// hold; both are refused alike.
constexpr unsigned char utf32le[] = {0xFF, 0xFE, 0x00, 0x00};
constexpr unsigned char utf32be[] = {0x00, 0x00, 0xFE, 0xFF};
constexpr unsigned char utf8[] = {0xEF, 0xBB, 0xBF};
constexpr unsigned char utf16be[] = {0xFF, 0xFE};
constexpr unsigned char utf16le[] = {0xFE, 0xFF};

template <size_t size>
bool Begins(const char* bytes, size_t read, const unsigned char (&mark)[size]) {
  return read >= size && memcmp(bytes, mark, size) == 0;
}

// Where the text begins, or kIniUnsupportedEncoding.
int32_t TextOffset(const char* bytes, size_t read) {
  if (Begins(bytes, read, utf32le) || Begins(bytes, read, utf32be)) return kIniUnsupportedEncoding;
  if (Begins(bytes, read, utf8)) return sizeof utf8;
  if (Begins(bytes, read, utf16be) || Begins(bytes, read, utf16le)) return kIniUnsupportedEncoding;
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
  const int32_t offset = TextOffset(start, fread(start, 1, sizeof start, file));
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

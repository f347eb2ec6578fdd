#include <utility>

#include "ztini/Document.h"
#include "ztini/FileReplace.h"
#include "ztini/StringTools.h"

int32_t IniWriteToFile(IniStructForwardReferenceTag* doc, const char* path) {
  if (!doc || !path || !*path) return kIniBadPath;
  // Beforehand: once the file is in place nothing may fail.
  ztini::OwnedText name(ztini_StrDup(path));
  if (!name) return kIniOutOfMemory;
  ztini::FileReplacement file(path, doc->writeOptions);
  int32_t status = file.open();
  if (status == 0) status = ztini_IniWriteToFileHelper(doc, file.stream());
  if (status == 0) status = file.commit(doc->durability);
  if (status < 0) return status;
  int64_t written = 0;
  IniGetFileTimestamp(path, &written);
  doc->fileName = std::move(name);
  doc->fileTimestamp = written;
  return 0;
}

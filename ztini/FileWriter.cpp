#include <utility>

#include "ztini/Document.h"
#include "ztini/FileReplace.h"
#include "ztini/Render.h"
#include "ztini/StringTools.h"
#include "ztini/TextBuffer.h"

int32_t IniWriteToFile(IniStructForwardReferenceTag* doc, const char* path) {
  if (!doc || !path || !*path) return kIniBadPath;
  // Beforehand: once the file is in place nothing may fail.
  ztini::OwnedText name(ztini_StrDup(path));
  if (!name) return kIniOutOfMemory;
  ztini::FileReplacement file(path, doc->writeOptions);
  int32_t status = file.open();
  ztini::TextBuffer text;
  if (status == 0) status = ztini::IniRender(doc, &text);
  if (status == 0) status = file.write(text.text(), text.size());
  if (status == 0) status = file.commit(doc->durability);
  if (status < 0) return status;
  int64_t written = 0;
  IniGetFileTimestamp(path, &written);
  doc->fileName = std::move(name);
  doc->fileTimestamp = written;
  return 0;
}

#include <sys/stat.h>

#include <utility>

#include "ztini/Document.h"
#include "ztini/FileReplace.h"
#include "ztini/OpenFile.h"
#include "ztini/Render.h"
#include "ztini/StringTools.h"
#include "ztini/TextBuffer.h"

int32_t IniWriteToFileAndTell(IniStructForwardReferenceTag* doc, const char* path,
                              IniTextFunction seen, void* context, IniFileState* written) {
  *written = IniFileState();
  if (!doc || !path || !*path) return kIniBadPath;
  // Beforehand: once the file is in place nothing may fail.
  ztini::OwnedText name(ztini_StrDup(path));
  if (!name) return kIniOutOfMemory;
  // Opened before the text is made: a target that cannot be replaced costs no rendering, and the
  // text is written in one call.
  ztini::FileReplacement file(path, doc->writeOptions);
  int32_t status = file.open();
  ztini::TextBuffer text;
  size_t unchanged = 0;
  if (status == 0) status = ztini::IniRender(doc, &text, seen ? &unchanged : nullptr);
  if (status == 0) status = file.write(text.text(), text.size());
  if (status == 0 && seen) seen(context, text.text(), text.size(), unchanged);
  IniFileState state;
  if (status == 0) status = file.commit(doc->durability, &state);
  if (status < 0) return status;
  // What is too large to be read back is not settled.
  if (text.size() > static_cast<size_t>(ztini::kLargestFileBytes)) doc->settled = false;
  if (std::exchange(doc->wasSaved, true)) doc->rendering = std::move(text);
  struct stat now;
  const bool known = stat(path, &now) == 0;
  // By the path once more: another process, or a link, may have put another file there since the
  // rename.
  if (known && IniFileStateOf(now) == state) *written = state;
  doc->fileName = std::move(name);
  doc->fileTimestamp = known ? now.st_mtime : 0;
  return 0;
}

int32_t IniWriteToFile(IniStructForwardReferenceTag* doc, const char* path) {
  IniFileState ignored;
  return IniWriteToFileAndTell(doc, path, nullptr, nullptr, &ignored);
}

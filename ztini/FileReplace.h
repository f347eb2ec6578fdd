#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

#include "zt/posix/Files.h"
#include "zt/posix/ScopedFd.h"
#include "ztini/Alloc.h"
#include "ztini/ztini.h"

namespace ztini {

// Names of the temporary file beside a target; null without memory.

// The target with its extension replaced by "TMP". What has no extension after its last slash, has
// no slash, or ends in ".TMP" already, gets ".TMP" appended.
char* SiblingTemporaryName(const char* target);

// For mkstemp: "ini$$.TMPXXXXXX" in the target's directory.
char* UniqueTemporaryTemplate(const char* target);

// One save of one file: open, write, commit. An object that goes without a commit
// removes what it wrote, and the target is then as before.
//
//   state      open()                 commit()              destructor
//   closed     opened, or closed      -                     nothing
//   opened     -                      done, or closed       removes the written file
//   done       -                      -                     nothing
//
// Without kIniWriteSafely the written file is the target itself.
class FileReplacement {
 public:
  // The path must outlive the object.
  FileReplacement(const char* target, int32_t writeOptions);
  ~FileReplacement();
  FileReplacement(const FileReplacement&) = delete;
  FileReplacement& operator=(const FileReplacement&) = delete;

  // 0, or kIniNotReplaceable, kIniNoTemporary, kIniCannotCreate, kIniOutOfMemory.
  int32_t open();

  // All of the bytes, or kIniWriteFailed; interrupted and short writes go on.
  int32_t write(const char* bytes, size_t size);

  // Closes the file and puts it in place. 0, or kIniWriteFailed, kIniNotReplaceable.
  // kIniWriteFailed after the rename, with the new file in place, if its directory could not be
  // synced: a power cut may still lose it. Sets *state, if asked for, to that of the written file.
  int32_t commit(IniDurability durability, IniFileState* state = nullptr);

 private:
  bool safely() const { return m_temporary != nullptr; }
  zt::posix::ScopedFd openUnique();
  zt::posix::ScopedFd openSibling();
  int32_t openTemporary();
  int32_t openTarget();
  bool statTarget(struct stat* status) const;
  void inheritFromTarget(const struct stat& own);
  int32_t closeFile();
  int rename() const;
  void removeWritten() const;
  const char* targetName() const;
  const char* written() const { return m_temporary ? m_temporary.get() : m_target; }
  void discard();

  const char* m_target;
  int32_t m_options;
  OwnedText m_temporary;                    // null when the target itself is written
  std::optional<zt::posix::Entry> m_place;  // of the sibling; its name is in m_temporary
  zt::posix::ScopedFd m_file;
  bool m_pending = false;  // the written file is ours to remove
};

}  // namespace ztini

#pragma once

#include <memory>
#include <string>

#include "source/IniSidecar.h"
#include "source/vlIniMgr.h"

// What differs between the kinds of guarded files. The texts are static; a null one is left out.
struct GuardedIniKind {
  bool useEscapes = false;  // as CvlIniMgr takes it
  // Result of a step that the system did not refuse and that failed all the same: out of memory, or
  // a relative path where a full one is needed.
  HRESULT otherFailure = E_FAIL;
  // Lines of the log for a file that cannot be set aside: where the system refuses, and otherwise.
  const char* refusedMessage = nullptr;
  const char* otherFailureMessage = nullptr;
  // Function that an opening reports as out of memory, with the result E_OUTOFMEMORY. Null: the
  // opening throws std::bad_alloc.
  const char* openSignature = nullptr;
  // Hook points (source/Common/vltHookPoints.h) in the order in which they are passed. An answer
  // other than 0 at the first two means out of memory.
  const char* openPoint = nullptr;
  const char* retryPoint = nullptr;    // before the second opening
  const char* writtenPoint = nullptr;  // the file is written, its sidecar is old
  const char* sealedPoint = nullptr;   // the sidecar is written
};

// What a guarded file and its sidecar are like, and what the next opening makes of them.
struct GuardedIniState {
  enum class Kind {
    Sound,              // the digest matches
    NoSidecar,          // nor anything that counts as one
    FirstSave,          // the sidecar is the mark of a first save that has not ended
    DurableCopy,        // a database whose scan has not ended, with its second name
    DigestDiffers,      // a save that has not ended, or a change by hand
    Missing,            // there is no file
    Unparsable,         // in an encoding that cannot be read
    UnparsableChanged,  // the same, and the digest differs
    Unreadable,         // not to be opened or read now; nothing is known of the contents
    SidecarShort,
    SidecarDirectory,
    SidecarUnreadable,
  };
  enum class Opening {
    Takes,               // the file as it is
    TakesCopy,           // the second name, in the place of the file (source/DurableCopy.h)
    Begins,              // an empty file
    SetsAsideAndBegins,  // moves the file aside and begins an empty one
    SetsAsideAndFails,   // moves it aside and fails; the opening after it begins an empty one
    Fails,               // and leaves everything
  };
  Kind kind;
  Opening opening;
  int error = 0;  // errno of what is Unreadable, if it is known
};

// An INI file with its sidecar (source/IniSidecar.h): how both are opened, saved and set aside.
//
//   found at open              | *out              | result
//   no sidecar                 | the file as it is | S_OK
//   the digest matches         | the file          | S_OK
//   the digest differs         | the file as it is | S_OK; a save repairs the sidecar
//   the file cannot be parsed  | an empty file     | S_OK; the old one is set aside
//   the sidecar is short       | an empty file     | E_FAIL; the old one is set aside, if possible
//   the sidecar cannot be read | null              | E_FAIL; nothing is known of the file, and it
//   at the moment              |                   | stays
//
// A crash at any moment of a save leaves the old or the new file, with a sidecar that matches it or
// one that cannot match: never a file that looks as if it had not been guarded.
//
// Threads: the object is constant; save is for the thread that the manager belongs to.
class GuardedIniFile {
 public:
  // `kind` is kept by reference. Throws std::bad_alloc.
  GuardedIniFile(std::string file, const GuardedIniKind& kind);

  // Waits for other processes without limit. Sets *out, whose earlier object is destroyed first.
  // Throws what the second opening throws, the int 1 of CvlIniMgr included; *out is null then.
  HRESULT open(std::unique_ptr<CvlIniMgr>* out) const;

  // Writes file and sidecar, as durable as the manager writes. Results are those of the file, or of
  // the sidecar if that cannot be written: the file is the new one then, and the next opening takes
  // it.
  HRESULT save(CvlIniMgr& ini) const;

  // What open() would find and do, by the same judges, without the lock and without a change: while
  // another process saves, the answer may be of no moment at all. Throws std::bad_alloc.
  GuardedIniState inspect() const;
  // The same for the opening of a registrar, which takes up a second name before.
  GuardedIniState inspectDatabase() const;

  // Renames the file and removes the sidecar (CvlIniMgr::SetAside). E_FAIL where the system
  // refuses. The caller holds the file's lock.
  HRESULT setAside() const;

  // False for an inaccessible sidecar, too: a failed write of the mark is ignored.
  bool hasSidecar() const;

  // E_FAIL if the system refuses.
  HRESULT writeSidecar(const IniSidecar::Digest& digest, IniDurability durability) const;

  const std::string& file() const { return m_file; }
  const std::string& sidecar() const { return m_sidecar; }

 private:
  GuardedIniState inspectContents(const std::string& contents) const;
  std::unique_ptr<CvlIniMgr> create(const char* hookPoint,
                                    const IniSidecar::Digest* expected) const;

  const std::string m_file, m_sidecar;
  const GuardedIniKind& m_kind;
};

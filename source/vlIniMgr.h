#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "source/Cmd5vlt.h"
#include "source/Common/vltTypes.h"
#include "source/IniDocument.h"
#include "source/IniFileLock.h"
#include "source/IniSidecar.h"
#include "ztini/TextBuffer.h"
#include "ztini/ztini.h"

// The one door to a shared INI file.
//
// From construction to destruction the object holds the file's named lock, so that reading,
// checking and rewriting are one critical section among all processes; the lock is recursive within
// a thread. Beside the file is its sidecar, NAME.vl5: the 16 raw bytes of the MD5 of every byte
// of the file.
//
//   found at construction              | what happens
//   the file is missing                | made, with its directory, mode 0777; the object is dirty
//   no digest expected, or it matches  | read
//   the digest differs                 | throws 1; the file stays
//   the file cannot be parsed          | throws 1; the file is renamed to NAME_mmddyyyy.bad, or
//                                      | NAME_mmddyyyy.1.bad and so on after earlier ones of that
//                                      | day, and the sidecar removed
//   no memory; the file cannot be      | throws 1; the file stays
//   opened or read; above 256 MiB      |
//
// Results are S_OK, E_FAIL, E_POINTER for a null argument, E_OUTOFMEMORY. The items are those of
// the IniDocument. Threads: an object belongs to one at a time; any may destroy it.
class CvlIniMgr : public IniDocument {
 public:
  // The usual ways to open a file, without a check of its digest. They throw what the constructor
  // throws.

  // Values are in the escape encoding. The caller saves what it changes.
  static CvlIniMgr OpenForUpdate(const std::string& fileName);
  // The same, and the destructor saves.
  static CvlIniMgr OpenAndSaveAtEnd(const std::string& fileName);
  // Values are as they are in the file. The caller saves what it changes.
  static CvlIniMgr OpenRaw(const std::string& fileName);
  // Holds the lock and does nothing else; items must not be asked for.
  static CvlIniMgr LockOnly(const std::string& fileName);

  // Waits for the lock without limit. `lockOnly`: holds the lock and does nothing else; items must
  // not be asked for. `expectedChecksum`: 16 bytes or null for no check. `saveOnDestroy`: the
  // destructor writes. `useEscapes`: values are encoded when set and decoded when read. Throws the
  // plain int 1 as in the table, and what the lock throws (zt::fnd::osdep::PosixError).
  CvlIniMgr(char const* fileName, bool lockOnly, unsigned char const* expectedChecksum,
            bool saveOnDestroy, bool useEscapes);
  ~CvlIniMgr() override;

  // Makes sure that the lock still keeps other processes out: a fork, a host that closes all
  // descriptors and a removed lock file each end it without a word. A lost lock is taken again
  // without waiting; the file is read again if it is no longer what this object last read or wrote,
  // and changes that were not written are dropped. To be called before a change of an object that
  // lives long. E_FAIL, with the object as it was and a line in the log, where another process has
  // the lock or the file cannot be read. One thread at a time.
  HRESULT MakeSureOfLock();

  // Whether the lock keeps other processes out at this moment. Takes nothing, changes nothing.
  bool HoldsLock() const { return m_lock->excludesOthers(); }

  // For a forked child whose copy of the document another thread was changing at the fork: reads
  // the file again and leaves the copy, which may be in no state to be freed, where it is. Where
  // the file cannot be read the object is empty, and MakeSureOfLock fails until it can.
  void AbandonDocument();

  // Replaces the file if anything was changed since construction. A failure leaves the file. E_FAIL
  // also where the lock was lost and another process has it, or has changed the file since.
  HRESULT Write();
  // Write, then the digest of the file as it is, new[]; then the object holds exactly what the file
  // holds: it is read again, unless it is known to read back as this object. Null on failure. Where
  // the file cannot be read again, for whatever reason, the object keeps what it held.
  HRESULT WriteAndGetChecksum(unsigned char** digest);
  // The same into *digest, which is indeterminate on failure.
  HRESULT WriteAndGetDigest(IniSidecar::Digest* digest);

  // What a Write guarantees when it returns; Synced at first.
  void SetDurability(IniDurability durability);
  IniDurability durability() const { return m_durability; }

  // Path of the sidecar: the part from the last "." of the whole path on becomes ".vl5".
  static std::string SidecarName(const std::string& fileName);

  // Renames the file, if it is there, to NAME_mmddyyyy.bad, with a number after the date where that
  // is taken, and removes its sidecar. The caller holds the lock. Throws what zt::fnd::osdep::path
  // throws; a directory in the sidecar's place that cannot be moved leaves the file.
  static void SetAside(const zt::fnd::String& fileName);

  // What a construction would find, by the same judges, without the lock and without changing
  // anything. `digest`: 16 bytes or null for no check.
  enum class Found { Readable, Missing, OtherDigest, NoIniFile, NotReadable };
  struct Finding {
    Found found;
    int error = 0;  // why it is NotReadable: errno, or 0 if that is not known
  };
  static Finding Inspect(const std::string& fileName, const unsigned char* digest);

 private:
  void Initialize(unsigned char const* digest);
  void CreateFile();
  // What a file held, and its digest.
  struct Digested {
    ztini::TextBuffer bytes;
    size_t sizeBytes = 0;
    IniSidecar::Digest digest = {};
  };
  static bool Digest(int fd, Digested* of);
  static bool ValidateFile(int fd, unsigned char const* digest, Digested* validated);
  IniSidecar::Digest digestOf(const unsigned char* text, size_t sizeBytes, size_t unchangedBytes);
  static int32_t GetFileLength(int fd);
  static void GetMD5Checksum(const unsigned char* data, unsigned long lengthBytes,
                             unsigned char* digest);
  int32_t InitializeIniBindings();
  int32_t readDocument(int fd);
  [[noreturn]] void CleanupAndThrow(bool setAside);
  HRESULT DigestFile(IniSidecar::Digest* digest) const;
  HRESULT writeDocument(IniSidecar::Digest* digest, bool* isInPlace);
  bool ownsLock();

  using FileState = IniFileState;
  FileState stateOfFile() const;
  static FileState StateOf(int fd);
  // Whether that is the state in which this object last read or wrote the file.
  bool isUnchanged(const FileState& now) const { return now.isKnown() && now == m_known; }

  std::string m_fileName;
  bool m_lockOnly;
  bool m_saveOnDestroy;
  IniDurability m_durability = IniDurability::Synced;
  FileState m_known;  // of the file as it was last read or written
  // What the opening found good, until a write; its bytes are the document's source.
  Digested m_validated;
  // The digest of the beginning of what was written last.
  struct Beginning {
    size_t sizeBytes = 0;
    Cmd5vlt md5;
  };
  Beginning m_beginning;
  bool m_lockWasLost = false;  // and the file has not been compared with m_known since
  std::unique_ptr<IniFileLock> m_lock;
};

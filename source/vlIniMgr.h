#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "source/IniFileLock.h"
#include "source/Utilities/vltTypes.h"

struct IniStructForwardReferenceTag;

// The one door to a shared INI file.
//
// From construction to destruction the object holds the file's named lock, so that reading,
// checking and rewriting are one critical section among all processes; the lock is recursive within
// a thread. Beside the file stands its sidecar, NAME.vl5: the 16 raw bytes of the MD5 of every byte
// of the file.
//
//   found at construction              | what happens
//   the file is missing                | made, with its directory, mode 0777; the object is dirty
//   no digest expected, or it matches  | read
//   the digest differs                 | throws 1; the file stays
//   the file cannot be parsed          | throws 1; the file is renamed to NAME_mmddyyyy.bad over an
//                                      | earlier one of that day, and the sidecar removed
//   no memory; the file cannot be      | throws 1; the file stays
//   opened                             |
//
// Results are S_OK, E_FAIL, E_POINTER for a null argument, E_OUTOFMEMORY. Names and values are
// taken as they are: a line feed in a name or, without escapes, in a value breaks the file's lines.
// Threads: an object belongs to one at a time; any may destroy it.
class CvlIniMgr {
 public:
  // Waits for the lock without limit. `lockOnly`: holds the lock and does nothing else; items must
  // not be asked for. `expectedChecksum`: 16 bytes or null for no check. `saveOnDestroy`: the
  // destructor writes. `useEscapes`: values are encoded when set and decoded when read. Throws the
  // plain int 1 as in the table, and what the lock throws (zt::fnd::osdep::PosixError).
  CvlIniMgr(char const* fileName, bool lockOnly, unsigned char const* expectedChecksum,
            bool saveOnDestroy, bool useEscapes);
  virtual ~CvlIniMgr();
  CvlIniMgr(const CvlIniMgr&) = delete;
  CvlIniMgr& operator=(const CvlIniMgr&) = delete;

  // Replaces the file if anything was changed since construction. A failure leaves the file.
  HRESULT Write();
  // Write, then the digest of the file as it stands, new[]; then reads the file anew, so that the
  // object holds exactly what the file holds. Null on failure. Where the file cannot be read anew for
  // want of memory or because it cannot be opened, the object keeps what it held.
  HRESULT WriteAndGetChecksum(unsigned char** digest);

  // Copies the value to *out, which the caller provides and sizes.
  HRESULT GetItem(char const* section, char const* item, char** out) const;
  HRESULT GetItem(char const* section, char const* item, std::string* out) const;
  HRESULT SetItem(char const* section, char const* item, char const* value, bool quote);
  // S_OK when it is there, E_FAIL when not.
  HRESULT ItemExists(char const* section, char const* item) const;
  HRESULT SectionExists(char const* section) const;
  HRESULT EraseItem(char const* section, char const* item);
  HRESULT EraseSection(char const* section);
  int GetNumberOfSections() const;
  int GetNumberOfItems(char const* section) const;  // 0 for an unknown section
  // n from 1; 0 is the last and -1 the first.
  HRESULT GetNthSectionName(int n, char** out) const;
  HRESULT GetNthSectionName(int n, std::string* out) const;
  HRESULT GetNthItemName(char const* section, int n, char** out) const;
  HRESULT GetNthItemName(char const* section, int n, std::string* out) const;

  // With `durable` a Write returns when the medium has the file; otherwise a power cut, but no
  // killed process, can lose it. Durable at first.
  void SetDurable(bool durable);

  // Path of the sidecar: the part from the last "." of the whole path on becomes ".vl5".
  static std::string SidecarName(const std::string& fileName);

  // Renames the file, if it is there, to NAME_mmddyyyy.bad over an earlier one of that day, and does away
  // with its sidecar. The caller holds the lock. Throws what zt::fnd::osdep::path throws; a directory
  // in the sidecar's place that cannot be moved leaves the file.
  static void SetAside(const zt::fnd::String& fileName);

 private:
  void Initialize(unsigned char const* digest);
  void CreateFile();
  bool ValidateFile(int fd, unsigned char const* digest) const;
  static int32_t GetFileLength(int fd);
  static void GetMD5Checksum(const unsigned char* data, unsigned long lengthBytes,
                             unsigned char* digest);
  int32_t InitializeIniBindings();
  [[noreturn]] void CleanupAndThrow(bool setAside);
  HRESULT DigestFile(unsigned char** digest) const;
  void DisposeDocument();

  IniStructForwardReferenceTag* m_ini = nullptr;
  std::string m_fileName;
  bool m_lockOnly;
  bool m_dirty = false;
  bool m_saveOnDestroy;
  bool m_useEscapes;
  bool m_durable = true;
  std::unique_ptr<IniFileLock> m_lock;
};

#pragma once

#include <memory>

#include "zt/fnd/String.h"

// Hold on the named lock of one guarded INI file, for the object's life.
//
// All holds of one name in the process share ONE zt::fnd::osdep::Mutex: a second object of that
// class would be a second owner in the eyes of the kernel, and the thread that holds the first
// would wait for itself indefinitely.
//
//   lock of the name      a hold is made by          it
//   free                  any thread                 takes the named lock
//   held by this thread   this thread                counts up at once
//   held by a thread      another thread             waits
//   held by a process     any thread of another      waits
//
// Any thread may end a hold. Other threads wait as long as the holder lives, or indefinitely if the
// holding thread has ended without giving up its hold. A forked child owns none of its parent's
// holds: ending one there leaves the parent's lock alone. excludesOthers and retake: one thread at
// a time.
// Lock order: settings file before jar; registration database before registration file.
class IniFileLock {
 public:
  // Waits without limit. Throws what Mutex throws; nothing is held then.
  explicit IniFileLock(const zt::fnd::String& name);
  ~IniFileLock();
  IniFileLock(const IniFileLock&) = delete;
  IniFileLock& operator=(const IniFileLock&) = delete;

  // True while the hold keeps other processes out (Mutex::excludesOthers). What is written without
  // it may replace what another process has saved.
  bool excludesOthers() const;

  // Makes a hold that no longer excludes others one that does, without waiting. In a forked child
  // the object becomes a hold of the child. False, with nothing changed, where another process has
  // the lock, or another thread of a forked child, and for every failure.
  bool retake();

  // Hold on a file. A failure may have passed, so it is tried twice; what the second try throws
  // counts.
  static std::unique_ptr<IniFileLock> ForFile(const char* fileName);

  // Name of the lock of a file: its path without "\", "/", ":" and ".", a-z as A-Z, and bytes
  // beyond ASCII as "%" and two hexadecimal digits ("%C3"), so that one path has one name in every
  // locale. A name that would be too long for a directory entry ends in a digest instead of its
  // tail.
  static zt::fnd::String NameForFile(const char* fileName);

 private:
  struct Entry;
  class Table;
  Entry* m_entry;
};

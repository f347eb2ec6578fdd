#pragma once

#include "zt/fnd/StringFwd.h"
#include "zt/fnd/osdep/ThreadAnnotations.h"

namespace zt::fnd::osdep {

// Lock known by name to every process of the machine.
//
// An flock() on the file "mutex/" + name of the shared directory (SharedUnixObject.h), for the
// processes, and a section shared by the objects of one name in a process, for its threads. The
// kernel drops the file lock when the holder dies, so there is no abandoned state. The file stays;
// if it is removed or replaced, the next taker makes it again. So it is after the host has
// closed the descriptor, as daemons do; whatever has got the number since is left alone.
//
// Recursive for the thread that holds it, per object: a second object of the name in the same
// thread passes the section and waits in flock, as it is another owner of the file. Names that
// differ only in the case of a-z share the section and have two files. The file's name is the UTF-8
// form of the mutex's (SharedObjectName.h), so that it is the same in processes of any locale.
//
//   state of the object    lock               tryLock               unlock
//   free                   waits; held, 1     held, 1, or false     nothing
//   held by this thread    held, n + 1        held, n + 1           n - 1; 0 is free
//   held by another        waits              false                 n - 1; 0 frees the file, while
//                                                                   the section stays the holder's
//
// A forked child holds nothing: its objects open their files again on first use and never free what
// the parent holds. Neither it nor a program started by exec keeps the lock of a parent that died.
//
// Threads: one object may be shared. Lock order: the name's section, then the file.
class CAPABILITY("named mutex") Mutex {
 public:
  // Makes the file; throws what CreateSharedUnixFile and SharedObjectPath throw.
  explicit Mutex(const String& name);

  // Frees what the object holds.
  ~Mutex();
  Mutex(const Mutex&) = delete;
  Mutex& operator=(const Mutex&) = delete;

  // Takes the lock; waits without limit and resumes interrupted waits. Throws PosixError with
  // flock's errno, or of making the file again; the lock is then not held.
  void lock() const;

  // Takes the lock if that needs no wait. Returns false, with nothing changed, where it would have
  // to wait and for any failure.
  bool tryLock() const;

  // Never throws. A failing system call leaves the file locked.
  void unlock() const;

  // True while the lock that this object holds keeps others out: in the process that took it, with
  // the descriptor still open and the path still naming the locked file. A fork, a host that closes
  // all descriptors and a cleaner of old files each end that without a word. For any thread.
  bool excludesOthers() const;

  // Takes the file lock of a held object again after it was lost, without waiting. False where
  // another process has it, for any failure, and in a forked child, which holds nothing. For any
  // thread.
  bool retake() const;

 private:
  struct Record;
  Record* m_record;
};

}  // namespace zt::fnd::osdep

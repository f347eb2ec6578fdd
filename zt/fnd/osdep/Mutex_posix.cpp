// Two locks in a row. Threads of the process meet in a section that all objects of the name share;
// its owner alone then takes the flock, which keeps other processes out. The section first, since
// flock knows no threads: two objects of one process are two owners of the file, and would wait for
// each other's process, which is their own.
//
// A file lock may be lost or be worth nothing without a call that says so. The path can come to
// name another file, which later takers lock; the host can close the descriptor; a fork leaves the
// child with a copy. So every taking ends with the question whether the path still names what was
// locked, and begins again if it does not.
#include <sys/file.h>

#include <cerrno>
#include <exception>
#include <utility>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/CloseOnFork.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/Mutex.h"
#include "zt/fnd/osdep/MutexGlobalStatics.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/SharedObjectName.h"
#include "zt/fnd/osdep/SharedUnixObject.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Files.h"

using zt::posix::Flock;

namespace zt::fnd::osdep {
namespace {

constexpr const wchar_t* kDirectory = L"mutex";
// Attempts of tryLock on a file that another process keeps replacing.
constexpr int kReplacedFiles = 100;

// Opens the file of a name once more; its directory may have gone meanwhile.
CloseOnForkFd OpenLockFile(const AnsiString& file) {
  String dir = path::DirName(String(file));
  path::MakePathEndInSlash(dir);
  CreateSharedUnixDir(dir);
  return CloseOnForkFd::OpenShared(file, InTheWay::MovedAside);
}

using ScopedEntry = UnlockUnlessKept<const UnixCriticalSection>;

}  // namespace

struct Mutex::Record {
  explicit Record(const String& mutexName)
      : name(mutexName),
        statics(MutexGlobalStatics::Get()),
        file(SharedObjectPath(String(kDirectory), name)),
        fd(CloseOnForkFd::OpenShared(file, InTheWay::MovedAside)),
        data(statics->attach(name)),
        process(statics->process) {}

  ~Record();

  bool ofThisProcess() const { return process.isCurrent(); }
  void renewAfterFork();
  void reopen();
  bool addHoldIfHeld();
  bool takeFile(int operation, int attempts);
  void finishLock(ScopedEntry& entry);
  const UnixCriticalSection& section() const { return *data->second.section; }

  const String name;
  RefPtr<MutexGlobalStatics> statics;
  const AnsiString file;
  // Changed by the section's owner alone, under the statics' section, so that other threads may
  // read it there.
  CloseOnForkFd fd;
  MutexGlobalStatics::Map::iterator data;
  // How often the file lock was taken through this object, and how often the section was entered
  // for it. They differ after an unlock by a thread that does not own the section.
  int holds GUARDED_BY(statics->section) = 0;
  int entries GUARDED_BY(statics->section) = 0;
  ProcessMark process;
};

Mutex::Record::~Record() {
  if (!ofThisProcess()) {
    // The inherited statics are unusable.
    statics.detach();
    return;
  }
  // The descriptor closes with the object and frees the file lock; the section is shared and has to
  // be left as often as it was entered.
  for (; entries > 0; --entries) section().leave();
  statics->detach(data);
}

// Makes an object that came through fork() one of this process, which holds nothing.
void Mutex::Record::renewAfterFork() {
  if (ofThisProcess()) return;
  RefPtr<MutexGlobalStatics> fresh = MutexGlobalStatics::Get();
  Hold hold(fresh->renewal);
  // Once more under the lock: another thread may have renewed the object meanwhile.
  if (ofThisProcess()) return;
  CloseOnForkFd own = OpenLockFile(file);
  data = fresh->attach(name);
  statics.detach();
  statics = fresh;
  fd = std::move(own);
  {
    Hold counts(statics->section);
    holds = entries = 0;
  }
  process = fresh->process;  // last, as other threads ask for it first
}

void Mutex::Record::reopen() {
  CloseOnForkFd own = OpenLockFile(file);
  Hold hold(statics->section);
  fd = std::move(own);
}

// Counts a further lock of the thread that holds the file already.
bool Mutex::Record::addHoldIfHeld() {
  Hold hold(statics->section);
  if (holds == 0) return false;
  ++holds;
  ++entries;
  return true;
}

// Takes the file lock; false with flock's errno, and not locked when reopen() throws. A lock on a
// file that the path no longer names excludes no later taker, so the new file is locked
// instead.
bool Mutex::Record::takeFile(int operation, int attempts) {
  for (int attempt = 1;; ++attempt) {
    int number = fd.get();  // none, if the host has closed it
    if (number >= 0) {
      if (Flock(number, operation) != 0) return false;
      if (fd.identity().isNamedBy(file)) return true;
      // At once, as it may not come to a new file: those who wait for this one have to see it, too.
      Flock(number, LOCK_UN);
    }
    if (attempt == attempts) {
      errno = EWOULDBLOCK;
      return false;
    }
    reopen();
  }
}

void Mutex::Record::finishLock(ScopedEntry& entry) {
  Hold hold(statics->section);
  ++holds;
  ++entries;
  entry.keep();
}

Mutex::Mutex(const String& name) : m_record(new Record(name)) {}

Mutex::~Mutex() { delete m_record; }

void Mutex::lock() const {
  Record& record = *m_record;
  record.renewAfterFork();
  record.section().enter();
  ScopedEntry entry(record.section());
  if (record.addHoldIfHeld()) {
    entry.keep();
    return;
  }
  // 0 attempts never match the count: lock() tries without limit.
  if (!record.takeFile(LOCK_EX, 0)) ZT_RAISE(PosixError());
  record.finishLock(entry);
}

bool Mutex::tryLock() const {
  Record& record = *m_record;
  try {
    record.renewAfterFork();
    // Another thread of this process has it, which counts as another process would.
    if (!record.section().tryEnter()) return false;
    ScopedEntry entry(record.section());
    if (record.addHoldIfHeld()) {
      entry.keep();
      return true;
    }
    if (!record.takeFile(LOCK_EX | LOCK_NB, kReplacedFiles)) return false;
    record.finishLock(entry);
    return true;
  } catch (const std::exception&) {  // A file that cannot be made again, or no memory to do it.
    return false;
  }
}

void Mutex::unlock() const {
  Record& record = *m_record;
  if (!record.ofThisProcess()) return;  // what the parent holds
  bool leave;
  {
    Hold hold(record.statics->section);
    // The file goes with the count, so that a lock between the two cannot lose it.
    if (record.holds > 0 && --record.holds == 0) Flock(record.fd.get(), LOCK_UN);
    leave = record.entries > 0 && record.section().inOwningThread();
    if (leave) --record.entries;
  }
  if (leave) record.section().leave();
}

bool Mutex::excludesOthers() const {
  const Record& record = *m_record;
  if (!record.ofThisProcess()) return false;
  Hold hold(record.statics->section);
  return record.holds > 0 && record.fd.get() >= 0 && record.fd.identity().isNamedBy(record.file);
}

bool Mutex::retake() const {
  Record& record = *m_record;
  if (!record.ofThisProcess()) return false;
  try {
    CloseOnForkFd own = OpenLockFile(record.file);
    Hold hold(record.statics->section);
    // A new descriptor, as the old one may be closed or lead to a file that no other process locks
    // any more. Its lock goes with it when this fails.
    if (record.holds == 0 || Flock(own.get(), LOCK_EX | LOCK_NB) != 0) return false;
    if (!own.identity().isNamedBy(record.file)) return false;
    record.fd = std::move(own);
    return true;
  } catch (const std::exception&) {  // A file that cannot be made again, or no memory to do it.
    return false;
  }
}

}  // namespace zt::fnd::osdep

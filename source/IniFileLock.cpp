// Two locks in a row: a table of names for the threads of the process, and the named mutex, an
// flock, for the processes. The table decides which thread may go for the file lock, and counts its
// depth; only the first hold of a name makes the mutex, and the last one destroys it. The table's
// own lock is held for look-ups only: waits for other processes are made without it.
//
// Threads are known by numbers of this source. The system's ids are given to new threads again, and
// a new thread must not be taken for the owner of a hold that its predecessor has left.
//
// After a fork the child has a table of its own from the first use on. Entries of the parent are
// never changed there: another thread may have been doing so at the fork. A hold that came through
// the fork belongs to the parent, which the entry's ProcessMark says.
#include "source/IniFileLock.h"

#include <pthread.h>

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <map>
#include <memory>
#include <string>

#include "source/Cmd5vlt.h"
#include "source/Common/vltResultOf.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/Mutex.h"
#include "zt/fnd/osdep/PosixMutex.h"
#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/SharedObjectName.h"

using zt::fnd::String;
using zt::fnd::osdep::Hold;
using zt::fnd::osdep::PosixMutex;

namespace {

// Never reused, as thread ids of the system are: the owner of a hold may have ended.
uint64_t ThisThread() {
  static std::atomic<uint64_t> next{0};
  thread_local uint64_t mine = ++next;
  return mine;
}

constexpr uint64_t kNobody = 0;
constexpr uint64_t kReleasing = UINT64_MAX;  // no thread's number: the last hold is being ended

void AppendHex(std::string* text, unsigned char byte) {
  *text += "0123456789ABCDEF"[byte >> 4];
  *text += "0123456789ABCDEF"[byte & 15];
}

void AppendToName(std::string* name, unsigned char byte) {
  // Separators go, so that the name is one directory entry, and the dot with them, so that it never
  // is "." or "..".
  if (byte == '\\' || byte == '/' || byte == ':' || byte == '.') return;
  if (byte >= 0x80) {
    *name += '%';
    AppendHex(name, byte);
  } else {
    *name += static_cast<char>(byte >= 'a' && byte <= 'z' ? byte - 'a' + 'A' : byte);
  }
}

// Two processes may make the directory of the locks at once; one of them then gets an exception.
std::unique_ptr<zt::fnd::osdep::Mutex> CreateMutex(const String& name) {
  try {
    return std::make_unique<zt::fnd::osdep::Mutex>(name);
  } catch (const zt::fnd::exception::ObjectAlreadyExists&) {
    return std::make_unique<zt::fnd::osdep::Mutex>(name);
  }
}

}  // namespace

struct IniFileLock::Entry {
  std::string name;  // key of the table
  String mutexName;
  zt::fnd::osdep::ProcessMark process;
  std::unique_ptr<zt::fnd::osdep::Mutex> mutex;  // present while the lock is owned
  uint64_t owner = kNobody;
  unsigned depth = 0;
  unsigned users = 0;  // owners and those that wait
};

class IniFileLock::Table {
 public:
  static Table& Instance() {
    pthread_once(&s_once, Register);
    Table* present = s_instance;
    if (present) return *present;
    auto fresh = std::make_unique<Table>();
    if (s_instance.compare_exchange_strong(present, fresh.get())) present = fresh.release();
    return *present;
  }

  Entry* acquire(const String& name);
  // Null where that would have to wait.
  Entry* tryAcquire(const String& name);
  void release(Entry* entry);

 private:
  Entry* find(const String& name) REQUIRES(m_lock);
  Entry* enter(const String& name, bool* mine) REQUIRES(m_lock);
  void leave(Entry* entry) REQUIRES(m_lock);

  // At load, before any thread can fork: a handler that is registered during a fork is not run by it.
  static void RegisterAtLoad() __attribute__((constructor));
  // A child of fork starts without: another thread may have held the table at that moment.
  static void Register() {
    pthread_atfork(nullptr, nullptr, [] { s_inherited = s_instance.exchange(nullptr); });
  }

  static inline pthread_once_t s_once = PTHREAD_ONCE_INIT;
  // Leaked: managers of static objects may outlive every destructor that could run here.
  static inline std::atomic<Table*> s_instance{nullptr};
  // The parent's, never used again, but still reachable: its entries are no leak.
  static inline Table* s_inherited = nullptr;

  PosixMutex m_lock;
  std::condition_variable_any m_ownerGone;
  // The owner, depth and users of each entry are guarded, too; its mutex is the owner's.
  std::map<std::string, std::unique_ptr<Entry>> m_entries GUARDED_BY(m_lock);
};

void IniFileLock::Table::RegisterAtLoad() { pthread_once(&s_once, Register); }

// The name's entry, made where there is none.
IniFileLock::Entry* IniFileLock::Table::find(const String& name) {
  std::string key = zt::fnd::osdep::SharedObjectFileName(name).c_str();
  auto& slot = m_entries[key];
  if (!slot)
    slot =
        std::make_unique<Entry>(Entry{key, name, zt::fnd::osdep::ProcessMark::Current(), nullptr});
  return slot.get();
}

// Waits until the entry is this thread's. `mine` says whether it was before.
IniFileLock::Entry* IniFileLock::Table::enter(const String& name, bool* mine) {
  Entry* entry = find(name);
  ++entry->users;
  *mine = entry->owner == ThisThread();
  // users was raised before the wait: the entry outlives it.
  m_ownerGone.wait(m_lock, [&] { return *mine || entry->owner == kNobody; });
  entry->owner = ThisThread();
  ++entry->depth;
  return entry;
}

// Gives the entry up.
void IniFileLock::Table::leave(Entry* entry) {
  entry->owner = kNobody;
  entry->depth = 0;
  if (--entry->users == 0) m_entries.erase(entry->name);
  m_ownerGone.notify_all();
}

IniFileLock::Entry* IniFileLock::Table::acquire(const String& name) {
  Entry* entry;
  {
    Hold hold(m_lock);
    bool mine = false;
    entry = enter(name, &mine);
    if (mine) return entry;
  }
  // Unlocked: the wait for other processes must not stop the threads that want other files.
  try {
    auto mutex = CreateMutex(name);
    mutex->lock();
    entry->mutex = std::move(mutex);
    return entry;
  } catch (...) {
    // Whatever it was goes on to the caller; the threads that wait for this name must not be stuck.
    Hold hold(m_lock);
    leave(entry);
    throw;
  }
}

IniFileLock::Entry* IniFileLock::Table::tryAcquire(const String& name) {
  auto mutex = CreateMutex(name);
  // The mutex was made before the table was locked, as that opens a file. Trying it does not wait,
  // so that it may be done inside.
  Hold hold(m_lock);
  Entry* entry = find(name);
  if (entry->owner == ThisThread()) {
    ++entry->users;
    ++entry->depth;
    return entry;
  }
  if (entry->owner != kNobody || !mutex->tryLock()) {
    if (entry->users == 0) m_entries.erase(entry->name);
    return nullptr;
  }
  ++entry->users;
  entry->owner = ThisThread();
  entry->depth = 1;
  entry->mutex = std::move(mutex);
  return entry;
}

void IniFileLock::Table::release(Entry* entry) {
  std::unique_ptr<zt::fnd::osdep::Mutex> mutex;
  {
    Hold hold(m_lock);
    if (--entry->depth > 0) {
      --entry->users;
      return;
    }
    mutex = std::move(entry->mutex);
    // The owner is another thread where a hold ends on a thread that did not begin it, and must wait
    // as all others do.
    entry->owner = kReleasing;
  }
  // Outside the table: closing a file on a slow disk must not stop the threads that want other
  // files.
  mutex->unlock();
  // Before the next owner: when the hold ends on another thread than it began on, the section
  // inside stays with the first thread, and only the end of the last Mutex of the name does away
  // with it.
  mutex.reset();
  Hold hold(m_lock);
  leave(entry);
}

IniFileLock::IniFileLock(const String& name) : m_entry(Table::Instance().acquire(name)) {}

IniFileLock::~IniFileLock() {
  if (!m_entry->process.isCurrent()) {
    // A copy of the parent's. Closing it leaves the lock with the parent; unlocking would not.
    m_entry->mutex.reset();
    return;
  }
  Table::Instance().release(m_entry);
}

bool IniFileLock::excludesOthers() const {
  return m_entry->process.isCurrent() && m_entry->mutex && m_entry->mutex->excludesOthers();
}

bool IniFileLock::retake() {
  if (m_entry->process.isCurrent()) return m_entry->mutex && m_entry->mutex->retake();
  // A lock file that cannot be made excludes no other process.
  return vlt::Attempt<std::exception>([&] {
    Entry* own = Table::Instance().tryAcquire(m_entry->mutexName);
    if (!own) return false;
    m_entry->mutex.reset();  // a copy of the parent's, whose lock stays
    m_entry = own;
    return true;
  });
}

std::unique_ptr<IniFileLock> IniFileLock::ForFile(const char* fileName) {
  String name = NameForFile(fileName);
  try {
    return std::make_unique<IniFileLock>(name);
  } catch (...) {
    return std::make_unique<IniFileLock>(name);
  }
}

String IniFileLock::NameForFile(const char* fileName) {
  constexpr size_t kLongestEntry = 255;
  constexpr size_t kKept = 200;
  // By the bytes of the path, as the kernel has it: the locale, which would fold and convert them,
  // is not the same in all processes.
  std::string name;
  for (; fileName && *fileName; ++fileName)
    AppendToName(&name, static_cast<unsigned char>(*fileName));
  // NAME_MAX bytes; the digest keeps long names apart that begin alike.
  if (name.size() <= kLongestEntry) return String(name.c_str());
  unsigned char digest[16];
  Cmd5vlt md5;
  md5.addString(reinterpret_cast<const unsigned char*>(name.data()),
                static_cast<unsigned>(name.size()));
  md5.getDigest(digest);
  name.resize(kKept);
  for (unsigned char byte : digest) AppendHex(&name, byte);
  return String(name.c_str());
}

#include "source/IniFileLock.h"

#include <pthread.h>
#include <wctype.h>

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "source/Cmd5vlt.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/Mutex.h"
#include "zt/fnd/osdep/ProcessMark.h"

using zt::fnd::AnsiString;
using zt::fnd::String;

namespace {

// Never reused, as thread ids of the system are: the owner of a hold may have ended.
uint64_t ThisThread() {
  static std::atomic<uint64_t> next{0};
  thread_local uint64_t mine = ++next;
  return mine;
}

constexpr uint64_t kNobody = 0;
constexpr uint64_t kReleasing = UINT64_MAX;  // no thread's number: the last hold is being ended

// The directory of the locks may be made by two processes at once, and one of them is told so.
std::unique_ptr<zt::fnd::osdep::Mutex> CreateMutex(const String& name) {
  try {
    return std::make_unique<zt::fnd::osdep::Mutex>(name);
  } catch (const zt::fnd::exception::ObjectAlreadyExists&) {
    return std::make_unique<zt::fnd::osdep::Mutex>(name);
  }
}

}  // namespace

struct IniFileLock::Entry {
  std::string name;
  zt::fnd::osdep::ProcessMark process;
  std::unique_ptr<zt::fnd::osdep::Mutex> mutex;  // present while somebody owns the lock
  uint64_t owner = kNobody;
  unsigned depth = 0;
  unsigned users = 0;  // owners and those that wait
};

class IniFileLock::Table {
 public:
  static Table& Instance() {
    static Table* table = [] {
      // A child of fork starts afresh: another thread may have held the table at that moment.
      pthread_atfork(nullptr, nullptr, [] { s_instance = new Table; });
      return s_instance = new Table;
    }();
    (void)table;
    return *s_instance;
  }

  Entry* acquire(const String& name);
  void release(Entry* entry);

 private:
  Entry* enter(std::unique_lock<std::mutex>& hold, const std::string& name, bool* mine);
  void leave(Entry* entry);

  // Leaked: managers of static objects may outlive every destructor that could run here.
  static inline std::atomic<Table*> s_instance{nullptr};

  std::mutex m_lock;
  std::condition_variable m_ownerGone;
  std::map<std::string, std::unique_ptr<Entry>> m_entries;
};

// Waits until the entry is this thread's. `mine` tells whether it was before.
IniFileLock::Entry* IniFileLock::Table::enter(std::unique_lock<std::mutex>& hold,
                                              const std::string& name, bool* mine) {
  auto& slot = m_entries[name];
  if (!slot) slot.reset(new Entry{name, zt::fnd::osdep::ProcessMark::Current(), nullptr});
  Entry* entry = slot.get();
  ++entry->users;
  *mine = entry->owner == ThisThread();
  m_ownerGone.wait(hold, [&] { return *mine || entry->owner == kNobody; });
  entry->owner = ThisThread();
  ++entry->depth;
  return entry;
}

// Gives the entry up; the table is locked.
void IniFileLock::Table::leave(Entry* entry) {
  entry->owner = kNobody;
  entry->depth = 0;
  if (--entry->users == 0) m_entries.erase(entry->name);
  m_ownerGone.notify_all();
}

IniFileLock::Entry* IniFileLock::Table::acquire(const String& name) {
  std::unique_lock<std::mutex> hold(m_lock);
  bool mine = false;
  Entry* entry = enter(hold, AnsiString(name).c_str(), &mine);
  if (mine) return entry;
  hold.unlock();  // The wait for other processes must not stop the threads that want other files.
  try {
    auto mutex = CreateMutex(name);
    mutex->lock();
    entry->mutex = std::move(mutex);
    return entry;
  } catch (...) {
    // Whatever it was goes on to the caller; the threads that wait for this name must not be stuck.
    hold.lock();
    leave(entry);
    throw;
  }
}

void IniFileLock::Table::release(Entry* entry) {
  std::unique_lock<std::mutex> hold(m_lock);
  if (--entry->depth > 0) {
    --entry->users;
    return;
  }
  auto mutex = std::move(entry->mutex);
  // The owner is another thread where a hold ends on a thread that did not begin it, and must wait as
  // all others do.
  entry->owner = kReleasing;
  hold.unlock();
  mutex->unlock();
  // Before the next owner: when the hold ends on another thread than it began on, the section
  // inside stays with the first thread, and only the end of the last Mutex of the name does away
  // with it.
  mutex.reset();
  hold.lock();
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
  String path(fileName), name;
  name.reserve(path.length());
  for (const wchar_t* c = path.begin(); c != path.end(); ++c) {
    if (*c == L'\\' || *c == L'/' || *c == L':' || *c == L'.') continue;
    name += static_cast<wchar_t>(towupper(static_cast<wint_t>(*c)));
  }
  std::string narrow = AnsiString(name).c_str();
  if (narrow.size() <= kLongestEntry) return name;
  unsigned char digest[16];
  Cmd5vlt md5;
  md5.addString(reinterpret_cast<const unsigned char*>(narrow.data()),
                static_cast<unsigned>(narrow.size()));
  md5.getDigest(digest);
  narrow.resize(kKept);
  for (unsigned char byte : digest) {
    narrow += "0123456789ABCDEF"[byte >> 4];
    narrow += "0123456789ABCDEF"[byte & 15];
  }
  return String(narrow.c_str());
}

#include "zt/fnd/osdep/MutexGlobalStatics.h"

#include <pthread.h>
#include <unistd.h>

#include <cstdlib>
#include <utility>

namespace zt {
namespace fnd {
namespace osdep {
namespace {

// Plain objects, ready before any initialiser and good after every destructor.
pthread_once_t s_once = PTHREAD_ONCE_INIT;
pthread_mutex_t s_lock = PTHREAD_MUTEX_INITIALIZER;
// Guarded by s_lock: one reference, and the list of the statics that came through forks. Those are
// never released, as their sections may belong to threads that are not here, but kept in sight of
// leak checkers.
MutexGlobalStatics* s_statics = nullptr;
MutexGlobalStatics* s_inherited = nullptr;

class Hold {
 public:
  Hold() { pthread_mutex_lock(&s_lock); }
  ~Hold() { pthread_mutex_unlock(&s_lock); }
  Hold(const Hold&) = delete;
  Hold& operator=(const Hold&) = delete;
};

void LockForFork() { pthread_mutex_lock(&s_lock); }
void UnlockAfterFork() { pthread_mutex_unlock(&s_lock); }

// Sets statics of another process aside. The process id tells a child apart that was made without
// the handlers of fork(), too.
void DropInherited() {
  if (s_statics == nullptr || s_statics->pid == getpid()) return;
  s_statics->inherited = std::exchange(s_inherited, s_statics);
  s_statics = nullptr;
}

void AtExit() {
  MutexGlobalStatics* last;
  {
    Hold hold;
    DropInherited();
    last = std::exchange(s_statics, nullptr);
  }
  if (last != nullptr) last->release();
}

void Register() {
  pthread_atfork(LockForFork, UnlockAfterFork, UnlockAfterFork);
  std::atexit(AtExit);
}

}  // namespace

MutexGlobalStatics::MutexGlobalStatics() : pid(getpid()) {}

RefPtr<MutexGlobalStatics> MutexGlobalStatics::Get() {
  pthread_once(&s_once, Register);
  Hold hold;
  DropInherited();
  if (s_statics == nullptr) s_statics = RefPtr<MutexGlobalStatics>(new MutexGlobalStatics).detach();
  return RefPtr<MutexGlobalStatics>(s_statics);
}

MutexGlobalStatics::Map::iterator MutexGlobalStatics::attach(const String& name) {
  CriticalSectionGuard guard(section);
  Map::iterator data = m_data.try_emplace(name).first;
  ++data->second.objects;
  return data;
}

void MutexGlobalStatics::detach(Map::iterator data) {
  CriticalSectionGuard guard(section);
  if (--data->second.objects == 0) m_data.erase(data);
}

}  // namespace osdep
}  // namespace fnd
}  // namespace zt

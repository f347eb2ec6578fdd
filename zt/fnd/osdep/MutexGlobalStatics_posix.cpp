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
MutexGlobalStatics* s_statics = nullptr;  // one reference, guarded by s_lock

class Hold {
 public:
  Hold() { pthread_mutex_lock(&s_lock); }
  ~Hold() { pthread_mutex_unlock(&s_lock); }
  Hold(const Hold&) = delete;
  Hold& operator=(const Hold&) = delete;
};

void BeforeFork() { pthread_mutex_lock(&s_lock); }
void InParent() { pthread_mutex_unlock(&s_lock); }
void InChild() {
  pthread_mutex_init(&s_lock, nullptr);
  s_statics = nullptr;  // not released: its sections may belong to threads that are not here
}

void AtExit() {
  MutexGlobalStatics* last;
  {
    Hold hold;
    last = std::exchange(s_statics, nullptr);
  }
  if (last != nullptr && last->pid == getpid()) last->release();
}

void Register() {
  pthread_atfork(BeforeFork, InParent, InChild);
  std::atexit(AtExit);
}

}  // namespace

MutexGlobalStatics::MutexGlobalStatics() : pid(getpid()) {}

RefPtr<MutexGlobalStatics> MutexGlobalStatics::Get() {
  pthread_once(&s_once, Register);
  Hold hold;
  // The process id tells a child apart that was made without the handlers of fork().
  if (s_statics == nullptr || s_statics->pid != getpid()) {
    RefPtr<MutexGlobalStatics> fresh(new MutexGlobalStatics);
    s_statics = fresh.detach();
  }
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

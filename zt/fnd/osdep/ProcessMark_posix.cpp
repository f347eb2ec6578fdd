#include <pthread.h>
#include <unistd.h>

#include "zt/fnd/osdep/ProcessMark.h"

namespace zt::fnd::osdep {
namespace {

// Plain objects, ready before any initialiser and good after every destructor.
pthread_once_t s_once = PTHREAD_ONCE_INIT;
// Of this process: so many forks from the first one with marks.
std::atomic<unsigned> s_generation{0};

void CountFork() { s_generation.fetch_add(1, std::memory_order_relaxed); }
void Register() { pthread_atfork(nullptr, nullptr, CountFork); }

}  // namespace

ProcessMark& ProcessMark::operator=(const ProcessMark& other) noexcept {
  m_pid.store(other.m_pid.load(std::memory_order_acquire), std::memory_order_release);
  m_generation.store(other.m_generation.load(std::memory_order_acquire), std::memory_order_release);
  return *this;
}

ProcessMark ProcessMark::Current() noexcept {
  pthread_once(&s_once, Register);
  ProcessMark mark;
  mark.m_pid = getpid();
  mark.m_generation = s_generation.load(std::memory_order_relaxed);
  return mark;
}

bool ProcessMark::isCurrent() const noexcept {
  return m_pid.load(std::memory_order_acquire) == getpid() &&
         m_generation.load(std::memory_order_acquire) ==
             s_generation.load(std::memory_order_relaxed);
}

}  // namespace zt::fnd::osdep

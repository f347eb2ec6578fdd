#include <pthread.h>
#include <unistd.h>

#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/WipedOnFork.h"

namespace zt::fnd::osdep {
namespace {

using Number = std::atomic<uint64_t>;
static_assert(Number::is_always_lock_free,
              "shared with children of fork(), and asked in its handlers");

// Plain objects, ready before any initialiser and good after every destructor. What a fork needs is
// set up by the first mark: a process that makes none pays nothing.
pthread_once_t s_once = PTHREAD_ONCE_INIT;
// This process's number, 0 until it is asked for the first time; null where the kernel wipes
// nothing.
Number* s_own = nullptr;
// Counts the processes on the way from the first one with marks to this one. A child goes on from
// what it inherits, so no process has the number of one that it descends from.
std::atomic<uint32_t> s_generation{0};

void CountFork() { s_generation.fetch_add(1, std::memory_order_relaxed); }

void Register() {
  static_assert(sizeof(Number) <= kWipedOnForkBytes);
  s_own = static_cast<Number*>(AllocateWipedOnFork());
  if (!s_own) pthread_atfork(nullptr, nullptr, CountFork);
}

// The number without the kernel's help.
uint64_t CountedNumber() {
  uint64_t pid = static_cast<uint32_t>(getpid());
  return pid << 32 | s_generation.load(std::memory_order_relaxed);
}

// Two threads of a new process may come at once: one of their numbers counts for both.
uint64_t WipedNumber() {
  uint64_t number = s_own->load(std::memory_order_acquire);
  if (number != 0) return number;
  uint64_t fresh = s_generation.fetch_add(1, std::memory_order_relaxed) + uint64_t{1};
  return s_own->compare_exchange_strong(number, fresh) ? fresh : number;
}

}  // namespace

ProcessMark& ProcessMark::operator=(const ProcessMark& other) noexcept {
  m_number.store(other.m_number.load(std::memory_order_acquire), std::memory_order_release);
  return *this;
}

ProcessMark ProcessMark::Current() noexcept {
  pthread_once(&s_once, Register);
  ProcessMark mark;
  mark.m_number = s_own ? WipedNumber() : CountedNumber();
  return mark;
}

bool ProcessMark::isCurrent() const noexcept {
  // Whoever made the mark has set s_own before.
  uint64_t number = m_number.load(std::memory_order_acquire);
  if (number == 0) return false;
  return number == (s_own ? s_own->load(std::memory_order_relaxed) : CountedNumber());
}

}  // namespace zt::fnd::osdep

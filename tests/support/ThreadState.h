#pragma once

#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <functional>
#include <thread>
#include <utility>

#include "tests/support/Child.h"

// What threads are at in the kernel, as /proc reports it: for states that nothing announces. A thread
// has its own id there, which gettid() returns; that of a process is its first thread's.
namespace vlt::test {

// True if the thread, of this process or of a child, lets time pass.
inline bool Sleeps(pid_t thread) {
  return BlockedIn(thread, SYS_nanosleep) || BlockedIn(thread, SYS_clock_nanosleep)
#if defined(SYS_clock_nanosleep_time64)
         || BlockedIn(thread, SYS_clock_nanosleep_time64)
#endif
      ;
}

// True if the thread waits for a lock or a condition of its process.
inline bool WaitsForLock(pid_t thread) {
  return BlockedIn(thread, SYS_futex)
#if defined(SYS_futex_time64)
         || BlockedIn(thread, SYS_futex_time64)
#endif
      ;
}

// A thread whose waits can be seen. Joined at the latest when its object goes.
class WatchedThread {
 public:
  explicit WatchedThread(std::function<void()> body)
      : m_body(std::move(body)), m_thread([this] {
          m_id = gettid();
          m_body();
          m_done = true;
        }) {}
  ~WatchedThread() { join(); }
  WatchedThread(const WatchedThread&) = delete;
  WatchedThread& operator=(const WatchedThread&) = delete;

  void join() {
    if (m_thread.joinable()) m_thread.join();
  }
  bool done() const { return m_done; }
  pthread_t handle() { return m_thread.native_handle(); }

  // Each waits until the thread is there; false if it ends, or past the deadline.
  bool blocksInLock() const {
    return blocks([](pid_t id) { return WaitsForLock(id); });
  }
  bool blocksIn(long systemCallNumber) const {
    return blocks([=](pid_t id) { return BlockedIn(id, systemCallNumber); });
  }
  // In a write of a stream, which is one call or the other, by the C library.
  bool blocksInWrite() const {
    return blocks([](pid_t id) { return BlockedIn(id, SYS_write) || BlockedIn(id, SYS_writev); });
  }
  bool fallsAsleep() const {
    return blocks([](pid_t id) { return Sleeps(id); });
  }

 private:
  bool blocks(const std::function<bool(pid_t)>& there) const {
    return Eventually([&] { return m_done || (m_id != 0 && there(m_id)); }) && !m_done;
  }

  const std::function<void()> m_body;
  std::atomic<pid_t> m_id{0};
  std::atomic<bool> m_done{false};
  std::thread m_thread;  // last, as it uses the others
};

}  // namespace vlt::test

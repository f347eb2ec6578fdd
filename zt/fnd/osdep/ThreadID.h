#pragma once

#include <pthread.h>

#include <cstring>

#include "zt/fnd/StringFwd.h"

namespace zt::fnd::osdep {

// Identity of a thread, as long as that thread lives: the system may give it to a later one.
class ThreadID {
 public:
  // The calling thread.
  ThreadID() noexcept : m_id(pthread_self()) {}
  static ThreadID getCallingID() noexcept { return ThreadID(); }

  bool isCurrentThread() const noexcept { return pthread_equal(m_id, pthread_self()) != 0; }

  // The number that the system gives the thread, or the address that it knows it by.
  unsigned long number() const noexcept {
    unsigned long number;
    static_assert(sizeof m_id == sizeof number);
    memcpy(&number, &m_id, sizeof number);
    return number;
  }

  // The number in capital hexadecimal digits, without prefix.
  String getDisplayStringHex() const;

  friend bool operator==(const ThreadID& a, const ThreadID& b) noexcept {
    return pthread_equal(a.m_id, b.m_id) != 0;
  }

 private:
  pthread_t m_id;
};

static_assert(sizeof(ThreadID) == sizeof(pthread_t));

}  // namespace zt::fnd::osdep

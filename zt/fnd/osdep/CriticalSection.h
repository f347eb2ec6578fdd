#pragma once

#include "zt/fnd/osdep/ThreadAnnotations.h"

// Recursive locks inside one process.
//
// clang-format off
//   state      enter (owner)  enter (other)  tryEnter (other)  leave (owner)     leave (other)
//   free       owned, 1       owned, 1       owned, 1          -                 ignored
//   owned, n   owned, n + 1   waits          false             n - 1; 0 is free  ignored
// clang-format on
//
// Nothing here throws but the constructors (std::bad_alloc). A section has to be left as often as
// it was entered before it goes; one that is still owned then is abandoned quietly.
namespace zt::fnd::osdep {

class UnixCriticalSection {
 public:
  UnixCriticalSection();
  ~UnixCriticalSection();
  UnixCriticalSection(const UnixCriticalSection&) = delete;
  UnixCriticalSection& operator=(const UnixCriticalSection&) = delete;

  void enter() const;     // waits
  bool tryEnter() const;  // false, with nothing changed, if another thread owns the section
  void leave() const;     // by a thread that is not the owner: does nothing
  bool inOwningThread() const;

  // The names that Hold.h calls.
  void lock() const { enter(); }
  void unlock() const { leave(); }

 private:
  struct Block;
  Block* m_block;
};

// The section that most code uses.
class CAPABILITY("critical section") CriticalSection {
 public:
  CriticalSection();
  ~CriticalSection();
  CriticalSection(const CriticalSection&) = delete;
  CriticalSection& operator=(const CriticalSection&) = delete;

  void enter() const;
  void leave() const;
  void lock() const { enter(); }
  void unlock() const { leave(); }

 private:
  UnixCriticalSection* m_section;
};

static_assert(sizeof(CriticalSection) == sizeof(void*));

}  // namespace zt::fnd::osdep

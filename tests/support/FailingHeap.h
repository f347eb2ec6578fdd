#pragma once

// A heap that refuses: the 1st, 2nd, 3rd ... allocation of a call fails, once and for all that follow,
// until the call succeeds. No crash; a result or an exception that is told; nothing that grows; and the
// call works again afterwards.
//
// One source of the program includes RefusingMalloc.h as well.
#include <errno.h>

#include <atomic>
#include <functional>
#include <new>
#include <string>

#include "zt/fnd/Exception.h"

namespace vlt::test::heap {

inline std::atomic<long> g_countdown{-1};  // allocations until the failure; negative: not armed
inline std::atomic<bool> g_forEver{false};
inline std::atomic<bool> g_failed{false};
inline std::atomic<long> g_live{0};

// True if this allocation is to fail.
inline bool Refuse() {
  long left = g_countdown;
  if (left < 0) return false;
  if (left > 0) {
    --g_countdown;
    return false;
  }
  g_failed = true;
  if (!g_forEver) g_countdown = -1;
  errno = ENOMEM;
  return true;
}

inline void* Counted(void* block) {
  if (block) ++g_live;
  return block;
}

// What is swept. `run` gives a negative result only for a failure; it succeeds with all allocations.
// `holds`, where there is one, is asked after every attempt, with all allocations: is the state that of
// after the call, or, where the call told a failure, that of before it?
struct Call {
  std::string name;
  std::function<int32_t()> run;
  std::function<bool(bool succeeded)> holds = {};
};

enum Outcome { kWorks = 0, kTold = 1, kBadAlloc = 2, kNoFailure = 77 };

// Runs the call with the n-th allocation, from 0, failing.
inline Outcome Attempt(const std::function<int32_t()>& run, long n, bool forEver) {
  g_forEver = forEver;
  g_failed = false;
  g_countdown = n;
  Outcome outcome;
  try {
    outcome = run() < 0 ? kTold : kWorks;
  } catch (const std::bad_alloc&) {
    outcome = kBadAlloc;
  } catch (const zt::fnd::exception::Exception&) {
    outcome = kTold;  // A system call that failed for want of memory is told by its own exception.
  } catch (int) {
    outcome = kTold;
  }
  g_countdown = -1;
  return g_failed ? outcome : kNoFailure;
}

// What went wrong in a sweep; the number of allocations that failed before.
enum Trouble {
  kNone = 0,
  kFailsAnyway = 10,      // without a failed allocation
  kFailsAfterwards = 11,  // with all allocations again
  kGrows = 12,
  kStateLost = 13
};

// Every allocation of the call in turn.
inline Trouble Sweep(const Call& call, bool forEver, long* tried) {
  for (*tried = 0;; ++*tried) {
    if (call.run() < 0) return *tried == 0 ? kFailsAnyway : kFailsAfterwards;
    // Three times: what is made at a first failure, and kept, is no leak; a leak grows again.
    long afterFirst = 0;
    for (int round = 0; round < 3; ++round) {
      Outcome outcome = Attempt(call.run, *tried, forEver);
      if (outcome == kNoFailure) return kNone;
      if (call.holds && !call.holds(outcome == kWorks)) return kStateLost;
      if (call.run() < 0) return kFailsAfterwards;
      if (round == 1) afterFirst = g_live;
    }
    if (g_live > afterFirst) return kGrows;
  }
}

}  // namespace vlt::test::heap

#pragma once

// A heap that refuses: the 1st, 2nd, 3rd ... allocation of a call fails, once or with all that follow,
// until the call succeeds. No crash; a result or an exception that reports it; nothing that grows; and
// the call works again afterwards.
//
// Every test program has this malloc, which comes before the C library's for every library of the
// process. The sanitizers have a malloc of their own: there only FailAllocation refuses, and sweeps are
// skipped (kCanLimitMemory).
#include <errno.h>

#include <atomic>
#include <functional>
#include <new>
#include <string>

#include "tests/support/Sanitizer.h"
#include "zt/fnd/Exception.h"

namespace vlt::test::heap {

inline std::atomic<long> g_countdown{-1};  // allocations until the failure; negative: not armed
inline std::atomic<bool> g_allThatFollow{false};
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
  if (!g_allThatFollow) g_countdown = -1;
  errno = ENOMEM;
  return true;
}

inline void* Counted(void* block) {
  if (block) ++g_live;
  return block;
}

// What is swept. `run` gives a negative result only for a failure; it succeeds with all allocations.
// `holds`, where there is one, is asked after every attempt, with all allocations: is the state that of
// after the call, or, where the call reported a failure, that of before it?
struct Call {
  std::string name;
  std::function<int32_t()> run;
  std::function<bool(bool succeeded)> holds = {};
};

enum Outcome { kWorks = 0, kReported = 1, kBadAlloc = 2, kNoFailure = 77 };

// Runs the call with the n-th allocation, from 0, failing.
inline Outcome Attempt(const std::function<int32_t()>& run, long n, bool allThatFollow) {
  g_allThatFollow = allThatFollow;
  g_failed = false;
  g_countdown = n;
  Outcome outcome;
  try {
    outcome = run() < 0 ? kReported : kWorks;
  } catch (const std::bad_alloc&) {
    outcome = kBadAlloc;
  } catch (const zt::fnd::exception::Exception&) {
    outcome = kReported;  // A system call that ran out of memory has an exception of its own.
  } catch (int) {
    outcome = kReported;
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
inline Trouble Sweep(const Call& call, bool allThatFollow, long* tried) {
  for (*tried = 0;; ++*tried) {
    if (call.run() < 0) return *tried == 0 ? kFailsAnyway : kFailsAfterwards;
    // Three times: what is made at a first failure, and kept, is no leak; a leak grows again.
    long afterFirst = 0;
    for (int round = 0; round < 3; ++round) {
      Outcome outcome = Attempt(call.run, *tried, allThatFollow);
      if (outcome == kNoFailure) return kNone;
      if (call.holds && !call.holds(outcome == kWorks)) return kStateLost;
      if (call.run() < 0) return kFailsAfterwards;
      if (round == 1) afterFirst = g_live;
    }
    if (g_live > afterFirst) return kGrows;
  }
}

// Blocks of the heap that are alive, in every build. Only differences mean something, and only while no
// other thread allocates.
long LiveBlocks();

}  // namespace vlt::test::heap

namespace vlt::test {

// Makes the nth allocation by operator new of this thread fail with std::bad_alloc, counted from 1
// from here on; the ones before and after it succeed, and so does malloc(). Ends with the object. One
// at a time.
class FailAllocation {
 public:
  explicit FailAllocation(int nth);
  ~FailAllocation();
  FailAllocation(const FailAllocation&) = delete;
  FailAllocation& operator=(const FailAllocation&) = delete;

  // True once the allocation has failed.
  bool happened() const;
};

}  // namespace vlt::test

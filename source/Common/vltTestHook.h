#pragma once

// Fault injection at named points, in the release build: a process arms itself (vltHookFile.h), and
// the code at the point then waits, ends, or pretends to be out of memory.
//
// An unarmed process pays one comparison with an empty name a point. Threads: any may pass a point;
// arming while others do is safe, and seen by them at once or a little later.

#include <atomic>
#include <cstdint>
#include <string>

#include "source/Common/vltHookPoints.h"
#include "source/Common/vltTypes.h"

// Returns 0 unless the armed name is exactly this one. Then, in order of precedence: waits and
// returns 1; ends the process by exit(0); returns 1; throws std::bad_alloc; takes all memory and
// returns 1.
VLT_EXPORT unsigned vltTestHook(const char* name);

namespace vlt::hook {

// Empty in the usual process; for Strikes alone.
extern std::atomic<const char*> armedName;

// What the library asks at its own points: vltTestHook without a call in the usual process.
inline bool Strikes(const char* hookPoint) {
  return *armedName.load() && vltTestHook(hookPoint) != 0;
}

// What an armed point does. The members are in order of precedence.
struct Faults {
  static constexpr uint32_t kForeverInMSecs = 0x7FFFFFFF;

  bool hang = false;
  uint32_t hangTimeInMSecs = kForeverInMSecs;  // counts with `hang` only
  bool crash = false;
  bool simulateMemoryAllocationFailure = false;
  bool simulateMemoryAllocationFailureAndThrow = false;
  void (*takeMemory)() = nullptr;
};

// Arms the points of that name in place of the one armed before. A fault that was set stays set.
// Throws std::bad_alloc; nothing is armed then.
void Arm(const std::string& name, const Faults& faults);

}  // namespace vlt::hook

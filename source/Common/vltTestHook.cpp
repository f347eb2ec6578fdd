#include "source/Common/vltTestHook.h"

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <new>
#include <set>

#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/LeakedInstance.h"
#include "zt/fnd/osdep/Sleep.h"

namespace {

constinit std::atomic<bool> causeHang{false};
constinit std::atomic<bool> causeCrash{false};
constinit std::atomic<bool> simulateMemoryAllocationFailure{false};
constinit std::atomic<bool> simulateMemoryAllocationFailureAndThrow{false};
constinit std::atomic<void (*)()> causeMemoryAllocationFailure{nullptr};
constinit std::atomic<uint32_t> hangTimeInMSecs{vlt::hook::Faults::kForeverInMSecs};

// A copy that stays for good; one for each name, as a process may refresh as often as it likes.
struct KeptNames {
  zt::fnd::osdep::ForkSafeMutex lock{zt::fnd::osdep::AtFork::Wait, 70};
  std::set<std::string> names GUARDED_BY(lock);
};

const char* Kept(const std::string& name) {
  KeptNames& kept = zt::fnd::osdep::LeakedInstance<KeptNames>();
  zt::fnd::osdep::Hold hold(kept.lock);
  return kept.names.insert(name).first->c_str();
}

}  // namespace

namespace vlt::hook {

// Replaced whole, since another thread may be comparing with the old one.
constinit std::atomic<const char*> armedName{""};

void Arm(const std::string& name, const Faults& faults) {
  armedName = Kept(name);
  if (faults.crash) causeCrash = true;
  if (faults.hang) {
    // Before the flag: a thread that sees the flag waits for this time.
    hangTimeInMSecs = faults.hangTimeInMSecs;
    causeHang = true;
  }
  if (faults.simulateMemoryAllocationFailure) simulateMemoryAllocationFailure = true;
  if (faults.simulateMemoryAllocationFailureAndThrow) {
    simulateMemoryAllocationFailureAndThrow = true;
  }
  if (faults.takeMemory) causeMemoryAllocationFailure = faults.takeMemory;
}

}  // namespace vlt::hook

extern "C" unsigned vltTestHook(const char* name) {
  // No point has an empty name.
  const char* armed = vlt::hook::armedName;
  if (!*armed || !name || strcmp(armed, name) != 0) return 0;
  if (causeHang) {
    zt::fnd::osdep::Sleep(hangTimeInMSecs);
    return 1;
  }
  // exit and not _exit: the process under test ends as one that a host ends, with its exit
  // handlers.
  if (causeCrash) exit(0);
  if (simulateMemoryAllocationFailure) return 1;
  if (simulateMemoryAllocationFailureAndThrow) throw std::bad_alloc();
  if (auto takeMemory = causeMemoryAllocationFailure.load()) takeMemory();
  return 1;
}

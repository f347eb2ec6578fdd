// A fault is asked for by the word "true", in any case; everything else leaves it unarmed.
//
// Exhausting memory takes blocks that double while the heap gives them, halves them after each
// refusal, and ends when even the smallest is refused or, after the first refusal, when enough
// blocks were taken. Doubling reaches the limit in a few steps, and the small blocks at the end
// take what lies between the large ones.
#include "source/Utilities/vltHookFile.h"

#include <stdlib.h>

#include <new>
#include <string>

#include "source/Common/vltResultOf.h"
#include "source/Common/vltTestHook.h"
#include "source/Utilities/vltutils.h"
#include "source/vlIniMgr.h"
#include "vlloader/source/InstallLayout.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/LeakedInstance.h"
#include "zt/fnd/osdep/StringCompare.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::String;

namespace {

bool IsTrue(const CvlIniMgr& ini, const char* key) {
  std::string value;
  return ini.GetItem("Hook", key, &value) >= 0 &&
         zt::fnd::osdep::StringCaseCompare(String(value.c_str()).c_str(), L"true") == 0;
}

vlt::hook::Faults FaultsOf(const CvlIniMgr& ini) {
  vlt::hook::Faults faults;
  faults.crash = IsTrue(ini, "Crash");
  faults.hang = IsTrue(ini, "Hang");
  std::string hangTime;
  if (ini.GetItem("Hook", "HangTime", &hangTime) >= 0) {
    faults.hangTimeInMSecs = static_cast<uint32_t>(strtol(hangTime.c_str(), nullptr, 10));
  }
  faults.simulateMemoryAllocationFailure = IsTrue(ini, "SimulateMemoryAllocationFailure");
  faults.simulateMemoryAllocationFailureAndThrow =
      IsTrue(ini, "SimulateMemoryAllocationFailureAndThrow");
  if (IsTrue(ini, "MemoryAllocationFailure")) faults.takeMemory = exhaustMemory;
  return faults;
}

void ArmFromFile() {
  const char* directory = GetCurrentVltPath();
  if (!directory) return;
  String file = vlt::layout::FileIn(String(directory), vlt::layout::kHookFile);
  // Asked for first: opening would make the file.
  if (!zt::fnd::osdep::path::DoesFileExist(file)) return;
  CvlIniMgr ini = CvlIniMgr::OpenRaw(zt::fnd::AnsiString(file).c_str());
  std::string name;
  if (ini.GetItem("Hook", "Name", &name) >= 0) vlt::hook::Arm(name, FaultsOf(ini));
}

}  // namespace

// The process under test must not notice a bad hook file; it is simply not armed.
void vltRefreshHook() { vlt::Attempt(ArmFromFile); }

namespace {

constexpr uint32_t kChunkUnitBytes = 4096;
constexpr uint32_t kSmallChunk = 0x20000;
constexpr uint32_t kLargestGrowingChunkWords = 100000000;

struct Exhaustion {
  // Held as long as there is memory, which no fork should wait for.
  zt::fnd::osdep::ForkSafeMutex lock{zt::fnd::osdep::AtFork::Renew, 70};
  uint32_t s_chunkSize = 1;  // in units of kChunkUnitBytes
  bool s_increaseChunkSize = true;
  uint32_t s_entryNum = 0;
};

// The block is never freed. Volatile, or the compiler sees that it is not used and removes it.
void TakeChunk(uint32_t chunkSize) {
  [[maybe_unused]] static void* volatile last;
  last = ::operator new[](static_cast<size_t>(chunkSize) * kChunkUnitBytes);
}

// After a success. True if the exhaustion is over.
bool Grow(Exhaustion& state, uint32_t i, uint32_t* limit) {
  bool stop = i > *limit && !state.s_increaseChunkSize;
  if (state.s_chunkSize <= kSmallChunk && !state.s_increaseChunkSize && *limit > 40) *limit -= 40;
  if (state.s_increaseChunkSize && state.s_chunkSize * 1024u <= kLargestGrowingChunkWords) {
    state.s_chunkSize *= 2;
  }
  return stop;
}

// After a refusal. True if even the smallest block was refused.
bool Shrink(Exhaustion& state) {
  state.s_increaseChunkSize = false;
  if (state.s_chunkSize <= 1) return true;
  state.s_chunkSize /= 2;
  return false;
}

}  // namespace

void exhaustMemory() {
  Exhaustion& state = zt::fnd::osdep::LeakedInstance<Exhaustion>();
  zt::fnd::osdep::ForkSafeHold hold(state.lock);
  ++state.s_entryNum;
  uint32_t limit = state.s_entryNum == 1 || state.s_increaseChunkSize ? 10 : 1000;
  uint32_t i = 0;
  for (;;) {
    // What this is for: the heap refuses, and smaller blocks have their turn.
    bool taken = vlt::Attempt<std::bad_alloc>([&] { TakeChunk(state.s_chunkSize); });
    bool stop = taken ? Grow(state, i, &limit) : Shrink(state);
    if (taken) ++i;
    if (stop) return;
  }
}

#pragma once

#include <array>
#include <atomic>
#include <cstdint>
#include <string>

#include "tools/storm/EventStorm.h"

namespace storm {

constexpr unsigned kMaxProcesses = 32;
constexpr unsigned kMaxNames = 1024;
constexpr unsigned kMaxSets = 4096;

// What a worker shows the others. Lives in shared memory and survives the worker.
struct WorkerState {
  // Even while the worker runs, odd from before it is killed until its entries below are cleared.
  std::atomic<std::uint32_t> epoch;
  std::atomic<std::uint32_t> roundsDone;
  // By name: which semaphore the worker has open, 0 for none.
  std::array<std::atomic<std::uint64_t>, kMaxNames> holds;
};

struct StormState {
  std::array<WorkerState, kMaxProcesses> workers;
  std::atomic<std::uint32_t> lostWakeUps, splitNames, timeOuts, errors;
  std::atomic<std::uint32_t> comparisons;  // of a name that another worker had open, too
  std::atomic<std::uint32_t> pingPongs;
  std::atomic<bool> stop, lastPing;
  // Identifiers of the kernel's sets that were seen, 0 for none.
  std::array<std::atomic<std::int64_t>, kMaxSets> sets;
};

std::string EventName(unsigned name);

// The rounds of one worker, from where its predecessor was killed.
int WorkEvents(const EventStormSize& size, StormState& state, unsigned self, std::uint64_t seed);

// Both sides of the ping-pong, until it is asked to stop. The first one keeps the events; the second
// one opens and closes them in each round. Neither ever waits with a limit.
int PingSide(StormState& state);
int PongSide(StormState& state);

}  // namespace storm

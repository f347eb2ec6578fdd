#pragma once

namespace storm {

struct EventStormSize {
  unsigned processes = 8;
  unsigned rounds = 20000;  // of each process
  unsigned names = 300;
  unsigned kills = 2000;
  unsigned held = 40;    // events that a process has open at once, at most
  bool pingPong = true;  // which also keeps one set alive all the time
  unsigned seed = 1;
  bool machineSemaphores = false;  // otherwise a name space of the storm's own, where allowed
};

// Processes open, set, wait and close events of common names while some of them are killed at random
// moments; killed ones are replaced. Two more, which are never killed, play ping-pong all the time.
// Prints what was seen. True if no wake-up was lost, no name was split over two semaphores, nothing
// ran out of time or failed, and nothing was left at the end.
bool RunEventStorm(const EventStormSize& size);

}  // namespace storm

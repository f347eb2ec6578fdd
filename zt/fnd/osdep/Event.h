#pragma once

// Events inside one process.
//
//              set         reset   resetIfAuto      check                 wait
//   set        set         clear   clear if auto    true; auto clears     returns; auto clears
//   clear      set, wakes  clear   clear            false                 waits for a set
//
// A set wakes all waiters of a manual-reset event, one of an automatic one. Sets do not add up.
// Only PumpEvent's timed wait and the constructors (std::bad_alloc) throw. Threads: any.
namespace zt::fnd::osdep {

class Event {
 public:
  Event(bool manualReset, bool initialState);
  ~Event();
  Event(const Event&) = delete;
  Event& operator=(const Event&) = delete;

  void set() const;
  void reset() const;
  void resetIfAuto();
  bool check() const;
  void wait() const;

  // True if the event was set within the time. 0 is check(); 0xFFFFFFFF waits without limit. The
  // deadline is one of wall-clock time: setting the clock moves it.
  bool wait(unsigned int ms) const;

 private:
  struct Block;
  Block* m_block;
};

// An event for callers that would handle messages while they wait; there are none here.
class PumpEvent : public Event {
 public:
  PumpEvent(bool manualReset, bool initialState, bool pump)
      : Event(manualReset, initialState), m_pump(pump) {}

  void wait(bool) const { Event::wait(); }

  // Throws OutOfRange for a time above 32 bits.
  bool wait(unsigned long ms, bool) const;

 private:
  [[maybe_unused]] bool m_pump;
};

}  // namespace zt::fnd::osdep

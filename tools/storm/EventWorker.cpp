#include "tools/storm/EventWorker.h"

#include <cerrno>
#include <cstdio>
#include <deque>
#include <memory>
#include <vector>

#include "tools/storm/Process.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/events/NamedEventGlobalStatics.h"

namespace storm {
namespace {

using zt::fnd::String;
using zt::fnd::osdep::NamedEvent;
using zt::fnd::osdep::NamedEventGlobalStatics;

constexpr bool kManual = true, kAutomatic = false, kClear = false;
constexpr unsigned kPatienceMs = 10000;

String Wide(const std::string& text) { return String(text.c_str()); }

void Note(StormState& state, int set) {
  for (auto& entry : state.sets) {
    std::int64_t seen = 0;
    if (entry.compare_exchange_strong(seen, set + 1LL) || seen == set + 1LL) return;
  }
}

// Which semaphore this process has for an event that it has open.
std::uint64_t SemaphoreOf(const String& name, StormState& state) {
  auto data = NamedEventGlobalStatics::Get()->getOrCreateNamedEvent(name, kManual, kClear);
  Note(state, data->set().id());
  return (static_cast<std::uint64_t>(data->set().id() + 1) << 32) | data->slot();
}

class Worker {
 public:
  Worker(const EventStormSize& size, StormState& state, unsigned self, std::uint64_t seed)
      : m_size(size), m_state(state), m_self(self), m_random(seed), m_counts(size.names) {
    m_room = m_random.below(m_size.held) + 1;
  }

  void round(unsigned number) {
    unsigned name = m_random.below(m_size.names);
    auto event = std::make_unique<NamedEvent>(Wide(EventName(name)), kManual, kClear);
    publish(name);
    event->set();
    // The event is signaled for good now, so neither way of waiting may block. One without limit
    // that does is found by the supervisor.
    if (number % 2 == 0) {
      event->wait();
    } else if (!event->wait(kPatienceMs)) {
      ++m_state.lostWakeUps;
    }
    m_held.push_back({name, std::move(event)});
    if (m_held.size() >= m_room) closeOne();
  }

  void closeAll() {
    while (!m_held.empty()) closeOne();
  }

 private:
  struct Held {
    unsigned name;
    std::unique_ptr<NamedEvent> event;
  };

  WorkerState& mine() { return m_state.workers[m_self]; }

  void publish(unsigned name) {
    std::uint64_t semaphore = SemaphoreOf(Wide(EventName(name)), m_state);
    ++m_counts[name];
    mine().holds[name] = semaphore;
    for (unsigned other = 0; other < m_size.processes; ++other) {
      if (other != m_self) compare(name, semaphore, m_state.workers[other]);
    }
  }

  // Two living processes that have a name open at the same time must have the same semaphore. One
  // that was being killed meanwhile proves nothing.
  void compare(unsigned name, std::uint64_t semaphore, const WorkerState& other) {
    std::uint32_t epoch = other.epoch;
    std::uint64_t theirs = other.holds[name];
    if (theirs == 0 || epoch % 2 != 0) return;
    ++m_state.comparisons;
    if (theirs == semaphore || other.holds[name] != theirs || other.epoch != epoch) return;
    ++m_state.splitNames;
  }

  void closeOne() {
    unsigned name = m_held.front().name;
    if (--m_counts[name] == 0) mine().holds[name] = 0;  // before it is closed
    m_held.pop_front();
  }

  const EventStormSize& m_size;
  StormState& m_state;
  const unsigned m_self;
  Random m_random;
  std::vector<unsigned> m_counts;
  std::deque<Held> m_held;
  std::size_t m_room;
};

}  // namespace

std::string EventName(unsigned name) { return "storm " + std::to_string(name); }

int WorkEvents(const EventStormSize& size, StormState& state, unsigned self, std::uint64_t seed) {
  Worker worker(size, state, self, seed);
  std::atomic<std::uint32_t>& done = state.workers[self].roundsDone;
  while (done < size.rounds) {
    try {
      worker.round(done);
    } catch (const zt::fnd::osdep::PosixError& e) {
      ++(e.whatcode() == EWOULDBLOCK ? state.timeOuts : state.errors);
      fprintf(stderr, "worker %u: %s\n", self, e.what());
    }
    ++done;
  }
  worker.closeAll();
  return 0;
}

int PingSide(StormState& state) {
  NamedEvent ping(String(L"ping"), kAutomatic, kClear), pong(String(L"pong"), kAutomatic, kClear);
  while (!state.stop) {
    ping.set();
    pong.wait();
    ++state.pingPongs;
  }
  state.lastPing = true;
  ping.set();
  pong.wait();  // not earlier may the events go
  return 0;
}

int PongSide(StormState& state) {
  for (;;) {
    NamedEvent ping(String(L"ping"), kAutomatic, kClear);
    ping.wait();
    bool last = state.lastPing;
    NamedEvent(String(L"pong"), kAutomatic, kClear).set();
    if (last) return 0;
  }
}

}  // namespace storm

#include "tools/storm/EventStorm.h"

#include <sched.h>
#include <sys/ipc.h>
#include <sys/sem.h>

#include <chrono>
#include <cstdio>
#include <memory>
#include <vector>

#include "tools/storm/EventWorker.h"
#include "tools/storm/Process.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"

namespace storm {
namespace {

constexpr auto kStall = std::chrono::seconds(20);

// All semaphore sets of the name space.
int CountSets() {
  seminfo info = {};
  semctl(0, 0, SEM_INFO, &info);
  return info.semusz;
}

class Supervisor {
 public:
  explicit Supervisor(const EventStormSize& size)
      : m_size(size),
        m_state(*static_cast<StormState*>(SharedMemory(sizeof(StormState)))),
        m_random(size.seed),
        m_workers(size.processes),
        m_setsBefore(CountSets()) {}

  bool run() {
    const auto begin = Clock::now();
    if (m_size.pingPong) startPingPong(begin);
    for (unsigned i = 0; i < m_size.processes; ++i) start(i);
    while (m_running > 0) step();
    if (m_size.pingPong) endPingPong();
    m_filesOfTheDead = m_place.countEventFiles();
    sweep();
    report(std::chrono::duration<double>(Clock::now() - begin).count());
    return clean();
  }

 private:
  struct Process {
    pid_t pid = 0;
    std::uint32_t lastRounds = 0;
    Clock::time_point lastProgress;
  };

  void start(unsigned index) {
    std::uint64_t seed = m_size.seed * 1000003u + ++m_started;
    m_workers[index].pid =
        Spawn([this, index, seed] { return WorkEvents(m_size, m_state, index, seed); });
    m_workers[index].lastProgress = Clock::now();
    ++m_running;
  }

  void startPingPong(Clock::time_point begin) {
    m_ping = Spawn([this] { return PingSide(m_state); });
    // Both events and their set.
    while (m_place.countEventFiles() < 3 && Clock::now() - begin < kStall) SleepUs(1000);
    m_pong = Spawn([this] { return PongSide(m_state); });
  }

  // One that waits indefinitely has lost a wake-up.
  void endPingPong() {
    m_state.stop = true;
    if (Reap(m_ping, Clock::now() + kStall) != 0) ++m_state.lostWakeUps;
    if (Reap(m_pong, Clock::now() + kStall) != 0) ++m_state.lostWakeUps;
  }

  std::uint64_t roundsDone() const {
    std::uint64_t sum = 0;
    for (const WorkerState& worker : m_state.workers) sum += worker.roundsDone;
    return sum;
  }

  // The kills are spread evenly over the rounds, each at a moment of its own.
  void step() {
    SleepUs(m_random.below(400));
    for (unsigned i = 0; i < m_size.processes; ++i) watch(i);
    const std::uint64_t all = static_cast<std::uint64_t>(m_size.processes) * m_size.rounds;
    if (m_kills < m_size.kills && roundsDone() >= all * (m_kills + 1) / (m_size.kills + 1)) {
      unsigned victim = m_random.below(m_size.processes);
      if (m_workers[victim].pid != 0) killAndReplace(victim);
    }
  }

  void watch(unsigned index) {
    Process& process = m_workers[index];
    if (process.pid == 0) return;
    int code;
    if (HasEnded(process.pid, &code)) {
      process.pid = 0;
      --m_running;
      if (code != 0) ++m_state.errors;
      return;
    }
    std::uint32_t rounds = m_state.workers[index].roundsDone;
    if (rounds != process.lastRounds) {
      process.lastRounds = rounds;
      process.lastProgress = Clock::now();
    } else if (Clock::now() - process.lastProgress > kStall) {
      fprintf(stderr, "worker %u makes no progress in round %u\n", index, rounds);
      ++m_state.lostWakeUps;
      ++m_state.workers[index].roundsDone;
      killAndReplace(index);
    }
  }

  void killAndReplace(unsigned index) {
    WorkerState& worker = m_state.workers[index];
    ++worker.epoch;  // odd: what it shows proves nothing from here on
    Kill(m_workers[index].pid);
    int code = Reap(m_workers[index].pid, Clock::now() + kStall);
    --m_running;
    if (code == 128 + 9) {
      ++m_kills;
    } else if (code != 0) {  // 0: it was just done
      ++m_state.errors;
    }
    for (auto& held : worker.holds) held = 0;
    ++worker.epoch;
    m_workers[index].pid = 0;
    if (worker.roundsDone < m_size.rounds || code != 0) start(index);
  }

  // What killed processes left goes with the next one who opens and closes the names.
  void sweep() {
    pid_t last = Spawn([this] {
      std::vector<std::unique_ptr<zt::fnd::osdep::NamedEvent>> events;
      for (unsigned i = 0; i < m_size.names; ++i) {
        zt::fnd::String name(EventName(i).c_str());
        events.push_back(std::make_unique<zt::fnd::osdep::NamedEvent>(name, true, false));
      }
      return 0;
    });
    if (Reap(last, Clock::now() + kStall) != 0) ++m_state.errors;
    m_filesLeft = m_place.countEventFiles();
    m_setsLeft = CountSets() - m_setsBefore;
    // Of a storm that failed nothing must stay on the machine either.
    for (const auto& set : m_state.sets) {
      if (set != 0) semctl(static_cast<int>(set - 1), 0, IPC_RMID);
    }
  }

  void report(double seconds) const {
    printf("events: %u processes x %u rounds over %u names in %.1f s, %u killed\n",
           m_size.processes, m_size.rounds, m_size.names, seconds, m_kills);
    printf("  lost wake-ups %u, split names %u (of %u comparisons), time-outs %u, errors %u\n",
           m_state.lostWakeUps.load(), m_state.splitNames.load(), m_state.comparisons.load(),
           m_state.timeOuts.load(), m_state.errors.load());
    printf("  ping-pong beside it: %u rounds\n", m_state.pingPongs.load());
    printf(
        "  files left by the killed: %zu; after one more open and close of each name: %zu files,"
        " %d semaphore sets\n",
        m_filesOfTheDead, m_filesLeft, m_setsLeft);
  }

  bool clean() const {
    return m_state.lostWakeUps == 0 && m_state.splitNames == 0 && m_state.timeOuts == 0 &&
           m_state.errors == 0 && m_filesLeft == 0 && m_setsLeft == 0 && m_kills == m_size.kills &&
           (m_state.pingPongs > 0 || !m_size.pingPong);
  }

  const EventStormSize m_size;
  StormState& m_state;
  Random m_random;
  Place m_place;
  std::vector<Process> m_workers;
  const int m_setsBefore;
  pid_t m_ping = 0, m_pong = 0;
  unsigned m_started = 0, m_running = 0, m_kills = 0;
  std::size_t m_filesOfTheDead = 0, m_filesLeft = 0;
  int m_setsLeft = 0;
};

}  // namespace

bool RunEventStorm(const EventStormSize& size) {
  if (!size.machineSemaphores && unshare(CLONE_NEWIPC) != 0) {
    printf("no semaphores of the storm's own: the machine's are used\n");
  }
  return Supervisor(size).run();
}

}  // namespace storm

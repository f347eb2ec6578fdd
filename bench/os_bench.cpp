// Named events beside bare System V semaphores, in one run.
//
// Each pair has the same name before the slash: "PingPong/NamedEvent" and "PingPong/semop". What
// counts is the ratio inside a pair. A ping-pong is two signals: there and back.
#include <benchmark/benchmark.h>
#include <fcntl.h>
#include <sched.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/file.h>
#include <sys/ipc.h>
#include <sys/prctl.h>
#include <sys/sem.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <string>

#include "bench/Place.h"
#include "source/Common/ZtUtils/General/vlTracer.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"

namespace {

using zt::fnd::String;
using zt::fnd::osdep::NamedEvent;

constexpr bool kManual = true, kAutomatic = false, kClear = false;

// A process that repeats something until the object goes.
class Partner {
 public:
  explicit Partner(const std::function<void()>& again) {
    pid_t parent = getpid();
    m_pid = fork();
    if (m_pid < 0) abort();
    if (m_pid > 0) return;
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) _exit(1);
    for (;;) again();
  }
  ~Partner() {
    kill(m_pid, SIGKILL);
    waitpid(m_pid, nullptr, 0);
  }
  Partner(const Partner&) = delete;
  Partner& operator=(const Partner&) = delete;

 private:
  pid_t m_pid;
};

// A private set of semaphores; gone with the object.
class BareSet {
 public:
  explicit BareSet(int count) : m_id(semget(IPC_PRIVATE, count, 0600)) {
    if (m_id < 0) abort();
  }
  ~BareSet() { semctl(m_id, 0, IPC_RMID); }
  BareSet(const BareSet&) = delete;
  BareSet& operator=(const BareSet&) = delete;
  void add(unsigned short number, short value) const {
    sembuf operation = {number, value, 0};
    if (semop(m_id, &operation, 1) != 0) abort();
  }
  void assign(int number, int value) const {
    union {
      int value;
      void* unused;
    } argument = {value};
    if (semctl(m_id, number, SETVAL, argument) != 0) abort();
  }

 private:
  int m_id;
};

// ---- signal to wake, across processes

void PingPongSemop(benchmark::State& state) {
  ThePlace();
  BareSet set(2);
  Partner partner([&] {
    set.add(0, -1);
    set.add(1, 1);
  });
  for (auto _ : state) {
    set.add(0, 1);
    set.add(1, -1);
  }
}
BENCHMARK(PingPongSemop)->Name("PingPong/semop")->UseRealTime();

// With a signal that is an assignment, in a set as large as that of the events: the kernel locks all
// of its semaphores for that.
void PingPongSetval(benchmark::State& state) {
  ThePlace();
  BareSet set(128);
  Partner partner([&] {
    set.add(0, -1);
    set.assign(1, 1);
  });
  for (auto _ : state) {
    set.assign(0, 1);
    set.add(1, -1);
  }
}
BENCHMARK(PingPongSetval)->Name("PingPong/SETVAL of 128")->UseRealTime();

void PingPongEvent(benchmark::State& state) {
  ThePlace();
  NamedEvent ping(String(L"ping"), kAutomatic, kClear), pong(String(L"pong"), kAutomatic, kClear);
  Partner partner([&] {
    ping.wait();
    pong.set();
  });
  for (auto _ : state) {
    ping.set();
    pong.wait();
  }
}
BENCHMARK(PingPongEvent)->Name("PingPong/NamedEvent")->UseRealTime();

// ---- set and look, without anybody waiting

void SetCheckBare(benchmark::State& state) {
  ThePlace();
  BareSet set(static_cast<int>(state.range(0)));
  for (auto _ : state) {
    set.assign(0, 1);
    set.add(0, -1);
  }
}
BENCHMARK(SetCheckBare)->Name("SetCheck/bare")->Arg(1)->Arg(128);

void SetCheckEvent(benchmark::State& state) {
  ThePlace();
  NamedEvent event(String(L"name"), kAutomatic, kClear);
  for (auto _ : state) {
    event.set();
    if (!event.check()) abort();
  }
}
BENCHMARK(SetCheckEvent)->Name("SetCheck/NamedEvent");

// ---- open and close

// What any event of this kind needs: a set, and a locked file that names it.
void OpenCloseBare(benchmark::State& state) {
  const std::string path = ThePlace().path() + "/bare";
  char bytes[9] = {};
  for (auto _ : state) {
    int fd = open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
    if (fd < 0 || flock(fd, LOCK_EX) != 0 || write(fd, bytes, sizeof bytes) < 0) abort();
    { BareSet set(128); }
    unlink(path.c_str());
    close(fd);
  }
}
BENCHMARK(OpenCloseBare)->Name("OpenClose/bare");

void OpenCloseFirst(benchmark::State& state) {
  ThePlace();
  const String name(L"name");
  for (auto _ : state) NamedEvent event(name, kManual, kClear);
}
BENCHMARK(OpenCloseFirst)->Name("OpenClose/first of all");

void OpenCloseInSet(benchmark::State& state) {
  ThePlace();
  NamedEvent other(String(L"other"), kManual, kClear);
  const String name(L"name");
  for (auto _ : state) NamedEvent event(name, kManual, kClear);
}
BENCHMARK(OpenCloseInSet)->Name("OpenClose/beside another");

void OpenCloseJoin(benchmark::State& state) {
  ThePlace();
  const String name(L"name");
  NamedEvent ready(String(L"ready"), kAutomatic, kClear);
  Partner partner([&] {
    NamedEvent event(name, kManual, kClear);
    ready.set();
    for (;;) pause();
  });
  ready.wait();
  for (auto _ : state) NamedEvent event(name, kManual, kClear);
}
BENCHMARK(OpenCloseJoin)->Name("OpenClose/joining a process");

void OpenCloseSecondObject(benchmark::State& state) {
  ThePlace();
  const String name(L"name");
  NamedEvent first(name, kManual, kClear);
  for (auto _ : state) NamedEvent event(name, kManual, kClear);
}
BENCHMARK(OpenCloseSecondObject)->Name("OpenClose/second object");

void TraceLine(benchmark::State& state) {
  std::string directory = (std::filesystem::temp_directory_path() / "vlt.trace").string();
  std::filesystem::create_directories(directory);
  vlTracer::Initialize(vlTracer::kSeverityErrors, vlTracer::kTargetFile,
                       std::wstring(directory.begin(), directory.end()).c_str(), 0);
  for (auto _ : state) vlt_vlTracer::TraceOutput(' ', "a line of the usual length, say", false);
  vlTracer::Cleanup();
  std::filesystem::remove_all(directory);
}
BENCHMARK(TraceLine)->Name("TraceLine/TraceOutput");

void TraceLineBare(benchmark::State& state) {
  std::string file = (std::filesystem::temp_directory_path() / "vlt.bare").string();
  int fd = open(file.c_str(), O_CREAT | O_WRONLY | O_APPEND | O_CLOEXEC, 0600);
  const char line[] = "  a line of the usual length, say\n";
  for (auto _ : state) benchmark::DoNotOptimize(write(fd, line, sizeof line - 1));
  close(fd);
  unlink(file.c_str());
}
BENCHMARK(TraceLineBare)->Name("TraceLine/write");

}  // namespace

int main(int argc, char** argv) {
  // Semaphores of its own, where that is allowed.
  if (unshare(CLONE_NEWIPC) != 0) fprintf(stderr, "uses the machine's semaphores\n");
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
}

#include "tools/storm/MutexDeath.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <system_error>
#include <vector>

#include "tools/storm/Process.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/Mutex.h"
#include "zt/posix/ScopedFd.h"

namespace storm {
namespace {

using zt::fnd::osdep::Mutex;
using zt::posix::ScopedFd;

constexpr auto kDeadline = std::chrono::seconds(10);
constexpr int kDeadlineMs = 10000;

struct Pipe {
  ScopedFd out, in;
  Pipe() {
    int fds[2];
    if (pipe2(fds, O_CLOEXEC) != 0) throw std::system_error(errno, std::generic_category(), "pipe");
    out = ScopedFd(fds[0]);
    in = ScopedFd(fds[1]);
  }
};

template <class Value>
bool Receive(const Pipe& pipe, Value* value) {
  pollfd fd = {pipe.out.get(), POLLIN, 0};
  return poll(&fd, 1, kDeadlineMs) == 1 &&
         read(pipe.out.get(), value, sizeof *value) == static_cast<ssize_t>(sizeof *value);
}

template <class Value>
void Send(const Pipe& pipe, const Value& value) {
  if (write(pipe.in.get(), &value, sizeof value) != static_cast<ssize_t>(sizeof value)) _exit(97);
}

long long NowUs() {
  return std::chrono::duration_cast<std::chrono::microseconds>(Clock::now().time_since_epoch())
      .count();
}

// Ids of what a holder has left.
struct Orphans {
  pid_t forked, executed;
};

bool Alive(pid_t pid) {
  siginfo_t info = {};
  return waitid(P_PID, static_cast<id_t>(pid), &info, WEXITED | WNOHANG | WNOWAIT) == 0 &&
         info.si_pid == 0;
}

class Rounds {
 public:
  explicit Rounds(unsigned kills) : m_kills(kills) {}

  bool run() {
    const auto begin = Clock::now();
    prctl(PR_SET_CHILD_SUBREAPER, 1);  // the holders' children come to this process
    for (unsigned i = 0; i < m_kills; ++i) round(i);
    std::sort(m_waits.begin(), m_waits.end());
    printf("mutex: %u holders killed in %.1f s, %zu times the next process got in\n", m_kills,
           std::chrono::duration<double>(Clock::now() - begin).count(), m_waits.size());
    if (!m_waits.empty()) {
      printf("  longest wait %lld us, median %lld us\n", m_waits.back(),
             m_waits[m_waits.size() / 2]);
    }
    return m_waits.size() == m_kills;
  }

 private:
  void round(unsigned number) {
    Pipe ready, entered, end;
    pid_t holder = Spawn([&] { return hold(ready, end); });
    Orphans orphans = {};
    bool good = Receive(ready, &orphans);
    pid_t next = Spawn([&] {
      Mutex mutex{zt::fnd::String(L"storm")};
      mutex.lock();
      Send(entered, NowUs());
      mutex.unlock();
      return 0;
    });
    // In most rounds the next one waits in the kernel by then, in some it comes too late for that.
    SleepUs(m_random.below(1500));
    const long long killed = NowUs();
    Kill(holder);
    long long got = 0;
    good = good && Receive(entered, &got);
    good = Reap(next, Clock::now() + kDeadline) == 0 && good;
    good = Reap(holder, Clock::now() + kDeadline) == 128 + SIGKILL && good;
    // The holder's children, which are this process's by now, have been there all the time.
    good = good && Alive(orphans.forked) && Alive(orphans.executed);
    end.in.reset();
    for (pid_t orphan : {orphans.forked, orphans.executed}) {
      if (orphan > 0) good = Reap(orphan, Clock::now() + kDeadline) == 0 && good;
    }
    if (good) {
      m_waits.push_back(std::max(0LL, got - killed));
    } else {
      fprintf(stderr, "round %u: the next process did not get in\n", number);
    }
  }

  static int hold(const Pipe& ready, Pipe& end) {
    Mutex mutex{zt::fnd::String(L"storm")};
    mutex.lock();
    end.in.reset();  // so that the children see the end
    Orphans orphans = {};
    orphans.forked = fork();
    if (orphans.forked == 0) {
      char byte;
      _exit(read(end.out.get(), &byte, 1) == 0 ? 0 : 1);
    }
    Pipe started;
    orphans.executed = fork();
    if (orphans.executed == 0) {
      dup2(end.out.get(), 0);
      execlp("cat", "cat", static_cast<char*>(nullptr));
      _exit(1);
    }
    started.in.reset();
    char byte;
    if (read(started.out.get(), &byte, 1) != 0) return 1;  // closed by the start of the program
    Send(ready, orphans);
    for (;;) pause();
  }

  const unsigned m_kills;
  Random m_random{7};
  std::vector<long long> m_waits;
};

}  // namespace

bool RunMutexDeath(unsigned kills) {
  Place place;
  return Rounds(kills).run();
}

}  // namespace storm

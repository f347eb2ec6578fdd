// The parent hands batches of components to children and reads what they say through a pipe each, in
// lines: which component is begun, what is found of it, and that it has ended. A library may write into
// the pipe as well, which is no more than it could do to its own verdict; what root checks of another
// user's is alone in its child.
#include "tools/vltctl-client/Check.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <stdio.h>
#include <string.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <deque>
#include <memory>
#include <optional>
#include <system_error>
#include <thread>
#include <utility>

namespace vltctl {
namespace {

using Clock = std::chrono::steady_clock;

constexpr auto kTimeLimit = std::chrono::seconds(10);
constexpr size_t kTextLimit = 1 << 20;
constexpr size_t kBatch = 64;
constexpr char kBegin = 'B', kCode = 'C', kLibrary = 'L', kMessage = 'M', kNote = 'N', kEnd = 'E';

[[noreturn]] void Fail(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

// ---- The child

// Sends one line to the parent. A text of several lines stays one.
void Send(int fd, char kind, std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  text = kind + text + "\n";
  const char* at = text.data();
  for (size_t left = text.size(); left > 0;) {
    ssize_t written = write(fd, at, left);
    if (written <= 0) return;
    at += written;
    left -= static_cast<size_t>(written);
  }
}

void DieWith(pid_t parent) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  if (getppid() != parent) _exit(1);
}

void CheckInside(const Component& component, const CheckOptions& options, pid_t parent, int* fd) {
  Send(*fd, kBegin, "");
  // A change of user makes the kernel forget whom this process dies with.
  std::string refusal = PrepareToLoad(component, fd);
  DieWith(parent);
  Verdict verdict = refusal.empty() ? CheckLibrary(component) : Bad("refused", refusal);
  if (refusal.empty() && options.asksLibrary) AddLibrarysWords(component, &verdict);
  if (!verdict.code.empty()) Send(*fd, kCode, verdict.code);
  if (!verdict.library.empty()) Send(*fd, kLibrary, verdict.library);
  for (const std::string& text : verdict.messages) Send(*fd, kMessage, text);
  for (const std::string& text : verdict.notes) Send(*fd, kNote, text);
  Send(*fd, kEnd, "");
}

// ---- The parent

using Jobs = std::deque<size_t>;

class Checker {
 public:
  Checker(const std::vector<Component>& components, const CheckOptions& options)
      : m_components(components), m_options(options), m_verdicts(components.size()) {}
  ~Checker() {
    for (auto& worker : m_workers) end(*worker);
  }
  Checker(const Checker&) = delete;
  Checker& operator=(const Checker&) = delete;

  void run(const std::function<void(const Component&, const Verdict&)>& done);

 private:
  struct Worker {
    pid_t pid = -1;
    int fd = -1;
    Jobs jobs;  // the first one is under way once it has begun
    bool isAlone = false;
    bool hasBegun = false;
    std::string text;      // what is not a whole line yet
    size_t sizeBytes = 0;  // of what it has said of the present job
    Clock::time_point deadline;
    Verdict verdict;
  };

  void plan();
  void start(const Jobs& jobs);
  void wait();
  void read(Worker& worker);
  void take(Worker& worker, const std::string& line);
  void finish(Worker& worker);
  void fail(Worker& worker, const char* code, const std::string& fate);
  int end(Worker& worker);

  const std::vector<Component>& m_components;
  const CheckOptions m_options;
  std::vector<std::optional<Verdict>> m_verdicts;
  std::deque<Jobs> m_queue;
  std::vector<std::unique_ptr<Worker>> m_workers;
};

void Checker::plan() {
  Jobs batch;
  for (size_t i = 0; i < m_components.size(); ++i) {
    if (NeedsOtherUser(m_components[i])) {
      m_queue.push_back({i});
      continue;
    }
    batch.push_back(i);
    if (batch.size() == kBatch) m_queue.push_back(std::exchange(batch, {}));
  }
  if (!batch.empty()) m_queue.push_back(batch);
}

// In a session of its own, so that what a library starts can be ended with it, and has no terminal.
void Checker::start(const Jobs& jobs) {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) Fail("pipe");
  fflush(nullptr);
  pid_t parent = getpid(), child = fork();
  if (child < 0) Fail("fork");
  if (child == 0) {
    setsid();
    DieWith(parent);  // What is typed at the terminal no longer reaches it.
    close(ends[0]);
    // What the library prints while it is loaded is not ours.
    int null = open("/dev/null", O_RDWR | O_CLOEXEC);
    dup2(null, 1);
    dup2(null, 2);
    for (size_t job : jobs) CheckInside(m_components[job], m_options, parent, &ends[1]);
    _exit(0);
  }
  close(ends[1]);
  auto worker = std::make_unique<Worker>();
  worker->pid = child;
  worker->fd = ends[0];
  worker->jobs = jobs;
  worker->isAlone = jobs.size() == 1;
  worker->deadline = Clock::now() + kTimeLimit;
  m_workers.push_back(std::move(worker));
}

// Ends the child with all that its libraries have started; returns its status.
int Checker::end(Worker& worker) {
  int status = 0;
  close(worker.fd);
  kill(worker.pid, SIGKILL);
  while (waitpid(worker.pid, &status, 0) < 0 && errno == EINTR) {
  }
  kill(-worker.pid, SIGKILL);
  worker.pid = -1;
  return status;
}

// The job under way has its verdict.
void Checker::finish(Worker& worker) {
  size_t job = worker.jobs.front();
  bool isBad = !worker.verdict.code.empty();
  if (isBad && !worker.isAlone) {
    fail(worker, "", "");
    return;
  }
  m_verdicts[job] = std::exchange(worker.verdict, Verdict());
  worker.jobs.pop_front();
  worker.hasBegun = false;
  worker.sizeBytes = 0;
  worker.deadline = Clock::now() + kTimeLimit;
}

// Ends the child. A job that was alone has its fate; others are checked again, each alone.
void Checker::fail(Worker& worker, const char* code, const std::string& fate) {
  if (worker.isAlone) {
    worker.verdict.code = code;
    worker.verdict.messages.push_back(fate);
    m_verdicts[worker.jobs.front()] = std::exchange(worker.verdict, Verdict());
  } else {
    for (auto job = worker.jobs.rbegin(); job != worker.jobs.rend(); ++job) {
      m_queue.push_front({*job});
    }
  }
  worker.jobs.clear();
}

void Checker::take(Worker& worker, const std::string& line) {
  std::string text = line.substr(1);
  switch (line[0]) {
    case kBegin:
      worker.hasBegun = true;
      break;
    case kCode:
      worker.verdict.code = text;
      break;
    case kLibrary:
      worker.verdict.library = text;
      break;
    case kMessage:
      worker.verdict.messages.push_back(text);
      break;
    case kNote:
      worker.verdict.notes.push_back(text);
      break;
    case kEnd:
      if (worker.hasBegun) finish(worker);
      break;
    default:  // a library's
      break;
  }
}

std::string FateOf(int status) {
  if (WIFSIGNALED(status)) {
    return std::string("the process that loaded the library died: ") + strsignal(WTERMSIG(status));
  }
  return "the library ended its process with " + std::to_string(WEXITSTATUS(status));
}

void Checker::read(Worker& worker) {
  char block[65536];
  ssize_t got = ::read(worker.fd, block, sizeof block);
  if (got < 0 && errno == EINTR) return;
  if (got <= 0) {
    // The end came without a last word, which is the code's own doing; asked for its status alone.
    int status = 0;
    while (waitpid(worker.pid, &status, 0) < 0 && errno == EINTR) {
    }
    kill(-worker.pid, SIGKILL);
    close(worker.fd);
    worker.pid = -1;
    fail(worker, WIFSIGNALED(status) ? "died" : "ended-its-process", FateOf(status));
    return;
  }
  worker.text.append(block, static_cast<size_t>(got));
  worker.sizeBytes += static_cast<size_t>(got);
  for (size_t end; !worker.jobs.empty() && (end = worker.text.find('\n')) != std::string::npos;) {
    std::string line = worker.text.substr(0, end);
    worker.text.erase(0, end + 1);
    if (!line.empty()) take(worker, line);
  }
  if (!worker.jobs.empty() && worker.sizeBytes > kTextLimit) {
    fail(worker, "floods",
         "the library wrote more than 1 MiB into the check's pipe; its process was killed");
  }
}

// Waits until a child says something, and for none longer than it may take.
void Checker::wait() {
  std::vector<pollfd> fds;
  auto first = Clock::time_point::max();
  for (auto& worker : m_workers) {
    fds.push_back({worker->fd, POLLIN, 0});
    first = std::min(first, worker->deadline);
  }
  auto left = std::chrono::duration_cast<std::chrono::milliseconds>(first - Clock::now()).count();
  poll(fds.data(), fds.size(), static_cast<int>(std::max<long long>(left + 1, 0)));
  for (size_t i = 0; i < fds.size(); ++i) {
    Worker& worker = *m_workers[i];
    if (fds[i].revents) {
      read(worker);
    } else if (Clock::now() >= worker.deadline) {
      fail(worker, "hangs", "the library did not load within 10 s; its process was killed");
    }
  }
  std::erase_if(m_workers, [&](auto& worker) {
    if (!worker->jobs.empty()) return false;
    if (worker->pid > 0) end(*worker);
    return true;
  });
}

void Checker::run(const std::function<void(const Component&, const Verdict&)>& done) {
  const size_t most = std::max(1u, std::thread::hardware_concurrency());
  plan();
  for (size_t next = 0; next < m_components.size();) {
    while (m_workers.size() < most && !m_queue.empty()) {
      Jobs jobs = m_queue.front();
      m_queue.pop_front();
      start(jobs);
    }
    wait();
    for (; next < m_components.size() && m_verdicts[next]; ++next) {
      done(m_components[next], *m_verdicts[next]);
    }
  }
}

}  // namespace

void CheckComponents(const std::vector<Component>& components, const CheckOptions& options,
                     const std::function<void(const Component&, const Verdict&)>& done) {
  Checker(components, options).run(done);
}

}  // namespace vltctl

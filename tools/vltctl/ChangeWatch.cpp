#include "tools/vltctl/ChangeWatch.h"

#include <errno.h>
#include <poll.h>
#include <signal.h>
#include <string.h>
#include <sys/inotify.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <filesystem>

#include "tools/common/Output.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr milliseconds kQuiet{50}, kLongestUnrest{500};

// Not what reading a file does.
constexpr uint32_t kChanges = IN_CREATE | IN_DELETE | IN_MODIFY | IN_CLOSE_WRITE | IN_ATTRIB |
                              IN_MOVED_FROM | IN_MOVED_TO | IN_DELETE_SELF | IN_MOVE_SELF;

vltctl::Failure NoMore(const std::string& where) {
  return {vltctl::kDataUnusable,
          {"cannot-watch", where, "cannot be watched", strerror(errno),
           "see fs.inotify.max_user_watches and max_user_instances of sysctl"}};
}

zt::posix::ScopedFd OpenSignals() {
  sigset_t ends;
  sigemptyset(&ends);
  sigaddset(&ends, SIGINT);
  sigaddset(&ends, SIGTERM);
  sigprocmask(SIG_BLOCK, &ends, nullptr);
  return zt::posix::ScopedFd(signalfd(-1, &ends, SFD_CLOEXEC));
}

}  // namespace

ChangeWatch::ChangeWatch()
    : m_inotify(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)), m_signals(OpenSignals()) {
  if (!m_inotify || !m_signals) throw NoMore("inotify");
}

bool ChangeWatch::add(const std::string& directory, const std::string& only) {
  int watch = inotify_add_watch(m_inotify.get(), directory.c_str(), kChanges | IN_ONLYDIR);
  if (watch < 0 && errno == ENOSPC) throw NoMore(directory);
  if (watch < 0) return false;
  m_only[watch] = only;
  return true;
}

bool ChangeWatch::addWithWay(const std::string& directory) {
  fs::path path = fs::path(directory).lexically_normal();
  if (!path.has_filename()) path = path.parent_path();
  for (fs::path part = path; part.has_relative_path(); part = part.parent_path()) {
    add(part.parent_path(), part.filename());
  }
  return add(path);
}

// Takes all events that there are. Whether one of them counts; lost ones do.
bool ChangeWatch::takeEvents() {
  alignas(inotify_event) char block[16384];
  bool counts = false;
  for (;;) {
    ssize_t got = read(m_inotify.get(), block, sizeof block);
    if (got <= 0) return counts;
    for (ssize_t at = 0; at < got;) {
      auto* event = reinterpret_cast<const inotify_event*>(block + at);
      at += static_cast<ssize_t>(sizeof *event + event->len);
      auto only = m_only.find(event->wd);
      bool isOther = only != m_only.end() && !only->second.empty() && event->len > 0 &&
                     only->second != event->name;
      counts = counts || !isOther;
      if (event->mask & IN_IGNORED) m_only.erase(event->wd);
    }
  }
}

ChangeWatch::Woken ChangeWatch::wait(milliseconds longest) {
  const auto deadline = Clock::now() + longest;
  for (;;) {
    auto left = std::chrono::ceil<milliseconds>(deadline - Clock::now());
    if (left.count() < 0) return Woken::Late;
    pollfd fds[] = {{m_inotify.get(), POLLIN, 0}, {m_signals.get(), POLLIN, 0}};
    if (poll(fds, 2, static_cast<int>(left.count())) == 0) return Woken::Late;
    if (fds[1].revents) return Woken::Signalled;
    if (fds[0].revents && takeEvents()) return Woken::Changed;
  }
}

ChangeWatch::Woken ChangeWatch::settle() {
  const auto deadline = Clock::now() + kLongestUnrest;
  for (;;) {
    Woken woken = wait(kQuiet);
    if (woken == Woken::Signalled) return woken;
    if (woken == Woken::Late || Clock::now() >= deadline) return Woken::Changed;
  }
}

}  // namespace admin

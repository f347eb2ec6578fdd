// watch: what changes in an installation, one line each, until a signal or a limit ends it.
#include <time.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <optional>
#include <system_error>

#include "tools/vltctl/ChangeWatch.h"
#include "tools/vltctl/Picture.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;
using Woken = ChangeWatch::Woken;
using std::chrono::milliseconds;
using vltctl::Json;

// A bundle with the directory of its registration file is two below the directory of bundles.
constexpr int kDepth = 3;

// Each directory before what is in it, so that nothing that is made meanwhile is missed.
void AddBelow(const fs::path& directory, int depth, ChangeWatch* watch) {
  if (!watch->add(directory) || depth == 0) return;
  std::error_code gone;
  for (fs::directory_iterator entry(directory, gone), end; !gone && entry != end;
       entry.increment(gone)) {
    std::error_code hidden;
    if (entry->is_directory(hidden)) AddBelow(entry->path(), depth - 1, watch);
  }
}

void AddAll(const fs::path& root, ChangeWatch* watch) {
  watch->addWithWay(root);
  AddBelow(root, kDepth, watch);
}

class Watcher {
 public:
  Watcher(const Arguments& arguments, Output& output)
      : m_output(output), m_count(arguments.number("--count", 0)), m_root(InstallDirectory()) {
    if (arguments.has("--for")) {
      m_deadline = Clock::now() + std::chrono::seconds(arguments.number("--for", 0));
    }
  }

  int run() {
    look();
    show({"watching", "watching " + m_root, m_root, nullptr, nullptr});
    Picture nothing = m_last;
    nothing.pending.clear();
    for (const Change& change : Differences(nothing, m_last)) show(change);
    for (;;) {
      if (m_count > 0 && m_seen >= m_count) return vltctl::kGood;
      Woken woken = m_watch.wait(left());
      if (woken == Woken::Changed) woken = m_watch.settle();
      if (woken == Woken::Signalled) return vltctl::kGood;
      if (woken == Woken::Late && m_deadline && Clock::now() >= *m_deadline) {
        return m_count > 0 ? vltctl::kNotFound : vltctl::kGood;
      }
      if (woken == Woken::Changed) compare();
    }
  }

 private:
  milliseconds left() const {
    constexpr milliseconds kLong = std::chrono::hours(1);
    if (!m_deadline) return kLong;
    auto rest = std::chrono::ceil<milliseconds>(*m_deadline - Clock::now());
    return std::clamp(rest, milliseconds(0), kLong);
  }

  void look() {
    AddAll(m_root, &m_watch);
    ExpectNoWayOut();
    m_last = TakePicture();
  }

  void compare() {
    Picture before = m_last;
    try {
      look();
    } catch (const vltctl::Failure& failure) {
      // A moment at which nothing can be said; the next one may be better.
      m_output.problem(failure.problem);
      return;
    }
    for (const Change& change : Differences(before, m_last)) {
      show(change);
      if (++m_seen == m_count) return;
    }
  }

  void show(const Change& change) {
    const std::string now = UtcText(time(nullptr));
    m_output.item({{"time", now},
                   {"what", change.what},
                   {"subject", change.subject.empty() ? Json() : Json(change.subject)},
                   {"before", change.before},
                   {"after", change.after},
                   {"text", change.text}});
    m_output.line(now + "  " + change.text);
    m_output.flush();
  }

  ChangeWatch m_watch;
  Output& m_output;
  const unsigned m_count;
  const std::string m_root;
  std::optional<Clock::time_point> m_deadline;
  Picture m_last;
  unsigned m_seen = 0;
};

}  // namespace

int Watch(const Arguments& arguments, Output& output) {
  ChooseRoot(arguments, MissingRoot::Awaited);
  if (InstallDirectory().empty()) throw NoInstallDirectory();
  return Watcher(arguments, output).run();
}

}  // namespace admin

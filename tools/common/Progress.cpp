#include "tools/common/Progress.h"

#include <stdio.h>
#include <unistd.h>

#include <atomic>
#include <system_error>
#include <utility>

namespace vltctl {
namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kPatience{500}, kBetweenShows{50};
constexpr std::chrono::seconds kBetweenTimes{1};

// Of the one terminal.
std::atomic<bool> s_isShown = false;

void ShowLine(const std::string& text) {
  fprintf(stderr, "\r%s\x1B[K", text.c_str());
  s_isShown = true;
}

}  // namespace

void ClearProgress() {
  if (s_isShown.exchange(false)) fprintf(stderr, "\r\x1B[K");
}

Progress::Progress(std::string verb, size_t steps)
    : m_verb(std::move(verb)), m_steps(steps), m_nextShow(Clock::now() + kPatience) {}

Progress::~Progress() { ClearProgress(); }

void Progress::step() {
  ++m_done;
  auto now = Clock::now();
  if (now < m_nextShow || m_done >= m_steps || !isatty(STDERR_FILENO)) return;
  m_nextShow = now + kBetweenShows;
  ShowLine(m_verb + " " + std::to_string(m_done) + " of " + std::to_string(m_steps));
}

Waiting::Waiting(std::string what) : m_what(std::move(what)) {
  if (!isatty(STDERR_FILENO)) return;
  try {
    m_thread = std::thread([this] { show(); });
  } catch (const std::system_error&) {
    // Without a thread the work is done all the same.
  }
}

Waiting::~Waiting() {
  if (!m_thread.joinable()) return;
  {
    std::lock_guard hold(m_mutex);
    m_hasEnded = true;
  }
  m_ended.notify_one();
  m_thread.join();
  ClearProgress();
}

void Waiting::show() {
  const auto start = Clock::now();
  std::unique_lock hold(m_mutex);
  auto hasEnded = [this] { return m_hasEnded; };
  for (auto next = start + kPatience; !m_ended.wait_until(hold, next, hasEnded);
       next += kBetweenTimes) {
    auto taken = std::chrono::duration_cast<std::chrono::seconds>(next + kPatience - start);
    ShowLine(m_what + ": " + std::to_string(taken.count()) + " s");
  }
}

}  // namespace vltctl

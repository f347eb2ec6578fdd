#include "tools/common/Progress.h"

#include <stdio.h>
#include <unistd.h>

#include <utility>

namespace vltctl {

constexpr std::chrono::milliseconds kPatience{500};

Progress::Progress(std::string verb, size_t steps) : m_verb(std::move(verb)), m_steps(steps) {}

void Progress::step() {
  ++m_done;
  bool isDue = std::chrono::steady_clock::now() - m_start >= kPatience && m_done < m_steps;
  if (!isDue || !isatty(STDERR_FILENO)) return;
  fprintf(stderr, "\r%s %zu of %zu\x1B[K", m_verb.c_str(), m_done, m_steps);
  m_isShown = true;
}

void Progress::clear() {
  if (std::exchange(m_isShown, false)) fprintf(stderr, "\r\x1B[K");
}

}  // namespace vltctl

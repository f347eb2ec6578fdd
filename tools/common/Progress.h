#pragma once

#include <stddef.h>

#include <chrono>
#include <string>

namespace vltctl {

// How far a long command is: "checking 12 of 200" in the last line of the terminal, from half a second
// on. Nothing where standard error is no terminal.
class Progress {
 public:
  // "checking", and how many steps there are.
  Progress(std::string verb, size_t steps);
  ~Progress() { clear(); }
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  // A step is done.
  void step();
  // Removes the line, before something else is printed.
  void clear();

 private:
  const std::string m_verb;
  const size_t m_steps;
  const std::chrono::steady_clock::time_point m_start = std::chrono::steady_clock::now();
  size_t m_done = 0;
  bool m_isShown = false;
};

}  // namespace vltctl

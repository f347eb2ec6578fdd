#pragma once

#include <stddef.h>

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <string>
#include <thread>

// What a long command is doing, in the last line of the terminal, from half a second on. Nothing where
// standard error is no terminal.
namespace vltctl {

// How far it is: "checking 12 of 200".
class Progress {
 public:
  // "checking", and how many steps there are.
  Progress(std::string verb, size_t steps);
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  // A step is done.
  void step();

 private:
  const std::string m_verb;
  const size_t m_steps;
  std::chrono::steady_clock::time_point m_nextShow;
  size_t m_done = 0;
};

// How long it has taken, for work without steps to count: "reading the installation: 3 s". A thread
// shows it, so that the creator prints nothing, and does not fork, as long as the object lives.
class Waiting {
 public:
  explicit Waiting(std::string what);
  ~Waiting();
  Waiting(const Waiting&) = delete;
  Waiting& operator=(const Waiting&) = delete;

 private:
  void show();

  const std::string m_what;
  std::mutex m_mutex;
  std::condition_variable m_ended;
  bool m_hasEnded = false;
  std::thread m_thread;
};

// Removes the line, if there is one. Output does so before it prints.
void ClearProgress();

}  // namespace vltctl

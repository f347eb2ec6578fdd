#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <string>

namespace storm {

using Clock = std::chrono::steady_clock;

// Forks a process that runs the body and ends with its result, or with 99 for an exception. It is
// killed when its parent ends.
pid_t Spawn(const std::function<int()>& body);

// Kills by id; harmless for 0.
void Kill(pid_t pid);

// Reaps the process. Returns its exit code, 128 + signal, or -1 if it still runs at the deadline;
// it is then killed and reaped all the same.
int Reap(pid_t pid, Clock::time_point deadline);

// Takes the exit code of the process if it has ended.
bool HasEnded(pid_t pid, int* code);

// A directory of the storm's own, which is its shared place; gone at the end.
class Place {
 public:
  Place();
  ~Place();
  Place(const Place&) = delete;
  Place& operator=(const Place&) = delete;
  // Number of files in "namedEvent/".
  std::size_t countEventFiles() const;

 private:
  std::string m_path;
};

// Memory that is shared with all processes forked later; zero at first.
void* SharedMemory(std::size_t size);

// Small fast numbers at random.
class Random {
 public:
  explicit Random(std::uint64_t seed) : m_state(seed * 0x9E3779B97F4A7C15u + 1) {}
  // From 0 to n - 1.
  std::uint32_t below(std::uint32_t n);

 private:
  std::uint64_t m_state;
};

void SleepUs(unsigned us);

}  // namespace storm

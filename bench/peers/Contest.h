#pragma once

#include <functional>
#include <string>
#include <vector>

// Jobs of the library timed beside others' way of doing the same, in one process, in turns.
//
// Times of one run do not compare with those of another: the machine decides them. The ratio inside a
// pair does, as far as its spread reaches.
namespace peers {

struct Rival {
  std::string name;
  // Time of ours divided by the rival's that is the aim; 0 where there is none.
  double aim;
  std::function<void()> job;
};

struct Contest {
  std::string row;
  std::string job;
  std::function<void()> ours;
  std::vector<Rival> rivals;
  // Before each timed run of anybody, for jobs that change what they need; not timed.
  std::function<void()> prepare = {};
  int rounds = 15;
};

// Runs the contest in turns and prints a line for each rival: the median ratio of the pairs, and the
// quartiles. A job without `prepare` is repeated until a run takes some milliseconds.
void Run(const Contest& contest);

void PrintHead();

// Ends the program with a message: a result that is wrong has no time.
[[noreturn]] void Fail(const char* what);
inline void Require(bool condition, const char* what) {
  if (!condition) Fail(what);
}

}  // namespace peers

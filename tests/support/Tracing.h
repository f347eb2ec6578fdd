#pragma once

#include <string>
#include <utility>
#include <vector>

#include "tests/support/Child.h"

namespace vlt::test {

// A system call of a traced program.
struct Call {
  std::string name;
  int when;          // which of its name, from 1
  std::string text;  // the whole line, with the paths of descriptors
};

// A program that is run under strace again and again, and is killed, or refused a call, at one system
// call of a run that was recorded before. Every run must make the same calls.
class Tracing {
 public:
  // `variables` go to the traced program.
  Tracing(std::vector<std::string> program, Environment variables);

  // Why the machine cannot do this; empty if it can.
  static std::string Missing();

  // The calls from the first line with `from` to the last with `to`, but for those about memory.
  std::vector<Call> record(const std::string& from, const std::string& to) const;

  // Runs the program again and kills it on its way into the call. 128 + SIGKILL if it met it.
  int killAt(const Call& call) const;

  // Runs the program again; the call fails with the error ("EIO") and does nothing. Returns the exit
  // code, or -1, with a failure of the test, past the deadline.
  int failAt(const Call& call, const std::string& error, int deadlineMs) const;

  // Runs the program to its end; its exit code.
  int runOnce() const;

 private:
  ProgramResult run(const std::vector<std::string>& options, int deadlineMs = kDeadlineMs) const;
  ProgramResult inject(const Call& call, const std::string& what, int deadlineMs) const;

  std::vector<std::string> m_program;
  Environment m_variables;
};

// What a series of kills came to.
struct Tally {
  int kills = 0, old = 0, fresh = 0, lost = 0, setAside = 0, refused = 0;

  void print(const char* what) const;
  // Every kill left the old or the new contents.
  void expectNoLoss() const;
};

// Number of ".bad" files at any depth.
int FilesSetAside(const std::string& root);

// The test is to run at its full size: VLT_FULL is set, and neither empty nor "0".
bool FullSize();

}  // namespace vlt::test

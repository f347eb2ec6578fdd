#include "tests/support/Tracing.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <set>

#include "tests/support/TempDir.h"

namespace vlt::test {
namespace {

bool IsAboutMemory(const std::string& name) {
  static const std::set<std::string> names = {"brk",      "mmap",    "mmap2", "munmap",    "mremap",
                                              "mprotect", "madvise", "futex", "exit_group"};
  return names.count(name) != 0;
}

// "openat(AT_FDCWD, ..." gives "openat".
std::string NameIn(const std::string& line) {
  size_t begin = line.find_first_not_of("0123456789 ");
  size_t end = line.find('(', begin);
  if (begin == std::string::npos || end == std::string::npos) return "";
  std::string name = line.substr(begin, end - begin);
  return name.find_first_not_of("abcdefghijklmnopqrstuvwxyz0123456789_") == std::string::npos ? name
                                                                                              : "";
}

}  // namespace

Tracing::Tracing(std::vector<std::string> program, Environment variables)
    : m_program(std::move(program)), m_variables(std::move(variables)) {
  // Leak checks do not work under a tracer.
  m_variables.push_back({"ASAN_OPTIONS", "detect_leaks=0:allocator_may_return_null=1"});
}

std::string Tracing::Missing() {
  ProgramResult result = RunProgram({"strace", "-o", "/dev/null", "true"});
  if (result.exitCode == 127) return "strace is not installed";
  return result.exitCode == 0 ? "" : "strace may not trace here: " + result.err;
}

std::vector<Call> Tracing::record(const std::string& from, const std::string& to) const {
  TempDir dir;
  EXPECT_EQ(run({"-o", dir / "log", "-s", "300", "-y"}).exitCode, 0);
  std::ifstream in(dir / "log");
  std::vector<Call> calls;
  std::map<std::string, int> seen;
  bool inside = false;
  size_t last = 0;
  for (std::string line; std::getline(in, line);) {
    std::string name = NameIn(line);
    if (name.empty()) continue;
    int when = ++seen[name];
    if (line.find(from) != std::string::npos) inside = true;
    if (inside && !IsAboutMemory(name)) calls.push_back({name, when, line});
    if (inside && line.find(to) != std::string::npos) last = calls.size();
  }
  calls.resize(last);
  return calls;
}

int Tracing::killAt(const Call& call) const {
  return inject(call, "signal=KILL", kDeadlineMs).exitCode;
}

int Tracing::failAt(const Call& call, const std::string& error, int deadlineMs) const {
  return inject(call, "error=" + error, deadlineMs).exitCode;
}

int Tracing::runOnce() const { return RunProgram(m_program, m_variables).exitCode; }

ProgramResult Tracing::inject(const Call& call, const std::string& what, int deadlineMs) const {
  return run({"-o", "/dev/null", "-e", "trace=" + call.name, "-e",
              "inject=" + call.name + ":" + what + ":when=" + std::to_string(call.when)},
             deadlineMs);
}

ProgramResult Tracing::run(const std::vector<std::string>& options, int deadlineMs) const {
  std::vector<std::string> argv = {"strace", "-f", "-qq"};
  argv.insert(argv.end(), options.begin(), options.end());
  argv.insert(argv.end(), m_program.begin(), m_program.end());
  return RunProgram(argv, m_variables, deadlineMs);
}

void Tally::print(const char* what) const {
  printf(
      "%s: %d kills; %d old contents, %d new contents, %d lost values, %d files set aside, "
      "%d starts refused\n",
      what, kills, old, fresh, lost, setAside, refused);
}

void Tally::expectNoLoss() const {
  EXPECT_EQ(lost, 0);
  EXPECT_EQ(setAside, 0);
  EXPECT_EQ(refused, 0);
  EXPECT_EQ(old + fresh, kills);
}

int FilesSetAside(const std::string& root) {
  int count = 0;
  for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
    if (entry.path().extension() == ".bad") ++count;
  }
  return count;
}

bool FullSize() {
  const char* full = getenv("VLT_FULL");
  return full && *full && strcmp(full, "0") != 0;
}

}  // namespace vlt::test

#include "tools/storm/Process.h"

#include <poll.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <exception>
#include <filesystem>
#include <iterator>
#include <system_error>

namespace storm {
namespace {

namespace fs = std::filesystem;

[[noreturn]] void Fail(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

int ExitCode(int status) {
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

}  // namespace

pid_t Spawn(const std::function<int()>& body) {
  pid_t parent = getpid();
  fflush(nullptr);
  pid_t pid = fork();
  if (pid < 0) Fail("fork");
  if (pid > 0) return pid;
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  if (getppid() != parent) _exit(98);
  int code = 99;
  try {
    code = body();
  } catch (const std::exception& e) {
    fprintf(stderr, "process %d: %s\n", static_cast<int>(getpid()), e.what());
  }
  fflush(nullptr);
  _exit(code);
}

void Kill(pid_t pid) {
  if (pid > 0) kill(pid, SIGKILL);
}

bool HasEnded(pid_t pid, int* code) {
  int status;
  pid_t got = waitpid(pid, &status, WNOHANG);
  if (got == 0 || (got < 0 && errno == EINTR)) return false;
  if (got < 0) Fail("waitpid");
  *code = ExitCode(status);
  return true;
}

int Reap(pid_t pid, Clock::time_point deadline) {
  int code = -1;
  while (!HasEnded(pid, &code)) {
    if (Clock::now() >= deadline) {
      Kill(pid);
      while (!HasEnded(pid, &code)) poll(nullptr, 0, 1);
      return -1;
    }
    SleepUs(100);
  }
  return code;
}

Place::Place() {
  m_path = (fs::temp_directory_path() / "storm.XXXXXX").string();
  if (!mkdtemp(m_path.data())) Fail("mkdtemp");
  setenv("ZTFNDTMPSHAREDFILEDIR", m_path.c_str(), 1);
}

Place::~Place() {
  std::error_code ignored;  // what cannot be removed lies in the temporary directory anyway
  fs::remove_all(m_path, ignored);
}

std::size_t Place::countEventFiles() const {
  std::error_code missing;
  fs::directory_iterator files(m_path + "/namedEvent", missing);
  return missing ? 0 : static_cast<std::size_t>(std::distance(begin(files), end(files)));
}

void* SharedMemory(std::size_t size) {
  void* memory = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  if (memory == MAP_FAILED) Fail("mmap");
  return memory;
}

std::uint32_t Random::below(std::uint32_t n) {
  m_state ^= m_state << 13;
  m_state ^= m_state >> 7;
  m_state ^= m_state << 17;
  return static_cast<std::uint32_t>(m_state >> 32) % n;
}

void SleepUs(unsigned us) {
  timespec time = {static_cast<time_t>(us / 1000000), static_cast<long>(us % 1000000) * 1000};
  nanosleep(&time, nullptr);
}

}  // namespace storm

// Processes that have a registrar without the lock of its database: workers of a parent that forked
// after it had made the registrar, daemons, hosts that close every descriptor, and processes whose lock
// file was removed. Whatever they are answered with S_OK is on disk afterwards, and nothing that
// another process has put there is lost.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <functional>
#include <system_error>

#include "tests/e2e/Start.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/Tracing.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr int kWorkers = 6, kEach = 60;
constexpr int kLongestMs = 120000;

// What the processes of a test have been answered, in memory that all of them share.
struct Answers {
  std::atomic<int> stored[kWorkers + 1][kEach];  // 1 for S_OK
  std::atomic<int> refused, other, blind;        // E_FAIL, another result, a question unanswered
};

class SharedAnswers {
 public:
  SharedAnswers()
      : m_answers(static_cast<Answers*>(mmap(nullptr, sizeof(Answers), PROT_READ | PROT_WRITE,
                                             MAP_SHARED | MAP_ANONYMOUS, -1, 0))) {}
  // The file holds the answers of processes that are started by exec.
  explicit SharedAnswers(const std::string& file) : m_answers(Map(file)) {}
  ~SharedAnswers() { munmap(m_answers, sizeof(Answers)); }
  SharedAnswers(const SharedAnswers&) = delete;
  SharedAnswers& operator=(const SharedAnswers&) = delete;
  Answers* operator->() const { return m_answers; }

  int stored() const {
    int count = 0;
    for (auto& worker : m_answers->stored) {
      for (auto& answer : worker) count += answer;
    }
    return count;
  }

 private:
  static Answers* Map(const std::string& file) {
    int fd = open(file.c_str(), O_RDWR | O_CLOEXEC);
    void* page = mmap(nullptr, sizeof(Answers), PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    close(fd);
    if (page == MAP_FAILED) throw std::system_error(errno, std::generic_category(), "mmap");
    return static_cast<Answers*>(page);
  }

  Answers* m_answers;
};

GUID IdOf(int worker, int n) { return G(static_cast<uint32_t>(0x1000 * (worker + 1) + n)); }

HRESULT Register(IvltRegistrar& r, GUID id) {
  std::wstring name = L"Client's " + std::to_wstring(id.Data1);
  Offered d(vltComponentDataDictionary, name, id, L"/x/y.framework", L"rc");
  return r.RegisterComponent(&d.value);
}

void RegisterAll(IvltRegistrar& r, int worker, const SharedAnswers& answers) {
  for (int n = 0; n < kEach; ++n) {
    HRESULT result = Register(r, IdOf(worker, n));
    if (result == S_OK) {
      answers->stored[worker][n] = 1;
    } else {
      ++(result == E_FAIL ? answers->refused : answers->other);
    }
    answers->blind += Find(r, kVltdd) != S_OK;
  }
}

// The lock file of the database: its path in capitals, without separators and dots.
std::string LockFile() {
  std::string config = ReadBytes(std::string(getenv("XDG_CONFIG_HOME")) + "/com.zentrex.kor.ini");
  size_t begin = config.find('"') + 1;
  std::string name;
  for (char c : config.substr(begin, config.find('"', begin) - begin) + "/vlt.vlr") {
    if (c != '/' && c != '.') name += static_cast<char>(toupper(c));
  }
  return std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex/" + name;
}

bool FileIsLocked() {
  int fd = open(LockFile().c_str(), O_RDWR | O_CLOEXEC);
  bool locked = fd >= 0 && flock(fd, LOCK_EX | LOCK_NB) != 0;
  close(fd);
  return locked;
}

// The next process finds everything that was answered with S_OK; how many it did not.
int Missing(const SharedAnswers& answers) {
  int missing = -1;
  SharedAnswers found;
  ExpectInChild([&] {
    IvltRegistrar* r = nullptr;
    ASSERT_EQ(GetRegistrar(&r), "ok");
    for (int w = 0; w <= kWorkers; ++w) {
      for (int n = 0; n < kEach; ++n) found->stored[w][n] = Find(*r, IdOf(w, n)) == S_OK;
    }
    found->other = 1;
  });
  if (!found->other) return missing;
  missing = 0;
  for (int w = 0; w <= kWorkers; ++w) {
    for (int n = 0; n < kEach; ++n) missing += answers->stored[w][n] && !found->stored[w][n];
  }
  return missing;
}

enum class Parent { Stays, Ends };

// Makes a registrar, forks the workers, and stays, with registrations of its own, or ends before they
// register anything.
int ForkWorkers(Parent parent, const SharedAnswers& answers) {
  IvltRegistrar* r = nullptr;
  if (GetRegistrar(&r) != "ok") return 1;
  int ended[2];
  const pid_t maker = getpid();
  if (pipe(ended) != 0) return 2;
  for (int w = 0; w < kWorkers; ++w) {
    pid_t pid = fork();
    if (pid < 0) return 2;
    if (pid == 0) {
      alarm(kLongestMs / 1000);
      close(ended[1]);
      char byte;
      if (parent == Parent::Ends && read(ended[0], &byte, 1) != 0) _exit(3);
      // The parent's end of the pipe may close before its lock file does.
      if (parent == Parent::Ends && !Eventually([&] { return getppid() != maker; })) _exit(5);
      RegisterAll(*r, w, answers);
      _exit(0);
    }
  }
  if (parent == Parent::Ends) return 0;
  RegisterAll(*r, kWorkers, answers);
  int failed = 0, status = 0;
  while (wait(&status) > 0) failed += status != 0;
  return failed ? 4 : 0;
}

// Runs the body in a process, and returns when all the processes that it has left have ended, too: 0 if
// each of them ended so.
int WithOrphans(const std::function<int()>& body) {
  Child host([&] {
    if (prctl(PR_SET_CHILD_SUBREAPER, 1) != 0) return 90;
    pid_t pid = fork();
    if (pid < 0) return 91;
    if (pid == 0) {
      alarm(kLongestMs / 1000);
      _exit(body());
    }
    int status = 0, failed = 0;
    while (wait(&status) > 0) {
      if (status != 0 && !failed) failed = WIFEXITED(status) ? WEXITSTATUS(status) : 92;
    }
    return failed;
  });
  return host.wait(kLongestMs + kDeadlineMs);
}

class Prefork : public testing::Test {
 protected:
  Prefork() { i.addDictionary("Core", "Core", GText(1), 7, "co"); }

  void run(Parent parent, int times) {
    int stored = 0, refused = 0, missing = 0;
    for (int n = 0; n < times; ++n) {
      for (const char* name : {"/vlt.vlr", "/vlt.vl5"}) fs::remove(i.root() + name);
      SharedAnswers answers;
      ASSERT_EQ(WithOrphans([&] { return ForkWorkers(parent, answers); }), 0);
      check(answers);
      if (parent == Parent::Stays) {
        int own = 0;
        for (auto& answer : answers->stored[kWorkers]) own += answer;
        EXPECT_EQ(own, kEach) << "the parent's own registrations";
      }
      EXPECT_GE(answers.stored(), kEach);
      stored += answers.stored();
      refused += answers->refused;
      missing += Missing(answers);
    }
    printf("%d runs: %d registrations answered S_OK, %d E_FAIL, %d of the former not on disk\n",
           times, stored, refused, missing);
    EXPECT_EQ(missing, 0);
  }

  void check(const SharedAnswers& answers) {
    EXPECT_EQ(answers->other, 0) << "neither S_OK nor E_FAIL";
    EXPECT_EQ(answers->blind, 0) << "components not answered from memory";
    EXPECT_EQ(FilesSetAside(i.root()), 0);
    ExpectWhole(i);
  }

  // Another process registers the component, and lives until the object goes.
  class Other {
   public:
    explicit Other(GUID id)
        : m_process([this, id] {
            IvltRegistrar* r = nullptr;
            if (GetRegistrar(&r) != "ok" || Register(*r, id) != S_OK) return 1;
            m_registered.notify();
            m_end.await();
            _exit(0);
            return 0;
          }) {
      EXPECT_TRUE(m_registered.await());
    }
    void end() {
      m_end.notify();
      EXPECT_EQ(m_process.wait(), 0);
    }

   private:
    Signal m_registered, m_end;
    Child m_process;
  };

  Installation i;
};

// The parent has the lock as long as it lives: what a worker cannot save is reported to it.
TEST_F(Prefork, WhatWorkersOfALivingParentAreAnsweredIsOnDisk) {
  run(Parent::Stays, FullSize() ? 12 : 2);
}

// One of the workers has the lock from its first save on.
TEST_F(Prefork, WhatWorkersOfAnEndedParentAreAnsweredIsOnDisk) {
  run(Parent::Ends, FullSize() ? 12 : 2);
}

// ---- The same with slow writes: the program itself, run under strace with a variable set.

constexpr char kParentVariable[] = "VLT_E2E_PREFORK";

__attribute__((constructor)) void ActAsParent() {
  const char* answers = getenv(kParentVariable);
  if (!answers) return;
  _exit(ForkWorkers(Parent::Stays, SharedAnswers(std::string(answers))));
}

TEST_F(Prefork, SlowWritesTearNothing) {
  std::string missing = Tracing::Missing();
  if (!missing.empty()) {
    printf("NOT TESTED: workers with slow writes; %s\n", missing.c_str());
    GTEST_SKIP() << missing;
  }
  TempDir dir;
  int torn = 0, lost = 0;
  const int times = FullSize() ? 6 : 1;
  for (int n = 0; n < times; ++n) {
    for (const char* name : {"/vlt.vlr", "/vlt.vl5"}) fs::remove(i.root() + name);
    WriteBytes(dir / "answers", std::string(sizeof(Answers), '\0'));
    ProgramResult result =
        RunProgram({"strace", "-f", "-qq", "-o", "/dev/null", "-e", "trace=write,pwrite64", "-e",
                    "inject=write,pwrite64:delay_enter=2000", fs::read_symlink("/proc/self/exe")},
                   {{kParentVariable, dir / "answers"}}, kLongestMs);
    EXPECT_EQ(result.exitCode, 0) << result.err;
    SharedAnswers answers(dir / "answers");
    EXPECT_GE(answers.stored(), kEach);
    torn += Hex(ReadBytes(i.sidecar())) != Md5Sum(i.database());
    lost += Missing(answers);
    check(answers);
  }
  printf("%d runs with slow writes: %d files torn, %d registrations lost\n", times, torn, lost);
  EXPECT_EQ(torn, 0);
  EXPECT_EQ(lost, 0);
}

// ---- One process that has lost its lock

TEST_F(Prefork, ADaemonHasItsLockAgainAtItsNextCall) {
  EXPECT_EQ(WithOrphans([] {
              IvltRegistrar* r = nullptr;
              if (GetRegistrar(&r) != "ok") return 1;
              pid_t parent = getpid();
              pid_t pid = fork();
              if (pid != 0) return pid < 0 ? 2 : 0;
              alarm(kLongestMs / 1000);
              if (!Eventually([&] { return getppid() != parent; })) _exit(3);
              if (SetCacheSize(*r, 4711) != S_OK) _exit(4);
              if (!FileIsLocked()) _exit(5);
              if (Register(*r, G(50)) != S_OK) _exit(6);
              _exit(0);
              return 0;
            }),
            0);
  ExpectStart([](IvltRegistrar& r) {
    EXPECT_EQ(CacheSize(r), 4711u);
    EXPECT_EQ(Find(r, G(50)), S_OK);
  });
  ExpectWhole(i);
}

TEST_F(Prefork, AHostThatClosesAllDescriptorsHasItsLockAgainAtItsNextCall) {
  ExpectInChild([] {
    IvltRegistrar* r = nullptr;
    ASSERT_EQ(GetRegistrar(&r), "ok");
    ASSERT_EQ(syscall(SYS_close_range, 3u, ~0u, 0u), 0);
    ASSERT_FALSE(FileIsLocked());
    EXPECT_EQ(Register(*r, G(50)), S_OK);
    EXPECT_TRUE(FileIsLocked());
  });
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(50)), S_OK); });
  ExpectWhole(i);
}

// Loses the lock of a process, has another one register a component, and lets both go on.
class PreforkLostLock : public Prefork {
 protected:
  void expectNothingLost(const std::function<void()>& lose) {
    Signal ready, otherIsThere, tried, otherIsGone;
    Child first([&] {
      IvltRegistrar* r = nullptr;
      if (GetRegistrar(&r) != "ok" || Register(*r, G(40)) != S_OK) return 1;
      lose();
      ready.notify();
      if (!otherIsThere.await()) return 2;
      int failed = 0;
      // The other one has the lock.
      if (SetCacheSize(*r, 1) != E_FAIL) failed |= 4;
      if (Register(*r, G(41)) != E_FAIL) failed |= 8;
      if (Find(*r, G(1)) != S_OK || CacheSize(*r) != 33554432) failed |= 16;
      tried.notify();
      if (!otherIsGone.await()) return 3;
      if (SetCacheSize(*r, 2) != S_OK || Register(*r, G(42)) != S_OK) failed |= 32;
      if (!FileIsLocked()) failed |= 64;
      return failed;
    });
    ASSERT_TRUE(ready.await());
    Other other(G(50));
    std::string before = ReadBytes(i.database());
    otherIsThere.notify();
    ASSERT_TRUE(tried.await());
    EXPECT_EQ(ReadBytes(i.database()), before) << "written beside the other process";
    other.end();
    otherIsGone.notify();
    EXPECT_EQ(first.wait(), 0)
        << "4, 8: not E_FAIL beside the other; 16: not answered from memory; 32: refused when the "
           "other was gone; 64: without the lock then";
    ExpectStart([](IvltRegistrar& r) {
      EXPECT_EQ(Find(r, G(40)), S_OK);
      EXPECT_EQ(Find(r, G(50)), S_OK) << "the other process's component is lost";
      EXPECT_EQ(Find(r, G(42)), S_OK);
      EXPECT_EQ(Find(r, G(41)), E_INVALIDARG) << "a change that was refused was saved";
      EXPECT_EQ(CacheSize(r), 2u);
    });
    ExpectWhole(i);
  }
};

TEST_F(PreforkLostLock, ToACleanerOfTheLockDirectory) {
  expectNothingLost([] { unlink(LockFile().c_str()); });
}

TEST_F(PreforkLostLock, ToACleanerOfTheWholeSharedDirectory) {
  expectNothingLost([] { fs::remove_all(fs::path(LockFile()).parent_path()); });
}

// The numbers of the process's descriptors on its lock file.
std::vector<int> LockDescriptors() {
  std::vector<int> numbers;
  std::string file = LockFile();
  for (const auto& entry : fs::directory_iterator("/proc/self/fd")) {
    std::error_code gone;  // The listing's own descriptor.
    if (fs::read_symlink(entry.path(), gone) == file) {
      numbers.push_back(std::stoi(entry.path().filename()));
    }
  }
  EXPECT_FALSE(numbers.empty());
  return numbers;
}

TEST_F(PreforkLostLock, ToAHostThatReplacedTheDescriptor) {
  expectNothingLost([] {
    int null = open("/dev/null", O_RDWR | O_CLOEXEC);
    for (int number : LockDescriptors()) dup2(null, number);
    close(null);
  });
}

TEST_F(PreforkLostLock, ToAHostThatClosedTheDescriptor) {
  expectNothingLost([] {
    for (int number : LockDescriptors()) close(number);
  });
}

}  // namespace
}  // namespace vlt::test

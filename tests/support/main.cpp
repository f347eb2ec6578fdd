// Entry of every test program.
//
// The program starts itself again inside a directory of its own, with HOME, XDG_CONFIG_HOME,
// XDG_CONFIG_DIRS, TMPDIR and ZTFNDTMPSHAREDFILEDIR below it, and removes that directory at the
// end. It has to be a second process: the library under test reads some of these while it is being
// loaded.
#include <errno.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

#include "tests/support/Emulation.h"
#include "tests/support/PrivateRoot.h"

namespace {

namespace fs = std::filesystem;

constexpr const char* kInside = "VLT_TEST_ROOT";

void SetUp(const std::string& root) {
  const std::pair<const char*, const char*> places[] = {{"HOME", "/home"},
                                                        {"XDG_CONFIG_HOME", "/home/.config"},
                                                        {"XDG_CONFIG_DIRS", "/xdg"},
                                                        {"TMPDIR", "/tmp"},
                                                        {"ZTFNDTMPSHAREDFILEDIR", "/shared"}};
  for (const auto& [name, below] : places) {
    fs::create_directories(root + below);
    setenv(name, (root + below).c_str(), 1);
  }
  setenv(kInside, root.c_str(), 1);
}

int RunInside(char** argv) {
  std::string root = (fs::temp_directory_path() / "vlt.XXXXXX").string();
  if (!mkdtemp(root.data())) return 97;
  // Other users take part in some tests, and must be able to reach what lies inside.
  chmod(root.c_str(), 0755);
  // Asked for here: below another root directory, the link's text is a path outside.
  const std::string program = fs::read_symlink("/proc/self/exe");
  pid_t parent = getpid();
  pid_t pid = fork();
  if (pid < 0) return 97;
  if (pid == 0) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) _exit(97);
    SetUp(root);
    bool privateAlready = getenv("VLT_PRIVATE_ROOT") != nullptr;  // tests/support/in-private-root
    if (geteuid() == 0 && !privateAlready &&
        (!vlt::test::HasOtherUsers(root) || !vlt::test::EnterPrivateRoot(root))) {
      fprintf(stderr,
              "No root directory of its own, or no other user: runs as an ordinary user.\n");
      if (!vlt::test::BecomeOrdinaryUser(root)) {
        fprintf(stderr, "No right to become one, either.\n");
        _exit(97);
      }
    }
    execv(program.c_str(), argv);
    execv("/proc/self/exe", argv);  // for a user who may not enter the program's directory
    _exit(97);
  }
  int status = 0;
  while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
  }
  vlt::test::LeavePrivateRoot(root);
  std::error_code
      ignored;  // What a test made unreadable for its own user stays in the temporary place.
  fs::remove_all(root, ignored);
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

bool ListsOnly(int argc, char** argv) {
  for (int i = 1; i < argc; ++i) {
    if (std::string_view(argv[i]).starts_with("--gtest_list_tests")) return true;
  }
  return false;
}

}  // namespace

int main(int argc, char** argv) {
  if (!getenv(kInside) && !ListsOnly(argc, argv)) return RunInside(argv);
  testing::InitGoogleTest(&argc, argv);
  if (!ListsOnly(argc, argv)) vlt::test::LeaveOutBeyondEmulators();
  return RUN_ALL_TESTS();
}

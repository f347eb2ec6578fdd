#include "tools/vltctl-client/Check.h"

#include <dlfcn.h>
#include <elf.h>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <string.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <exception>
#include <fstream>
#include <memory>
#include <set>
#include <system_error>

#include "tools/vltctl-client/DropRights.h"
#include "tools/vltctl-client/LibraryTrust.h"

namespace vltctl {
namespace {

constexpr auto kTimeLimit = std::chrono::seconds(10);
constexpr size_t kTextLimit = 1 << 20;
constexpr char kMessage = 'M', kNote = 'N', kEnd = 'E';

[[noreturn]] void Fail(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

// Sends one line to the parent. A text of several lines stays one.
void Send(int fd, char kind, std::string text) {
  for (char& c : text) {
    if (c == '\n') c = ' ';
  }
  text = kind + text + "\n";
  const char* at = text.data();
  for (size_t left = text.size(); left > 0;) {
    ssize_t written = write(fd, at, left);
    if (written <= 0) return;
    at += written;
    left -= static_cast<size_t>(written);
  }
}

void DieWith(pid_t parent) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  if (getppid() != parent) _exit(1);
}

// A library for the other word size is a likely mistake, and the loader's words for it are dark.
std::string WordSizeNote(const std::string& file) {
  std::ifstream in(file, std::ios::binary);
  char ident[EI_NIDENT] = {};
  in.read(ident, sizeof ident);
  if (!in || memcmp(ident, ELFMAG, SELFMAG) != 0) return "";
  int bits = ident[EI_CLASS] == ELFCLASS64 ? 64 : 32;
  int own = sizeof(void*) * 8;
  if (bits == own) return "";
  return "the library is built for " + std::to_string(bits) + " bits, this program for " +
         std::to_string(own);
}

// What the loader itself says of the file; nothing if it loads.
// The check loads no relative path, and neither does this: it would begin in the present directory.
void SendLoadersWords(int fd, const std::string& file) {
  struct stat info;
  if (!file.starts_with('/') || stat(file.c_str(), &info) != 0 || !S_ISREG(info.st_mode)) return;
  void* handle = dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (handle) {
    dlclose(handle);
    return;
  }
  const char* words = dlerror();
  if (words) Send(fd, kNote, words);
  std::string note = WordSizeNote(file);
  if (!note.empty()) Send(fd, kNote, note);
}

void SendMessages(int fd, IEnumString* list) {
  wchar_t* text = nullptr;
  unsigned fetched = 0;
  while (list->Next(1, &text, &fetched) == S_OK) {
    Send(fd, kMessage, NarrowText(text));
    vltFree(text);
  }
}

HRESULT CheckByTheLibrary(const Component& component, int fd) {
  IEnumString* list = nullptr;
  HRESULT result = vltCheckComponent(ParseGuid(component.guid), &list);
  if (list) {
    SendMessages(fd, list);
    list->Release();
  }
  return result;
}

// What the check raises is a note in place of the messages, which are lost with it.
HRESULT CheckOrTellWhyNot(const Component& component, int fd) {
  try {
    return CheckByTheLibrary(component, fd);
  } catch (const std::exception& error) {
    Send(fd, kNote, std::string("the check could not be finished: ") + error.what());
    return E_FAIL;
  }
}

std::string Join(const std::set<uid_t>& users) {
  std::string out;
  for (uid_t user : users) out += (out.empty() ? "" : ", ") + std::to_string(user);
  return out;
}

// What root must not load, with the reason; or nothing.
std::string Refusal(const Controllers& controllers) {
  std::string why;
  if (!controllers.shared.empty()) {
    why = "\"" + controllers.shared + "\": " + controllers.reason;
  } else if (controllers.users.size() > 1) {
    why = "users " + Join(controllers.users) + " can each change it or a directory on its path";
  }
  if (why.empty()) return "";
  return "not loaded, as root would run the code of other users: " + why +
         "; check it as an ordinary user, or leave only its owner the right to change the path";
}

// The library's own conversion of the name may lead elsewhere.
constexpr const char* kInexact =
    "not loaded, as its path has characters that the locale lacks, and so root cannot see whose it "
    "is; "
    "check it in a UTF-8 locale";

// Why the process could not become the user, or nothing.
std::string Become(uid_t user, int* fd) {
  const char* failed = DetachFromParent(fd);
  if (!failed) failed = DropRights(user);
  if (!failed) return "";
  return "not loaded, as root cannot become user " + std::to_string(user) +
         ", who can change it: " + failed + "; check it as that user";
}

// Before root loads a library that another user can put there, it becomes that user: a process that
// shares nothing with the terminal and the files of the command. False, with a note, where it must not
// be loaded.
bool PrepareToLoad(const Component& component, pid_t parent, int* fd) {
  bool isLoaded = component.type != "dictionary" && component.file.starts_with('/');
  if (geteuid() != 0 || !isLoaded) return true;
  Controllers controllers = ControllersOfLibrary(component.file);
  std::string refusal = component.fileIsExact ? Refusal(controllers) : kInexact;
  if (refusal.empty() && controllers.users.empty()) return true;
  if (refusal.empty()) refusal = Become(*controllers.users.begin(), fd);
  if (!refusal.empty()) {
    Send(*fd, kNote, refusal);
    return false;
  }
  DieWith(parent);  // The change of user has made the kernel forget it.
  return true;
}

// The child: exit code 0 for a sound component, 1 for one with problems. Its last word is kEnd, without
// which the code is foreign: a library may end the process with any code while it is loaded.
int CheckInside(const Component& component, pid_t parent, int fd) {
  if (!PrepareToLoad(component, parent, &fd)) {
    Send(fd, kEnd, "");
    return 1;
  }
  HRESULT result = CheckOrTellWhyNot(component, fd);
  if (result < 0 && component.type != "dictionary") SendLoadersWords(fd, component.file);
  Send(fd, kEnd, "");
  return result < 0 ? 1 : 0;
}

bool HasEnded(const std::string& text) {
  const char end[] = {kEnd, '\n', 0};
  return text == end || text.ends_with(std::string("\n") + end);
}

// How the reading of what a child says has ended.
enum class Reading { Ended, TooSlow, TooMuch };

// What came through the pipe until its end, or the child's last word: processes that a library has
// started keep the pipe open. The library may write into it as well, and so no check says that much.
Reading ReadUntilEnd(int fd, std::string* text) {
  auto end = std::chrono::steady_clock::now() + kTimeLimit;
  char block[4096];
  for (;;) {
    auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
        end - std::chrono::steady_clock::now());
    pollfd wait = {fd, POLLIN, 0};
    if (left.count() <= 0 || poll(&wait, 1, static_cast<int>(left.count())) == 0) {
      return Reading::TooSlow;
    }
    ssize_t got = read(fd, block, sizeof block);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return Reading::Ended;
    text->append(block, static_cast<size_t>(got));
    if (HasEnded(*text)) return Reading::Ended;
    if (text->size() > kTextLimit) return Reading::TooMuch;
  }
}

void Sort(const std::string& text, Finding* finding) {
  for (size_t begin = 0; begin < text.size();) {
    size_t end = text.find('\n', begin);
    if (end == std::string::npos) end = text.size();
    std::string line = text.substr(begin, end - begin);
    if (line.starts_with(kMessage)) finding->messages.push_back(line.substr(1));
    if (line.starts_with(kNote)) finding->notes.push_back(line.substr(1));
    begin = end + 1;
  }
}

// In a session of its own, so that what a library starts can be ended with it, and has no terminal.
pid_t StartChild(const Component& component, int (&pipeEnds)[2]) {
  if (pipe2(pipeEnds, O_CLOEXEC) != 0) Fail("pipe");
  fflush(nullptr);
  pid_t parent = getpid();
  pid_t child = fork();
  if (child < 0) Fail("fork");
  if (child > 0) {
    close(pipeEnds[1]);
    return child;
  }
  setsid();
  DieWith(parent);  // What is typed at the terminal no longer reaches it.
  close(pipeEnds[0]);
  // What the library prints while it is loaded is not ours.
  int null = open("/dev/null", O_RDWR | O_CLOEXEC);
  dup2(null, 1);
  dup2(null, 2);
  _exit(CheckInside(component, parent, pipeEnds[1]));
}

// What became of the child, where that is worth a word.
std::string FateOf(int status, Reading reading, bool ended) {
  if (reading == Reading::TooSlow) {
    return "the library did not load within 10 s; its process was killed";
  }
  if (reading == Reading::TooMuch) {
    return "the library wrote more than 1 MiB into the check's pipe; its process was killed";
  }
  if (WIFSIGNALED(status) && !ended) {
    return std::string("the process that loaded the library died: ") + strsignal(WTERMSIG(status));
  }
  if (!ended) return "the library ended its process with " + std::to_string(WEXITSTATUS(status));
  return "";
}

bool HasIdentifier(const Component& component) { return component.guid != GuidText(GUID_NULL); }

Finding CheckOne(const Component& component) {
  Finding finding;
  finding.component = component;
  // To the library the null identifier means all components: their problems would be reported as
  // this one's.
  if (!HasIdentifier(component)) {
    finding.notes.push_back("it has no identifier of its own, so it cannot be checked alone");
    return finding;
  }
  int pipeEnds[2];
  pid_t child = StartChild(component, pipeEnds);
  std::string text;
  Reading reading = ReadUntilEnd(pipeEnds[0], &text);
  close(pipeEnds[0]);
  bool ended = HasEnded(text);
  if (reading != Reading::Ended) kill(child, SIGKILL);
  int status = 0;
  while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  kill(-child, SIGKILL);  // what the library has started and left running
  Sort(text, &finding);
  std::string fate = FateOf(status, reading, ended);
  if (!fate.empty()) finding.notes.push_back(fate);
  finding.sound =
      ended && WIFEXITED(status) && WEXITSTATUS(status) == 0 && finding.messages.empty();
  return finding;
}

}  // namespace

std::vector<Finding> CheckComponents(const Client& client, const std::optional<std::string>& guid) {
  std::vector<Finding> findings;
  if (guid) {
    if (auto component = client.find(*guid)) findings.push_back(CheckOne(*component));
    return findings;
  }
  for (const Component& component : client.list()) findings.push_back(CheckOne(component));
  return findings;
}

}  // namespace vltctl

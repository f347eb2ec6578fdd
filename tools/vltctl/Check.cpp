#include "tools/vltctl/Check.h"

#include <dlfcn.h>
#include <elf.h>
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
#include <system_error>

namespace vltctl {
namespace {

constexpr auto kTimeLimit = std::chrono::seconds(10);
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
void SendLoadersWords(int fd, const std::string& file) {
  struct stat info;
  if (stat(file.c_str(), &info) != 0 || !S_ISREG(info.st_mode)) return;
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

// What the check raises - a path that the system does not even let it look at - is told in place of the
// messages, which are lost with it.
HRESULT CheckOrTellWhyNot(const Component& component, int fd) {
  try {
    return CheckByTheLibrary(component, fd);
  } catch (const std::exception& error) {
    Send(fd, kNote, std::string("the check could not be finished: ") + error.what());
    return E_FAIL;
  }
}

// The child: exit code 0 for a sound component, 1 for one with problems. Its last word is kEnd, without
// which the code is somebody else's: a library may end the process with any code while it is loaded.
int CheckInside(const Component& component, int fd) {
  HRESULT result = CheckOrTellWhyNot(component, fd);
  if (result < 0 && component.type != "dictionary") SendLoadersWords(fd, component.file);
  Send(fd, kEnd, "");
  return result < 0 ? 1 : 0;
}

bool HasEnded(const std::string& text) {
  const char end[] = {kEnd, '\n', 0};
  return text == end || text.ends_with(std::string("\n") + end);
}

// What came through the pipe until its end, or the child's last word: processes that a library has
// started keep the pipe open. False past the time limit.
bool ReadUntilEnd(int fd, std::string* text) {
  auto end = std::chrono::steady_clock::now() + kTimeLimit;
  char block[4096];
  for (;;) {
    auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
        end - std::chrono::steady_clock::now());
    pollfd wait = {fd, POLLIN, 0};
    if (left.count() <= 0 || poll(&wait, 1, static_cast<int>(left.count())) == 0) return false;
    ssize_t got = read(fd, block, sizeof block);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return true;
    text->append(block, static_cast<size_t>(got));
    if (HasEnded(*text)) return true;
  }
}

void Sort(const std::string& text, Finding* finding) {
  for (size_t begin = 0; begin < text.size();) {
    size_t end = text.find('\n', begin);
    if (end == std::string::npos) end = text.size();
    std::string line = text.substr(begin + 1, end - begin - 1);
    if (text[begin] == kMessage) finding->messages.push_back(line);
    if (text[begin] == kNote) finding->notes.push_back(line);
    begin = end + 1;
  }
}

// In a process group of its own, so that what a library starts can be ended with it.
pid_t StartChild(const Component& component, int (&pipeEnds)[2]) {
  if (pipe2(pipeEnds, O_CLOEXEC) != 0) Fail("pipe");
  fflush(nullptr);
  pid_t parent = getpid();
  pid_t child = fork();
  if (child < 0) Fail("fork");
  if (child > 0) {
    setpgid(child, child);  // here too: whoever comes first
    close(pipeEnds[1]);
    return child;
  }
  setpgid(0, 0);
  prctl(PR_SET_PDEATHSIG, SIGKILL);  // what is typed at the terminal no longer reaches it
  if (getppid() != parent) _exit(1);
  close(pipeEnds[0]);
  // What the library prints while it is loaded is not ours.
  int null = open("/dev/null", O_RDWR | O_CLOEXEC);
  dup2(null, 1);
  dup2(null, 2);
  _exit(CheckInside(component, pipeEnds[1]));
}

// What became of the child, where that is worth a word.
std::string FateOf(int status, bool inTime, bool ended) {
  if (!inTime) return "the library did not load within 10 s; its process was killed";
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
  // To the library the null identifier stands for all components: their problems would be told as
  // this one's.
  if (!HasIdentifier(component)) {
    finding.notes.push_back("it has no identifier of its own, so it cannot be checked alone");
    return finding;
  }
  int pipeEnds[2];
  pid_t child = StartChild(component, pipeEnds);
  std::string text;
  bool inTime = ReadUntilEnd(pipeEnds[0], &text);
  close(pipeEnds[0]);
  bool ended = HasEnded(text);
  if (!inTime) kill(child, SIGKILL);
  int status = 0;
  while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  kill(-child, SIGKILL);  // what the library has started and left behind
  Sort(text, &finding);
  std::string fate = FateOf(status, inTime, ended);
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

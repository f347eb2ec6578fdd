// trace: where the log goes, and what is in it, or comes to it.
#include <stdint.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <sstream>
#include <utility>

#include "source/Common/Posix/vltlinuxos.h"
#include "tools/vltctl/ChangeWatch.h"
#include "tools/vltctl/Logs.h"
#include "tools/vltctl/Reading.h"
#include "zt/fnd/String.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using Woken = ChangeWatch::Woken;
using zt::posix::ScopedFd;

constexpr size_t kLastLines = 10;
constexpr size_t kTailSize = 256 * 1024;  // a line of the log has at most 2,047 bytes
constexpr std::chrono::milliseconds kBetweenLooks{250};

std::string Narrow(const zt::fnd::String& text) { return zt::fnd::AnsiString(text).c_str(); }

Row Option(const Document& document, const char* key, const char* fallback) {
  for (const char* section : {"vlt", "AllComponents"}) {
    uint32_t value;
    if (IniGetUInt(document.handle(), section, key, &value) == 1) {
      return {key, std::to_string(value), std::string("[") + section + "]"};
    }
  }
  return {key, fallback, "built-in default"};
}

pid_t ProcessOf(const Arguments& arguments) {
  unsigned pid = arguments.number("PID", 0);
  if (!arguments.has("PID") || (pid > 0 && pid <= INT32_MAX)) return static_cast<pid_t>(pid);
  throw vltctl::Failure(vltctl::kUsage,
                        {"bad-process", "", "no process has the id " + arguments.text("PID"), "",
                         "\"vltctl locks\" shows processes with locks"});
}

vltctl::Problem NoLog(const std::string& directory, pid_t process, bool hasEnded) {
  const std::string id = std::to_string(process);
  vltctl::Problem problem = {"no-log", directory, "there is no log of process " + id, "", ""};
  if (hasEnded) {
    problem.why = "no process with this id runs";
    problem.next = "\"vltctl trace\" shows the newest log";
  } else {
    problem.why = "it has traced nothing yet, or runs as another user, whose logs are elsewhere";
    problem.next = "\"vltctl trace -f " + id + "\" waits for its first line";
  }
  return problem;
}

// ---- Reading

// A log that grows, is cut or is replaced while it is read.
class GrowingLog {
 public:
  explicit GrowingLog(const std::string& file) : m_file(file) { open(); }

  // The last lines at the moment of opening, and then what was added. A line that is not whole yet is
  // kept back. `changed`: what happened to the file; empty for nothing.
  std::string take(std::string* changed);
  // What was kept back.
  std::string rest() { return std::exchange(m_rest, ""); }

 private:
  void open();
  std::string added();
  bool wasCut() const;
  enum class Name { Same, Gone, Other };
  Name name() const;

  const std::string m_file;
  ScopedFd m_fd;
  off_t m_at = 0;
  std::string m_rest;
  bool m_isNew = true, m_isGone = false;
};

void GrowingLog::open() {
  std::string ignored;
  m_fd = OpenRegular(m_file, &ignored);
  m_at = 0;
  m_rest.clear();
}

bool GrowingLog::wasCut() const {
  struct stat info;
  return m_fd && fstat(m_fd.get(), &info) == 0 && info.st_size < m_at;
}

GrowingLog::Name GrowingLog::name() const {
  struct stat mine, named;
  if (lstat(m_file.c_str(), &named) != 0) return Name::Gone;
  bool isSame = m_fd && fstat(m_fd.get(), &mine) == 0 && mine.st_dev == named.st_dev &&
                mine.st_ino == named.st_ino;
  return isSame ? Name::Same : Name::Other;
}

// Of what was there before only the end is read, however large the log has grown.
std::string GrowingLog::added() {
  struct stat info;
  if (!m_fd || fstat(m_fd.get(), &info) != 0) return "";
  if (m_isNew && info.st_size > static_cast<off_t>(kTailSize)) {
    m_at = info.st_size - static_cast<off_t>(kTailSize);
  }
  std::string text = std::exchange(m_rest, ""), block(kTailSize, '\0');
  ssize_t got = 0;
  do {
    got = pread(m_fd.get(), block.data(), block.size(), m_at);
    if (got <= 0) break;
    text.append(block, 0, static_cast<size_t>(got));
    m_at += got;
  } while (!m_isNew);
  size_t end = text.rfind('\n');
  size_t whole = end == std::string::npos ? 0 : end + 1;
  if (text.size() - whole < kTailSize) {
    m_rest = text.substr(whole);
    text.resize(whole);
  }
  if (!std::exchange(m_isNew, false)) return text;
  // The line that the tail begins in is not whole, and is not among the last ones.
  return std::string(LastLines(text, kLastLines));
}

std::string GrowingLog::take(std::string* changed) {
  changed->clear();
  if (wasCut()) {
    *changed = "was cut, and is read from its beginning";
    m_at = 0;
    m_rest.clear();
  }
  std::string text = added();
  Name now = name();
  if (now == Name::Gone && !std::exchange(m_isGone, true)) {
    *changed = "was removed or renamed; its process goes on writing to it";
  } else if (now == Name::Other) {
    *changed = "is another file now, which is read from its beginning";
    text += rest();
    open();
    text += added();
  }
  m_isGone = now == Name::Gone;
  return text;
}

// ---- Following

void Show(const std::string& file, const std::string& text, Output& output) {
  for (size_t at = 0; at < text.size();) {
    size_t end = std::min(text.find('\n', at), text.size());
    std::string line = text.substr(at, end - at);
    output.item({{"name", "line"}, {"value", line}, {"origin", file}});
    output.line(line);
    at = end + 1;
  }
  output.flush();
}

// Waits for a log; empty if a signal came first.
std::string AwaitLog(const std::string& directory, pid_t process, ChangeWatch* watch,
                     Output& output) {
  for (bool isFirst = true;; isFirst = false) {
    watch->addWithWay(directory);
    bool hasEnded = process != 0 && HasEnded(process);  // before the look: it may write at its end
    std::string name = NewestLog(directory, process);
    if (!name.empty()) return name;
    if (hasEnded) throw vltctl::Failure(vltctl::kNotFound, NoLog(directory, process, hasEnded));
    if (isFirst) {
      output.note(directory + ": there is no log yet; a process makes it with its first line");
    }
    if (watch->wait(kBetweenLooks) == Woken::Signalled) return "";
  }
}

int Follow(const Arguments& arguments, Output& output) {
  const std::string directory = Narrow(vlLogDirectory());
  ChangeWatch watch;
  const std::string name = AwaitLog(directory, ProcessOf(arguments), &watch, output);
  if (name.empty()) return vltctl::kGood;
  const std::string file = directory + name;
  const pid_t process = ProcessOfLog(name);
  GrowingLog log(file);
  output.note("following " + file);
  for (;;) {
    bool hasEnded = HasEnded(process);  // before the last lines are read
    std::string changed, text = log.take(&changed);
    Show(file, text, output);
    if (!changed.empty()) output.note(file + " " + changed);
    if (hasEnded) {
      Show(file, log.rest(), output);
      output.note("process " + std::to_string(process) + " has ended");
      return vltctl::kGood;
    }
    if (watch.wait(kBetweenLooks) == Woken::Signalled) return vltctl::kGood;
  }
}

}  // namespace

int Trace(const Arguments& arguments, Output& output) {
  if (arguments.has("--follow")) return Follow(arguments, output);
  std::string directory = Narrow(vlLogDirectory()), options = Narrow(vlDiagnosticsIni());
  Document document(ReadGuarded(options).bytes);
  std::vector<Row> rows = {{"directory", directory, ""},
                           {"options", options, fs::exists(options) ? "" : "missing"},
                           Option(document, "Severity", "1"),
                           Option(document, "Target", "1"),
                           Option(document, "LowDiskThreshold", "0")};
  const pid_t process = ProcessOf(arguments);
  const bool hasEnded = process != 0 && HasEnded(process);  // first, as in AwaitLog
  std::string newest = NewestLog(directory, process);
  if (!newest.empty()) rows.push_back({"newest log", directory + newest, ""});
  Print(rows, output);
  if (newest.empty() && process != 0) {
    output.problem(NoLog(directory, process, hasEnded));
    return vltctl::kNotFound;
  }
  if (newest.empty() || output.json()) return vltctl::kGood;
  std::string changed;
  GrowingLog log(directory + newest);
  std::istringstream lines(log.take(&changed) + log.rest());
  for (std::string line; std::getline(lines, line);) output.line("| " + line);
  return vltctl::kGood;
}

}  // namespace admin

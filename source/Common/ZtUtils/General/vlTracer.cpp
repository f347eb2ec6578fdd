// What a line needs at any time - mask, targets, threshold - is atomic and read without a lock. The
// file and its state are guarded by a named mutex, made at the start, which keeps the lines of this
// process's threads, and of those that it forks, from running into each other. The pointer to that
// mutex says that the log is started; it is set last and cleared first, and what it points to is
// never freed, since a thread may have read it just before.
//
// Tracing reports nothing and must not fail its caller: what cannot be written is dropped, and a
// lock that is not available is done without.
#include "source/Common/ZtUtils/General/vlTracer.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <exception>
#include <new>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "source/Common/ZtUtils/General/ztSync.h"
#include "zt/fnd/osdep/DateTime.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/LeakedInstance.h"
#include "zt/fnd/osdep/SharedUnixObject.h"
#include "zt/fnd/osdep/ThreadID.h"
#include "zt/posix/Files.h"

using zt::fnd::AnsiString;
using zt::fnd::String;
using namespace zt::fnd::osdep;
using zt::posix::ScopedFd;

constinit std::atomic<uint32_t> vlTracer::gs_traceMask{0};

namespace {

constexpr size_t kLongestLine = 2047;
constexpr mode_t kLogMode = 0666;  // less the process's mask
constexpr unsigned long kArgumentTextSize = 1024;
constexpr int kCleanupTries = 100;  // a second in all
constexpr useconds_t kCleanupPauseMicroseconds = 10000;
constexpr const char* kDiskShort =
    "** Available disk space is below the desired threshold. Aborting tracing. **";

constinit std::atomic<uint32_t> gs_traceTarget{vlTracer::kTargetError};
constinit std::atomic<long> gs_traceLowDiskThreshold{0};
constinit std::atomic<void (*)()> gs_traceInitCallback{nullptr};
// Serialises the output; its presence says that the log is started. Never freed: a thread may be
// inside while another one cleans up.
constinit std::atomic<Toolyard::CztMutex*> gs_traceSync{nullptr};

// What the lock above guards. Never freed, as exit handlers trace too.
struct LogFile {
  std::string directory, name;
  int fd = -1;
  FileIdentity
      identity;  // of the file that the descriptor is for; the host may close and use again
  bool diskShort = false;
};

LogFile& Log() { return LeakedInstance<LogFile>(); }

struct Start {
  ForkSafeMutex lock{AtFork::Wait, 60};
  // Output locks are never destroyed, since threads may be inside one while the log is closed. Held
  // here, they do not count as lost.
  std::vector<Toolyard::CztMutex*> outputLocks GUARDED_BY(lock);
};

Start& TheStart() { return LeakedInstance<Start>(); }

// The lock, if it is available: a line that may come between another's is better than none.
class OutputLock {
 public:
  explicit OutputLock(Toolyard::CztMutex& mutex) : m_mutex(mutex), m_held(Take(mutex)) {}
  ~OutputLock() {
    if (m_held) m_mutex.Unlock();
  }
  OutputLock(const OutputLock&) = delete;
  OutputLock& operator=(const OutputLock&) = delete;

 private:
  static bool Take(Toolyard::CztMutex& mutex) {
    try {
      return mutex.Lock(-1);
    } catch (const std::exception&) {
      return false;  // A lock file that is not available must not silence the log.
    }
  }

  Toolyard::CztMutex& m_mutex;
  bool m_held;
};

bool DiskIsShort(const LogFile& log) {
  long threshold = gs_traceLowDiskThreshold;
  // Asked for each line: a disk that fills up is to keep what others need of it. A file system that
  // cannot be asked counts as short.
  return threshold != 0 && CalcFreeSpace(log.directory.c_str()) < threshold;
}

void OpenLog(LogFile& log) {
  if (log.diskShort) return;
  if (DiskIsShort(log)) {
    log.diskShort = true;
    return;
  }
  // Others may write to the directory: a link or a pipe under the log's name, or a file with a
  // second name, is not what was meant.
  ScopedFd file = zt::posix::OpenOrCreate(log.name.c_str(), O_WRONLY | O_APPEND, kLogMode,
                                          zt::posix::LastLink::Refused);
  struct stat info;
  if (!file || fstat(file.get(), &info) != 0 || info.st_nlink > 1) return;
  log.identity.device = info.st_dev;
  log.identity.inode = info.st_ino;
  log.fd = file.release();
}

// Closes what is still the log, and never what the host has opened under its number.
void CloseLog(LogFile& log) {
  ScopedFd closes(log.fd >= 0 && log.identity.isBehind(log.fd) ? log.fd : -1);
  log.fd = -1;
}

// Writes the line with its end. Allocates nothing: lines are about memory, too.
void AppendLine(int fd, const char* line) {
  char text[kLongestLine + 2];
  snprintf(text, sizeof text, "%.*s\n", static_cast<int>(kLongestLine), line);
  zt::posix::WriteAll(fd, text, strlen(text));
}

// Writes the line to the file; on a disk that has become short, the message in the line's place,
// for all targets, and that is the file's last one.
const char* WriteToLog(LogFile& log, const char* line) {
  // The host has closed it, as daemons do; the number is not this log's any more.
  if (log.fd >= 0 && !log.identity.isBehind(log.fd)) log.fd = -1;
  if (log.fd < 0) OpenLog(log);
  if (log.fd < 0) return line;
  if (DiskIsShort(log)) {
    line = kDiskShort;
    log.diskShort = true;
  }
  AppendLine(log.fd, line);
  if (log.diskShort) CloseLog(log);
  return line;
}

void WriteLine(const char* line) {
  uint32_t target = gs_traceTarget;
  if (target & vlTracer::kTargetFile) line = WriteToLog(Log(), line);
  if (target & vlTracer::kTargetError) fprintf(stderr, "%s\n", line);
  if (target & vlTracer::kTargetOutput) puts(line);
}

std::string LocalTime(const wchar_t* date, const wchar_t* time, unsigned fractionDigits) {
  return AnsiString(AbsTimeToString(CurrentSystemTime(), date, time, fractionDigits, kTimeLocal))
      .c_str();
}

std::string NewLogName() {
  char suffix[64];
  snprintf(suffix, sizeof suffix, "-vlTracer-%08lX.log", static_cast<unsigned long>(getpid()));
  return LocalTime(L"%Y%m%d_%H%M%S", L"", 0) + suffix;
}

void PlaceLog(LogFile& log, const wchar_t* directory, const std::string& name) {
  log.directory = AnsiString(String(directory)).c_str();
  if (!log.directory.ends_with('/') && !log.directory.ends_with('\\')) log.directory += '/';
  log.name = log.directory + name;
}

char* CopyText(const std::string& text, char* buffer, unsigned long sizeBytes) {
  if (sizeBytes > 0) snprintf(buffer, sizeBytes, "%s", text.c_str());
  return buffer;
}

// The second line of a call with detail.
std::string DetailLine() {
  std::string thread = AnsiString(ThreadID::getCallingID().getDisplayStringHex()).c_str();
  return "  Thread = 0x" + thread + ", Time = " + LocalTime(L"%Y%m%d", L"%H%M%S", 3);
}

}  // namespace

int64_t CalcFreeSpace(const char* path) {
  struct statvfs info;
  if (statvfs(path, &info) != 0) return -1;
  return static_cast<int64_t>(info.f_bfree) * static_cast<int64_t>(info.f_frsize);
}

void vlTracer::Initialize(SeverityLevel mask, TraceTarget target, const wchar_t* directory,
                          long threshold) {
  Start& start = TheStart();
  Hold hold(start.lock);
  gs_traceMask = mask;
  gs_traceTarget = target;
  gs_traceLowDiskThreshold = threshold;
  // A second start changes the settings only: lines of one process stay in one file.
  if (gs_traceSync) return;
  LogFile& log = Log();  // also for a later start with a file, which may find no memory
  std::string name = NewLogName();
  auto* sync = new Toolyard::CztMutex(String(name.c_str()).c_str(), false);
  if ((target & kTargetFile) && log.name.empty() && directory) PlaceLog(log, directory, name);
  start.outputLocks.push_back(sync);
  gs_traceSync = sync;  // Last: whoever sees it sees the rest.
}

void vlTracer::Initialize(void (*callback)()) { gs_traceInitCallback = callback; }

void vlTracer::Cleanup() {
  Toolyard::CztMutex* sync = gs_traceSync.exchange(nullptr);
  if (!sync) return;
  // A thread may be in a write that does not end, to a full pipe. It must not keep the process from
  // ending; what is written is in the file already.
  for (int tries = 0; !sync->TryLock(); ++tries) {
    if (tries == kCleanupTries) return;
    usleep(kCleanupPauseMicroseconds);
  }
  CloseLog(Log());
  sync->Unlock();
}

unsigned vlt_vlTracer::GetTraceMask() {
  // Asked again under the lock: of two threads that come first one runs the callback.
  if (!gs_traceSync && gs_traceInitCallback) {
    Hold hold(TheStart().lock);
    if (!gs_traceSync) gs_traceInitCallback.load()();
  }
  return vlTracer::gs_traceMask;
}

void vlt_vlTracer::TraceOutput(char marker, const char* text, bool detail) {
  Toolyard::CztMutex* sync = gs_traceSync;
  if (!sync) return;
  // The time before the lock: what the system's own locks hold up must not hold up the log.
  const std::string detailLine = detail ? DetailLine() : std::string();
  OutputLock lock(*sync);
  if (gs_traceSync != sync) return;  // The log was closed while this line waited.
  char line[kLongestLine + 1];
  snprintf(line, sizeof line, "%c %s", marker, text ? text : "");
  WriteLine(line);
  if (detail) WriteLine(detailLine.c_str());
}

void vlt_vlTracer::TraceArgsHelper() {
  // The objects of this call are trace objects: the exported class only lends its name.
  auto* object = reinterpret_cast<vlTracer*>(this);
  char text[kArgumentTextSize];
  TraceOutput(object->marker(), object->GetStringContentsA(text, sizeof text), true);
}

char* vlTracer0::GetStringContentsA(char* buffer, unsigned long sizeBytes) {
  return CopyText(std::string("Func: ") + m_functionName, buffer, sizeBytes);
}

char* vlTracerX::GetStringContentsA(char* buffer, unsigned long sizeBytes) {
  std::ostringstream out;
  out << "Func: " << m_functionName << " Args: ";
  for (unsigned long i = 0; i < m_argCount; ++i) m_args[i].print(out, m_args[i]);
  return CopyText(out.str(), buffer, sizeBytes);
}

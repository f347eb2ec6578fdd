// What a line needs at any time - mask, targets, threshold - is atomic and read without a lock. The
// file and its state are guarded by a mutex of the process, which keeps its threads' lines apart.
//
// The children that the process forks write to the same places. In the file, each call is one write
// to a descriptor for appending, which the system does in one piece, so that the usual log needs no
// more. Standard streams have a write for each line, and a disk that may become short is asked
// before each: there a named mutex, made at the start, keeps the processes apart. The pointer to it
// says that the log is started; it is set last and cleared first, and what it points to is never
// freed, since a thread may have read it just before.
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
// Serialises the output of this process and its children, where that takes several calls; its
// presence says that the log is started. Never freed: a thread may be inside while another one
// cleans up.
constinit std::atomic<Toolyard::CztMutex*> gs_traceSync{nullptr};

// Guarded by the output lock of the process. Never freed, as exit handlers trace too.
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
  // Output of this process. A fork does not wait for it, as a write may not end; the file's number
  // is set last, so that a child can go on from any moment of an opening.
  ForkSafeMutex output{AtFork::Renew, 62};
  // Output locks are never destroyed, since threads may be inside one while the log is closed. Held
  // here, they do not count as lost.
  std::vector<Toolyard::CztMutex*> outputLocks GUARDED_BY(lock);
};

Start& TheStart() { return LeakedInstance<Start>(); }

// The lock between processes, where it is needed and available: a line that may come between
// another's is better than none.
class ProcessesLock {
 public:
  ProcessesLock(Toolyard::CztMutex& mutex, bool needed)
      : m_mutex(mutex), m_held(needed && Take(mutex)) {}
  ~ProcessesLock() {
    if (m_held) m_mutex.Unlock();
  }
  ProcessesLock(const ProcessesLock&) = delete;
  ProcessesLock& operator=(const ProcessesLock&) = delete;

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

// Writes the lines with their ends, in one call; the second may be null. Allocates nothing: lines are
// about memory, too.
void AppendLines(int fd, const char* first, const char* second) {
  constexpr int kMost = static_cast<int>(kLongestLine);
  char text[2 * (kLongestLine + 1) + 1];
  if (second) {
    snprintf(text, sizeof text, "%.*s\n%.*s\n", kMost, first, kMost, second);
  } else {
    snprintf(text, sizeof text, "%.*s\n", kMost, first);
  }
  zt::posix::WriteAll(fd, text, strlen(text));
}

// Opens the file where it is not open. False without one.
bool EnsureOpen(LogFile& log) {
  // The host has closed it, as daemons do; the number is not this log's any more.
  if (log.fd >= 0 && !log.identity.isBehind(log.fd)) log.fd = -1;
  if (log.fd < 0) OpenLog(log);
  return log.fd >= 0;
}

// Writes the line to the file; on a disk that has become short, the message in the line's place,
// for all targets, and that is the file's last one.
const char* WriteToLog(LogFile& log, const char* line) {
  if (!EnsureOpen(log)) return line;
  if (DiskIsShort(log)) {
    line = kDiskShort;
    log.diskShort = true;
  }
  AppendLines(log.fd, line, nullptr);
  if (log.diskShort) CloseLog(log);
  return line;
}

void WriteLine(uint32_t target, const char* line) {
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
  ForkSafeMutex& output = TheStart().output;
  for (int tries = 0; !output.try_lock(); ++tries) {
    if (tries == kCleanupTries) return;
    usleep(kCleanupPauseMicroseconds);
  }
  CloseLog(Log());
  output.unlock();
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
  const char* second = detail ? detailLine.c_str() : nullptr;
  Hold hold(TheStart().output);
  const uint32_t target = gs_traceTarget;
  const bool oneWrite = target == vlTracer::kTargetFile && gs_traceLowDiskThreshold == 0;
  ProcessesLock lock(*sync, !oneWrite);
  if (gs_traceSync != sync) return;  // The log was closed while this line waited.
  char line[kLongestLine + 1];
  snprintf(line, sizeof line, "%c %s", marker, text ? text : "");
  if (oneWrite) {
    if (EnsureOpen(Log())) AppendLines(Log().fd, line, second);
    return;
  }
  WriteLine(target, line);
  if (second) WriteLine(target, second);
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

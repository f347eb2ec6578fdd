// Helpers that work before, or without, the log: the early trace writes to standard output, and the
// place of the log is found without asking where the installation is.
#include "source/Common/Posix/vltlinuxos.h"

#include <fcntl.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <new>

#include "vlloader/source/InstallLayout.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/ThreadID.h"
#include "zt/fnd/osdep/path.h"
#include "zt/posix/Environment.h"
#include "zt/posix/Files.h"
#include "ztini/ztini.h"

using zt::fnd::AnsiString;
using zt::fnd::String;
using zt::fnd::osdep::path;
using zt::fnd::osdep::ThreadID;
using zt::posix::ScopedFd;

void vltEarlyTrace(const char* sourceName, long line, const char* format, ...) {
  // A line that is longer is cut; early tracing must not need the heap.
  char message[2048];
  va_list args;
  va_start(args, format);
  int length = vsnprintf(message, sizeof message, format, args);
  va_end(args);
  if (length < 0) return;
  printf("%s(%ld) : trace %d %ld: %s\n", sourceName, line, static_cast<int>(getpid()),
         static_cast<long>(ThreadID().number()), message);
}

namespace {

constexpr unsigned kFlagsUnread = 0xFFFFFFFF;

unsigned ReadTraceFlags() {
  std::string file = vlLookUpInstallDirectory() + "/vlttrace.txt";
  ScopedFd fd = zt::posix::OpenExisting(file.c_str(), O_RDONLY);
  // The answer is kept, so that a failure that passes must not become it.
  if (!fd && zt::posix::IsPassing(errno)) throw std::bad_alloc();
  char buffer[256];  // outlives the stream
  std::unique_ptr<FILE, int (*)(FILE*)> in(fd.valid() ? fdopen(fd.get(), "r") : nullptr, fclose);
  // fdopen fails for memory only: descriptor and mode are good.
  if (fd.valid() && !in) throw std::bad_alloc();
  // The stream owns the descriptor now, and its fclose is the one close.
  if (in) fd.release();
  if (in) setvbuf(in.get(), buffer, _IOFBF, sizeof buffer);
  unsigned first = 0, second = 0;
  // A short file leaves its zeros.
  if (in && fscanf(in.get(), "%u %u", &first, &second) < 0) return 0;
  return second << 4 | first;
}

}  // namespace

unsigned vltGetTraceFlagsImpl() {
  // Atomic for a race that is harmless otherwise: two threads read the file to the same result.
  static std::atomic<unsigned> flags{kFlagsUnread};
  unsigned known = flags;
  if (known == kFlagsUnread) flags = known = ReadTraceFlags();
  return known;
}

String vlDiagnosticsIni() {
  // The fixed place on purpose: logging starts before anybody has said where the installation is.
  String data = vlt::layout::DirectoryIn(String(kKorDefaultDirectory), vlt::layout::kData);
  return vlt::layout::FileIn(data, vlt::layout::kDiagnostics);
}

String vlLogDirectory() {
  // Not from the environment of a user who runs a program with more rights than the own.
  const char* home = zt::posix::TrustedEnvironment("HOME");
  String root(L"/tmp/zentrex");
  // HOME is not asked for: sudo may leave that of another user, in whose directory no log of root
  // belongs.
  if (geteuid() == 0) {
    root = L"/Library/Logs";
  } else if (home) {
    root = path::Join(String(home), String(L"Library/Logs"));
  }
  String directory = path::Join(root, String(L"KOR"));
  path::MakePathEndInSlash(directory);
  return directory;
}

String vlCreateLogDirIfNeeded(AnsiString& diagnosticsIni) {
  diagnosticsIni = AnsiString(vlDiagnosticsIni());
  String directory = vlLogDirectory();
  try {
    if (!path::IsDirectory(directory.c_str())) path::CreateDir(directory.c_str(), 0777);
  } catch (const zt::fnd::exception::Exception&) {
    // Without the directory the log file cannot be opened either, and that is silent too.
  }
  return directory;
}

namespace {

unsigned ReadOption(IniStructForwardReferenceTag* ini, const char* section, const char* key,
                    unsigned fallback) {
  uint32_t value = 0;
  if (IniGetUInt(ini, section, key, &value) == 1) return value;
  // A malformed value counts as a missing one, so that a slip in one section does not silence the
  // log.
  return IniGetUInt(ini, "AllComponents", key, &value) == 1 ? value : fallback;
}

}  // namespace

unsigned vlReadTracerOptions(IniStructForwardReferenceTag* ini, const char* section,
                             unsigned& severity, unsigned& target, unsigned* threshold) {
  severity = ReadOption(ini, section, "Severity", 1);
  target = ReadOption(ini, section, "Target", 1);
  if (!threshold) return target;
  *threshold = ReadOption(ini, section, "LowDiskThreshold", 0);
  return *threshold;
}

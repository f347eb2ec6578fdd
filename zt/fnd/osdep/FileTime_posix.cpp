#include <sys/stat.h>

#include <cstdint>

#include "zt/fnd/String.h"
#include "zt/fnd/osdep/FileTime.h"
#include "zt/posix/Retry.h"

using zt::posix::RetryEintr;

namespace zt::fnd::osdep {

AbsTime Time_TtoAbsTime(time_t seconds) {
  AbsTime::Value value(static_cast<int64_t>(seconds));
  value += AbsTime::Value(AbsTime::kUnixEpoch);
  return AbsTime(value);
}

AbsTime GetFileLastWriteTime(const String& path) {
  AnsiString narrow(path);
  struct stat info;
  // Not st_mtim: a file system that keeps no fractions, or a copy that drops them, would make an
  // unchanged file look changed.
  if (RetryEintr([&] { return ::stat(narrow.c_str(), &info); }) != 0) return AbsTime::min;
  return Time_TtoAbsTime(info.st_mtime);
}

}  // namespace zt::fnd::osdep

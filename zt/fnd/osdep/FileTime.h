#pragma once

#include <ctime>

#include "zt/fnd/AbsTime.h"
#include "zt/fnd/StringFwd.h"

namespace zt::fnd::osdep {

// A Unix time.
AbsTime Time_TtoAbsTime(time_t seconds);

// When the file was last written to, links followed, in whole seconds: finer parts are dropped,
// because stored stamps are compared with this one. AbsTime::min if the file cannot be asked.
AbsTime GetFileLastWriteTime(const String& path);

}  // namespace zt::fnd::osdep

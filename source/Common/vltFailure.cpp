#include "source/Common/vltFailure.h"

#include <stdarg.h>
#include <stdio.h>

#include <new>

#include "source/Common/ZtUtils/General/vlTracer.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"

void vltTraceError(const char* format, ...) {
  if (!(vlTracer::gs_traceMask & kTraceErrors)) return;
  char message[2048];  // As much as one line of the log takes.
  va_list args;
  va_start(args, format);
  int length = vsnprintf(message, sizeof message, format, args);
  va_end(args);
  if (length >= 0) vlt_vlTracer::TraceOutput(' ', message, false);
}

namespace {

// Whoever wants to know holds the event open; without such a process the signal is for nobody, and
// the event goes again with this object.
void SignalLockdown() {
  try {
    zt::fnd::osdep::NamedEvent lockdown(zt::fnd::String(L"LockdownVLTEvent"), true, true);
    lockdown.set();
  } catch (const std::bad_alloc&) {
    // Where memory is really out the event cannot be made either; the caller's result still tells.
  }
}

}  // namespace

HRESULT vltReportOutOfMemory(const char* signature) {
  SignalLockdown();
  vltTraceError("Memory allocation failure in %s", signature);
  return E_OUTOFMEMORY;
}

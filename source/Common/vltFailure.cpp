#include "source/Common/vltFailure.h"

#include <cstdarg>
#include <cstdio>
#include <exception>
#include <memory>

#include "source/Common/ZtUtils/General/vlTracer.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"

void vltTraceError(const char* format, ...) {
  // Before the formatting, which most processes never need.
  if (!(vlt_vlTracer::GetTraceMask() & kTraceErrors)) return;
  char message[2048];  // As much as one line of the log takes.
  va_list args;
  va_start(args, format);
  int length = vsnprintf(message, sizeof message, format, args);
  va_end(args);
  if (length >= 0) vlt_vlTracer::TraceOutput(' ', message, false);
}

namespace {

using zt::fnd::osdep::NamedEvent;

std::unique_ptr<NamedEvent> OpenLockdown() {
  try {
    return std::make_unique<NamedEvent>(zt::fnd::String(L"LockdownVLTEvent"), true, true);
  } catch (const std::exception&) {
    // None is available where memory or semaphores are really out, or where the place of the
    // events is closed. The caller's result reports what has failed; this must not take its place.
    return nullptr;
  }
}

// Whoever wants to know holds the event open; without such a process the signal has no receiver,
// and the event goes again with this object.
void SignalLockdown() {
  if (std::unique_ptr<NamedEvent> lockdown = OpenLockdown()) lockdown->set();
}

}  // namespace

HRESULT vltReportOutOfMemory(const char* signature) {
  SignalLockdown();
  vltTraceError("Memory allocation failure in %s", signature);
  return E_OUTOFMEMORY;
}

#pragma once

// The one way in which the library reports a failure beside its result code.

#include "source/Common/vltTypes.h"

// Bit of the trace mask under which error messages go out.
inline constexpr unsigned kTraceErrors = 2;

// Passes the message to the log if the trace mask has kTraceErrors. `format` is that of printf.
// Never fails: a message that cannot be formed is lost.
void vltTraceError(const char* format, ...) __attribute__((format(printf, 1, 2)));

// Reports to other processes and the log that memory ran out in the function with this signature:
// signals the named event "LockdownVLTEvent" and traces a line. Returns E_OUTOFMEMORY, so that
// callers can end with it. May wait for other processes that open or close the event, up to half a
// second. Where no event is available there is no report; throws what NamedEvent::set throws.
HRESULT vltReportOutOfMemory(const char* signature);

#include "ztcom/ztcore/zttrace.h"

#include <cstdarg>
#include <cstdio>
#include <cstdlib>

#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/LeakedInstance.h"

using zt::fnd::osdep::AtFork;
using zt::fnd::osdep::ForkSafeMutex;
using zt::fnd::osdep::Hold;
using zt::fnd::osdep::LeakedInstance;

IZTDebugOutputStream* g_pZTDebugOutputStream = nullptr;

namespace {

// Recursive, so that a nested call of the same thread reaches the test below instead of waiting for
// itself.
struct Trace {
  ForkSafeMutex lock{AtFork::Wait, 65};
  bool inProgress GUARDED_BY(lock) = false;
};

class InTrace {
 public:
  explicit InTrace(Trace& trace) : m_trace(trace) { m_trace.inProgress = true; }
  ~InTrace() { m_trace.inProgress = false; }
  InTrace(const InTrace&) = delete;
  InTrace& operator=(const InTrace&) = delete;

 private:
  Trace& m_trace;
};

}  // namespace

void ZTTrace(const char* format, ...) {
  Trace& trace = LeakedInstance<Trace>();
  Hold hold(trace.lock);
  // Of a thread that is not in this child.
  if (trace.lock.takeInterrupted()) trace.inProgress = false;
  if (trace.inProgress) abort();  // a nested call of this thread
  InTrace inTrace(trace);
  // After the test for nested calls, so that one aborts with a sink or without.
  if (!g_pZTDebugOutputStream) return;
  char text[1024];
  va_list args;
  va_start(args, format);
  int length = vsnprintf(text, sizeof text, format, args);
  va_end(args);
  if (length >= 0) g_pZTDebugOutputStream->Write(text);
}

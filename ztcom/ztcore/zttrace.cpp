#include "ztcom/ztcore/zttrace.h"

#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>

#include "ztcom/ztcore/ztlock.h"

IZTDebugOutputStream* g_pZTDebugOutputStream = nullptr;

namespace {

bool g_InZTTrace = false;

CZTMutex& TraceMutex() {
  // Never destroyed: exit handlers of other libraries may still trace.
  static CZTMutex* g_pZTTraceMutex = new CZTMutex;
  return *g_pZTTraceMutex;
}

struct InTrace {
  InTrace() { g_InZTTrace = true; }
  ~InTrace() { g_InZTTrace = false; }
};

}  // namespace

void ZTTrace(const char* format, ...) {
  CZTMutex& mutex = TraceMutex();
  // Before the lock, which a nested call of the same thread would never get.
  if (mutex.IsNesting()) abort();
  CZTMutexHold hold(mutex);
  if (g_InZTTrace) abort();
  InTrace inTrace;
  if (!g_pZTDebugOutputStream) return;
  char text[1024];
  va_list args;
  va_start(args, format);
  int length = vsnprintf(text, sizeof text, format, args);
  va_end(args);
  if (length >= 0) g_pZTDebugOutputStream->Write(text);
}

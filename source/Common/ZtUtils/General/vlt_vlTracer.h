#pragma once

// The exported side of the log, by which components outside write into the same file as the library
// (docs/log-format.md). No object of this class is ever made: its members are exported by their
// mangled names, and trace objects of the components are passed as `this` of the last one.
//
// Nothing here reports a failure: before the log is started, and after it is closed, lines are
// dropped, and so is what cannot be written. Threads: any; the lines of one call stay together. The
// log is started when the library is loaded, as "vldiag.ini" asks.
class __attribute__((visibility("default"))) vlt_vlTracer {
 public:
  // Writes "marker text", cut to 2047 bytes, to the log's targets: a file, standard output,
  // standard error. With `detail` a second line has the thread and the local time. A null text is
  // empty. The mask is not consulted: callers test it first. Waits for other threads that write.
  static void TraceOutput(char marker, const char* text, bool detail);
  // Which lines are wanted: bit value 2 errors, 0x20 load and unload; the other bits belong to the
  // components. 0 until the log is started. Runs a pending callback first, which may start it.
  static unsigned GetTraceMask();
  // Of a trace object of the library's own kind, which no other program can make: a call of a function
  // with its arguments. Writes its text, cut to 1023 bytes,
  // with its marker and with detail.
  void TraceArgsHelper();
};

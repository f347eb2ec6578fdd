#pragma once

// The exported side, by which components outside write into the same log.
class __attribute__((visibility("default"))) vlt_vlTracer {
 public:
  // Writes "marker text", cut to 2047 bytes, and with `detail` a second line with thread and time.
  static void TraceOutput(char marker, const char* text, bool detail);
  // Runs a pending callback first.
  static unsigned GetTraceMask();
  // Of a trace object: writes its text, cut to 1023 bytes, with its marker and with detail.
  void TraceArgsHelper();
};

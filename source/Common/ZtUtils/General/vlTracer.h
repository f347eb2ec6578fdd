#pragma once

// The log. Until it has been started no output goes anywhere.
class vlTracer {
 public:
  static unsigned gs_traceMask;  // set at start-up, before other threads run
};

class __attribute__((visibility("default"))) vlt_vlTracer {
 public:
  static void TraceOutput(char marker, const char* text, bool detail);
  static unsigned GetTraceMask();
};

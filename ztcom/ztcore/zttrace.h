#pragma once

// Sink of debugging output; none is installed by this library.
struct IZTDebugOutputStream {
  virtual void Write(const char* text) = 0;

 protected:
  ~IZTDebugOutputStream() = default;
};

// Set by the host, before its threads trace; null for none. The host keeps the object alive.
extern IZTDebugOutputStream* g_pZTDebugOutputStream;

// Passes the message, cut to 1023 bytes, to the sink, one call at a time. A call from inside the
// sink is a programming error and aborts the process.
void ZTTrace(const char* format, ...) __attribute__((format(printf, 1, 2)));

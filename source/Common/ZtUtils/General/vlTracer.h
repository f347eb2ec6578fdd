#pragma once

#include <atomic>
#include <climits>
#include <cstdint>
#include <ostream>
#include <utility>

#include "source/Common/ZtUtils/General/vlt_vlTracer.h"

// The log of a process.
//
// Code tests a bit of the mask and, if it is set, gives a line to vlt_vlTracer::TraceOutput, which
// sends it to the targets: a log file, standard output, standard error. The file appears with the
// first line that reaches it, so a process that traces nothing leaves none.
//
//   state                      TraceOutput                          Initialize
//   not initialised, cleaned   nothing, not even to standard error  starts
//   started                    writes to the targets                changes mask, targets, limit
//   stopped by a short disk    writes to the other targets          changes mask, targets, limit
//
// Nothing here reports a failure: lines that cannot be written are lost, and the log file is not
// opened again once the disk was short. Threads: any; the lines of one call stay together.

namespace Toolyard {

// An object with a text form. Returns the buffer, with as much of the text as fits and a
// terminator.
class IStringObjectA {
 public:
  virtual char* GetStringContentsA(char* buffer, unsigned long sizeBytes) = 0;

 protected:
  ~IStringObjectA() = default;
};

}  // namespace Toolyard

// A trace object: reports a call of its function. Components outside build them.
class vlTracer : public Toolyard::IStringObjectA {
 public:
  // Bits of the mask that this library tests, and of the targets; "vldiag.ini" has the same
  // numbers.
  enum SeverityLevel : uint32_t { kSeverityErrors = 2, kSeverityLoad = 0x20 };
  enum TraceTarget : uint32_t { kTargetFile = 1, kTargetOutput = 2, kTargetError = 4 };

  vlTracer(char marker, const char* functionName)
      : m_marker(marker), m_functionName(functionName) {}

  // The first character of the object's lines.
  char marker() const { return m_marker; }

  // Starts the log, or changes mask, targets and limit of a started one. The file's name holds the
  // local time of the start and the process id. A null directory leaves it without a place.
  // `threshold`: free bytes below which the file is given up; 0 for no limit.
  static void Initialize(SeverityLevel mask, TraceTarget target, const wchar_t* directory,
                         long threshold);
  // Has the callback start the log when the mask is first asked for.
  static void Initialize(void (*callback)());
  // Closes the file; nothing is written any more. Waits a second at most for a thread that is
  // writing, which then keeps the file.
  static void Cleanup();

  // The threshold for a number of bytes out of the options. What a long cannot hold, on 32 bits, is
  // its largest: a limit in any case.
  static constexpr long Threshold(uint32_t bytes) {
    return std::cmp_greater(bytes, LONG_MAX) ? LONG_MAX : static_cast<long>(bytes);
  }

  // Read without a lock by whoever is about to trace; changed by Initialize only.
  static std::atomic<uint32_t> gs_traceMask;  // 0 until the start

 protected:
  ~vlTracer() = default;

  char m_marker;
  const char* m_functionName;
};

// A call without arguments: "Func: name".
class vlTracer0 final : public vlTracer {
 public:
  using vlTracer::vlTracer;
  char* GetStringContentsA(char* buffer, unsigned long sizeBytes) override;
};

// A call with arguments: "Func: name Args: " and each argument as its printer writes it.
class vlTracerX final : public vlTracer {
 public:
  // The value, by address, and the function that knows its type. Both outlive the object.
  struct Argument {
    const void* value;
    void (*print)(std::ostream& out, const Argument& argument);
  };

  vlTracerX(char marker, const char* functionName, unsigned long argCount, const Argument* args)
      : vlTracer(marker, functionName), m_argCount(argCount), m_args(args) {}
  char* GetStringContentsA(char* buffer, unsigned long sizeBytes) override;

 private:
  unsigned long m_argCount;
  const Argument* m_args;
};

// Free bytes of the file system that holds the path; -1 if it cannot be asked.
int64_t CalcFreeSpace(const char* path);

#pragma once

// Chores with the installation's files: string resources, early trace flags, the log directory.

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "source/Common/vltTypes.h"
#include "zt/fnd/String.h"

struct IniStructForwardReferenceTag;

// Lines of early tracing, before and beside the log: to standard output, under the flags of
// "vlttrace.txt". The low two bits ask for: 0 nothing, 1 errors, 2 and 3 warnings too.
inline constexpr unsigned kEarlyTraceMask = 3;
inline constexpr unsigned kEarlyTraceWarnings = 2;
void vltEarlyTrace(const char* sourceName, long line, const char* format, ...)
    __attribute__((format(printf, 3, 4)));

// Flags of "vlttrace.txt" in the install directory, (second number << 4) | first; 0 without the
// file. Read at the first call.
unsigned vltGetTraceFlagsImpl();

// Answers vltGetStringResource. One database is read per directory and kept until forget(), so that
// many questions cost one reading; the install directory is looked up once in that time as well.
// Threads: one.
class vltStringResources {
 public:
  vltStringResources();
  ~vltStringResources();
  vltStringResources(const vltStringResources&) = delete;
  vltStringResources& operator=(const vltStringResources&) = delete;

  // S_OK with *out a vltTaskMemAlloc text of at most maxLength bytes, terminator included;
  // untouched when all texts found are empty. E_FAIL, and *out untouched, when there is none.
  HRESULT get(const char* separator, const wchar_t* file, const wchar_t* key, char** out,
              unsigned maxLength);

  // The next question reads the file again.
  void forget();

 private:
  class Database;
  // Null, after a word where that is asked for, if there is no install directory.
  Database* databaseFor(const std::string& file);
  bool isKnownMissing(const wchar_t* file, const wchar_t* key) const;

  std::string m_installDirectory;
  bool m_lookedUp = false;
  std::map<std::string, std::unique_ptr<Database>> m_databases;
  Database* m_installed = nullptr;  // of these, that of the install directory
  std::wstring m_missing;           // a key that it does not have; empty if none is known
};

HRESULT vltGetStringResourceImpl(const char* separator, const wchar_t* file, const wchar_t* key,
                                 char** out, unsigned maxLength);

// Where the logs of this user go, ending in a slash: below "/Library/Logs" for the superuser,
// "$HOME/Library/Logs" for others, "/tmp/zentrex" without HOME. And the file with their options.
zt::fnd::String vlLogDirectory();
zt::fnd::String vlDiagnosticsIni();

// vlLogDirectory, made with mode 0777 if it was missing; failures to make it are dropped. Sets the
// path of "vldiag.ini".
zt::fnd::String vlCreateLogDirIfNeeded(zt::fnd::AnsiString& diagnosticsIni);

// Reads "Severity" (default 1), "Target" (1) and, for a non-null threshold, "LowDiskThreshold" (0)
// of the section; what is missing or malformed there comes from "AllComponents". Returns the last
// value.
unsigned vlReadTracerOptions(IniStructForwardReferenceTag* ini, const char* section,
                             unsigned& severity, unsigned& target, unsigned* threshold);

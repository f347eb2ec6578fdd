#pragma once

#include <string>
#include <vector>

#include "source/GuardedIniFile.h"
#include "tools/common/Output.h"
#include "zt/fnd/osdep/Mutex.h"

// The guarded files of an installation: their states in words, and their locks.
namespace admin {

// A state with its names for people and for programs.
struct StateWords {
  const char* code;   // "digest-differs"
  const char* found;  // "the digest differs"
  const char* next;   // what to do about it; empty if nothing is to be done
};
const StateWords& WordsOf(GuardedIniState::Kind kind);

struct OpeningWords {
  const char* code;  // "takes"
  const char* text;  // "takes the file as it is"
};
const OpeningWords& WordsOf(GuardedIniState::Opening opening);

// Why the file or its sidecar cannot be read; empty if nothing is known.
std::string WhyOf(const GuardedIniState& state);

// The state at a moment at which no other process was writing the file.
GuardedIniState Inspect(const std::string& file);

// The files below the install directory that are guarded, whether they are there or not: the database,
// the jar, the settings and other INI files of "Data".
std::vector<std::string> GuardedFiles();

// Throws a Failure that says why the registrar of this installation cannot be had at this moment: its
// database would be set aside or cannot be opened, a directory cannot be used, or another process has
// it, for which a client would wait without limit. A change in the next moment is not foreseen.
void ExpectUsableDatabase();

// The lock of a guarded file.
std::string LockFileOf(const std::string& guardedFile);

// A file of the installation that the command was to write; errno, or 0 where it is not known why.
vltctl::Failure CannotWrite(const std::string& file, int error);

// Says which file cannot be opened, and why: see OpenForWriting.
[[noreturn]] void ThrowCannotOpen(const std::string& file);

// What `open` returns. The library throws an int for a guarded file that it cannot open, or whose lock it
// cannot have; then a failure that names the file is thrown.
template <class Open>
auto OpenForWriting(const std::string& file, Open open) {
  try {
    return open();
  } catch (int) {
    ThrowCannotOpen(file);
  }
}

// Holds that lock. Throws a Failure of kBusy, which names the holder, instead of waiting.
class FileHold {
 public:
  explicit FileHold(const std::string& file);
  ~FileHold() { m_mutex.unlock(); }
  FileHold(const FileHold&) = delete;
  FileHold& operator=(const FileHold&) = delete;

 private:
  zt::fnd::osdep::Mutex m_mutex;
};

// Throws what a FileHold throws: before a call that would wait for the lock.
inline void ExpectFree(const std::string& file) { FileHold hold(file); }

}  // namespace admin

#pragma once

#include <string>
#include <vector>

#include "source/GuardedIniFile.h"

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

// The lock of a guarded file.
std::string LockFileOf(const std::string& guardedFile);

}  // namespace admin

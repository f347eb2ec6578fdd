#pragma once

#include <string>
#include <vector>

#include "source/Snapshot/Rehearsal.h"
#include "zt/fnd/AbsTime.h"

namespace vlt::snapshot {

struct TreeFile {
  std::string here, recorded;  // its paths
  zt::fnd::AbsTime time;
};

// What an installation's directories hold.
struct Tree {
  std::vector<TreeFile> files;  // in the order of a scan
  std::vector<std::string> previousDictionaries;
  std::vector<Problem> problems;
};

// Throws zt::fnd::osdep::PosixError where the system cannot say now whether a file is there.
Tree ReadTree(const Place& place);

// Where the installation was when the database was written, by what it says of the built-in
// dictionary; `fallback` if it says nothing.
std::string RecordedRoot(const std::string& bytes, const std::string& fallback);

}  // namespace vlt::snapshot

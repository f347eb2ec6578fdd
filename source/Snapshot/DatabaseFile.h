#pragma once

#include <string>

#include "source/IniSidecar.h"
#include "source/Snapshot/snapshot.hpp"
#include "ztini/ztini.h"

namespace vlt::snapshot {

// Where the database's bytes come from; a test puts another process's writes in between.
class DatabaseAccess {
 public:
  virtual ~DatabaseAccess() = default;
  // Unknown if it cannot be said.
  virtual IniFileState stateOf(const std::string& file);
  // All bytes. 0 or errno; EFBIG for a file that no save writes.
  virtual int read(const std::string& file, std::string* bytes);
  virtual IniSidecar::State readSidecar(const std::string& sidecar, IniSidecar::Digest* digest);
  virtual void wait(unsigned milliseconds);
};

// The bytes of a database that were a whole file at one moment, and what they are worth.
struct DatabaseBytes {
  Database database;  // all but Unparsable, which only a parser can say
  std::string bytes;  // empty unless they count
};

// Reads the database and its sidecar. Where they do not match, or change meanwhile, a save may be
// under way: they are read again, a few times, for at most kLongestWaitMs. Throws std::bad_alloc.
inline constexpr unsigned kLongestWaitMs = 40;
DatabaseBytes ReadDatabase(const std::string& file, DatabaseAccess& access);

}  // namespace vlt::snapshot

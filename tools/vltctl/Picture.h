#pragma once

#include <map>
#include <set>
#include <string>
#include <vector>

#include "tools/common/Output.h"

// What is registered, set and pending in an installation at one moment, and how two moments differ.
namespace admin {

struct Picture {
  std::map<std::string, vltctl::Json> components;  // registered ones by GUID, as "list" shows them
  std::map<std::string, std::string> settings;     // of kor.ini, by key
  std::string database;                            // its state in a word
  // What the next start does beside removing what has vanished, which is not in `components` any more:
  // "adds object expert Tank {...}", by the GUID of the component or the file.
  std::map<std::string, std::string> pending;
};

// Takes no lock and changes nothing. Throws vltctl::Failure.
Picture TakePicture();

// One difference. `what` is for programs: "added", "removed", "changed", "setting", "database", "pending",
// "no-longer-pending".
struct Change {
  std::string what, text;
  std::string subject;         // GUID, key or path
  vltctl::Json before, after;  // null for what is not there
};
std::vector<Change> Differences(const Picture& before, const Picture& after);

}  // namespace admin

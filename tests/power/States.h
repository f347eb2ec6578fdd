#pragma once

#include <map>
#include <string>
#include <vector>

#include "tests/power/Recording.h"

namespace vlt::test::power {

// What a file system promises about names that were not synced. In both, the bytes of a file that was
// not synced since they were written are there, or not, or zeros in their place, or cut at a sector;
// bytes that were overwritten in place are the old or the new ones.
enum class Model {
  OrderedMetadata,  // names change in the order of the calls
  StrictPosix  // any of the changes may be missing; fsync of a directory settles those before it
};

// What a disk may hold after a power cut.
struct State {
  Directories directories;
  std::map<int, std::string> bytes;
  size_t steps;      // that were done when the power went
  std::string text;  // for messages

  // As a key: the same for states that no process can tell apart.
  std::string contents(const Recording& recording) const;
  // Makes the directory, which is emptied, what the state says.
  void make(const Recording& recording, const std::string& root) const;
};

// The legal states after each step. Where there are too many, some of them, the same ones each time;
// `most` of them in all, 0 for no limit.
std::vector<State> StatesOf(const Recording& recording, Model model, size_t most);

}  // namespace vlt::test::power

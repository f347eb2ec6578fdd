#pragma once

// What processes do to a directory, as a power cut would see it: the changes of names, the changes of
// bytes, and the moments at which either reached the disk for certain.

#include <sys/stat.h>

#include <functional>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "tests/e2e/Promises.h"
#include "tests/support/TracedChild.h"

namespace vlt::test::power {

// Files and directories are numbered: a file keeps its number through renames and links.
using Names = std::map<std::string, int>;
using Directories = std::map<int, Names>;

struct Node {
  bool isDirectory;
  std::string bytes;  // at first
  mode_t mode;
  timespec changed;
};

struct Step {
  enum class Kind { Names, Bytes, Sync, SyncAll } kind;
  // Of one call, so all or none of them: directory, name, and what it names from here on, -1 for nothing.
  struct Change {
    int directory;
    std::string name;
    int node;
  };
  std::vector<Change> names;
  int node = -1;      // Bytes, Sync
  std::string bytes;  // Bytes: of the whole file
  std::string call;   // for messages
};

constexpr int kRoot = 0;

struct Recording {
  std::vector<Node> nodes;
  Directories before;
  std::vector<Step> steps;
  // What had been promised when this many steps were done.
  std::vector<std::pair<size_t, Promises>> promises;

  const Promises& promisedAt(size_t steps) const;
};

// Records what processes do to the directory, one after the other. What it holds at first counts as being
// on the disk.
class Recorder {
 public:
  Recorder(const std::string& root, const Promises& promises);
  ~Recorder();
  Recorder(const Recorder&) = delete;
  Recorder& operator=(const Recorder&) = delete;

  // Runs the function in a process of its own; its exit code. `before` may make calls fail.
  int run(const std::function<int(PromisedClient&)>& body, const TracedChild::Before& before = {});

  const Recording& recording() const { return m_recording; }

 private:
  int nodeOf(const std::string& path, const struct stat& info);
  void look(const std::string& path, int directory, Directories* found,
            std::map<int, std::string>* bytes);
  void lookAgain(const std::string& call);
  void after(const SystemCall& call, const Promises& promises);
  void synced(const SystemCall& call);

  std::string m_root;
  Recording m_recording;
  Directories m_now;
  std::map<int, std::string> m_bytes;
  std::map<ino_t, int> m_numbers;
  // Open on every file that was ever seen, so that none is given the number of one that is gone.
  std::vector<int> m_held;
  Promises m_first;
};

}  // namespace vlt::test::power

#pragma once

#include <sys/stat.h>

#include <ctime>
#include <string>
#include <vector>

namespace vlt::test {

// A directory with all that is below it, in memory: directories, files, symbolic links, hard links
// among them, modes and times. What else there is - pipes, sockets - is left out.
class DirectoryImage {
 public:
  explicit DirectoryImage(const std::string& directory);

  // Makes the directory what it was; what else it holds is removed.
  void restore() const;

 private:
  struct Entry {
    std::string path;   // below the directory
    std::string bytes;  // of a file, or the target of a link
    int linkTo;         // index of an earlier entry that is the same file, or -1
    mode_t mode;        // with the type
    timespec changed;
  };

  std::string m_directory;
  std::vector<Entry> m_entries;  // directories before what they hold
};

// Removes what the directory holds.
void EmptyDirectory(const std::string& directory);

}  // namespace vlt::test

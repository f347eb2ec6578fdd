#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tests/support/Child.h"

namespace vlt::test::power {

// What a disk was asked to do, in order.
struct BlockStep {
  enum class Kind : uint32_t {
    Write,
    Flush,  // all writes before it are on the disk
    Mark    // of a client; its number is in `offset`
  } kind;
  uint64_t offset;
  std::string bytes;
};

// A disk in memory that keeps a record of all writes and flushes: a file of a file system of its own, in
// user space, for a loop device. The file "mark" beside it takes the numbers of marks as text.
class RecordedDisk {
 public:
  // Serves the disk below the directory, from another process, until the object goes. Throws
  // std::runtime_error if it does not come up.
  RecordedDisk(const std::string& directory, uint64_t sizeBytes, const std::string& logFile);
  ~RecordedDisk();
  RecordedDisk(const RecordedDisk&) = delete;
  RecordedDisk& operator=(const RecordedDisk&) = delete;

  std::string disk() const { return m_directory + "/disk"; }
  std::string mark() const { return m_directory + "/mark"; }

 private:
  std::string m_directory;
  Child m_server;
};

std::vector<BlockStep> ReadBlockLog(const std::string& file);

}  // namespace vlt::test::power

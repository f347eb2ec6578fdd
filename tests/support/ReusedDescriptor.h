#pragma once

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <system_error>

#include "tests/support/MutexPlace.h"
#include "tests/support/TempDir.h"
#include "zt/posix/Files.h"

// The descriptors of this process, which hosts close and use again by their numbers.
namespace vlt::test {

inline bool IsOpen(int fd) { return fcntl(fd, F_GETFD) != -1; }

// The lowest descriptor that is open on the file; -1 if there is none.
inline int DescriptorOf(const std::string& path) {
  int lowest = -1;
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    std::error_code gone;  // The listing's own descriptor, for one.
    if (std::filesystem::read_symlink(entry.path(), gone) != path) continue;
    int number = std::stoi(entry.path().filename());
    if (lowest < 0 || number < lowest) lowest = number;
  }
  return lowest;
}

// A file of the host's, open under the number of a descriptor that it has closed.
class ReusedDescriptor {
 public:
  ReusedDescriptor(const std::string& path, int number) : m_path(path), m_number(number) {
    WriteBytes(path, kBytes);
    zt::posix::ScopedFd fd(::open(path.c_str(), O_RDWR | O_CLOEXEC));
    EXPECT_EQ(number, dup2(fd.get(), number));
  }
  ~ReusedDescriptor() { ::close(m_number); }
  ReusedDescriptor(const ReusedDescriptor&) = delete;
  ReusedDescriptor& operator=(const ReusedDescriptor&) = delete;

  // flock() through the number, and whether others can have it.
  bool lock() const { return zt::posix::Flock(m_number, LOCK_EX | LOCK_NB) == 0; }
  bool free() const { return FileIsFree(m_path); }
  bool isOpen() const { return IsOpen(m_number); }
  bool unchanged() const { return ReadBytes(m_path) == kBytes; }

 private:
  static constexpr const char* kBytes = "the host's own bytes, all of them";
  std::string m_path;
  int m_number;
};

}  // namespace vlt::test

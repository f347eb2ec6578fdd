#include "tests/support/DirectoryImage.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <map>
#include <system_error>

#include "tests/support/TempDir.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

void Check(int result, const std::string& what) {
  if (result != 0) throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

void EmptyDirectory(const std::string& directory) {
  for (const auto& entry : fs::directory_iterator(directory)) fs::remove_all(entry.path());
}

DirectoryImage::DirectoryImage(const std::string& directory) : m_directory(directory) {
  std::map<ino_t, int> seen;
  for (const auto& entry : fs::recursive_directory_iterator(directory)) {
    struct stat info;
    Check(lstat(entry.path().c_str(), &info), entry.path());
    Entry made = {entry.path().string().substr(directory.size()), "", -1, info.st_mode,
                  info.st_mtim};
    if (S_ISREG(info.st_mode)) {
      auto [first, isNew] = seen.insert({info.st_ino, static_cast<int>(m_entries.size())});
      if (isNew) {
        made.bytes = ReadBytes(entry.path());
      } else {
        made.linkTo = first->second;
      }
    } else if (S_ISLNK(info.st_mode)) {
      made.bytes = fs::read_symlink(entry.path());
    } else if (!S_ISDIR(info.st_mode)) {
      continue;
    }
    m_entries.push_back(made);
  }
}

void DirectoryImage::restore() const {
  EmptyDirectory(m_directory);
  for (const Entry& entry : m_entries) {
    std::string path = m_directory + entry.path;
    if (S_ISDIR(entry.mode)) {
      Check(mkdir(path.c_str(), 0700), path);
    } else if (S_ISLNK(entry.mode)) {
      Check(symlink(entry.bytes.c_str(), path.c_str()), path);
      continue;
    } else if (entry.linkTo >= 0) {
      Check(link((m_directory + m_entries[static_cast<size_t>(entry.linkTo)].path).c_str(),
                 path.c_str()),
            path);
      continue;
    } else {
      WriteBytes(path, entry.bytes);
    }
    Check(chmod(path.c_str(), entry.mode & 07777), path);
    timespec times[2] = {entry.changed, entry.changed};
    Check(utimensat(AT_FDCWD, path.c_str(), times, 0), path);
  }
}

}  // namespace vlt::test

// The XDG base directory rules: one directory of the user, then those of the system in the order of
// a list; what is not an absolute path is ignored. The files are plain INI files, read without a
// lock and without a sidecar: they belong to the administrator, and this library never writes them.
#include <cerrno>
#include <cstdlib>
#include <memory>
#include <new>
#include <vector>

#include "vlloader/source/Preference.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/posix/Environment.h"
#include "zt/posix/Files.h"
#include "ztini/ztini.h"

namespace {

std::string Environment(const char* name) {
  const char* value = zt::posix::TrustedEnvironment(name);
  return value ? value : "";
}

void AddIfAbsolute(std::vector<std::string>& directories, const std::string& directory) {
  if (!directory.empty() && directory[0] == '/') directories.push_back(directory);
}

void AddEach(std::vector<std::string>& directories, const std::string& list) {
  size_t start = 0;
  while (start <= list.size()) {
    size_t end = list.find(':', start);
    if (end == std::string::npos) end = list.size();
    AddIfAbsolute(directories, list.substr(start, end - start));
    start = end + 1;
  }
}

std::vector<std::string> ConfigDirectories() {
  std::vector<std::string> directories;
  std::string own = Environment("XDG_CONFIG_HOME");
  // An empty variable counts as one that is not set, by the same rules.
  if (own.empty()) {
    std::string home = Environment("HOME");
    if (!home.empty()) own = home + "/.config";
  }
  AddIfAbsolute(directories, own);
  std::string shared = Environment("XDG_CONFIG_DIRS");
  AddEach(directories, shared.empty() ? "/etc/xdg" : shared);
  return directories;
}

struct Dispose {
  void operator()(IniStructForwardReferenceTag* document) const { IniDispose(document); }
};

// The machine could not read the file at this moment: it may well be there.
void RaiseIfUnknown(int32_t status, int error) {
  bool exhausted = error == ENOMEM || error == EMFILE || error == ENFILE;
  if (status == kIniOutOfMemory || exhausted) throw std::bad_alloc();
  if (zt::posix::IsPassing(error)) ZT_RAISE(zt::fnd::osdep::PosixError(error));
}

std::optional<std::string> ReadItem(const std::string& file, const std::string& key) {
  constexpr int32_t kQuotesOfBothKinds = 2 | 4;
  std::unique_ptr<IniStructForwardReferenceTag, Dispose> document(IniNew(0));
  if (!document) throw std::bad_alloc();
  IniSetReadOptions(document.get(), kQuotesOfBothKinds);
  // The engine reports that a file was not read; why is what the system has left in errno.
  errno = 0;
  int32_t status = IniReadFromFile(document.get(), file.c_str());
  // Not "no value", which would lead a process to another installation for its whole life.
  if (status < 0) RaiseIfUnknown(status, errno);
  // Missing, or not to be read by this user: the next directory may have the item.
  if (status < 0) return std::nullopt;
  const char* value = nullptr;
  if (IniGetPointerToRawString(document.get(), "Preferences", key.c_str(), &value) != 1) {
    return std::nullopt;
  }
  return value;
}

}  // namespace

std::optional<std::string> vlReadPreference(const std::string& domain, const std::string& key,
                                            std::string* where) {
  const std::string file = "/" + domain + ".ini";
  const std::vector<std::string> directories = ConfigDirectories();
  if (where) *where = directories.empty() ? "" : directories.front() + file;
  for (const std::string& directory : directories) {
    auto value = ReadItem(directory + file, key);
    if (!value) continue;
    if (where) *where = directory + file;
    return value;
  }
  return std::nullopt;
}

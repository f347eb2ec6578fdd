#include "tools/vltctl/Reading.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>

#include "source/vlIniMgr.h"
#include "tools/vltctl/Root.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/posix/Files.h"

using zt::posix::ScopedFd;

namespace admin {
namespace {

constexpr int kTornReadsTolerated = 20;

struct Stamp {
  dev_t device = 0;
  ino_t inode = 0;
  off_t size = 0;
  timespec changed = {};
  bool operator==(const Stamp& o) const {
    return device == o.device && inode == o.inode && size == o.size &&
           changed.tv_sec == o.changed.tv_sec && changed.tv_nsec == o.changed.tv_nsec;
  }
};

Stamp StampOf(const std::string& file) {
  struct stat info;
  if (stat(file.c_str(), &info) != 0) return {};
  return {info.st_dev, info.st_ino, info.st_size, info.st_mtim};
}

// Appends at most `limit` bytes. 0, or errno.
int Append(int fd, size_t limit, std::string* bytes) {
  char block[65536];
  while (limit > 0) {
    ssize_t got = read(fd, block, std::min(limit, sizeof block));
    if (got < 0) return errno;
    if (got == 0) return 0;
    bytes->append(block, static_cast<size_t>(got));
    limit -= static_cast<size_t>(got);
  }
  return 0;
}

// 0, or errno. A file beyond the limit is EFBIG, and not read; one that grows beyond it meanwhile is
// read no further.
int ReadAll(const std::string& file, std::string* bytes, std::string* error) {
  ScopedFd fd = OpenRegular(file, error);
  if (!fd.valid()) return errno;
  struct stat info;
  bytes->clear();
  int failed = fstat(fd.get(), &info) != 0 ? errno : 0;
  bool large = failed == 0 && info.st_size > static_cast<off_t>(kFileLimit);
  if (!failed && !large) failed = Append(fd.get(), kFileLimit + 1, bytes);
  if (large || bytes->size() > kFileLimit) {
    bytes->clear();
    *error = kTooLarge;
    return EFBIG;
  }
  if (failed) *error = strerror(failed);
  return failed;
}

}  // namespace

ScopedFd OpenRegular(const std::string& file, std::string* error) {
  ScopedFd fd = zt::posix::OpenExisting(file.c_str(), O_RDONLY);
  int failed = fd ? 0 : errno;
  if (failed) *error = WhyNotOpened(failed);
  errno = failed;
  return fd;
}

std::string WhyNotOpened(int error) {
  if (error == EISDIR) return "it is a directory";
  if (error == ENXIO) return "it is no regular file";
  if (error == ELOOP) return "a symbolic link of another user leads there, or links in a circle";
  return strerror(error);
}

void ReadBetweenSaves(const std::string& file, const std::function<void()>& read) {
  std::string sidecar = CvlIniMgr::SidecarName(file);
  for (int i = 0; i < kTornReadsTolerated; ++i) {
    Stamp before = StampOf(file), sidecarBefore = StampOf(sidecar);
    read();
    if (StampOf(file) == before && StampOf(sidecar) == sidecarBefore) break;
  }
}

GuardedBytes ReadGuarded(const std::string& file) {
  GuardedBytes out;
  ReadBetweenSaves(file, [&] {
    out = GuardedBytes();
    int error = ReadAll(file, &out.bytes, &out.error);
    if (error == 0) out.state = GuardedBytes::State::Read;
    if (error != 0 && error != ENOENT) out.state = GuardedBytes::State::Unreadable;
  });
  return out;
}

Document::Document(const std::string& bytes) : m_document(IniNew(0)), m_status(kIniOutOfMemory) {
  if (!m_document) return;
  IniSetReadOptions(m_document, kIniReadDoubleQuotes | kIniReadSingleQuotes);
  m_status = 0;
  if (bytes.empty()) return;
  FILE* file = fmemopen(const_cast<char*>(bytes.data()), bytes.size(), "rb");
  if (!file) return;
  m_status = ztini_IniReadFromFileHelper(m_document, file);
  fclose(file);
}

std::optional<std::string> Document::get(const std::string& section,
                                         const std::string& item) const {
  const char* value = nullptr;
  if (IniGetPointerToRawString(m_document, section.c_str(), item.c_str(), &value) != 1) return {};
  return value;
}

std::vector<std::string> Document::sections() const {
  std::vector<std::string> names;
  int32_t count = IniNumberOfSections(m_document);
  for (int32_t n = 1; n <= count; ++n) {
    const char* name = nullptr;
    if (IniNthSectionName(m_document, n, &name) == 1) names.push_back(name);
  }
  return names;
}

std::vector<std::pair<std::string, std::string>> Document::items(const std::string& section) const {
  std::vector<std::pair<std::string, std::string>> found;
  int32_t count = IniNumberOfItems(m_document, section.c_str());
  for (int32_t n = 1; n <= count; ++n) {
    const char *name = nullptr, *value = nullptr;
    if (IniNthItemName(m_document, section.c_str(), n, &name) == 1 &&
        IniNthItemPointerToString(m_document, section.c_str(), n, &value) == 1) {
      found.emplace_back(name, value);
    }
  }
  return found;
}

std::string InstalledFile(const wchar_t* name) {
  std::string directory = InstallDirectory();
  if (!directory.ends_with('/')) directory += '/';
  return directory + zt::fnd::AnsiString(name).c_str();
}

std::string DataFile(const std::string& name) {
  return InstalledFile(vlt::layout::kData) + "/" + name;
}

std::string UtcText(time_t time) {
  struct tm utc;
  char text[32];
  strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", gmtime_r(&time, &utc));
  return text;
}

void Print(const std::vector<Row>& rows, vltctl::Output& output) {
  vltctl::Table table;
  for (const Row& row : rows) {
    table.add({row.name, row.value, row.origin});
    output.item({{"name", row.name},
                 {"value", row.value},
                 {"origin", row.origin.empty() ? vltctl::Json() : vltctl::Json(row.origin)}});
  }
  output.print(table);
}

vltctl::Failure NoInstallDirectory() {
  return {vltctl::kDataUnusable,
          {"no-install-directory", PreferenceFile(),
           "the preference \"Dir\" is empty, so there is no installation", "",
           "set it to the install directory, or remove it for the default"}};
}

vltctl::Failure Unusable(const std::string& file, const std::string& why) {
  return {vltctl::kDataUnusable, {"unreadable", file, "cannot be read", why, ""}};
}

}  // namespace admin

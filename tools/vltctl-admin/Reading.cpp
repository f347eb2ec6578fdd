#include "tools/vltctl-admin/Reading.h"

#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "source/vlIniMgr.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/osdep/ScopedFd.h"

using zt::fnd::osdep::ScopedFd;

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

// 0, or errno. What is no regular file is EINVAL, and not waited for.
int ReadAll(const std::string& file, std::string* bytes) {
  ScopedFd fd(open(file.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (!fd.valid()) return errno;
  struct stat info;
  if (fstat(fd.get(), &info) != 0 || !S_ISREG(info.st_mode)) return EINVAL;
  char block[65536];
  bytes->clear();
  for (;;) {
    ssize_t got = read(fd.get(), block, sizeof block);
    if (got < 0) return errno;
    if (got == 0) return 0;
    bytes->append(block, static_cast<size_t>(got));
  }
}

GuardedBytes ReadOnce(const std::string& file, const std::string& sidecar) {
  GuardedBytes out;
  std::string digest;
  int error = ReadAll(file, &out.bytes);
  if (ReadAll(sidecar, &digest) == 0) out.sidecar = digest;
  if (error == 0) {
    out.state = GuardedBytes::State::Read;
  } else if (error != ENOENT) {
    out.state = GuardedBytes::State::Unreadable;
    out.error = error == EINVAL ? "it is no regular file" : strerror(error);
  }
  return out;
}

}  // namespace

GuardedBytes ReadGuarded(const std::string& file) {
  std::string sidecar = CvlIniMgr::SidecarName(file);
  GuardedBytes out;
  for (int i = 0; i < kTornReadsTolerated; ++i) {
    Stamp before = StampOf(file), sidecarBefore = StampOf(sidecar);
    out = ReadOnce(file, sidecar);
    if (StampOf(file) == before && StampOf(sidecar) == sidecarBefore) break;
  }
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

std::string DataFile(const std::string& name) {
  std::string directory = vlLookUpInstallDirectory();
  if (!directory.ends_with('/')) directory += '/';
  return directory + "Data/" + name;
}

void PrintJson(const nlohmann::json& value) {
  puts(value.dump(2, ' ', false, nlohmann::json::error_handler_t::replace).c_str());
}

namespace {

// Control characters as \xNN: names and values come from files that others write, and a terminal obeys
// what it is sent.
std::string Shown(const std::string& text) {
  std::string out;
  for (unsigned char c : text) {
    char code[8];
    snprintf(code, sizeof code, "\\x%02X", c);
    if (c < 0x20 || c == 0x7F) {
      out += code;
    } else {
      out += static_cast<char>(c);
    }
  }
  return out;
}

}  // namespace

void Print(const std::vector<Row>& rows, bool json) {
  if (json) {
    nlohmann::json out = nlohmann::json::object();
    for (const Row& row : rows) out[row.name] = {{"value", row.value}, {"origin", row.origin}};
    return PrintJson(out);
  }
  size_t names = 0, values = 0;
  for (const Row& row : rows) {
    names = std::max(names, Shown(row.name).size());
    values = std::max(values, Shown(row.value).size());
  }
  for (const Row& row : rows) {
    printf("%-*s  %-*s  %s\n", static_cast<int>(names), Shown(row.name).c_str(),
           static_cast<int>(values), Shown(row.value).c_str(), Shown(row.origin).c_str());
  }
}

}  // namespace admin

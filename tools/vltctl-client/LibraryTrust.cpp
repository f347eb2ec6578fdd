#include "tools/vltctl-client/LibraryTrust.h"

#include <errno.h>
#include <limits.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <deque>
#include <sstream>

#include "tools/vltctl-client/Candidates.h"

namespace vltctl {
namespace {

constexpr int kMostLinks = 40;  // as the kernel's

void Share(Controllers* out, const std::string& path, const std::string& reason) {
  if (!out->shared.empty()) return;
  out->shared = path;
  out->reason = reason;
}

// Why others than the owner can write to it, or nothing. The bits of the group are those of an access
// control list too, where there is one.
std::string WhoElseWrites(const std::string& path, const struct stat& info) {
  if (info.st_mode & S_IWOTH) return "every user can change it";
  if (!(info.st_mode & S_IWGRP)) return "";
  if (lgetxattr(path.c_str(), "system.posix_acl_access", nullptr, 0) > 0) {
    return "an access control list lets others change it";
  }
  return info.st_gid == 0 ? "" : "group " + std::to_string(info.st_gid) + " can change it";
}

// No file can have the name; a path that is too long may yet have a shorter one through a link.
bool NameIsTooLong(const std::string& path) { return path.size() - path.rfind('/') - 1 > NAME_MAX; }

void AddOwner(Controllers* out, uid_t user) {
  if (user != 0) out->users.insert(user);
}

void Prepend(std::deque<std::string>* names, const std::string& path) {
  std::istringstream in(path);
  std::deque<std::string> parts;
  for (std::string part; std::getline(in, part, '/');) parts.push_back(part);
  names->insert(names->begin(), parts.begin(), parts.end());
}

// One walk along a path. m_at is free of links, so that ".." is its directory.
class Walk {
 public:
  Walk(const std::string& path, Controllers* out) : m_out(out) { Prepend(&m_names, path); }

  void run() {
    if (!look("/")) return;
    while (!m_names.empty()) {
      std::string name = m_names.front();
      m_names.pop_front();
      if (name.empty() || name == ".") continue;
      if (name == "..") {
        m_at.erase(m_at.empty() ? 0 : m_at.rfind('/'));
        if (!look(m_at.empty() ? "/" : m_at)) return;
      } else if (!step(name)) {
        return;
      }
    }
  }

 private:
  // Takes the directory or file at the path for the present one. False ends the walk.
  bool look(const std::string& path) {
    if (lstat(path.c_str(), &m_info) == 0) return true;
    int error = errno;
    // Nothing is there, nor below a file. Of any other path nothing is known.
    bool isMissing = error == ENOENT || error == ENOTDIR || NameIsTooLong(path);
    if (!isMissing) Share(m_out, path, strerror(error));
    return false;
  }

  bool step(const std::string& name) {
    struct stat directory = m_info;
    std::string directoryPath = m_at.empty() ? "/" : m_at, path = m_at + "/" + name;
    addDirectory(directoryPath, directory, path);
    if (!look(path)) return false;
    if (S_ISLNK(m_info.st_mode)) return follow(path, directory);
    m_at = path;
    if (S_ISDIR(m_info.st_mode)) return true;
    AddOwner(m_out, m_info.st_uid);
    std::string reason = WhoElseWrites(path, m_info);
    if (!reason.empty()) Share(m_out, path, reason);
    return true;
  }

  // Where a directory is sticky, an entry is changed by its owner and the directory's only.
  void addDirectory(const std::string& path, const struct stat& info, const std::string& entry) {
    AddOwner(m_out, info.st_uid);
    std::string reason = WhoElseWrites(path, info);
    if (reason.empty()) return;
    struct stat inside;
    bool isThere = lstat(entry.c_str(), &inside) == 0;
    if (!(info.st_mode & S_ISVTX) || !isThere) return Share(m_out, path, reason);
    AddOwner(m_out, inside.st_uid);
  }

  bool follow(const std::string& path, const struct stat& directory) {
    char target[PATH_MAX];
    ssize_t size = readlink(path.c_str(), target, sizeof target);
    if (size < 0) Share(m_out, path, "it cannot be followed");
    if (size < 0 || ++m_links > kMostLinks) return false;  // too many: the kernel gives up as well
    std::string text(target, static_cast<size_t>(size));
    Prepend(&m_names, text);
    if (text.starts_with('/')) {
      m_at.clear();
      return look("/");
    }
    m_info = directory;
    return true;
  }

  Controllers* m_out;
  std::deque<std::string> m_names;
  std::string m_at;  // empty for "/"
  struct stat m_info = {};
  int m_links = 0;
};

}  // namespace

Controllers ControllersOf(const std::string& path) {
  Controllers out;
  if (path.starts_with('/')) {
    Walk(path, &out).run();
  } else {
    Share(&out, path, "it is no absolute path");
  }
  return out;
}

Controllers ControllersOfLibrary(const std::string& file) {
  Controllers out = ControllersOf(file);
  for (const std::string& candidate : LibraryCandidates(file)) {
    if (candidate == file) continue;
    Controllers more = ControllersOf(candidate);
    out.users.insert(more.users.begin(), more.users.end());
    if (!more.shared.empty()) Share(&out, more.shared, more.reason);
  }
  return out;
}

}  // namespace vltctl

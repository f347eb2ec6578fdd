#include "tests/power/Recording.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <set>
#include <system_error>

#include "tests/support/TempDir.h"

namespace vlt::test::power {
namespace {

[[noreturn]] void Fail(const std::string& what) {
  throw std::system_error(errno, std::generic_category(), what);
}

// Calls after which the directory may be another than before.
bool Changes(const SystemCall& call) {
  static const std::set<std::string> names = {"write",   "pwrite64", "writev",    "ftruncate",
                                              "rename",  "renameat", "renameat2", "link",
                                              "linkat",  "unlink",   "unlinkat",  "mkdir",
                                              "mkdirat", "rmdir",    "symlink",   "symlinkat"};
  std::string name = call.name();
  if (name == "openat") return call.args[2] & (O_CREAT | O_TRUNC);
  if (name == "open") return call.args[1] & (O_CREAT | O_TRUNC);
  return names.count(name) != 0;
}

bool IsSyncOfAll(const std::string& name) {
  return name == std::to_string(SYS_sync) || name == std::to_string(SYS_syncfs);
}

}  // namespace

const Promises& Recording::promisedAt(size_t steps) const {
  const Promises* found = &promises.front().second;
  for (const auto& [count, promised] : promises) {
    if (count <= steps) found = &promised;
  }
  return *found;
}

Recorder::Recorder(const std::string& root, const Promises& promises)
    : m_root(root), m_first(promises) {
  struct stat info;
  if (lstat(root.c_str(), &info) != 0) Fail(root);
  nodeOf(root, info);
  look(root, kRoot, &m_now, &m_bytes);
  for (const auto& [node, bytes] : m_bytes)
    m_recording.nodes[static_cast<size_t>(node)].bytes = bytes;
  m_recording.before = m_now;
  m_recording.promises.push_back({0, promises});
}

Recorder::~Recorder() {
  for (int fd : m_held) close(fd);
}

int Recorder::nodeOf(const std::string& path, const struct stat& info) {
  auto [number, isNew] =
      m_numbers.insert({info.st_ino, static_cast<int>(m_recording.nodes.size())});
  if (!isNew) return number->second;
  int fd = open(path.c_str(), O_PATH | O_CLOEXEC);
  if (fd < 0) Fail(path);
  m_held.push_back(fd);
  m_recording.nodes.push_back({S_ISDIR(info.st_mode), "", info.st_mode & 07777, info.st_mtim});
  return number->second;
}

void Recorder::look(const std::string& path, int directory, Directories* found,
                    std::map<int, std::string>* bytes) {
  Names& names = (*found)[directory];
  for (const auto& entry : std::filesystem::directory_iterator(path)) {
    struct stat info;
    if (lstat(entry.path().c_str(), &info) != 0) Fail(entry.path());
    if (!S_ISDIR(info.st_mode) && !S_ISREG(info.st_mode)) continue;
    int node = nodeOf(entry.path(), info);
    names[entry.path().filename()] = node;
    if (S_ISDIR(info.st_mode)) {
      look(entry.path(), node, found, bytes);
    } else if (!bytes->count(node)) {
      (*bytes)[node] = ReadBytes(entry.path());
    }
  }
}

// Whatever the call was, what it has done is the difference.
void Recorder::lookAgain(const std::string& call) {
  Directories found;
  std::map<int, std::string> bytes;
  look(m_root, kRoot, &found, &bytes);
  for (const auto& [node, now] : bytes) {
    auto known = m_bytes.find(node);
    if (known == m_bytes.end() ? now.empty() : known->second == now) continue;
    m_recording.steps.push_back({Step::Kind::Bytes, {}, node, now, call});
  }
  for (const auto& [node, now] : bytes) m_bytes[node] = now;
  Step step = {Step::Kind::Names, {}, -1, "", call};
  for (const auto& [directory, names] : m_now) {
    for (const auto& [name, node] : names) {
      auto still = found.find(directory);
      if (still != found.end() && !still->second.count(name)) {
        step.names.push_back({directory, name, -1});
      }
    }
  }
  for (const auto& [directory, names] : found) {
    for (const auto& [name, node] : names) {
      auto known = m_now.find(directory);
      if (known == m_now.end() || !known->second.count(name) || known->second.at(name) != node) {
        step.names.push_back({directory, name, node});
      }
    }
  }
  if (!step.names.empty()) m_recording.steps.push_back(step);
  m_now = found;
}

void Recorder::synced(const SystemCall& call) {
  std::string path = "/proc/" + std::to_string(call.process) + "/fd/" +
                     std::to_string(static_cast<int>(call.args[0]));
  struct stat info, root;
  if (stat(path.c_str(), &info) != 0 || stat(m_root.c_str(), &root) != 0) Fail(path);
  std::string target = call.what();
  if (info.st_dev != root.st_dev || (target != m_root && !target.starts_with(m_root + "/"))) return;
  int node = nodeOf(path, info);
  // A file without a name so far: what it holds now is on the disk before the name is.
  if (S_ISREG(info.st_mode) && !m_bytes.count(node)) {
    m_bytes[node] = ReadBytes(path);
    m_recording.steps.push_back({Step::Kind::Bytes, {}, node, m_bytes[node], "write"});
  }
  m_recording.steps.push_back({Step::Kind::Sync, {}, node, "", call.name() + " " + target});
}

void Recorder::after(const SystemCall& call, const Promises& promises) {
  if (call.result == -1 || (call.result < 0 && call.result > -4096)) {
    // The look of a client that marks a promise fails always.
    std::string name = call.name();
    if ((name == "access" || name == "faccessat") && call.what() == kPromiseMark) {
      m_recording.promises.push_back({m_recording.steps.size(), promises});
    }
    return;
  }
  std::string name = call.name();
  if (name == "fsync" || name == "fdatasync") return synced(call);
  if (IsSyncOfAll(name)) {
    m_recording.steps.push_back({Step::Kind::SyncAll, {}, -1, "", "sync"});
    return;
  }
  if (Changes(call)) lookAgain(name + " " + call.what());
}

int Recorder::run(const std::function<int(PromisedClient&)>& body,
                  const TracedChild::Before& before) {
  SharedPromises promises(m_recording.promises.back().second);
  return TracedChild::Run(
      [&] {
        PromisedClient client(*promises);
        return body(client);
      },
      before, [&](const SystemCall& call) { after(call, *promises); });
}

}  // namespace vlt::test::power

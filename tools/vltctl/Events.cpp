// events: the named events of the machine, read from their files without disturbing them.
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <map>
#include <system_error>

#include "tools/vltctl/Reading.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/SharedUnixObject.h"
#include "zt/fnd/osdep/events/EventStateFile.h"
#include "zt/posix/ScopedFd.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using zt::fnd::osdep::EventPlace;
using zt::fnd::osdep::SetHeader;

constexpr const char* kUnlinked = " (deleted)";
using zt::fnd::osdep::kStateFileSize;
using zt::posix::ScopedFd;

// As much of a file as an event's can have. Anybody may put anything there: what is no regular file is
// not waited for, and a large one not read.
std::string Bytes(const fs::path& file) {
  std::string ignored;
  ScopedFd fd = OpenRegular(file, &ignored);
  if (!fd.valid()) return "";
  char block[kStateFileSize];
  ssize_t got = read(fd.get(), block, sizeof block);
  return got > 0 ? std::string(block, static_cast<size_t>(got)) : "";
}

// Files below a directory, by their path as the kernel reports it, and who has them open.
using FileHolders = std::map<std::string, std::vector<int>>;
struct Holders {
  FileHolders named, unlinked;
};

void AddOpenFile(const fs::path& fd, const std::string& directory, int pid, Holders* holders) {
  std::error_code hidden;  // Other users' processes do not show their files.
  std::string target = fs::read_symlink(fd, hidden).string();
  struct stat info;
  if (hidden || !target.starts_with(directory) || stat(fd.c_str(), &info) != 0) return;
  auto& pids = (info.st_nlink == 0 ? holders->unlinked : holders->named)[target];
  if (pids.empty() || pids.back() != pid) pids.push_back(pid);
}

Holders HoldersBelow(const std::string& directory) {
  Holders holders;
  std::error_code ignored;
  for (const auto& process : fs::directory_iterator("/proc", ignored)) {
    int pid = atoi(process.path().filename().c_str());
    if (pid <= 0) continue;
    std::error_code hidden;
    for (fs::directory_iterator fd(process.path() / "fd", hidden), end; !hidden && fd != end;
         fd.increment(hidden)) {
      AddOpenFile(fd->path(), directory, pid, &holders);
    }
  }
  return holders;
}

std::string List(const std::vector<int>& pids) {
  std::string out;
  for (int pid : pids) out += (out.empty() ? "" : " ") + std::to_string(pid);
  return out.empty() ? "no process" : out;
}

struct Shown {
  std::string name, state;
  std::vector<int> holders;
};

bool IsSetFile(const std::string& name) {
  return name.starts_with("sem_") && name.find_first_not_of("0123456789", 4) == std::string::npos;
}

template <size_t N>
bool Take(const std::string& bytes, std::array<unsigned char, N>* out) {
  if (bytes.size() < N) return false;
  std::copy_n(bytes.begin(), N, out->begin());
  return true;
}

std::string DescribeSet(const std::string& bytes) {
  SetHeader::Bytes head;
  SetHeader header;
  if (!Take(bytes, &head) || !header.decode(head)) return "not a state file";
  return "set of " + std::to_string(header.count) + " slots, " + std::to_string(header.freeCount) +
         " free" + (header.ready ? "" : ", not ready");
}

std::string DescribeEvent(const std::string& bytes) {
  EventPlace::Bytes place;
  if (!Take(bytes, &place)) return "no place yet";
  EventPlace decoded = EventPlace::Decode(place);
  return "set " + std::to_string(decoded.set) + ", slot " + std::to_string(decoded.slot);
}

}  // namespace

int Events(const Arguments&, Output& output) {
  std::string base = zt::fnd::AnsiString(zt::fnd::osdep::GetSharedUnixBase()).c_str();
  std::string directory = base + "/namedEvent/";
  Holders holders = HoldersBelow(directory);
  std::vector<Shown> shown;
  std::error_code missing;
  for (fs::directory_iterator entry(directory, missing), end; !missing && entry != end;
       entry.increment(missing)) {
    std::error_code gone;
    std::string name = entry->path().filename();
    if (!fs::is_regular_file(entry->symlink_status(gone))) continue;
    std::string bytes = Bytes(entry->path());
    shown.push_back({name, IsSetFile(name) ? DescribeSet(bytes) : DescribeEvent(bytes),
                     holders.named[directory + name]});
  }
  for (const auto& [path, pids] : holders.unlinked) {
    std::string name = path.substr(directory.size());
    if (!name.ends_with(kUnlinked)) name += kUnlinked;  // the kernel says so itself
    shown.push_back({name, "its file is gone", pids});
  }
  std::sort(shown.begin(), shown.end(),
            [](const Shown& a, const Shown& b) { return a.name < b.name; });
  vltctl::Table table;
  for (const Shown& event : shown) {
    table.add({event.name, event.state, "held by " + List(event.holders)});
    output.item({{"name", event.name}, {"state", event.state}, {"holders", event.holders}});
  }
  output.print(table);
  return vltctl::kGood;
}

}  // namespace admin

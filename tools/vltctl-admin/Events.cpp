// events: the named events of the machine, read from their files without disturbing them.
#include <dirent.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>

#include "tools/vltctl-admin/Reading.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/EventStateFile.h"
#include "zt/fnd/osdep/SharedUnixObject.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using zt::fnd::osdep::EventPlace;
using zt::fnd::osdep::SetHeader;

constexpr const char* kUnlinked = " (deleted)";

std::string Bytes(const fs::path& file) {
  std::ifstream in(file, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), {});
}

// Which processes have a file below the directory open: path, as the kernel tells it, to process ids.
std::map<std::string, std::vector<int>> Holders(const std::string& directory) {
  std::map<std::string, std::vector<int>> holders;
  std::error_code ignored;
  for (const auto& process : fs::directory_iterator("/proc", ignored)) {
    int pid = atoi(process.path().filename().c_str());
    if (pid <= 0) continue;
    std::error_code hidden;  // Other users' processes do not show their files.
    for (const auto& fd : fs::directory_iterator(process.path() / "fd", hidden)) {
      std::string target = fs::read_symlink(fd.path(), hidden).string();
      if (hidden || !target.starts_with(directory)) continue;
      auto& pids = holders[target];
      if (pids.empty() || pids.back() != pid) pids.push_back(pid);
    }
  }
  return holders;
}

std::string List(const std::vector<int>& pids) {
  std::string out;
  for (int pid : pids) out += (out.empty() ? "" : " ") + std::to_string(pid);
  return out.empty() ? "nobody" : out;
}

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

int Events(bool json) {
  std::string base = zt::fnd::AnsiString(zt::fnd::osdep::GetSharedUnixBase()).c_str();
  std::string directory = base + "/namedEvent/";
  auto holders = Holders(directory);
  std::vector<Row> rows;
  std::error_code missing;
  for (const auto& entry : fs::directory_iterator(directory, missing)) {
    std::string name = entry.path().filename();
    if (!entry.is_regular_file(missing)) continue;
    std::string bytes = Bytes(entry.path());
    rows.push_back({name, IsSetFile(name) ? DescribeSet(bytes) : DescribeEvent(bytes),
                    "held by " + List(holders[directory + name])});
  }
  for (const auto& [path, pids] : holders) {
    if (!path.ends_with(kUnlinked)) continue;
    std::string name = path.substr(directory.size());
    rows.push_back({name, "its file is gone", "held by " + List(pids)});
  }
  std::sort(rows.begin(), rows.end(), [](const Row& a, const Row& b) { return a.name < b.name; });
  Print(rows, json);
  return kGood;
}

}  // namespace admin

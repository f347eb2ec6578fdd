#include "tools/vltctl-client/Candidates.h"

namespace vltctl {
namespace {

void AddInside(const std::string& directory, std::vector<std::string>* out) {
  std::string base = directory.substr(directory.rfind('/') + 1),
              stem = base.substr(0, base.rfind('.'));
  if (stem.empty()) return;
  for (const std::string& name : {"lib" + stem + ".so", stem + ".so", stem}) {
    out->push_back(directory + "/" + name);
  }
}

}  // namespace

std::vector<std::string> LibraryCandidates(const std::string& file) {
  std::vector<std::string> out;
  size_t slash = file.rfind('/') + 1;  // 0 where there is none
  if (file.find('.', slash) != std::string::npos) {
    AddInside(file, &out);
    out.push_back(file);
    return out;
  }
  AddInside(file + ".framework", &out);
  AddInside(file + ".bundle", &out);
  out.push_back(file.substr(0, slash) + "lib" + file.substr(slash) + ".so");
  return out;
}

}  // namespace vltctl

#include "tests/power/States.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <functional>
#include <random>
#include <set>
#include <system_error>

#include "tests/support/DirectoryImage.h"
#include "tests/support/TempDir.h"

namespace vlt::test::power {
namespace {

constexpr size_t kSector = 512;
// More combinations than these of one moment are sampled.
constexpr size_t kSubsets = 64, kCombinations = 24;

using Random = std::mt19937;

// The cut after some of the steps: which names are settled, and what each file may hold.
class Cut {
 public:
  Cut(const Recording& recording, size_t steps) : m_recording(recording), m_steps(steps) {
    for (size_t k = 0; k < steps; ++k) {
      if (recording.steps[k].kind == Step::Kind::Names) m_names.push_back(k);
    }
  }

  const std::vector<size_t>& names() const { return m_names; }

  // Every directory that the change has to do with was synced after it.
  bool isSettled(size_t change) const {
    for (const Step::Change& name : m_recording.steps[change].names) {
      if (!isSyncedAfter(change, name.directory)) return false;
    }
    return true;
  }

  // The contents that the file may have; the ones as written first.
  std::vector<std::string> choices(int node) const {
    std::vector<std::string> versions = {m_recording.nodes[static_cast<size_t>(node)].bytes};
    for (size_t k = 0; k < m_steps; ++k) {
      const Step& step = m_recording.steps[k];
      bool mine = step.node == node || step.kind == Step::Kind::SyncAll;
      if (mine && step.kind == Step::Kind::Bytes) versions.push_back(step.bytes);
      if (mine && step.kind != Step::Kind::Bytes) versions = {versions.back()};
    }
    std::vector<std::string> all = {versions.back()};
    if (versions.size() == 1) return all;
    const std::string &old = versions.front(), &now = versions.back();
    all.insert(all.end(), versions.begin(), versions.end() - 1);
    if (now.size() > old.size()) {
      all.push_back(old + std::string(now.size() - old.size(), '\0'));
    }
    // A cut falls between sectors, and only what lies beyond the old end can be missing.
    for (size_t cut = kSector; cut < now.size(); cut += kSector) {
      if (cut <= old.size()) continue;
      all.push_back(now.substr(0, cut));
      all.push_back(now.substr(0, cut) + std::string(now.size() - cut, '\0'));
    }
    std::vector<std::string> different;
    for (const std::string& one : all) {
      if (std::find(different.begin(), different.end(), one) == different.end()) {
        different.push_back(one);
      }
    }
    return different;
  }

  Directories with(const std::vector<size_t>& changes) const {
    Directories made = m_recording.before;
    for (size_t k : changes) {
      for (const Step::Change& name : m_recording.steps[k].names) {
        if (name.node < 0) {
          made[name.directory].erase(name.name);
        } else {
          made[name.directory][name.name] = name.node;
        }
      }
    }
    return made;
  }

 private:
  bool isSyncedAfter(size_t change, int directory) const {
    for (size_t k = change + 1; k < m_steps; ++k) {
      const Step& step = m_recording.steps[k];
      if (step.kind == Step::Kind::SyncAll) return true;
      if (step.kind == Step::Kind::Sync && step.node == directory) return true;
    }
    return false;
  }

  const Recording& m_recording;
  size_t m_steps;
  std::vector<size_t> m_names;  // steps that change names
};

using Choices = std::vector<std::vector<size_t>>;

// In order: everything before a moment that is no earlier than the last settled change.
Choices Prefixes(const Cut& cut) {
  size_t least = 0;
  for (size_t n = 0; n < cut.names().size(); ++n) {
    if (cut.isSettled(cut.names()[n])) least = n + 1;
  }
  Choices all;
  for (size_t count = least; count <= cut.names().size(); ++count) {
    all.push_back({cut.names().begin(), cut.names().begin() + static_cast<long>(count)});
  }
  return all;
}

// The settled changes and any of the others.
Choices Subsets(const Cut& cut, Random& random) {
  std::vector<size_t> settled, open;
  for (size_t k : cut.names()) (cut.isSettled(k) ? settled : open).push_back(k);
  Choices all;
  auto add = [&](const std::function<bool(size_t)>& wanted) {
    std::vector<size_t> chosen = settled;
    for (size_t n = 0; n < open.size(); ++n) {
      if (wanted(n)) chosen.push_back(open[n]);
    }
    std::sort(chosen.begin(), chosen.end());
    all.push_back(chosen);
  };
  if ((size_t{1} << std::min<size_t>(open.size(), 20)) <= kSubsets) {
    for (size_t bits = 0; bits < (size_t{1} << open.size()); ++bits) {
      add([&](size_t n) { return (bits >> n & 1) != 0; });
    }
    return all;
  }
  for (size_t one = 0; one < open.size(); ++one) {
    add([&](size_t n) { return n == one; });
    add([&](size_t n) { return n != one; });
    add([&](size_t n) { return n < one; });
  }
  add([](size_t) { return true; });
  while (all.size() < kSubsets) add([&](size_t) { return random() % 2 != 0; });
  return all;
}

void CollectFiles(const Recording& recording, const Directories& directories, int directory,
                  std::set<int>* files) {
  auto names = directories.find(directory);
  if (names == directories.end()) return;
  for (const auto& [name, node] : names->second) {
    if (recording.nodes[static_cast<size_t>(node)].isDirectory) {
      CollectFiles(recording, directories, node, files);
    } else {
      files->insert(node);
    }
  }
}

// Every combination of contents, or some.
void AddStates(const Recording& recording, const Cut& cut, size_t steps,
               const std::vector<size_t>& changes, Random& random, std::set<std::string>* seen,
               std::vector<State>* states) {
  State state = {cut.with(changes), {}, steps, ""};
  std::set<int> files;
  CollectFiles(recording, state.directories, kRoot, &files);
  std::vector<std::pair<int, std::vector<std::string>>> open;
  size_t combinations = 1;
  for (int node : files) {
    std::vector<std::string> choices = cut.choices(node);
    state.bytes[node] = choices.front();
    if (choices.size() == 1) continue;
    combinations = std::min<size_t>(combinations * choices.size(), 1000000);
    open.push_back({node, choices});
  }
  for (size_t n = 0; n < std::min(combinations, kCombinations); ++n) {
    size_t rest = combinations <= kCombinations ? n : n == 0 ? 0 : random();
    std::string text = std::to_string(changes.size()) + " of " +
                       std::to_string(cut.names().size()) + " changes of names";
    for (const auto& [node, choices] : open) {
      state.bytes[node] = choices[rest % choices.size()];
      text += ", file " + std::to_string(node) + " choice " + std::to_string(rest % choices.size());
      rest /= choices.size();
    }
    state.text = text;
    if (seen->insert(state.contents(recording)).second) states->push_back(state);
  }
}

std::string PromiseKey(const Recording& recording, size_t steps) {
  const Promises& promises = recording.promisedAt(steps);
  return std::string(reinterpret_cast<const char*>(&promises), sizeof promises);
}

void Describe(const Recording& recording, const State& state, int directory,
              const std::string& path, const std::function<void(const std::string&, int)>& each) {
  auto names = state.directories.find(directory);
  if (names == state.directories.end()) return;
  for (const auto& [name, node] : names->second) {
    each(path + "/" + name, node);
    if (recording.nodes[static_cast<size_t>(node)].isDirectory) {
      Describe(recording, state, node, path + "/" + name, each);
    }
  }
}

}  // namespace

std::string State::contents(const Recording& recording) const {
  std::string key = PromiseKey(recording, steps);
  Describe(recording, *this, kRoot, "", [&](const std::string& path, int node) {
    key += path + '\0';
    auto found = bytes.find(node);
    if (found != bytes.end()) key += std::to_string(found->second.size()) + ":" + found->second;
  });
  return key;
}

void State::make(const Recording& recording, const std::string& root) const {
  EmptyDirectory(root);
  std::map<int, std::string> made;
  Describe(recording, *this, kRoot, "", [&](const std::string& below, int node) {
    const Node& what = recording.nodes[static_cast<size_t>(node)];
    std::string path = root + below;
    auto [first, isNew] = made.insert({node, path});
    int result = 0;
    if (what.isDirectory) {
      result = mkdir(path.c_str(), 0777);
    } else if (!isNew) {
      result = link(first->second.c_str(), path.c_str());
    } else {
      WriteBytes(path, bytes.at(node));
    }
    if (result != 0) throw std::system_error(errno, std::generic_category(), path);
    chmod(path.c_str(), 0777);
    timespec times[2] = {what.changed, what.changed};
    utimensat(AT_FDCWD, path.c_str(), times, 0);
  });
}

std::vector<State> StatesOf(const Recording& recording, Model model, size_t most) {
  Random random(1);
  std::set<std::string> seen;
  std::vector<State> states;
  for (size_t steps = 0; steps <= recording.steps.size(); ++steps) {
    Cut cut(recording, steps);
    Choices choices = model == Model::OrderedMetadata ? Prefixes(cut) : Subsets(cut, random);
    for (const auto& changes : choices) {
      AddStates(recording, cut, steps, changes, random, &seen, &states);
    }
  }
  std::shuffle(states.begin(), states.end(), random);
  if (most != 0 && states.size() > most) states.resize(most);
  return states;
}

}  // namespace vlt::test::power

// What the next start of a registrar would do.
#include <map>
#include <new>
#include <tuple>

#include "source/Database/databaseText.h"
#include "source/Snapshot/Opened.h"
#include "source/Snapshot/Rehearsal.h"
#include "source/Snapshot/Tree.h"
#include "source/Snapshot/snapshot.hpp"

using registrar::Narrow;
using registrar::Widen;

namespace vlt::snapshot {
namespace {

// The components that a database lists, by their sections.
std::map<std::string, Component> ListedIn(const IniDocument& document, const Place& place) {
  std::map<std::string, Component> listed;
  int count = document.GetNumberOfItems(registrar::kComponents);
  for (int n = 1; n <= count; ++n) {
    std::string name;
    if (document.GetNthItemName(registrar::kComponents, n, &name) < 0 || name.empty()) continue;
    std::string section = Narrow(Widen(name));
    registrar::RecordText record =
        registrar::ReadRecord(document, section, registrar::EmptyFileName::IsNone);
    listed.emplace(section, Describe(document, place, section, record));
  }
  return listed;
}

bool IsSame(const Component& a, const Component& b) {
  auto fields = [](const Component& c) {
    return std::tie(c.type, c.guid, c.file, c.schemaVersion, c.fragmentRegistered,
                    c.lastInstalledSchemaVersion, c.prefix, c.pnp, c.registrationFile);
  };
  return fields(a) == fields(b);
}

void CompareComponents(const std::map<std::string, Component>& before,
                       const std::map<std::string, Component>& after, Start* start) {
  for (const auto& [section, component] : before) {
    if (!after.count(section)) start->removed.push_back(component);
  }
  for (const auto& [section, component] : after) {
    auto known = before.find(section);
    if (known == before.end()) {
      start->added.push_back(component);
    } else if (!IsSame(known->second, component)) {
      start->changed.push_back(component);
    }
  }
}

using Items = std::map<std::pair<std::string, std::string>, std::string>;

Items ItemsOf(const IniDocument& document) {
  Items items;
  for (int s = 1; s <= document.GetNumberOfSections(); ++s) {
    std::string section, item, value;
    if (document.GetNthSectionName(s, &section) < 0) continue;
    int count = document.GetNumberOfItems(section.c_str());
    for (int n = 1; n <= count; ++n) {
      if (document.GetNthItemName(section.c_str(), n, &item) < 0) continue;
      if (document.GetItem(section.c_str(), item.c_str(), &value) < 0) continue;
      items.emplace(std::make_pair(section, item), value);
    }
  }
  return items;
}

void CompareItems(const Items& before, const Items& after, Start* start) {
  auto add = [&](const auto& key, const std::string* from, const std::string* to) {
    ItemChange change{Utf8(key.first), Utf8(key.second), std::nullopt, std::nullopt};
    if (from) change.before = Utf8(*from);
    if (to) change.after = Utf8(*to);
    start->items.push_back(std::move(change));
  };
  for (const auto& [key, value] : before) {
    auto now = after.find(key);
    if (now == after.end()) {
      add(key, &value, nullptr);
    } else if (now->second != value) {
      add(key, &value, &now->second);
    }
  }
  for (const auto& [key, value] : after) {
    if (!before.count(key)) add(key, nullptr, &value);
  }
}

void MergeFiles(const Tree& tree, const Place& place, Rehearsal* rehearsal, Start* start) {
  for (const TreeFile& file : tree.files) {
    FileState state = rehearsal->stateOf(file.recorded, file.time);
    start->files.push_back({Utf8(file.here), state});
    if (state == FileState::Unchanged || !start->scans) continue;
    switch (rehearsal->merge(file.recorded, file.time)) {
      case Rehearsal::Merge::Merged:
        break;
      case Rehearsal::Merge::SetAside:
        start->setAside.push_back(Utf8(file.here));
        break;
      case Rehearsal::Merge::Skipped:
        start->skipped.push_back(Utf8(file.here));
        break;
    }
  }
  std::vector<std::string> vanished;
  rehearsal->removeVanished(&vanished);
  for (const std::string& file : vanished) {
    start->files.push_back({Utf8(place.toHere(file)), FileState::Vanished});
  }
}

// Whether a registrar that opens the database goes on to scan.
bool Scans(DatabaseState state, bool isParsable) {
  // Of two openings the first fails by the digest, and the second by what it sets aside.
  if (!isParsable) return state != DatabaseState::DigestDiffers;
  return IsTaken(state) || state == DatabaseState::Missing;
}

Start RehearseAt(const Opened& opened) {
  Start start;
  start.root = Utf8(opened.place.here);
  start.database = opened.database;
  Rehearsal rehearsal(opened.bytes, opened.place);
  start.scans = Scans(opened.database.state, rehearsal.isParsable());
  if (!rehearsal.isParsable()) start.database.state = DatabaseState::Unparsable;
  auto listed = ListedIn(rehearsal.document(), opened.place);
  Items items = ItemsOf(rehearsal.document());
  if (start.scans) rehearsal.beginStart();
  Tree tree = ReadTree(opened.place);
  start.problems = tree.problems;
  MergeFiles(tree, opened.place, &rehearsal, &start);
  if (!start.scans) return start;
  std::vector<Component> components;
  std::vector<Binding> bindings;
  rehearsal.readComponents(&components, &bindings);  // which completes file names
  CompareComponents(listed, ListedIn(rehearsal.document(), opened.place), &start);
  Items left = ItemsOf(rehearsal.document());
  CompareItems(items, left, &start);
  start.saves = rehearsal.saves();
  start.text = rehearsal.onDisk();
  IniDocument onDisk(true);
  if (onDisk.Parse(start.text) != 0) throw std::bad_alloc();
  start.leavesErasedOnDisk = ItemsOf(onDisk) != left;
  return start;
}

}  // namespace

Start RehearseStart() {
  return WithStandardErrors([] { return RehearseAt(OpenInForce()); });
}

Start RehearseStart(const std::string& root) {
  return WithStandardErrors([&] { return RehearseAt(OpenAt(root)); });
}

}  // namespace vlt::snapshot

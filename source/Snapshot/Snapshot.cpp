#include "source/Snapshot/snapshot.hpp"
#include "source/Database/databaseText.h"
#include "source/Snapshot/DatabaseFile.h"
#include "source/Snapshot/Opened.h"
#include "source/Snapshot/Rehearsal.h"
#include "source/Snapshot/Tree.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/Guid.h"
#include "zt/fnd/osdep/OSException.h"

using registrar::Narrow;
using registrar::Widen;
using zt::fnd::String;

namespace vlt::snapshot {
namespace {

std::optional<std::string> Setting(const IniDocument& document, const char* item) {
  std::string text;
  if (document.GetItem(registrar::kGlobalSection, item, &text) < 0 || text.empty()) {
    return std::nullopt;
  }
  return text;
}

void ReadSettings(const IniDocument& document, Snapshot* snapshot) {
  if (auto text = Setting(document, registrar::kSchemaVersion)) {
    snapshot->schemaVersion = registrar::Number(*text);
  }
  if (auto text = Setting(document, registrar::kCacheSize)) {
    snapshot->cacheSizeBytes = registrar::Number(*text);
  }
  if (auto text = Setting(document, registrar::kConfigFile)) {
    snapshot->configurationFile = Utf8(*text);
  }
}

void AddTree(const Tree& tree, Rehearsal* rehearsal, Snapshot* snapshot) {
  for (const TreeFile& file : tree.files) {
    FileState state = rehearsal->stateOf(file.recorded, file.time);
    snapshot->files.push_back({Utf8(file.here), state});
  }
  for (const std::string& path : tree.previousDictionaries) {
    snapshot->previousDictionaries.push_back(Utf8(path));
  }
  snapshot->problems = tree.problems;
}

// What the database answers, in an installation of this place.
void Answer(const std::string& bytes, const Place& place, Snapshot* snapshot) {
  Rehearsal rehearsal(bytes, place);
  if (!rehearsal.isParsable()) snapshot->database.state = DatabaseState::Unparsable;
  AddTree(ReadTree(place), &rehearsal, snapshot);
  if (!IsTaken(snapshot->database.state)) return;
  rehearsal.beginStart();
  ReadSettings(rehearsal.document(), snapshot);
  std::vector<std::string> vanished;
  rehearsal.removeVanished(&vanished);
  for (const std::string& file : vanished) {
    snapshot->files.push_back({Utf8(place.toHere(file)), FileState::Vanished});
  }
  rehearsal.readComponents(&snapshot->components, &snapshot->bindings);
}

Snapshot ReadAt(const Opened& opened) {
  Snapshot snapshot;
  snapshot.root = Utf8(opened.place.here);
  snapshot.recordedRoot = Utf8(opened.place.recorded);
  snapshot.database = opened.database;
  Answer(opened.bytes, opened.place, &snapshot);
  return snapshot;
}

}  // namespace

Snapshot Read() {
  return WithStandardErrors([] { return ReadAt(OpenInForce()); });
}

Snapshot Read(const std::string& root) {
  return WithStandardErrors([&] { return ReadAt(OpenAt(root)); });
}

const char* NameOf(Type type) {
  switch (type) {
    case Type::Dictionary:
      return "dictionary";
    case Type::ObjectExpert:
      return "object expert";
    case Type::ResourceExpert:
      break;
  }
  return "resource expert";
}

const Component* Snapshot::find(const std::string& guid) const {
  std::optional<std::string> wanted = ParseGuid(guid);
  for (const Component& component : components) {
    if (wanted && component.guid == *wanted) return &component;
  }
  return nullptr;
}

std::vector<std::string> Snapshot::boundTo(Type type, const std::string& bindingClass) const {
  std::optional<std::string> wanted = ParseGuid(bindingClass);
  std::vector<std::string> found;
  for (const Binding& binding : bindings) {
    if (binding.type == type && wanted && binding.bindingClass == *wanted) {
      found.push_back(binding.component);
    }
  }
  return found;
}

unsigned Snapshot::changes() const {
  unsigned count = 0;
  for (const RegistrationFile& file : files) count += file.state != FileState::Unchanged;
  return count;
}

std::optional<std::string> ParseGuid(const std::string& text) {
  try {
    bool hasBrace = text.find('{') != std::string::npos;
    return GuidText(zt::fnd::Guid(Widen(hasBrace ? text : "{" + text + "}")).get());
  } catch (const zt::fnd::exception::BadGuidString&) {
    // A result here.
    return std::nullopt;
  }
}

}  // namespace vlt::snapshot

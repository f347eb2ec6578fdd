// A program of the snapshot reader, as others write them: C++17, the installed header, nothing else
// of the tree. Prints what it finds as JSON.
//
//   snapshot_client [ROOT]
//   snapshot_client --start ROOT
#include <locale.h>
#include <stdio.h>

#include <exception>
#include <nlohmann/json.hpp>

#include "source/Snapshot/snapshot.hpp"

namespace {

using namespace vlt::snapshot;
using nlohmann::json;

json OrNull(const std::optional<std::string>& text) { return text ? json(*text) : json(); }

json ToJson(const Component& c) {
  json out = {{"type", NameOf(c.type)},
              {"name", c.name},
              {"guid", c.guid},
              {"file", OrNull(c.file)},
              {"version", c.recordVersion}};
  if (c.type == Type::Dictionary) {
    out["schemaVersion"] = c.schemaVersion;
    out["fragmentRegistered"] = c.fragmentRegistered;
    out["lastInstalledSchemaVersion"] = c.lastInstalledSchemaVersion;
    out["prefix"] = OrNull(c.prefix);
  }
  if (c.type == Type::ResourceExpert) out["pnp"] = OrNull(c.pnp);
  return out;
}

json ToJson(const Snapshot& snapshot) {
  json out = {{"state", static_cast<int>(snapshot.database.state)},
              {"changes", snapshot.changes()},
              {"schemaVersion", snapshot.schemaVersion},
              {"cacheSizeBytes", snapshot.cacheSizeBytes},
              {"configurationFile", OrNull(snapshot.configurationFile)},
              {"previousDictionaries", snapshot.previousDictionaries},
              {"components", json::array()},
              {"bindings", json::object()}};
  for (const Component& c : snapshot.components) out["components"].push_back(ToJson(c));
  for (const Binding& b : snapshot.bindings) {
    out["bindings"][NameOf(b.type)][b.bindingClass] = snapshot.boundTo(b.type, b.bindingClass);
  }
  for (const RegistrationFile& f : snapshot.files) {
    out["files"][f.path] = static_cast<int>(f.state);
  }
  return out;
}

json Names(const std::vector<Component>& components) {
  json out = json::array();
  for (const Component& c : components) out.push_back(c.name);
  return out;
}

json ToJson(const Start& start) {
  json out = {{"scans", start.scans},
              {"saves", start.saves},
              {"fromDurableCopy", start.database.readFromDurableCopy},
              {"added", Names(start.added)},
              {"removed", Names(start.removed)},
              {"changed", Names(start.changed)},
              {"setAside", start.setAside},
              {"items", json::array()},
              {"leavesErasedOnDisk", start.leavesErasedOnDisk},
              {"text", std::vector<unsigned char>(start.text.begin(), start.text.end())}};
  for (const ItemChange& change : start.items) {
    out["items"].push_back(
        {change.section, change.item, OrNull(change.before), OrNull(change.after)});
  }
  for (const RegistrationFile& f : start.files) {
    out["files"][f.path] = static_cast<int>(f.state);
  }
  return out;
}

}  // namespace

int main(int argc, char** argv) {
  setlocale(LC_ALL, "");
  try {
    if (argc > 2) {
      puts(ToJson(RehearseStart(argv[2])).dump().c_str());
      return 0;
    }
    puts(ToJson(argc > 1 ? Read(argv[1]) : Read()).dump().c_str());
    return 0;
  } catch (const std::exception& error) {
    fprintf(stderr, "snapshot_client: %s\n", error.what());
    return 1;
  }
}

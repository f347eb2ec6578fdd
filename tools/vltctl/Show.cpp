// show: one component of a snapshot, with all that belongs to it.
#include <sys/stat.h>

#include "tools/vltctl/Components.h"
#include "tools/vltctl/Reading.h"

namespace admin {
namespace {

using vlt::snapshot::FileState;
using vlt::snapshot::Type;
using vltctl::Json;

std::string BaseName(const std::string& path) { return path.substr(path.rfind('/') + 1); }

// The dictionary's predecessor in "Last".
std::string PreviousOf(const Snapshot& snapshot, const Component& c) {
  if (c.type != Type::Dictionary || !c.file) return "";
  for (const std::string& path : snapshot.previousDictionaries) {
    if (BaseName(path) == BaseName(*c.file)) return path;
  }
  return "";
}

const char* StateOf(const Snapshot& snapshot, const std::string& file) {
  for (const auto& known : snapshot.files) {
    if (known.path == file) return WordOf(known.state);
  }
  return nullptr;
}

std::string TimeOf(const std::string& file) {
  struct stat info;
  if (file.empty() || stat(file.c_str(), &info) != 0) return "";
  return UtcText(info.st_mtime);
}

void Print(const Snapshot& snapshot, const Component& c, Output& output) {
  vltctl::Table table;
  auto add = [&](const char* name, const std::string& value) {
    if (!value.empty()) table.add({name, value});
  };
  add("type", NameOf(c.type));
  add("name", c.name);
  add("guid", c.guid);
  add("file", c.file.value_or(""));
  add("library", LibraryOf(FileOf(snapshot, c)));
  if (c.type == Type::Dictionary) {
    add("schema version", std::to_string(c.schemaVersion));
    add("changed since reset", c.fragmentRegistered ? "yes" : "no");
    add("last installed version", c.lastInstalledSchemaVersion == 0xFFFFFFFF
                                      ? "none"
                                      : std::to_string(c.lastInstalledSchemaVersion));
    add("prefix", c.prefix.value_or(""));
    add("previous version", PreviousOf(snapshot, c));
  }
  add("pnp", c.pnp.value_or(""));
  for (const std::string& bindingClass : c.classes) add("binds to", bindingClass);
  add("registration file", c.registrationFile);
  const char* state = StateOf(snapshot, c.registrationFile);
  if (state) add("its stamp", TimeOf(c.registrationFile) + ", " + state);
  output.print(table);
}

Json ItemOf(const Snapshot& snapshot, const Component& c) {
  auto orNull = [](const std::string& text) { return text.empty() ? Json() : Json(text); };
  const char* state = StateOf(snapshot, c.registrationFile);
  Json item = ToJson(c);
  item["stamp"] = state ? orNull(TimeOf(c.registrationFile)) : Json();
  item["registrationState"] = state ? Json(state) : Json();
  item["library"] = orNull(LibraryOf(FileOf(snapshot, c)));
  item["previousVersion"] = orNull(PreviousOf(snapshot, c));
  return item;
}

// For scripts: the exit code is the answer.
int IsAtLeast(const Component& c, unsigned version) {
  return c.type == Type::Dictionary && c.schemaVersion >= version ? vltctl::kGood
                                                                  : vltctl::kNotFound;
}

}  // namespace

int Show(const Arguments& arguments, Output& output) {
  unsigned version = arguments.number("--at-least", 0);
  Snapshot snapshot = ReadComponents(output);
  std::string text = arguments.text("COMPONENT");
  if (arguments.has("--exists")) {
    return Matches(snapshot, text).empty() ? vltctl::kNotFound : vltctl::kGood;
  }
  const Component& component = Only(snapshot, text);
  output.item(ItemOf(snapshot, component));
  if (arguments.has("--at-least")) return IsAtLeast(component, version);
  Print(snapshot, component, output);
  return vltctl::kGood;
}

}  // namespace admin

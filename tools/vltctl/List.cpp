// list and classes: the components of a snapshot.
#include <fnmatch.h>

#include <algorithm>
#include <utility>

#include "tools/common/Locale.h"
#include "tools/vltctl/Components.h"
#include "tools/vltctl/Reading.h"

namespace admin {
namespace {

using vlt::snapshot::Type;
using vltctl::Failure;

std::string OrDash(const std::optional<std::string>& text) {
  return text && !text->empty() ? *text : "-";
}

std::string Versions(const Component& c) {
  return c.type == Type::Dictionary ? std::to_string(c.schemaVersion) : "-";
}

void Print(const std::vector<const Component*>& components, bool isLong, Output& output) {
  std::vector<std::string> header = {"TYPE", "NAME", "GUID", "VERSION", "FILE"};
  if (isLong) header.insert(header.end(), {"PREFIX OR PNP", "CLASSES", "REGISTRATION FILE"});
  vltctl::Table table(header);
  for (const Component* c : components) {
    if (output.json()) {
      output.item(ToJson(*c));
      continue;
    }
    std::vector<std::string> row = {NameOf(c->type), c->name, c->guid, Versions(*c),
                                    OrDash(c->file)};
    if (isLong) {
      row.push_back(OrDash(c->type == Type::Dictionary ? c->prefix : c->pnp));
      row.push_back(std::to_string(c->classes.size()));
      row.push_back(OrDash(c->registrationFile));
    }
    table.add(std::move(row));
  }
  output.print(table);
}

// Each type in GUID order, as the registrar enumerates them.
std::vector<const Component*> InOrder(const Snapshot& snapshot) {
  std::vector<const Component*> order;
  for (Type type : {Type::Dictionary, Type::ObjectExpert, Type::ResourceExpert}) {
    for (const Component& component : snapshot.components) {
      if (component.type == type) order.push_back(&component);
    }
  }
  return order;
}

bool BindsTo(const Component& component, const std::string& guid) {
  return std::find(component.classes.begin(), component.classes.end(), guid) !=
         component.classes.end();
}

std::string GuidOf(const std::string& text) {
  auto guid = vlt::snapshot::ParseGuid(text);
  if (guid) return *guid;
  throw Failure(vltctl::kUsage, {"usage", "", "not a GUID: " + text, "", ""});
}

std::string TypeOf(const Arguments& arguments) {
  std::string type = arguments.text("--type");
  if (type.empty() || IsTypeWord(type)) return type;
  throw Failure(vltctl::kUsage, {"usage", "", "no such type: " + type, "",
                                 "give dictionary, object-expert or resource-expert"});
}

}  // namespace

int List(const Arguments& arguments, Output& output) {
  std::string type = TypeOf(arguments), name = arguments.text("--name");
  std::string bindingClass =
      arguments.has("--class") ? GuidOf(arguments.text("--class")) : std::string();
  Snapshot snapshot = ReadComponents(output);
  std::vector<const Component*> shown;
  for (const Component* c : InOrder(snapshot)) {
    if (!type.empty() && TypeWord(c->type) != type) continue;
    if (!name.empty() && fnmatch(name.c_str(), c->name.c_str(), 0) != 0) continue;
    if (!bindingClass.empty() && !BindsTo(*c, bindingClass)) continue;
    shown.push_back(c);
  }
  Print(shown, arguments.has("--long"), output);
  std::vector<vltctl::NamedTexts> texts;
  for (const Component* c : shown) texts.push_back({c->name, c->name + c->file.value_or("")});
  if (std::string note = vltctl::LocaleNote(texts); !note.empty()) output.note(note);
  output.line(std::to_string(shown.size()) + (shown.size() == 1 ? " component" : " components"));
  return vltctl::kGood;
}

int Classes(const Arguments& arguments, Output& output) {
  std::string guid = GuidOf(arguments.text("GUID"));
  Snapshot snapshot = ReadComponents(output);
  std::vector<const Component*> bound;
  for (Type type : {Type::ObjectExpert, Type::ResourceExpert}) {
    for (const std::string& component : snapshot.boundTo(type, guid)) {
      if (const Component* found = snapshot.find(component)) bound.push_back(found);
    }
  }
  if (bound.empty()) {
    throw Failure(vltctl::kNotFound,
                  {"no-class", "", "no component binds to " + guid, "", "\"vltctl list --long\""});
  }
  Print(bound, false, output);
  return vltctl::kGood;
}

}  // namespace admin

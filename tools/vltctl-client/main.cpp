// The commands of vltctl that are calls of the library: what the registrar of this machine knows.
#include <stdio.h>

#include <algorithm>
#include <optional>

#include "tools/common/Locale.h"
#include "tools/common/Program.h"
#include "tools/common/Progress.h"
#include "tools/vltctl-client/Check.h"
#include "tools/vltctl-client/Component.h"
#include "tools/vltctl-client/ListOnce.h"

namespace {

using vltctl::Arguments;
using vltctl::Client;
using vltctl::Component;
using vltctl::Failure;
using vltctl::Json;
using vltctl::kDataUnusable;
using vltctl::kGood;
using vltctl::kNotFound;
using vltctl::kUsage;
using vltctl::Output;

template <class T>
Json OrNull(const std::optional<T>& value) {
  return value ? Json(*value) : Json();
}

constexpr uint32_t kNeverInstalled = 0xFFFFFFFF;

Json ToJson(const Component& c) {
  bool wasInstalled = c.lastInstalledSchemaVersion.value_or(kNeverInstalled) != kNeverInstalled;
  return {
      {"type", c.type},
      {"name", c.name},
      {"guid", c.guid},
      {"file", c.file.empty() ? Json() : Json(c.file)},
      {"schemaVersion", OrNull(c.schemaVersion)},
      {"changed", c.fragmentRegistered ? Json(*c.fragmentRegistered != 0) : Json()},
      {"lastInstalledSchemaVersion", wasInstalled ? Json(*c.lastInstalledSchemaVersion) : Json()},
      {"prefix", OrNull(c.prefix)},
      {"pnp", OrNull(c.pnp)}};
}

std::string Or(const std::string& text, const char* otherwise) {
  return text.empty() ? otherwise : text;
}

void Print(const std::vector<Component>& components, Output& output) {
  vltctl::Table table({"TYPE", "NAME", "GUID", "VERSION", "FILE"});
  for (const Component& c : components) {
    std::string version = c.schemaVersion ? std::to_string(*c.schemaVersion) : "-";
    table.add({c.type, c.name, c.guid, version, Or(c.file, "-")});
    output.item(ToJson(c));
  }
  output.print(table);
}

// What a program started from here would not see (tools/common/Locale.h).
void NoteLocale(const std::vector<Component>& components, Output& output) {
  std::vector<vltctl::NamedTexts> texts;
  for (const Component& c : components) texts.push_back({c.name, c.name + c.file});
  if (std::string note = vltctl::LocaleNote(texts); !note.empty()) output.note(note);
}

void PrintOne(const Component& c, Output& output) {
  vltctl::Table table;
  table.add({"type", c.type});
  table.add({"name", c.name});
  table.add({"guid", c.guid});
  table.add({"file", c.file});
  if (c.schemaVersion) {
    table.add({"schema version", std::to_string(*c.schemaVersion)});
    table.add({"changed since reset", *c.fragmentRegistered ? "yes" : "no"});
    table.add({"last installed version", *c.lastInstalledSchemaVersion == kNeverInstalled
                                             ? "none"
                                             : std::to_string(*c.lastInstalledSchemaVersion)});
    table.add({"prefix", *c.prefix});
  }
  if (c.pnp) table.add({"pnp", *c.pnp});
  output.print(table);
  output.item(ToJson(c));
}

Failure NoComponent(const std::string& guid) {
  return {kNotFound, {"no-component", "", "no component " + guid, "", "\"vltctl list\" shows all"}};
}

int List(const Arguments&, Output& output) {
  Client client;
  auto components = client.list();
  double readyMs = static_cast<double>(client.timeToReady().count()) / 1000;
  Print(components, output);
  char summary[80];
  snprintf(summary, sizeof summary, "%zu component%s; scanned in %.1f ms", components.size(),
           components.size() == 1 ? "" : "s", readyMs);
  output.line(summary);
  NoteLocale(components, output);
  return kGood;
}

int Show(const Arguments& arguments, Output& output) {
  const std::string guid = arguments.text("COMPONENT");
  if (!vltctl::IsGuidText(guid)) {
    throw Failure(kUsage, {"usage", "", "with --live, show takes a GUID", "", ""});
  }
  auto component = Client().find(guid);
  if (!component) throw NoComponent(guid);
  PrintOne(*component, output);
  return kGood;
}

int Classes(const Arguments& arguments, Output& output) {
  const std::string guid = arguments.text("GUID");
  auto components = Client().classes(guid);
  if (components.empty()) {
    throw Failure(kNotFound, {"no-class", "", "no component binds to " + guid, "", ""});
  }
  Print(components, output);
  return kGood;
}

// Those that the argument names: by identifier or by name.
std::vector<Component> Chosen(const std::vector<Component>& all, const std::string& word) {
  std::vector<Component> chosen;
  std::vector<std::string> names;
  for (const Component& c : all) {
    if (c.name == word || vltctl::BareGuid(c.guid) == vltctl::BareGuid(word)) chosen.push_back(c);
    names.push_back(c.name);
  }
  if (!chosen.empty()) return chosen;
  std::string guess = vltctl::DidYouMean(word, names);
  throw Failure(kNotFound, {"no-component", "", "no component " + word, "",
                            guess.empty() ? "\"vltctl list\" shows all" : guess});
}

int Check(const Arguments& arguments, Output& output) {
  vltctl::CheckOptions options{arguments.has("--library")};
  std::optional<Client> client;  // kept, so that the children have it
  if (options.asksLibrary) client.emplace();
  std::vector<Component> components = client ? client->list() : vltctl::ListOnce();
  const std::string word = arguments.text("COMPONENT");
  if (!word.empty()) components = Chosen(components, word);
  size_t bad = 0;
  vltctl::Progress progress("checking", components.size());
  vltctl::CheckComponents(components, options, [&](const Component& c, const vltctl::Verdict& v) {
    if (!v.code.empty()) ++bad;
    if (!v.code.empty() || !arguments.has("--only-bad")) vltctl::Show(ToJson(c), v, output);
    progress.step();
  });
  output.line(vltctl::Summary(components.size(), bad));
  return bad == 0 ? kGood : kNotFound;
}

// Commands of the table that neither program knows.
int Unknown(char** argv, Output&) {
  throw Failure(kUsage, {"usage", "", std::string("no such command: ") + argv[1], "", ""});
}

}  // namespace

int main(int argc, char** argv) {
  const vltctl::Handler handlers[] = {
      {"list", List}, {"show", Show}, {"classes", Classes}, {"check", Check}};
  return vltctl::Run(argc, argv, handlers, Unknown);
}

// scan --dry-run: what the next start of a registrar would do.
#include <string.h>

#include "tools/vltctl/Components.h"
#include "tools/vltctl/Reading.h"

namespace admin {
namespace {

using vlt::snapshot::FileState;
using vlt::snapshot::RegistrationFile;
using vlt::snapshot::Start;
using vltctl::Failure;
using vltctl::Json;

std::string Quoted(const std::optional<std::string>& text) {
  return text ? "\"" + *text + "\"" : "nothing";
}

Json OrNull(const std::optional<std::string>& text) { return text ? Json(*text) : Json(); }

std::vector<std::string> NamesOf(const std::vector<Component>& components) {
  std::vector<std::string> names;
  for (const Component& component : components) names.push_back(component.name);
  return names;
}

void PrintFiles(const Start& start, Output& output) {
  size_t unchanged = 0;
  for (const RegistrationFile& file : start.files) {
    if (file.state == FileState::Unchanged) {
      ++unchanged;
    } else {
      output.line(std::string(WordOf(file.state)) + "  " + file.path);
    }
  }
  output.line(std::to_string(unchanged) + " unchanged");
  for (const std::string& file : start.setAside) {
    output.line("set aside, as it cannot be parsed: " + file);
  }
  for (const std::string& file : start.skipped) {
    output.line("skipped, as it cannot be read: " + file);
  }
}

void PrintComponents(const Start& start, Output& output) {
  auto print = [&](const char* word, const std::vector<Component>& components) {
    for (const Component& c : components) {
      output.line(std::string(word) + "  " + NameOf(c.type) + " " + c.name + " " + c.guid);
    }
  };
  print("added", start.added);
  print("changed", start.changed);
  print("REMOVED", start.removed);
}

void Print(const Start& start, Output& output) {
  PrintFiles(start, output);
  if (!start.scans) {
    output.line("The next start does not scan: the database cannot be opened, or is set aside.");
    return;
  }
  PrintComponents(start, output);
  for (const auto& change : start.items) {
    output.line("[" + change.section + "] " + change.item + ": " + Quoted(change.before) +
                " becomes " + Quoted(change.after));
  }
  output.line(std::to_string(start.saves) + (start.saves == 1 ? " save" : " saves"));
  if (start.leavesErasedOnDisk) {
    output.line("What vanished leaves the database file with the first save after that start.");
  }
}

Json ItemOf(const Start& start) {
  Json files = Json::array(), items = Json::array();
  for (const RegistrationFile& file : start.files) {
    files.push_back({{"path", file.path}, {"state", WordOf(file.state)}});
  }
  for (const auto& change : start.items) {
    items.push_back({{"section", change.section},
                     {"key", change.item},
                     {"before", OrNull(change.before)},
                     {"after", OrNull(change.after)}});
  }
  return {{"scans", start.scans},
          {"files", files},
          {"setAside", start.setAside},
          {"skipped", start.skipped},
          {"added", NamesOf(start.added)},
          {"changed", NamesOf(start.changed)},
          {"removed", NamesOf(start.removed)},
          {"keys", items},
          {"saves", start.scans ? Json(start.saves) : Json()},
          {"leavesErasedOnDisk", start.leavesErasedOnDisk}};
}

}  // namespace

int Scan(const Arguments& arguments, Output& output) {
  if (!arguments.has("--dry-run")) {
    throw Failure(vltctl::kUsage,
                  {"usage", "", "scan only knows --dry-run", "a registrar scans when it starts",
                   "\"vltctl list --live\" starts one"});
  }
  Start start = Rehearse();
  NoteProblems(start.problems, output);
  output.item(ItemOf(start));
  Print(start, output);
  return start.scans ? vltctl::kGood : vltctl::kDataUnusable;
}

}  // namespace admin

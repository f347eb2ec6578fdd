// check --root: what is to be seen of the components' files without running any of their code.
#include <sys/stat.h>

#include "source/Database/recordText.h"
#include "tools/common/Verdict.h"
#include "tools/vltctl/Components.h"
#include "tools/vltctl/Library.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"

namespace admin {
namespace {

using vltctl::Bad;
using vltctl::Verdict;

constexpr const char* kNullGuid = "{00000000-0000-0000-0000-000000000000}";

Verdict CheckFile(const std::string& file) {
  struct stat info;
  if (file.empty()) return Bad("no-file", "its registration names no file");
  if (!file.starts_with('/')) return Bad("relative-path", file + " is no absolute path");
  if (!IsHere(file)) {
    return Bad("outside", file + " is outside of " + InstallDirectory());
  }
  if (stat(file.c_str(), &info) != 0) return Bad("missing", file + " does not exist");
  Verdict out;
  out.library = LibraryOf(file);
  if (out.library.empty()) return Bad("no-library", file + " has no library");
  return out;
}

Verdict CheckComponent(const Snapshot& snapshot, const Component& component) {
  if (component.name == registrar::kBuiltInDictionary) return {};
  if (component.guid == kNullGuid) {
    return Bad("no-identifier", "it has no identifier of its own, so no program can ask for it");
  }
  Verdict out = CheckFile(FileOf(snapshot, component));
  if (!out.code.empty()) return out;
  const char* entry = EntryPointOf(component.type);
  if (!IsLibrary(out.library)) {
    out.code = "not-a-library";
    out.messages.push_back(out.library + " is no library");
  } else if (!MayExport(out.library, entry)) {
    out.code = "no-entry-point";
    out.messages.push_back(out.library + " does not export \"" + entry + "\"");
  }
  return out;
}

}  // namespace

int CheckImage(const Arguments& arguments, Output& output) {
  if (arguments.has("--library")) {
    throw vltctl::Failure(vltctl::kUsage, {"usage", "", "--library goes without --root",
                                           "the libraries of an image are not loaded", ""});
  }
  Snapshot snapshot = ReadComponents(output);
  const std::string word = arguments.text("COMPONENT");
  size_t all = 0, bad = 0;
  const Component* only = word.empty() ? nullptr : &Only(snapshot, word);
  for (const Component& component : snapshot.components) {
    if (only && only != &component) continue;
    Verdict verdict = CheckComponent(snapshot, component);
    ++all;
    if (!verdict.code.empty()) ++bad;
    if (verdict.code.empty() && arguments.has("--only-bad")) continue;
    vltctl::Json json = ToJson(component);
    for (const char* more : {"registrationFile", "classes"}) json.erase(more);
    Show(json, verdict, output);
  }
  output.line(vltctl::Summary(all, bad) + "; nothing was loaded");
  return bad == 0 ? vltctl::kGood : vltctl::kNotFound;
}

}  // namespace admin

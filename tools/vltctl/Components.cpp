#include "tools/vltctl/Components.h"

#include <string.h>
#include <sys/stat.h>
#include <time.h>

#include <algorithm>
#include <chrono>
#include <system_error>

#include "source/IniFileLock.h"
#include "tools/common/LockHolder.h"
#include "tools/common/Progress.h"
#include "tools/vltctl/GuardedFiles.h"
#include "tools/vltctl/Library.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/osdep/Mutex.h"

namespace admin {

using vlt::snapshot::DatabaseState;
using vlt::snapshot::Type;
using vltctl::Failure;
using vltctl::Json;

void WithFailures(const std::function<void()>& step) {
  try {
    step();
  } catch (const std::system_error& error) {
    throw Failure(vltctl::kDataUnusable, {"unreadable", "", "the installation cannot be read",
                                          strerror(error.code().value()), "try again later"});
  } catch (const std::runtime_error& error) {
    throw Failure(vltctl::kDataUnusable, {"no-installation", "", "there is no installation",
                                          error.what(), "give its directory with --root"});
  }
}

namespace {
constexpr const char* kReading = "reading the installation";
}  // namespace

Snapshot ReadSnapshot() {
  vltctl::Waiting waiting(kReading);
  Snapshot snapshot;
  WithFailures([&] {
    snapshot = HasChosenRoot() ? vlt::snapshot::Read(InstallDirectory()) : vlt::snapshot::Read();
  });
  return snapshot;
}

vlt::snapshot::Start Rehearse() {
  vltctl::Waiting waiting(kReading);
  vlt::snapshot::Start start;
  WithFailures([&] {
    start = HasChosenRoot() ? vlt::snapshot::RehearseStart(InstallDirectory())
                            : vlt::snapshot::RehearseStart();
  });
  return start;
}

void NoteProblems(const std::vector<vlt::snapshot::Problem>& problems, Output& output) {
  for (const auto& problem : problems) {
    output.problem({"unreadable-directory", problem.path, "cannot be read", strerror(problem.error),
                    "run the command as a user who may"});
  }
}

namespace {

constexpr const char* kSeeScan = "\"vltctl scan --dry-run\" shows what the next start registers";

// A database that a registrar would not begin with has nothing to show. Why, is said in the words of
// verify and repair.
void CheckDatabase(const vlt::snapshot::Database& database) {
  switch (database.state) {
    case DatabaseState::Sound:
    case DatabaseState::DigestDiffers:
    case DatabaseState::SidecarMissing:
      return;
    case DatabaseState::Missing:
      throw Failure(vltctl::kDataUnusable,
                    {"no-database", database.path, "there is no registration database",
                     "no registrar has run here", kSeeScan});
    default:
      break;
  }
  GuardedIniState state = Inspect(database.path);
  const StateWords& words = WordsOf(state.kind);
  throw Failure(vltctl::kDataUnusable,
                {words.code, database.path, words.found, WhyOf(state), words.next});
}

}  // namespace

std::string Plural(unsigned count, const std::string& what) {
  return std::to_string(count) + " " + what + (count == 1 ? "" : "s");
}

Snapshot ReadComponents(Output& output) {
  Snapshot snapshot = ReadSnapshot();
  CheckDatabase(snapshot.database);
  NoteProblems(snapshot.problems, output);
  if (snapshot.database.state == DatabaseState::DigestDiffers) {
    output.note(
        snapshot.database.path +
        output.remedy(": the digest differs; \"vltctl verify\" says what the next opening does"));
  }
  if (unsigned changes = snapshot.changes()) {
    output.note(
        Plural(changes, "registration file") +
        output.remedy(" changed since the database was saved; 'vltctl scan --dry-run' lists them"));
  }
  return snapshot;
}

Json ToJson(const Component& c) {
  bool isDictionary = c.type == Type::Dictionary;
  bool wasInstalled = isDictionary && c.lastInstalledSchemaVersion != 0xFFFFFFFF;
  auto text = [](const std::optional<std::string>& value) { return value ? Json(*value) : Json(); };
  return {
      {"type", NameOf(c.type)},
      {"name", c.name},
      {"guid", c.guid},
      {"file", text(c.file)},
      {"schemaVersion", isDictionary ? Json(c.schemaVersion) : Json()},
      {"changed", isDictionary ? Json(c.fragmentRegistered != 0) : Json()},
      {"lastInstalledSchemaVersion", wasInstalled ? Json(c.lastInstalledSchemaVersion) : Json()},
      {"prefix", text(c.prefix)},
      {"pnp", text(c.pnp)},
      {"registrationFile", c.registrationFile.empty() ? Json() : Json(c.registrationFile)},
      {"classes", c.classes}};
}

// ---- Which component is meant

namespace {

std::string Folded(std::string text) {
  for (char& c : text) c = c >= 'a' && c <= 'z' ? static_cast<char>(c - 'a' + 'A') : c;
  return text;
}

std::string Bare(const std::string& guid) { return guid.size() == 38 ? guid.substr(1, 36) : guid; }

bool IsPathOf(const Component& component, const std::string& text) {
  std::string path = text;
  while (path.size() > 1 && path.back() == '/') path.pop_back();
  if (component.file == path || component.registrationFile == path) return true;
  return component.registrationFile == path + "/Resources/Info.vlr";
}

bool IsExact(const Component& component, const std::string& text) {
  return component.name == text || vlt::snapshot::ParseGuid(text) == component.guid ||
         IsPathOf(component, text);
}

bool BeginsLike(const Component& component, const std::string& text) {
  std::string start = Folded(text);
  std::string guid = start[0] == '{' ? start.substr(1) : start;
  return Folded(component.name).starts_with(start) || Bare(component.guid).starts_with(guid);
}

}  // namespace

std::vector<const Component*> Matches(const Snapshot& snapshot, const std::string& text) {
  std::vector<const Component*> exact, beginnings;
  for (const Component& component : snapshot.components) {
    if (text.empty()) break;
    if (IsExact(component, text)) exact.push_back(&component);
    if (BeginsLike(component, text)) beginnings.push_back(&component);
  }
  return exact.empty() ? beginnings : exact;
}

const Component& Only(const Snapshot& snapshot, const std::string& text) {
  std::vector<const Component*> found = Matches(snapshot, text);
  if (found.size() == 1) return *found[0];
  if (found.empty()) {
    throw Failure(vltctl::kNotFound, {"no-component", "", "no component " + text, "",
                                      "\"vltctl list\" shows all, and \"vltctl why\" says why"});
  }
  std::string all;
  for (const Component* component : found) {
    all += (all.empty() ? "" : ", ") + component->name + " " + component->guid;
  }
  throw Failure(vltctl::kNotFound,
                {"ambiguous", "", text + " may be any of " + all, "", "give more of the name"});
}

bool IsTypeWord(const std::string& word) {
  for (Type type : {Type::Dictionary, Type::ObjectExpert, Type::ResourceExpert}) {
    if (word == TypeWord(type)) return true;
  }
  return false;
}

std::string TypeWord(Type type) {
  std::string word = NameOf(type);
  std::replace(word.begin(), word.end(), ' ', '-');
  return word;
}

std::string FileOf(const Snapshot& snapshot, const Component& component) {
  const std::string file = component.file.value_or("");
  bool isInside = file.starts_with(snapshot.recordedRoot);
  return isInside ? snapshot.root + file.substr(snapshot.recordedRoot.size()) : file;
}

bool IsHere(const std::string& file) {
  return !HasChosenRoot() || file.starts_with(InstallDirectory() + "/");
}

std::string LibraryOf(const std::string& file) {
  struct stat info;
  if (file.empty() || !IsHere(file) || stat(file.c_str(), &info) != 0) return "";
  return S_ISDIR(info.st_mode) ? LibraryIn(file) : file;
}

const char* WordOf(vlt::snapshot::FileState state) {
  switch (state) {
    case vlt::snapshot::FileState::Unchanged:
      return "unchanged";
    case vlt::snapshot::FileState::New:
      return "new";
    case vlt::snapshot::FileState::Changed:
      return "changed";
    case vlt::snapshot::FileState::Vanished:
      break;
  }
  return "vanished";
}

// ---- --live

void WaitForRegistrar(const Arguments& arguments) {
  using Clock = std::chrono::steady_clock;
  if (HasChosenRoot()) {
    throw Failure(vltctl::kUsage, {"usage", "", "--live goes without --root",
                                   "a registrar is that of the installation in force", ""});
  }
  auto deadline = Clock::now() + std::chrono::seconds(arguments.number("--wait", 0));
  const std::string file = InstalledFile(vlt::layout::kDatabase);
  zt::fnd::osdep::Mutex mutex(IniFileLock::NameForFile(file.c_str()));
  while (!mutex.tryLock()) {
    if (Clock::now() >= deadline) {
      throw Failure(
          vltctl::kBusy,
          {"busy", file,
           "the registrar is " + vltctl::HeldBy(vltctl::LockTable().holders(LockFileOf(file))), "",
           "leave --live out, or wait for it with --wait SECONDS"});
    }
    timespec pause = {0, 20 * 1000000};
    nanosleep(&pause, nullptr);
  }
  mutex.unlock();
}

}  // namespace admin

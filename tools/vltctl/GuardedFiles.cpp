#include "tools/vltctl/GuardedFiles.h"

#include <errno.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <system_error>

#include "source/IniFileLock.h"
#include "tools/common/LockHolder.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/SharedObjectName.h"
#include "zt/fnd/osdep/SharedUnixObject.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using Kind = GuardedIniState::Kind;
using Opening = GuardedIniState::Opening;

constexpr GuardedIniKind kAnyKind = {};

struct KindRow {
  Kind kind;
  StateWords words;
};
constexpr const char* kRepair = "\"vltctl repair\" keeps the file and gives it a sidecar";
constexpr const char* kConvert = "\"vltctl repair\" converts it to UTF-8";
constexpr KindRow kKinds[] = {
    {Kind::Sound, {"sound", "the digest matches", ""}},
    {Kind::NoSidecar, {"no-sidecar", "there is no sidecar", ""}},
    {Kind::FirstSave, {"first-save", "the sidecar is the mark of a first save under way", ""}},
    {Kind::DurableCopy,
     {"durable-copy", "a scan has not ended, and NAME.durable is the last state on disk",
      "the next start of a registrar, or \"vltctl repair\", takes it"}},
    {Kind::DigestDiffers, {"digest-differs", "the digest differs", ""}},
    {Kind::Missing, {"missing", "the file is missing", ""}},
    {Kind::Unparsable, {"unparsable", "the file cannot be parsed", kConvert}},
    {Kind::UnparsableChanged,
     {"unparsable-changed", "the file cannot be parsed, and the digest differs", kConvert}},
    {Kind::Unreadable,
     {"unreadable", "the file cannot be read",
      "put a readable INI file in its place, or remove it"}},
    {Kind::SidecarShort, {"sidecar-short", "the sidecar is short", kRepair}},
    {Kind::SidecarDirectory, {"sidecar-directory", "the sidecar is a directory", kRepair}},
    {Kind::SidecarUnreadable,
     {"sidecar-unreadable", "the sidecar cannot be read", "check the disk"}},
};

struct OpeningRow {
  Opening opening;
  OpeningWords words;
};
constexpr OpeningRow kOpenings[] = {
    {Opening::Takes, {"takes", "takes the file as it is"}},
    {Opening::TakesCopy, {"takes-copy", "takes NAME.durable in its place"}},
    {Opening::Begins, {"begins", "makes an empty file"}},
    {Opening::SetsAsideAndBegins,
     {"sets-aside", "sets the file aside as .bad and begins an empty one"}},
    {Opening::SetsAsideAndFails,
     {"sets-aside-and-fails",
      "sets the file aside as .bad and fails; the one after it begins an empty one"}},
    {Opening::Fails, {"fails", "fails and leaves the file"}},
};

std::string Narrow(const wchar_t* text) { return zt::fnd::AnsiString(text).c_str(); }

}  // namespace

const StateWords& WordsOf(Kind kind) {
  return std::find_if(std::begin(kKinds), std::end(kKinds),
                      [&](const KindRow& row) { return row.kind == kind; })
      ->words;
}

const OpeningWords& WordsOf(Opening opening) {
  return std::find_if(std::begin(kOpenings), std::end(kOpenings),
                      [&](const OpeningRow& row) { return row.opening == opening; })
      ->words;
}

std::string WhyOf(const GuardedIniState& state) {
  if (state.error == EFBIG) return kTooLarge;
  return state.error ? WhyNotOpened(state.error) : "";
}

GuardedIniState Inspect(const std::string& file) {
  GuardedIniFile guarded(file, kAnyKind);
  GuardedIniState state = {};
  bool isDatabase = fs::path(file).filename() == Narrow(vlt::layout::kDatabase);
  ReadBetweenSaves(file,
                   [&] { state = isDatabase ? guarded.inspectDatabase() : guarded.inspect(); });
  return state;
}

std::vector<std::string> GuardedFiles() {
  const std::string data = InstalledFile(vlt::layout::kData) + "/";
  std::vector<std::string> files = {InstalledFile(vlt::layout::kDatabase),
                                    data + Narrow(vlt::layout::kJar),
                                    data + Narrow(vlt::layout::kSettings)};
  const std::string unguarded = data + Narrow(vlt::layout::kDiagnostics);
  std::error_code missing;
  std::vector<std::string> more;
  for (fs::directory_iterator entry(data, missing), end; !missing && entry != end;
       entry.increment(missing)) {
    std::string file = data + entry->path().filename().string();
    bool isKnown = std::find(files.begin(), files.end(), file) != files.end();
    if (file.ends_with(".ini") && !isKnown && file != unguarded) more.push_back(file);
  }
  std::sort(more.begin(), more.end());
  files.insert(files.end(), more.begin(), more.end());
  return files;
}

vltctl::Failure CannotWrite(const std::string& file, int error) {
  return {vltctl::kCannotWrite,
          {"cannot-write", file, "cannot be written", error ? strerror(error) : "",
           "check the rights to its directory and the space on the disk"}};
}

void ThrowCannotOpen(const std::string& file) {
  // Its directory is made with it: what decides is the nearest thing that is there.
  fs::path what = file;
  while (access(what.c_str(), F_OK) != 0 && what.has_relative_path()) what = what.parent_path();
  throw CannotWrite(file, access(what.c_str(), W_OK) == 0 ? 0 : errno);
}

FileHold::FileHold(const std::string& file) : m_mutex(IniFileLock::NameForFile(file.c_str())) {
  if (m_mutex.tryLock()) return;
  std::string holder = vltctl::HeldBy(vltctl::LockTable().holders(LockFileOf(file)));
  throw vltctl::Failure(vltctl::kBusy, {"busy", file, "its lock is " + holder, "",
                                        "end that process, or try again later"});
}

namespace {

void ExpectDirectory(const std::string& directory) {
  struct stat info;
  if (stat(directory.c_str(), &info) != 0) {
    // A missing one is made.
    if (errno == ENOENT) return;
    throw vltctl::Failure(vltctl::kDataUnusable,
                          {"directory", directory, "cannot be entered", strerror(errno),
                           "give this user the right to its path, or run as its owner"});
  }
  if (S_ISDIR(info.st_mode)) return;
  throw vltctl::Failure(vltctl::kDataUnusable, {"directory", directory, "is no directory", "",
                                                "move what is there out of the way"});
}

// Whether the database could be made where there is none.
void ExpectWritable(const std::string& directory) {
  if (access(directory.c_str(), W_OK) == 0 || errno == ENOENT) return;
  throw vltctl::Failure(vltctl::kDataUnusable,
                        {"not-writable", directory, "the database cannot be made", strerror(errno),
                         "run \"vltctl list --live\" once as a user who may write there"});
}

}  // namespace

void ExpectUsableDatabase() {
  const std::string root = InstallDirectory();
  if (root.empty()) throw NoInstallDirectory();
  ExpectDirectory(root);
  ExpectDirectory(InstalledFile(vlt::layout::kData));
  const std::string database = InstalledFile(vlt::layout::kDatabase);
  GuardedIniState state = Inspect(database);
  if (state.opening == Opening::Fails || state.opening == Opening::SetsAsideAndFails) {
    const StateWords& words = WordsOf(state.kind);
    throw vltctl::Failure(vltctl::kDataUnusable,
                          {words.code, database, words.found, WhyOf(state), words.next});
  }
  if (state.kind == Kind::Missing) ExpectWritable(root);
  ExpectFree(database);
}

std::string LockFileOf(const std::string& guardedFile) {
  zt::fnd::String name = IniFileLock::NameForFile(guardedFile.c_str());
  std::string base = Narrow(zt::fnd::osdep::GetSharedUnixBase().c_str());
  return base + "/mutex/" + zt::fnd::osdep::SharedObjectFileName(name).c_str();
}

}  // namespace admin

#include "tools/vltctl/GuardedFiles.h"

#include <string.h>

#include <algorithm>
#include <filesystem>
#include <system_error>

#include "source/IniFileLock.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/SharedObjectName.h"
#include "zt/fnd/osdep/SharedUnixObject.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using Kind = GuardedIniState::Kind;
using Opening = GuardedIniState::Opening;

constexpr GuardedIniKind kAnyKind = {.useEscapes = false,
                                     .otherFailure = E_FAIL,
                                     .refusedMessage = nullptr,
                                     .otherFailureMessage = nullptr,
                                     .openSignature = nullptr,
                                     .openPoint = nullptr,
                                     .retryPoint = nullptr,
                                     .writtenPoint = nullptr,
                                     .sealedPoint = nullptr};

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
    {Kind::DigestDiffers, {"digest-differs", "the digest differs", ""}},
    {Kind::Missing, {"missing", "the file is missing", ""}},
    {Kind::Unparsable, {"unparsable", "the file cannot be parsed", kConvert}},
    {Kind::UnparsableChanged,
     {"unparsable-changed", "the file cannot be parsed, and the digest differs", kConvert}},
    {Kind::Unreadable,
     {"unreadable", "the file cannot be read", "make it a file that every user can read"}},
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
  ReadBetweenSaves(file, [&] { state = guarded.inspect(); });
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

std::string LockFileOf(const std::string& guardedFile) {
  zt::fnd::String name = IniFileLock::NameForFile(guardedFile.c_str());
  std::string base = Narrow(zt::fnd::osdep::GetSharedUnixBase().c_str());
  return base + "/mutex/" + zt::fnd::osdep::SharedObjectFileName(name).c_str();
}

}  // namespace admin

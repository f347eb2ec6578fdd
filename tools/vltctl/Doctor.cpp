// doctor: what is good, doubtful and bad about this installation and machine, and what to do.
#include <errno.h>
#include <langinfo.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <utility>

#include "source/Common/Posix/vltlinuxos.h"
#include "tools/common/Locale.h"
#include "tools/common/LockHolder.h"
#include "tools/common/Progress.h"
#include "tools/vltctl/GuardedFiles.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/SharedUnixObject.h"

namespace admin {
namespace {

enum class Level { Ok, Warn, Bad };
constexpr const char* kLevels[] = {"ok", "warn", "BAD"};

vltctl::Mood MoodOf(Level level) {
  if (level == Level::Ok) return vltctl::Mood::Good;
  return level == Level::Warn ? vltctl::Mood::Doubtful : vltctl::Mood::Bad;
}

struct Sign {
  Level level;
  std::string code, what, where, next;
};

using Signs = std::vector<Sign>;

std::string Narrow(const zt::fnd::String& text) { return zt::fnd::AnsiString(text).c_str(); }

void CheckDirectory(const std::string& name, const std::string& path, Signs* signs) {
  struct stat info;
  if (stat(path.c_str(), &info) != 0 && errno == ENOENT) {
    signs->push_back({Level::Warn, "directory-missing", name + " is missing", path,
                      "it is made by the first start that may make it"});
  } else if (errno = 0; stat(path.c_str(), &info) != 0 || !S_ISDIR(info.st_mode)) {
    signs->push_back({Level::Bad, "directory-unusable",
                      name + (errno ? std::string(" cannot be entered: ") + strerror(errno)
                                    : std::string(" is no directory")),
                      path, "put a directory there that every user can enter"});
  } else if (access(path.c_str(), R_OK | X_OK) != 0) {
    signs->push_back(
        {Level::Bad, "directory-closed", name + " is closed to this user", path, "chmod a+rx it"});
  } else {
    signs->push_back({Level::Ok, "directory", name, path, ""});
  }
}

void CheckInstallation(Signs* signs) {
  const std::string root = InstallDirectory();
  if (root.empty()) {
    signs->push_back({Level::Bad, "no-install-directory", "the preference \"Dir\" is empty",
                      PreferenceFile(), "set it to the install directory"});
    return;
  }
  CheckDirectory("the install directory", root, signs);
  for (const auto& [name, place] :
       {std::pair{"the directory of dictionaries", vlt::layout::kDictionaries},
        {"the directory of experts", vlt::layout::kExperts},
        {"the data directory", vlt::layout::kData}}) {
    CheckDirectory(name, InstalledFile(place), signs);
  }
}

void CheckGuardedFile(const std::string& file, Signs* signs) {
  GuardedIniState state = Inspect(file);
  const StateWords& words = WordsOf(state.kind);
  std::string why = WhyOf(state), what = words.found + (why.empty() ? "" : ": " + why);
  bool isTaken = state.opening == GuardedIniState::Opening::Takes ||
                 state.opening == GuardedIniState::Opening::TakesCopy;
  if (!isTaken && state.kind != GuardedIniState::Kind::Missing) {
    signs->push_back({Level::Bad, words.code, what, file, words.next});
  } else if (state.kind == GuardedIniState::Kind::DurableCopy) {
    signs->push_back({Level::Warn, words.code, what, file, words.next});
  } else if (state.kind == GuardedIniState::Kind::DigestDiffers) {
    signs->push_back(
        {Level::Warn, words.code, what, file,
         "a save was cut short, or it was edited by hand: \"vltctl repair\" seals it"});
  } else if (isTaken) {
    signs->push_back({Level::Ok, words.code, what, file, ""});
  }
}

void CheckFiles(Signs* signs) {
  if (InstallDirectory().empty()) return;
  for (const std::string& file : GuardedFiles()) CheckGuardedFile(file, signs);
  const std::string database = InstalledFile(vlt::layout::kDatabase);
  if (HasChosenRoot()) return;  // The machine's own locks are of other paths.
  auto holders = vltctl::LockTable().holders(LockFileOf(database));
  if (!holders.empty()) {
    signs->push_back(
        {Level::Ok, "in-use", "the database is " + vltctl::HeldBy(holders), database, ""});
  }
}

void CheckHooks(Signs* signs) {
  if (InstallDirectory().empty()) return;
  const std::string file = InstalledFile(vlt::layout::kHookFile);
  auto armed = Document(ReadGuarded(file).bytes).get("Hook", "Name");
  if (armed) {
    signs->push_back({Level::Warn, "hook-armed", "fault injection is armed: " + *armed, file,
                      "\"vltctl hook clear\" disarms it"});
  }
}

void CheckSpace(Signs* signs) {
  constexpr unsigned kLeastPercent = 1;
  const std::string root = InstallDirectory();
  struct statvfs info;
  if (root.empty() || statvfs(root.c_str(), &info) != 0 || info.f_blocks == 0) return;
  bool isShort = info.f_bavail * 100 < info.f_blocks * kLeastPercent;
  signs->push_back({isShort ? Level::Bad : Level::Ok, isShort ? "disk-full" : "disk",
                    isShort ? "less than 1 % of the disk is free" : "the disk has space", root,
                    isShort ? "free some: saves fail without it" : ""});
}

void CheckShared(Signs* signs) {
  const std::string base = Narrow(zt::fnd::osdep::GetSharedUnixBase());
  for (const char* name : {"/mutex", "/namedEvent"}) {
    const std::string path = base + name;
    struct stat info;
    if (stat(path.c_str(), &info) != 0) continue;  // made when it is needed
    bool isOpen = S_ISDIR(info.st_mode) && (info.st_mode & 0777) == 0777;
    signs->push_back({isOpen ? Level::Ok : Level::Bad, isOpen ? "shared" : "shared-closed",
                      isOpen ? "locks and events are shared with all users"
                             : "other users cannot share locks and events",
                      path, isOpen ? "" : "chmod 0777 it"});
  }
}

void CheckProcess(Signs* signs) {
  bool isReplaced = vltctl::LocaleWasReplaced();
  signs->push_back(
      {isReplaced ? Level::Warn : Level::Ok, isReplaced ? "no-locale" : "locale",
       isReplaced
           ? "the environment has no UTF-8 locale: programs started with it do not find names "
             "beyond ASCII"
           : std::string("the locale's encoding is ") + nl_langinfo(CODESET),
       "LANG", isReplaced ? "set LANG=C.UTF-8 for services and cron jobs" : ""});
  const std::string logs = Narrow(vlLogDirectory());
  if (access(logs.c_str(), F_OK) == 0 && access(logs.c_str(), W_OK) != 0) {
    signs->push_back({Level::Warn, "log-closed", "this user's log cannot be written", logs,
                      "give the user the right to write there"});
  }
  if (access("/proc/self", F_OK) != 0) {
    signs->push_back({Level::Warn, "no-proc", "there is no /proc: holders of locks are not named",
                      "/proc", "mount it"});
  }
}

Signs AllSigns() {
  vltctl::Waiting waiting("examining the installation");
  Signs signs;
  for (auto check : {CheckInstallation, CheckFiles, CheckHooks, CheckSpace}) check(&signs);
  if (!HasChosenRoot()) {
    for (auto check : {CheckShared, CheckProcess}) check(&signs);
  }
  return signs;
}

}  // namespace

int Doctor(const Arguments&, Output& output) {
  const Signs signs = AllSigns();
  vltctl::Table table;
  bool isBad = false;
  for (const Sign& sign : signs) {
    const char* level = kLevels[static_cast<int>(sign.level)];
    isBad = isBad || sign.level == Level::Bad;
    const std::string next = output.remedy(sign.next);
    table.add({level, sign.what, sign.where, next}, MoodOf(sign.level));
    output.item({{"level", level},
                 {"code", sign.code},
                 {"what", sign.what},
                 {"where", sign.where},
                 {"next", next.empty() ? vltctl::Json() : vltctl::Json(next)}});
  }
  output.print(table);
  return isBad ? vltctl::kNotFound : vltctl::kGood;
}

}  // namespace admin

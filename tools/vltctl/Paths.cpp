// paths: every place of the installation and of this machine, and what decides it.
#include <errno.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/vlIniMgr.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"
#include "vlloader/source/InstallLayout.h"
#include "vlloader/source/Preference.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/SharedUnixObject.h"

namespace admin {
namespace {

using zt::fnd::String;

std::string Narrow(const String& text) { return zt::fnd::AnsiString(text).c_str(); }

std::string StateOf(const std::string& path) {
  struct stat info;
  if (path.empty()) return "none";
  if (stat(path.c_str(), &info) != 0) return errno == ENOENT ? "missing" : strerror(errno);
  if (S_ISDIR(info.st_mode)) return "directory";
  return S_ISREG(info.st_mode) ? "file" : "neither file nor directory";
}

}  // namespace

std::string PreferenceFile() {
  std::string file;
  vlReadPreference(kKorPreferenceDomain, "Dir", &file);
  return file;
}

std::vector<Place> Places() {
  std::string preference;
  bool isSet = vlReadPreference(kKorPreferenceDomain, "Dir", &preference).has_value();
  const std::string root = InstallDirectory();
  std::vector<Place> places;
  if (HasChosenRoot()) {
    places = {{"install directory", root, "--root"}};
  } else {
    places = {{"preference", preference,
               isSet ? "the first that sets \"Dir\"" : "none of the places has \"Dir\""},
              {"install directory", root, isSet ? preference : "built-in default"}};
  }
  if (!root.empty()) {
    const std::string below = "below the install directory";
    const std::string database = InstalledFile(vlt::layout::kDatabase);
    const std::string dictionaries = InstalledFile(vlt::layout::kDictionaries);
    for (const Place& place :
         {Place{"database", database, below},
          {"its sidecar", CvlIniMgr::SidecarName(database), below},
          {"dictionaries", dictionaries, below},
          {"previous dictionaries", dictionaries + "/" + Narrow(vlt::layout::kPreviousDictionaries),
           below},
          {"experts", InstalledFile(vlt::layout::kExperts), below},
          {"fault injection", InstalledFile(vlt::layout::kHookFile), below},
          {"data", InstalledFile(vlt::layout::kData), below},
          {"jar", DataFile(Narrow(vlt::layout::kJar)), below},
          {"settings", DataFile(Narrow(vlt::layout::kSettings)), below}}) {
      places.push_back(place);
    }
  }
  if (HasChosenRoot()) return places;
  places.push_back({"log options", Narrow(vlDiagnosticsIni()), "the default install directory"});
  places.push_back({"log directory", Narrow(vlLogDirectory()),
                    geteuid() == 0 ? "the superuser's" : "below the user's home"});
  const std::string base = Narrow(zt::fnd::osdep::GetSharedUnixBase());
  const char* variable = secure_getenv("ZTFNDTMPSHAREDFILEDIR");
  bool isChosen = variable && variable[0] == '/';
  const std::string origin = isChosen ? "ZTFNDTMPSHAREDFILEDIR" : "built-in default";
  places.push_back({"locks", base + "/mutex", origin});
  places.push_back({"events", base + "/namedEvent", origin});
  return places;
}

int Paths(const Arguments&, Output& output) {
  vltctl::Table table;
  for (const Place& place : Places()) {
    std::string state = StateOf(place.path);
    table.add({place.name, place.path.empty() ? "-" : place.path, state, place.origin});
    output.item({{"name", place.name},
                 {"path", place.path.empty() ? vltctl::Json() : vltctl::Json(place.path)},
                 {"state", state},
                 {"origin", place.origin}});
  }
  output.print(table);
  return vltctl::kGood;
}

}  // namespace admin

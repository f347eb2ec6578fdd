#include "tools/vltctl/Root.h"

#include <string.h>

#include <filesystem>
#include <system_error>

#include "tools/common/Output.h"
#include "vlloader/source/vlloader.h"

namespace admin {
namespace {

namespace fs = std::filesystem;

std::string s_chosen;

bool IsBelow(const fs::path& path, const fs::path& directory) {
  fs::path rest = path.lexically_relative(directory);
  return !rest.empty() && *rest.begin() != "..";
}

// A link that leads nowhere counts by what it names: a file may be there at the next moment.
void Follow(const fs::path& link, const fs::path& directory) {
  std::error_code circle;
  fs::path named = fs::read_symlink(link, circle);
  fs::path target = fs::weakly_canonical(link.parent_path() / named, circle);
  if (circle || IsBelow(target, directory)) return;
  throw vltctl::Failure(
      vltctl::kDataUnusable,
      {"leads-out", link, "is a link out of the image, to " + target.string(),
       "the machine of the image has another file there", "put a copy of that file in its place"});
}

}  // namespace

void ExpectNoWayOut() {
  if (!HasChosenRoot()) return;
  std::error_code hidden;
  const fs::path directory = fs::canonical(s_chosen, hidden);
  // Links to directories are not entered.
  for (fs::recursive_directory_iterator
           entry(s_chosen, fs::directory_options::skip_permission_denied, hidden),
       end;
       !hidden && entry != end; entry.increment(hidden)) {
    std::error_code gone;
    if (entry->is_symlink(gone)) Follow(entry->path(), directory);
  }
}

void ChooseRoot(const vltctl::Arguments& arguments, MissingRoot missing) {
  if (!arguments.has("--root")) return;
  const std::string given = arguments.text("--root");
  std::error_code error;
  bool isThere = fs::is_directory(given, error);
  if (!isThere && missing == MissingRoot::Failure) {
    throw vltctl::Failure(
        vltctl::kDataUnusable,
        {"no-directory", given, "is no directory", error ? strerror(error.value()) : "",
         "give the install directory, the one with vlt.vlr, as --root"});
  }
  s_chosen = fs::absolute(given).lexically_normal();
  while (s_chosen.size() > 1 && s_chosen.ends_with('/')) s_chosen.pop_back();
  ExpectNoWayOut();
}

bool HasChosenRoot() { return !s_chosen.empty(); }

std::string InstallDirectory() { return HasChosenRoot() ? s_chosen : vlLookUpInstallDirectory(); }

}  // namespace admin

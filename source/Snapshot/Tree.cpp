#include "source/Snapshot/Tree.h"

#include <dirent.h>
#include <errno.h>

#include <memory>

#include "source/Database/databaseText.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/osdep/FindFiles.h"
#include "zt/posix/Files.h"

using registrar::Narrow;
using registrar::Widen;
using zt::fnd::String;

namespace vlt::snapshot {
namespace {

// A directory that is not there is empty.
bool CanBeListed(const String& directory, Tree* tree) {
  std::string path = Narrow(directory);
  if (zt::posix::OpenDirectory(path.c_str())) return true;
  int error = errno;
  if (error != ENOENT) tree->problems.push_back({Utf8(path), error});
  return false;
}

void AddFiles(const Place& place, const String& directory, const wchar_t* mask, Tree* tree) {
  if (!CanBeListed(directory, tree)) return;
  registrar::RegistrationFiles found;
  registrar::AppendRegistrationFiles(directory, String(mask), found);
  for (const auto& [file, time] : found) {
    std::string here = Narrow(file);
    tree->files.push_back({here, place.toRecorded(here), time});
  }
}

}  // namespace

Tree ReadTree(const Place& place) {
  Tree tree;
  String root = Widen(place.here);
  String dictionaries = layout::DirectoryIn(root, layout::kDictionaries);
  AddFiles(place, dictionaries, L"*.framework", &tree);
  AddFiles(place, layout::DirectoryIn(root, layout::kExperts), L"*.vle", &tree);
  String last = layout::DirectoryIn(dictionaries, layout::kPreviousDictionaries);
  if (CanBeListed(last, &tree)) {
    for (const String& name : zt::fnd::osdep::FindFiles().getFilenames(last + L"*.framework")) {
      tree.previousDictionaries.push_back(Narrow(name));
    }
  }
  return tree;
}

std::string RecordedRoot(const std::string& bytes, const std::string& fallback) {
  IniDocument document(true);
  std::string file;
  if (document.Parse(bytes) != 0 ||
      document.GetItem(registrar::kBuiltInDictionary, registrar::kFileName, &file) < 0) {
    return fallback;
  }
  std::string below = *registrar::BuiltInDictionary(Narrow(layout::kDictionaries) + "/").file;
  if (file.size() <= below.size() || file[0] != '/' ||
      file.compare(file.size() - below.size(), below.size(), below) != 0) {
    return fallback;
  }
  return file.substr(0, file.size() - below.size());
}

}  // namespace vlt::snapshot

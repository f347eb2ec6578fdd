#include "vlloader/source/InstallLayout.h"

#include "vlloader/source/vlloader.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::String;
using zt::fnd::osdep::path;

namespace vlt::layout {

String InstallRoot() {
  // The directory of the first call, which stays until a clean-up: all paths of a process belong to
  // one installation.
  const char* text = GetCurrentVltPath();
  String root(text ? text : "");
  if (!root.empty()) path::MakePathEndInSlash(root);
  return root;
}

String FileIn(const String& directory, const wchar_t* name) {
  String file(directory);
  // Callers have directories with and without the slash.
  path::MakePathEndInSlash(file);
  return file + name;
}

String DirectoryIn(const String& directory, const wchar_t* name) {
  return FileIn(directory, name) + L"/";
}

}  // namespace vlt::layout

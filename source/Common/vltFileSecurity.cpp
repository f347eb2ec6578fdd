#include "source/Common/vltFileSecurity.h"

#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <string>

#include "source/Common/Posix/ChangeMode.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/DateTime.h"
#include "zt/fnd/osdep/FindFiles.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::AnsiString;
using zt::fnd::String;
using zt::fnd::osdep::path;

namespace {

// Leaves the status alone if there are no entries; else it becomes that of the last one visited.
void SecureEntries(const String& directory, int mode, HRESULT* status) {
  zt::fnd::Vector<String> entries =
      zt::fnd::osdep::FindFiles().getFilenames(path::Join(directory, String(L"*")));
  String self = path::Join(directory, String(L"."));
  String parent = path::Join(directory, String(L".."));
  for (const String& entry : entries) {
    if (entry.exactCompare(self) == 0 || entry.exactCompare(parent) == 0) continue;
    *status = vltSetFileSecurityImpl(entry, mode, true);
    if (*status < 0) break;
  }
}

// Made aside, opened up, and put in its place: a process that is killed between making a directory and
// opening it up would leave one that no other user can ever enter. False, and nothing left, where that
// cannot be done; the plain way then tells why, or makes the levels above it.
bool MakeOpenDirectory(const String& directory) {
  std::string target = AnsiString(directory).c_str();
  target.erase(target.find_last_not_of('/') + 1);
  std::string aside = target + ".XXXXXX";
  if (target[0] != '/' || !mkdtemp(aside.data())) return false;
  if (vlChangeModeNoFollow(aside.c_str(), kSharedMode) == 0 &&
      rename(aside.c_str(), target.c_str()) == 0) {
    return true;
  }
  rmdir(aside.c_str());
  return false;
}

}  // namespace

HRESULT vltSetFileSecurityImpl(const String& path, int mode, bool recursive) {
  HRESULT status = vlrSetFileSecurity(path, mode);
  if (!recursive || !path::IsDirectory(path.c_str()) || path::IsSymLink(path.c_str()))
    return status;
  try {
    SecureEntries(path, mode, &status);
    return status;
  } catch (const std::exception&) {
    return E_FAIL;  // Entries come and go while others work here; the caller only learns that it
                    // failed.
  }
}

HRESULT vlrSetFileSecurity(const String& path, int mode) {
  return vlChangeModeNoFollow(AnsiString(path).c_str(), mode) == 0 ? S_OK : E_FAIL;
}

HRESULT vltMakeSharedDirectory(const String& directory) {
  if (path::IsDirectory(directory.c_str()) || MakeOpenDirectory(directory)) return S_OK;
  try {
    path::CreateDir(directory.c_str());
  } catch (const zt::fnd::exception::ObjectAlreadyExists&) {
    // Another process was first, which is as good. A file in its place is not.
    if (!path::IsDirectory(directory.c_str())) throw;
  }
  return vltSetFileSecurityImpl(directory, kSharedMode, false);
}

String vlrGetCurrentLocalTime() {
  constexpr auto kLocal = static_cast<zt::fnd::osdep::TimeStringType>(1);
  return zt::fnd::osdep::AbsTimeToString(zt::fnd::osdep::CurrentSystemTime(), L"_%m%d%Y", L"", 0,
                                         kLocal, false, nullptr, 0);
}

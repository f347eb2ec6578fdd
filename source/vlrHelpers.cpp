#include "source/vlrHelpers.h"

#include <string.h>
#include <wchar.h>

#include "zt/fnd/Exception.h"
#include "zt/fnd/Guid.h"
#include "zt/fnd/osdep/FileTime.h"
#include "zt/fnd/osdep/FindFiles.h"
#include "ztcom/ztcore/ztmemmgr.h"

using zt::fnd::String;

String vlrGuidToString(GUID guid) {
  String text;
  zt::fnd::Guid(guid).toString(text);
  return text;
}

GUID vlrGuidFromString(const String& text) {
  try {
    // The database keeps GUIDs without braces, registration files may have either form.
    bool hasBrace = text.find(L'{') != String::npos;
    return zt::fnd::Guid(hasBrace ? text : String(L"{") + text + L"}").get();
  } catch (const zt::fnd::exception::BadGuidString&) {
    // Bad text is no failure here: the component is registered under the null GUID.
    return GUID_NULL;
  }
}

zt::fnd::AbsTime vlrGetFileModificationTime(const String& path) {
  return zt::fnd::osdep::GetFileLastWriteTime(path);
}

HRESULT vlrDuplicateString(const wchar_t* source, wchar_t** target) {
  if (!source || !target) return E_POINTER;
  size_t sizeBytes = (wcslen(source) + 1) * sizeof(wchar_t);
  void* copy = ZtTaskMemAlloc(sizeBytes);
  if (!copy) return E_OUTOFMEMORY;
  memcpy(copy, source, sizeBytes);
  *target = static_cast<wchar_t*>(copy);
  return S_OK;
}

namespace {

HRESULT ListNames(const String& mask, zt::fnd::Vector<String>& names) {
  // By swap: an exception leaves the caller's list as it was.
  zt::fnd::Vector<String> found = zt::fnd::osdep::FindFiles().getFilenames(mask);
  names.swap(found);
  return names.size() ? S_OK : S_FALSE;
}

}  // namespace

HRESULT vlrGetComponentNamesFromDirectory(const String& directory, const String& extension,
                                          zt::fnd::Vector<String>& names) {
  // FindFiles takes either separator; a directory of this form ends in none.
  return ListNames(directory + L"\\*." + extension, names);
}

HRESULT vltGetComponentNamesFromDirectory(const String& directory, const String& extension,
                                          zt::fnd::Vector<String>& names) {
  return ListNames(directory + L"*." + extension, names);
}

#pragma once

// Text helpers of the registrar, over those of the database.

#include "source/Database/databaseText.h"
#include "source/vlrHelpers.h"
#include "ztcom/ztcore/ztmemmgr.h"

namespace registrar {

// A record's text that is a copy; null for null, and where memory is out.
inline wchar_t* CopyOf(const wchar_t* text) {
  wchar_t* copy = nullptr;
  if (text) vlrDuplicateString(text, &copy);
  return copy;
}

// Frees the record's text and puts a copy in its place.
inline void ReplaceText(wchar_t** text, const wchar_t* by) {
  wchar_t* copy = CopyOf(by);
  ZtTaskMemFree(*text);
  *text = copy;
}

}  // namespace registrar

// The directory `name` below the root, ending in a slash, made if it was missing. Its code is that
// of the mode change, or E_FAIL where the rights to make it are missing. Without a root the text is
// empty, and the code E_FAIL.
HRESULT vlrMakeRootDirectory(const wchar_t* name, zt::fnd::String* directory);

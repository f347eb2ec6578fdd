#pragma once

// Small helpers of all registrar code.

#include "source/Common/vltTypes.h"
#include "zt/fnd/AbsTime.h"
#include "zt/fnd/String.h"
#include "zt/fnd/Vector.h"

// "{38 characters}", upper case.
zt::fnd::String vlrGuidToString(GUID guid);
// Braces are added if the text has no "{". The null GUID for bad text.
GUID vlrGuidFromString(const zt::fnd::String& text);
zt::fnd::AbsTime vlrGetFileModificationTime(const zt::fnd::String& path);
// Copy in a ZtTaskMemAlloc block. E_POINTER, E_OUTOFMEMORY; *target is then untouched.
HRESULT vlrDuplicateString(const wchar_t* source, wchar_t** target);
// Full paths of the entries that match directory + "\*." + extension. S_OK, or S_FALSE if there are
// none.
HRESULT vlrGetComponentNamesFromDirectory(const zt::fnd::String& directory,
                                          const zt::fnd::String& extension,
                                          zt::fnd::Vector<zt::fnd::String>& names);
// The same with directory + "*." + extension: the directory ends in a slash.
HRESULT vltGetComponentNamesFromDirectory(const zt::fnd::String& directory,
                                          const zt::fnd::String& extension,
                                          zt::fnd::Vector<zt::fnd::String>& names);

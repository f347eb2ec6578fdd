#pragma once

// The files that the system writes for itself belong to all users of the machine: they are opened
// up after each change. The functions here do that, and stamp files that are given up.

#include "source/Common/vltTypes.h"
#include "zt/fnd/String.h"

// Mode of every shared file and directory.
inline constexpr int kSharedMode = 0777;

// Gives the path, and with `recursive` what a directory holds, these permission bits. A symbolic
// link is neither changed nor followed, and counts as done. Entries whose name starts with a dot
// are not visited. The first failure ends the walk: E_FAIL. Every change is made through a
// descriptor, so that no other user can lead it out of the tree.
HRESULT vltSetFileSecurityImpl(const zt::fnd::String& path, int mode, bool recursive);

// For the shared files: the path alone, and neither a file with a second name nor one that neither
// root nor the caller owns. S_OK or E_FAIL.
HRESULT vlrSetFileSecurity(const zt::fnd::String& path, int mode);

// Makes the directory, with the missing ones above it, which get mode 0755, unless it is there. Its
// mode becomes kSharedMode; the result is that of the mode change. A process that is killed here leaves the
// directory open to all or not there, where the level above it was there before. Throws what
// path::CreateDir throws.
HRESULT vltMakeSharedDirectory(const zt::fnd::String& directory);

// "_%m%d%Y" of the local time, "_11142026".
zt::fnd::String vlrGetCurrentLocalTime();

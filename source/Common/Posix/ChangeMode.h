#pragma once

// Sets the permission bits of what the path names, but never through a symbolic link as its last
// component: a link, and what it points to, stay as they are, and that counts as done. 0, or -1
// with errno.
int vlChangeModeNoFollow(const char* path, int mode);

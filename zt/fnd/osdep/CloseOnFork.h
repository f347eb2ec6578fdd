#pragma once

#include "zt/fnd/StringFwd.h"
#include "zt/fnd/osdep/ScopedFd.h"

// Descriptors that a forked child does not keep (O_CLOFORK, which Linux lacks).
//
// A lock of flock() belongs to the open file, which a child of fork() shares: as long as the child
// lives, the lock of a parent that was killed would last. A marked descriptor is closed in the child
// before fork() returns there, which leaves the parent's lock alone. Its number means nothing in the
// child any more: owners there let go of it without closing. A process made without fork()'s
// handlers keeps the descriptor. Threads: any.
namespace zt {
namespace fnd {
namespace osdep {

// CreateSharedUnixFile, with the descriptor marked before any fork can copy it. Throws what that
// throws, and std::bad_alloc.
ScopedFd CreateSharedUnixFileCloseOnFork(const AnsiString& path);

// Takes the mark off; before the descriptor is closed, as its number may serve another file then.
void KeepOnFork(int fd) noexcept;

// Marks a descriptor again that was marked at its opening.
void CloseOnForkAgain(int fd) noexcept;

}  // namespace osdep
}  // namespace fnd
}  // namespace zt

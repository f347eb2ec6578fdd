#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <cstddef>
#include <optional>
#include <utility>

#include "zt/posix/ScopedFd.h"

// Files in places that other users can write: the one rule for all of them.
//
// 1. A symbolic link, also in the middle of a path, counts only if root, the caller (the effective
//    user) or the owner of what it leads to owns it. Any other one is refused with ELOOP. So a user
//    can lead a privileged process to files of that user only.
// 2. What is neither a regular file nor, where one is asked for, a directory is never opened, not
//    even to examine it: a device may act on being opened, and a pipe may wait.
// 3. No mode is changed of a file that has a second name, or that neither root nor the caller owns.
//
// Every descriptor is close-on-exec, never becomes a controlling terminal, and is 3 or more: a host
// may have closed its standard streams, and what it prints must not end in a file of ours.
//
// Nothing here throws or allocates through operator new; failures are -1, or an invalid descriptor,
// with errno. Interrupted calls are made again. Threads: any.
namespace zt::posix {

// ---- Opening

enum class Kind { File, FileOrDirectory };

// Whether a link in the last place is judged by rule 1, or refused (ELOOP) whoever owns it.
enum class LastLink { Judged, Refused };

// An existing file, opened with the access mode and the flags given. EISDIR or ENXIO for what it
// must not be.
ScopedFd OpenExisting(const char* path, int flags, Kind kind = Kind::File,
                      LastLink link = LastLink::Judged);

// A file that was not there before: EEXIST if the path names anything, a dangling link included.
ScopedFd CreateNew(const char* path, int flags, mode_t mode);

// An existing file, or a new one. A dangling link is refused with ELOOP: nothing is made where it
// leads.
ScopedFd OpenOrCreate(const char* path, int flags, mode_t mode, LastLink link = LastLink::Judged);

ScopedFd OpenDirectory(const char* path);

// The directory of a Found, opened for reading.
ScopedFd OpenDirectory(int fd);

// What a path names, held without being opened: whoever replaces a part of the path changes nothing
// about it.
struct Found {
  Found() = default;  // nothing
  Found(ScopedFd held) : fd(std::move(held)) {}
  Found(const struct stat& info) : unheld(info) {}

  explicit operator bool() const { return fd.valid() || unheld; }

  // As fstat(2). False with errno; nothing found keeps that of the look-up.
  bool examine(struct stat* info) const;

  // For *at() calls, fstat and ChangeMode only.
  ScopedFd fd;
  // The state of what the system cannot hold: never set on Linux.
  std::optional<struct stat> unheld;
};

// `follow` false: a link in the last place is the thing itself.
Found LookUp(const char* path, bool follow = true);

// The same for an entry of a directory; a link is the thing itself. `flags`: O_DIRECTORY, or none.
Found LookUpEntry(int directory, const char* name, int flags = 0);

// The descriptor, or a copy of it that is 3 or more.
ScopedFd AboveStandardStreams(ScopedFd fd);

// ---- Entries of directories

// The directory that holds an entry, and the entry's name in it: what happens to the entry then
// happens in this very directory, whoever replaces a part of the path meanwhile. `name` points into
// the path.
struct Entry {
  explicit Entry(const char* path);
  bool valid() const { return directory.valid(); }

  ScopedFd directory;
  const char* name;
};

// As CreateNew, unlink(2), and rename(2) to a name in the same directory.
ScopedFd CreateNew(const Entry& entry, int flags, mode_t mode);
int Unlink(const Entry& entry);
int RenameBeside(const Entry& from, const char* name);

// As rename(2), unlink(2) and link(2).
int Rename(const char* from, const char* to);
int Unlink(const char* path);
int Link(const char* existing, const char* path);

// rename(2) inside a directory that replaces nothing: EEXIST where `to` is taken.
int RenameToNew(int directory, const char* from, const char* to);

// Renames what is at the path to path + stamp + ".bad", or path + stamp + ".1.bad" and so on where
// that is taken: nothing is replaced.
int MoveAside(const char* path, const char* stamp = "");

// unlink(2) of what is at the path; a directory is moved aside. Nothing there counts as done.
int MakeRoom(const char* path);

// ---- Modes

// Gives the file or directory of the descriptor (that of a Found will do) these bits by rule 3,
// unless it has them: EPERM or EMLINK for what the rule excludes.
int SetSharedMode(int fd, mode_t mode);

// The same where fstat() of the descriptor is known.
int SetSharedMode(int fd, const struct stat& info, mode_t mode);

// The same for a path. A link in the last place is left alone and counts as done.
int SetSharedMode(const char* path, mode_t mode);

// chmod for a descriptor of any kind, that of a Found included, without rule 3.
int ChangeMode(int fd, mode_t mode);

// ---- Failures

// True for the failures of the machine at this moment (a failing disk or server, no memory, no
// descriptors), in contrast to answers about the file: they must not be taken for "there is none".
bool IsPassing(int error);

// ---- Contents

// All bytes, from the descriptor's position or from `offset` on; continues after a short write.
bool WriteAll(int fd, const void* data, size_t sizeBytes);
bool WriteAllAt(int fd, const void* data, size_t sizeBytes, off_t offset);

// ---- Locks

// flock(2): 0, or -1 with errno.
int Flock(int fd, int operation);

// ---- Durability

// fsync. A file system that has no such thing counts as done.
bool Sync(int fd);

// fsync of a directory, or of the one that holds the path. A directory that may be entered but not
// read cannot be opened for it, and counts as done.
bool SyncDirectory(const char* path);
bool SyncDirectoryOf(const char* path);

}  // namespace zt::posix

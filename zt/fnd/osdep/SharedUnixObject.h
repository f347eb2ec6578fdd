#pragma once

#include <sys/types.h>

#include "zt/fnd/StringFwd.h"

// The place in the file system where objects live that processes of different users share by name.
//
// Everything there is open to all users: directories 0777, files 0666, whatever the umask. Nothing
// is removed when a process ends. As any user may put anything there, nothing follows a symbolic
// link in the last place, waits for a pipe, or touches a file that has a second name elsewhere
// (zt/posix/Files.h). All steps may be repeated, and run in several processes at once. Threads:
// any.
namespace zt::fnd::osdep {

// "/var/tmp/zentrex/shared", or $ZTFNDTMPSHAREDFILEDIR, read at each call, where that is absolute.
String GetSharedUnixBase();

// The path of a file in the directory `dirName` below the base. Makes the directory;
// throws what CreateSharedUnixDir throws.
AnsiString BuildSharedUnixFilePath(const String& dirName, const String& fileName);

// Makes the directory with all missing ones above it, and gives it mode 0777, also if it was there;
// one that belongs to another user stays as it is. The path ends in "/". Throws PosixError: with
// ENOTDIR where a file or a link is in its place, and for a missing directory whose path does
// not end in "/". Passes on AccessDenied from path::CreateDir.
void CreateSharedUnixDir(const String& path);

// What happens to something in the place of a file that is no file of its own: a link, a directory,
// a pipe, a device, a file with several names.
enum class InTheWay {
  Refused,     // it stays, and the file is not available
  MovedAside,  // it becomes NAME.bad where this user may rename it
};

// Which file a descriptor belongs to.
struct FileIdentity {
  dev_t device = 0;
  ino_t inode = 0;

  // False if the descriptor leads to another file by now, or is closed. True when the system cannot
  // be asked. Safe in a signal handler; keeps errno.
  bool isBehind(int fd) const noexcept;

  // False if the path names another file by now, or none. True when it cannot be asked.
  bool isNamedBy(const AnsiString& path) const;
};

// Opens the file for reading and writing, made if missing, and gives it mode 0666; one that belongs
// to another user stays as it is. *identity, if asked for, is the file's. Returns the descriptor,
// close-on-exec, which the caller owns. Throws PosixError: refused access (EACCES) after three
// attempts a millisecond apart, EPERM for any failure to set the mode; ELOOP, EISDIR, ENXIO or
// EMLINK, with the path in the message, for what is in the way and stays.
int CreateSharedUnixFile(const AnsiString& path, InTheWay way = InTheWay::Refused,
                         FileIdentity* identity = nullptr);

}  // namespace zt::fnd::osdep

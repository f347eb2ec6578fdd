#pragma once

#include "zt/fnd/StringFwd.h"

namespace zt::fnd::osdep {

// Operations on path text and on the file system.
//
// A path is POSIX text with "/" as the only separator; it goes to the system in the narrow form of
// the process locale, where characters that the locale lacks become "?". Apart from the plain text
// operations nearly everything insists on an absolute path and throws InvalidArgument otherwise.
// Failures of the system that have no class of their own throw PosixError. Interrupted calls are
// made again, except in SetCWD. Threads: any, but for SetCWD, which changes the whole process.
class path {
 public:
  path() = delete;

  static bool PlatformSupportsSymLinks() { return true; }

  // Starts with "/"; a null path does not.
  static bool IsPathAbsolute(const wchar_t* path);
  static bool IsAbs(const String& path);

  // The path without its last run of "/" and what follows: "/a/b" and "/a/b/" give "/a" and "/a/b".
  // Without a "/" after the leading ones, these: "/a" gives "/", "a" gives "".
  static String DirName(const String& path);
  // What follows the last "/".
  static String BaseName(const String& path);
  // b if it is absolute or a is empty; else both with one "/" between, if a does not end in one.
  static String Join(const String& a, const String& b);
  static AnsiString Join(const AnsiString& a, const AnsiString& b);
  // Throws InvalidArgument for an empty path.
  static void MakePathEndInSlash(String& path);
  // Takes "." and ".." out of an absolute path, as text. Empty for a path that is relative, climbs
  // above the root, or has a component "...". Doubled slashes stay, and ".." takes the empty
  // component between them.
  static String NormalizePath(const String& path);

  static String GetCWD();
  // Returns the directory that was left.
  static String SetCWD(String dir);
  // The working directory for ".", otherwise the path, below the working directory if relative.
  static String AbsPath(const String& path);
  // $TMPDIR, or "/var/tmp/".
  static String TempDirName();
  // A name that is free now; nothing is created. An empty dir means TempDirName(). $TMPDIR goes
  // before dir, and five characters of the prefix count. Throws InvalidArgument for an empty prefix
  // or a relative dir, NonexistentException where dir is no directory.
  static String TempFileName(const String& prefix, const String& dir);

  // False for a relative path and for any failure. IsDirectory follows links.
  static bool IsDirectory(const wchar_t* path);
  static bool IsSymLink(const wchar_t* path);
  // True for a regular file, links followed; false for what is missing or is something else. Every
  // other failure throws PosixError, a file in a directory's place (ENOTDIR) included.
  static bool DoesFileExist(const String& path);

  // Makes the directories that the path names up to its last "/": end the path in "/" to have its
  // last component made too. What is a directory already is left alone. Without a mode new ones get
  // 0700 under the umask; with a mode (16 bits) each new one ends with exactly that mode, or is
  // taken away again. Throws ObjectAlreadyExists where something that is no directory is in the
  // way, AccessDenied with the failing part of the path for any other failure. Directories made
  // before the failing one stay.
  static void CreateDir(const wchar_t* path);
  static void CreateDir(const wchar_t* path, unsigned int mode);

  static void RemoveFile(const wchar_t* path);
  static void RemoveFile(const String& path);
  // Both throw NonexistentException for what is no directory, and AccessDenied with the path where
  // rmdir fails. Of a link to a directory only the link is removed. RemoveDirForce removes the
  // contents first, and may stop half-way.
  static void RemoveDir(const wchar_t* path);
  static void RemoveDirForce(const wchar_t* path);

  // Replaces `to`. Does nothing where the names differ in case only, or name one file. Between file
  // systems the file is copied, and removed once the copy is on the disk; throws PosixError,
  // without the copy, where it does not get there or the source cannot be removed.
  static void RenameFile(const String& from, const String& to);
  // Copies the bytes of a file; a new file has mode 0600. Does nothing where the names differ in
  // case only or name one file. Throws FileAlreadyExists for an existing `to` without overwrite,
  // FileReadFailed or FileWriteFailed half-way and for what is no regular file.
  static void CpFile(const String& from, const String& to, bool overwrite);
  // Copies a tree without its hidden entries, overwriting. Links are followed; a directory that
  // contains itself throws PosixError(ELOOP). A missing `to` is made by CreateDir, so end it in
  // "/". Throws NonexistentException where `from` is no directory.
  static void CpDir(const String& from, const String& to);

  // Makes `link` point to `target`.
  static void CreateSymLink(const String& link, const String& target);
  // The text that the link holds, which may be relative. Throws InvalidArgument for what is no
  // link.
  static String ResolveSymLink(const String& path);
};

}  // namespace zt::fnd::osdep

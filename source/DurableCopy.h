#pragma once

#include <string>

// A second name for a guarded file while many saves replace it that are not synced each.
//
// A power cut may leave such a save as an empty file, a file of zeros or any other beginning of it,
// under the file's name. A scan makes one save a registration file, and waiting for the disk each
// time would make a first start several times as long. So the file as it is on disk before the
// first of them gets a second name, NAME.durable (a hard link). The saves in between replace the
// first name only. When the last of them is on disk the second name goes.
//
// The next opening decides what a process has left that did not come to that point:
//
//   NAME.durable   NAME matches its sidecar   what counts
//   not there      -                          NAME
//   there          yes                        NAME: the digest covers every byte of it
//   there          no                         NAME.durable, which takes the name of the file
//
// So a process that is killed loses nothing, but where it is killed between a save and its sidecar:
// then the scan that follows merges again what it had merged. Calls are made under the file's lock,
// the destructor's included: leave() comes before it where the lock was lost.
//
// Only a regular file counts as a second name. Anything else there was planted, and is removed or
// moved aside. A file of more than 256 MiB, which no save writes, matches no sidecar.
class DurableCopy {
 public:
  explicit DurableCopy(const std::string& file);
  // finish(); where that fails the next opening sees to it.
  ~DurableCopy();
  DurableCopy(const DurableCopy&) = delete;
  DurableCopy& operator=(const DurableCopy&) = delete;

  // Puts the file on disk and gives it the second name; uses one that is there already. False, with
  // every save to be synced on its own, where the file system or the rights do not allow it.
  // finish() is due where pending() says so, whatever the result.
  bool begin();

  // Whether there is a second name, left by a process that did not finish, or that cannot be seen
  // at the moment. Then begin() is due before the first save, whatever its durability: a later
  // opening would take the second name up over that save.
  bool isLeft() const;

  // Whether there may be a second name that finish() has to remove.
  bool pending() const { return m_pending; }

  // Puts the file and its directory on disk and removes the second name. True if there was nothing
  // to do. Never throws.
  bool finish();

  // Leaves the second name to the next opening: without the lock it may be another process's by
  // now.
  void leave() { m_pending = false; }

  // Puts the file's directory on disk. Never throws.
  bool syncDirectory() const;

  // For an opening, before anything else is read: takes up what is described above. False if the
  // files could not be read now, so that nothing can be decided: the opening must fail.
  static bool takeUp(const std::string& file);

  static std::string NameFor(const std::string& file) { return file + ".durable"; }

 private:
  const std::string m_file, m_copy;  // both made beforehand: finish() must not run out of memory
  bool m_pending = false;
};

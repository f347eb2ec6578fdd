#pragma once

#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <memory>

#include "zt/fnd/String.h"
#include "zt/fnd/osdep/CloseOnFork.h"
#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/SharedUnixObject.h"

namespace zt::fnd::osdep {

// Locks an open file: true if the caller has it alone, false if beside others who share it.
//
// Waits for a process that has it alone, 500 times a millisecond. Throws PosixError with flock's
// errno after that; the file is then not locked.
bool GetLockAccessToFile(int fd);

// A file of "namedEvent/" in the shared directory, open and locked.
//
// The lock shows who is there: every user of the file shares it, so that the last one, and only
// the last, can have it alone; the kernel drops it when a process dies. A child that is forked
// while a file is being opened or closed has no copy of it; a copy of a settled file counts as one
// more user. An object that came through fork() never unlocks what its parent holds. After the host
// has closed the descriptor everything fails, and nothing touches what has got its number. Threads:
// one at a time.
class EventFile {
 public:
  EventFile() = default;  // none
  EventFile(EventFile&& other) noexcept;
  EventFile& operator=(EventFile&& other) noexcept;
  ~EventFile() { close(); }

  // Opens, made if missing, and locks, alone if possible. What is locked is the file that the name
  // leads to: one that was removed meanwhile is given up for the new one. Throws what
  // CreateSharedUnixFile and GetLockAccessToFile throw; PosixError(ENOLCK) if the file is replaced
  // again and again.
  static EventFile Open(const String& name);

  // Whether the name is taken, by a file or anything else. False also where that cannot be known.
  static bool Exists(const String& name) noexcept;

  bool valid() const noexcept { return m_fd.valid(); }
  bool exclusive() const noexcept { return m_exclusive; }
  // ftok(path, 1); never -1.
  key_t key() const noexcept { return m_key; }

  // One transfer of all the bytes; false for less.
  bool read(void* bytes, size_t n, uint64_t offset) const noexcept;
  bool write(const void* bytes, size_t n, uint64_t offset) const noexcept;

  // From alone to shared, without a moment between. False with errno: not locked.
  bool share() noexcept;

  // Ends the opening: from here on the file stays, and a forked child keeps its copy of it.
  void settle() noexcept;

  // Whether close() takes the file's name away, if it is still held alone then. So it is after an
  // opening that found the file empty, so that one that fails leaves nothing.
  void discardAtClose(bool discard) noexcept { m_discard = discard; }

  // From shared to alone, if no other user is there. On false the file is not locked at all, so
  // this is for the last use only.
  bool claim() noexcept;

  // Takes the file's name away, unless it names another file by now. For those who have it alone.
  bool unlink() const noexcept;

  // Unlocks and closes.
  void close() noexcept;

 private:
  explicit EventFile(const AnsiString& path);
  bool identify();

  std::unique_ptr<const AnsiString> m_path;  // a pointer, as moving a string can fail
  CloseOnForkFd m_fd;
  ProcessMark m_process;
  bool m_exclusive = false;
  bool m_discard = false;
  key_t m_key = -1;
};

}  // namespace zt::fnd::osdep

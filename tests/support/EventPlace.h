#pragma once

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "tests/support/Child.h"

namespace vlt::test {

// The shared place of a test with named events.
//
// One directory a process, as the library keeps its mutex of the first place it saw; empty at the
// begin of each test. The first object of a process gives it a name space of its own for semaphores,
// where that is allowed. At the end all semaphore sets of the test go, also those of a test that
// failed: in a name space of its own all there are, otherwise those that the state files name.
class EventPlace {
 public:
  EventPlace();
  ~EventPlace();
  EventPlace(const EventPlace&) = delete;
  EventPlace& operator=(const EventPlace&) = delete;

  // Absolute path of a file in "namedEvent/".
  std::string file(const std::string& name) const;
  // Names in "namedEvent/", sorted.
  std::vector<std::string> files() const;

  // Set and slot as the event's lock file has them.
  struct Slot {
    std::uint32_t set, index;
    bool operator==(const Slot&) const = default;
  };
  Slot slotOf(const std::string& name) const;

  // Identifier of the kernel's set for a state file, -1 if there is none.
  static int SetOfFile(const std::string& stateFile);
  int setOf(unsigned number) const { return SetOfFile(file("sem_" + std::to_string(number))); }
  static int SetOfKey(key_t key);
  static int ValueOf(int set, unsigned slot);

  // Number of all semaphore sets; -1 if the process has no name space of its own.
  static int CountSets();
  static bool HasOwnIpc();

 private:
  void clean() const;
};

// A process that does something, says so, and stays until it is asked to end or killed.
class Keeper {
 public:
  // `begin` runs in the child and returns what is to live until the end.
  template <class Begin>
  explicit Keeper(Begin begin)
      : m_child([this, begin] {
          auto kept = begin();
          m_ready.notify();
          m_end.await();
          (void)kept;
          return 0;
        }) {
    m_good = m_ready.await();
  }

  bool good() const { return m_good; }
  pid_t pid() const { return m_child.pid(); }
  // Lets it end in order; true if it did.
  bool finish() {
    m_end.notify();
    return m_child.wait() == 0;
  }
  void kill();

 private:
  Signal m_ready, m_end;
  Child m_child;
  bool m_good;
};

// Runs the body in a child that has a fresh tmpfs, with these mount options, as its shared place (and
// as "/tmp"). Returns the child's code, or nothing if the machine does not allow it.
enum class Allowed { No, Yes };
Allowed RunInOwnTmp(const std::string& options, const std::function<int()>& body, int* code);

}  // namespace vlt::test

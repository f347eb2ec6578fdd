#pragma once

#include <errno.h>
#include <limits.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <string>
#include <system_error>

namespace vlt::test {

// Counts how often the file of this name was replaced in the directory, by whatever process, since
// the object was made. What a forked child has counted does not reach the parent.
//
// (The kernel folds equal events that follow each other into one; those of the
// temporary name keep them apart.)
class SaveCounter {
 public:
  SaveCounter(const std::string& directory, const std::string& name)
      : m_fd(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)), m_name(name) {
    if (m_fd < 0 || inotify_add_watch(m_fd, directory.c_str(), IN_MOVED_FROM | IN_MOVED_TO) < 0) {
      throw std::system_error(errno, std::generic_category(), "inotify");
    }
  }
  ~SaveCounter() { close(m_fd); }
  SaveCounter(const SaveCounter&) = delete;
  SaveCounter& operator=(const SaveCounter&) = delete;

  int count() {
    alignas(inotify_event) char buffer[64 * (sizeof(inotify_event) + NAME_MAX + 1)];
    for (;;) {
      ssize_t got = read(m_fd, buffer, sizeof buffer);
      if (got <= 0) return m_count;
      for (char* at = buffer; at < buffer + got;) {
        auto* event = reinterpret_cast<inotify_event*>(at);
        if ((event->mask & IN_MOVED_TO) && event->len && m_name == event->name) ++m_count;
        at += sizeof *event + event->len;
      }
    }
  }

 private:
  int m_fd;
  std::string m_name;
  int m_count = 0;
};

}  // namespace vlt::test

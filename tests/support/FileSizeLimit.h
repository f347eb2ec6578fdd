#pragma once

#include <signal.h>
#include <sys/resource.h>

namespace vlt::test {

// While it lives, this process writes no file beyond the size: the write fails with EFBIG, as on a full
// disk it would with ENOSPC.
class FileSizeLimit {
 public:
  explicit FileSizeLimit(rlim_t sizeBytes) : m_signal(signal(SIGXFSZ, SIG_IGN)) {
    getrlimit(RLIMIT_FSIZE, &m_old);
    rlimit limit = m_old;
    limit.rlim_cur = sizeBytes;
    setrlimit(RLIMIT_FSIZE, &limit);
  }
  ~FileSizeLimit() {
    setrlimit(RLIMIT_FSIZE, &m_old);
    signal(SIGXFSZ, m_signal);
  }
  FileSizeLimit(const FileSizeLimit&) = delete;
  FileSizeLimit& operator=(const FileSizeLimit&) = delete;

 private:
  rlimit m_old;
  void (*m_signal)(int);
};

}  // namespace vlt::test

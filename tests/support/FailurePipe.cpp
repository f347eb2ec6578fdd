#include "tests/support/FailurePipe.h"

#include <errno.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <limits.h>
#include <stdio.h>
#include <unistd.h>

#include <sstream>
#include <string>
#include <system_error>

namespace vlt::test {
namespace {

using testing::TestPartResult;

// A record: kind, line, file and text, each but the last with a line feed, and a NUL.
std::string RecordOf(const TestPartResult& part) {
  std::string record = std::to_string(part.type()) + "\n" + std::to_string(part.line_number()) +
                       "\n" + (part.file_name() ? part.file_name() : "") + "\n" + part.message();
  return record.substr(0, PIPE_BUF - 1);
}

void Repeat(const std::string& record) {
  std::istringstream in(record);
  int type = 0, line = 0;
  std::string file, text;
  in >> type >> line;
  in.ignore();
  std::getline(in, file);
  std::getline(in, text, '\0');
  if (type == TestPartResult::kSkip) GTEST_SKIP() << text;
  ADD_FAILURE_AT(file.c_str(), line) << text;
}

class Sender : public testing::EmptyTestEventListener {
 public:
  explicit Sender(int fd) : m_fd(fd) {}

  void OnTestPartResult(const TestPartResult& part) override {
    if (part.type() == TestPartResult::kSuccess) return;
    std::string record = RecordOf(part);
    size_t size = record.size() + 1;
    if (write(m_fd, record.c_str(), size) == static_cast<ssize_t>(size)) return;
    fprintf(stderr, "child: %s\n", record.c_str());
  }

 private:
  int m_fd;
};

}  // namespace

FailurePipe::FailurePipe() {
  int fds[2];
  if (pipe2(fds, O_CLOEXEC | O_NONBLOCK) != 0) {
    throw std::system_error(errno, std::generic_category(), "pipe2");
  }
  m_read = fds[0];
  m_write = fds[1];
}

FailurePipe::~FailurePipe() {
  close(m_read);
  close(m_write);
}

void FailurePipe::send() const {
  // A child of a child has the Sender of its parent, which would report a second time.
  static testing::TestEventListener* present =
      testing::UnitTest::GetInstance()->listeners().default_result_printer();
  testing::TestEventListeners& listeners = testing::UnitTest::GetInstance()->listeners();
  delete listeners.Release(present);
  present = new Sender(m_write);
  listeners.Append(present);
}

void FailurePipe::receive() const {
  std::string arrived;
  char buffer[PIPE_BUF];
  for (ssize_t got; (got = read(m_read, buffer, sizeof buffer)) > 0;) {
    arrived.append(buffer, static_cast<size_t>(got));
  }
  std::istringstream records(arrived);
  for (std::string record; std::getline(records, record, '\0');) Repeat(record);
}

}  // namespace vlt::test

#pragma once

// A vltctl that goes on until it is stopped: watch, trace -f.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <string>
#include <vector>

#include "tests/e2e/Vltctl.h"

namespace vlt::test {

class RunningVltctl {
 public:
  explicit RunningVltctl(const std::vector<std::string>& arguments)
      : m_child([&] { return exec(arguments); }) {}

  // True once it has printed the text.
  bool prints(const std::string& text) const {
    bool printed = Eventually([&] { return out().find(text) != std::string::npos; });
    EXPECT_TRUE(printed) << text << " in\n" << out() << err();
    return printed;
  }
  std::string out() const { return textOf("out"); }
  std::string err() const { return textOf("err"); }

  // Its exit code.
  int wait() { return m_child.wait(); }
  int stop(int signal = SIGINT) {
    m_child.kill(signal);
    return wait();
  }

 private:
  std::string textOf(const char* name) const {
    return access((m_dir / name).c_str(), F_OK) == 0 ? ReadBytes(m_dir / name) : "";
  }

  int exec(const std::vector<std::string>& arguments) const {
    for (const auto& [name, fd] : {std::pair{"out", 1}, {"err", 2}}) {
      int file = open((m_dir / name).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0666);
      if (dup2(file, fd) != fd) return 126;
    }
    std::vector<char*> argv = {const_cast<char*>(kVltctl.c_str())};
    for (const std::string& text : arguments) argv.push_back(const_cast<char*>(text.c_str()));
    argv.push_back(nullptr);
    execv(argv[0], argv.data());
    return 127;
  }

  TempDir m_dir;
  Child m_child;
};

}  // namespace vlt::test

#pragma once

#include <gtest/gtest.h>

#include <clocale>
#include <string>

namespace vlt::test {

// One category of the process's C locale for the life of the object. Fails the test if the machine
// has no such locale.
class ScopedLocale {
 public:
  ScopedLocale(int category, const char* name)
      : m_category(category), m_old(std::setlocale(category, nullptr)) {
    if (std::setlocale(category, name) == nullptr) ADD_FAILURE() << "no locale " << name;
  }
  ~ScopedLocale() { std::setlocale(m_category, m_old.c_str()); }
  ScopedLocale(const ScopedLocale&) = delete;
  ScopedLocale& operator=(const ScopedLocale&) = delete;

 private:
  int m_category;
  std::string m_old;
};

}  // namespace vlt::test

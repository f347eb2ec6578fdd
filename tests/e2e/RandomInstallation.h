#pragma once

// Installations as no installer makes them, from a seed: names that need quoting, repeated and null
// identifiers, missing sections, files in place of directories, damaged databases.

#include <random>
#include <string>
#include <vector>

#include "tests/support/Installation.h"

namespace vlt::test {

class RandomInstallation : public Installation {
 public:
  explicit RandomInstallation(unsigned seed);

  // Adds, replaces, touches and removes some bundles.
  void change();
  // Does something to the database that a save does not do.
  void damage();
  // A number below `count`.
  unsigned any(unsigned count) { return static_cast<unsigned>(m_random() % count); }

  // Identifiers and classes are G(n) with n below this.
  static constexpr unsigned kIdentifiers = 12;

 private:
  bool oneIn(unsigned count) { return any(count) == 0; }
  const char* oneOf(const std::vector<const char*>& texts) {
    return texts[any(static_cast<unsigned>(texts.size()))];
  }
  std::string guid();
  std::string bindingClasses();
  std::string value(const std::string& text);
  std::string section(const std::string& name, bool isDictionary);
  std::string registration(bool isDictionary);
  void addAny();
  void removeAny();
  void touchAny();
  std::vector<std::string> registrationFiles() const;

  std::mt19937 m_random;
};

}  // namespace vlt::test

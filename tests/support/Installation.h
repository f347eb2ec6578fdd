#pragma once

#include <ctime>
#include <string>

#include "tests/support/TempDir.h"

namespace vlt::test {

// A sample installation in a directory of its own, with the preference "Dir" of this process's
// configuration pointing at it. Registration files get the fixed time kInstalled.
class Installation {
 public:
  static constexpr time_t kInstalled = 1767225600;  // 2026-01-01 00:00:00 UTC

  Installation();

  // Without a slash at the end.
  const std::string& root() const { return m_root; }
  std::string database() const { return m_root + "/vlt.vlr"; }
  std::string sidecar() const { return m_root + "/vlt.vl5"; }

  // Each makes a bundle, whose registration file brings one component, and returns that file's path.
  std::string addDictionary(const std::string& bundle, const std::string& component,
                            const std::string& guid, int schemaVersion, const std::string& prefix);
  std::string addObjectExpert(const std::string& bundle, const std::string& component,
                              const std::string& guid, const std::string& bindingClasses = "");
  std::string addResourceExpert(const std::string& bundle, const std::string& component,
                                const std::string& guid, const std::string& pnp,
                                const std::string& bindingClasses = "");
  // A bundle below `directory` ("Experts") with this registration file.
  std::string addBundle(const std::string& directory, const std::string& bundle,
                        const std::string& registration);
  void removeBundle(const std::string& directory, const std::string& bundle);

  // Sets the time of the last change.
  static void touch(const std::string& file, time_t time);
  // Points the preference somewhere.
  static void setDir(const std::string& directory);
  // The value of "Registration" for that time, by arithmetic of its own.
  static std::string stamp(time_t time);

 private:
  TempDir m_dir;
  std::string m_root;
};

// Hexadecimal MD5 by the system's md5sum, and the same form of a sidecar's bytes.
std::string Md5Sum(const std::string& file);
std::string Hex(const std::string& bytes);

}  // namespace vlt::test

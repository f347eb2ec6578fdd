#pragma once

#include <gtest/gtest.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <map>
#include <string>

#include "tests/e2e/HostileInstallation.h"
#include "tests/support/TempDir.h"

namespace vlt::test {

namespace fs = std::filesystem;

// In each of the secrets, and to be found nowhere else.
inline constexpr char kSecretText[] = "HUSH-HUSH-4711";

struct Stat {
  mode_t mode;
  uid_t owner;
  bool operator==(const Stat&) const = default;
};

inline Stat StatOf(const std::string& path) {
  struct stat info = {};
  EXPECT_EQ(lstat(path.c_str(), &info), 0) << path;
  return {info.st_mode, info.st_uid};
}

// A private file, and a private directory with a file in it.
class Secrets {
 public:
  explicit Secrets(uid_t owner) : m_file(m_dir / "secret"), m_private(m_dir.makeDir("private")) {
    chmod(m_dir.path().c_str(), 0755);
    // As every one of the files could be read: registration file, settings, jar, database.
    m_bytes = Component("Secret", 0x5EC, std::string("Password = \"") + kSecretText + "\"\n") +
              "[CookieSection]\nLastServerCookie = 4\nPassword = \"" + kSecretText +
              "\"\n[STORAGE]\nPassword = \"" + kSecretText + "\"\n";
    WriteBytes(m_file, m_bytes);
    // As each of the directories could be read.
    for (const char* bundle : {"/Last/Old.framework", "/Old.framework", "/Old.vle", ""}) {
      fs::create_directories(m_private + bundle + "/Resources");
      WriteBytes(m_private + bundle + "/Resources/Info.vlr", m_bytes);
    }
    for (const char* file : {"/Info.vlr", "/Flat.framework", "/Last/Flat.framework", "/vlt.vlr"}) {
      WriteBytes(m_private + file, m_bytes);
    }
    WriteBytes(m_private + "/kept", m_bytes);
    for (const std::string& path : {m_file, m_private, m_private + "/kept", m_private + "/Last"}) {
      chmod(path.c_str(), fs::is_directory(path) ? 0700 : 0600);
      EXPECT_EQ(chown(path.c_str(), owner, owner), 0);
    }
    m_before = picture();
  }
  const std::string& file() const { return m_file; }
  const std::string& directory() const { return m_private; }
  // Not there, where only the superuser could make it.
  std::string missing() const { return m_private + "/made"; }

  // Names, modes, owners and bytes of everything.
  bool areAsTheyWere(std::string* difference) const {
    auto now = picture();
    for (const auto& [path, was] : m_before) {
      if (!now.count(path)) {
        *difference += " removed:" + path;
      } else if (now.at(path) != was) {
        *difference += " changed:" + path + " (" + now.at(path).substr(0, 12) + ")";
      }
    }
    for (const auto& [path, is] : now) {
      if (!m_before.count(path)) *difference += " made:" + path;
    }
    return now == m_before;
  }

 private:
  std::map<std::string, std::string> picture() const {
    std::map<std::string, std::string> all;
    for (const auto& entry : fs::recursive_directory_iterator(m_dir.path())) {
      Stat stat = StatOf(entry.path());
      char head[64];
      snprintf(head, sizeof head, "%o %u ", stat.mode, stat.owner);
      all[entry.path().string().substr(m_dir.path().size())] =
          head + (entry.is_regular_file() ? ReadBytes(entry.path()) : "");
    }
    return all;
  }

  TempDir m_dir;
  std::string m_file, m_private, m_bytes;
  std::map<std::string, std::string> m_before;
};

}  // namespace vlt::test

#include "bench/peers/Parts.h"

#include <fcntl.h>
#include <openssl/evp.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <system_error>

#include "bench/peers/Contest.h"

namespace peers {
namespace {

struct Directory {
  Directory() {
    path = (std::filesystem::temp_directory_path() / "vlt.peers.XXXXXX").string();
    Require(mkdtemp(path.data()) != nullptr, "no directory for this run");
    std::filesystem::create_directories(path + "/config");
    std::ofstream(path + "/config/com.zentrex.kor.ini")
        << "[Preferences]\nDir = " << path << "/KOR\n";
    setenv("XDG_CONFIG_HOME", (path + "/config").c_str(), 1);
    setenv("HOME", path.c_str(), 1);
    setenv("ZTFNDTMPSHAREDFILEDIR", (path + "/shared").c_str(), 1);
  }
  ~Directory() {
    std::error_code ignored;  // what cannot be removed lies in the temporary directory anyway
    std::filesystem::remove_all(path, ignored);
  }
  std::string path;
};

}  // namespace

const std::string& Place() {
  static Directory directory;
  return directory.path;
}

std::string ReadFile(const std::string& path) {
  int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  struct stat info;
  Require(fd >= 0 && fstat(fd, &info) == 0, path.c_str());
  std::string text(static_cast<size_t>(info.st_size), '\0');
  Require(read(fd, text.data(), text.size()) == info.st_size, path.c_str());
  close(fd);
  return text;
}

void Replace(const std::string& path, const std::string& text) {
  std::string aside = path + ".tmp";
  int fd = open(aside.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0666);
  Require(fd >= 0 && write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size()),
          "a save failed");
  close(fd);
  Require(rename(aside.c_str(), path.c_str()) == 0, "a save failed");
}

std::string Md5(const std::string& text) {
  std::string digest(16, '\0');
  Require(EVP_Digest(text.data(), text.size(), reinterpret_cast<unsigned char*>(digest.data()),
                     nullptr, EVP_md5(), nullptr) == 1,
          "MD5 failed");
  return digest;
}

void WriteSidecar(const std::string& path, const std::string& digest) {
  int fd = open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0666);
  Require(fd >= 0 && pwrite(fd, digest.data(), digest.size(), 0) == 16, "a sidecar failed");
  close(fd);
}

std::string IniText(int sections) {
  std::string text;
  for (int s = 0; s < sections; ++s) {
    text += "[Component " + std::to_string(s) + "]\n";
    for (int i = 0; i < 10; ++i) {
      text += "Attribute" + std::to_string(i) + " = \"value " + std::to_string(s * 10 + i) + "\"\n";
    }
  }
  return text;
}

}  // namespace peers

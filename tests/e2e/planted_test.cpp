// What a user without rights plants among the shared files before the superuser's process starts:
// links to the superuser's or another user's private files and directories, pipes, devices,
// sockets, further names of private files. After two starts, with saves and calls on the jar, every
// private file and directory is as it was, what is in them is in no file that others may read, and
// what is no regular file was not opened.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <system_error>

#include "tests/e2e/HostileInstallation.h"
#include "tests/e2e/Promises.h"
#include "tests/e2e/Secrets.h"
#include "tests/support/TracedChild.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr uid_t kAttacker = 65534, kVictim = 1234;
constexpr int kDeadlineSeconds = 20;

// Exit code of the start: what did not work in it.
enum Refusal { kNoStart = 1, kNoSave = 2, kNoJar = 4 };

std::string NameOfRefusal(int code) {
  if (code < 0 || code > 7) return "ends with " + std::to_string(code);
  std::string text = code == 0 ? "all works" : "";
  if (code & kNoStart) text += "start refused ";
  if (code & kNoSave) text += "save refused ";
  if (code & kNoJar) text += "jar refused";
  return text;
}

// A start with everything that writes; must end, whatever it finds.
int StartAndSave() {
  int code = 0;
  SharedPromises promises;
  PromisedClient client(*promises);
  if (client.start() != "ok") code |= kNoStart;
  if (!(client.setCacheSize(4711) && client.registerComponent(90))) code |= kNoSave;
  if (!client.setCookie(5)) code |= kNoJar;
  try {
    unsigned limit = 0;
    vltGetClientCacheSettings(&limit, nullptr, nullptr, nullptr, nullptr, nullptr, 0, nullptr);
    IvltRegistrar* r = nullptr;
    void* raw = nullptr;
    if (!(code & kNoStart) && GetRegistrar(&r) == "ok" &&
        r->QueryInterface(IID_IvltDowngradeRegistrar, &raw) == S_OK) {
      static_cast<IvltDowngradeRegistrar*>(raw)->RemovePreviousDictionaries(nullptr);
    }
  } catch (...) {
    // What it refuses and how is not the question here.
  }
  return code;
}

bool Contains(const std::string& path, const char* text) {
  return ReadBytes(path).find(text) != std::string::npos;
}

enum class Kind {
  LinkToFile,
  DanglingLink,
  HardLink,
  Pipe,
  Device,
  Socket,
  LinkToDirectory,
  LinkInThePath,
  Directory
};

const char* NameOf(Kind kind) {
  const char* names[] = {"link to a private file",
                         "dangling link",
                         "second name of a private file",
                         "pipe",
                         "device",
                         "socket",
                         "link to a private directory",
                         "link in the middle of the path",
                         "directory"};
  return names[static_cast<int>(kind)];
}

bool IsNoFile(Kind kind) {
  return kind == Kind::Pipe || kind == Kind::Device || kind == Kind::Socket;
}

class Planted : public testing::Test {
 protected:
  void SetUp() override {
    if (geteuid() != 0) {
      printf("NOT TESTED: planted files; needs root, to be attacked by another user\n");
      GTEST_SKIP() << "needs root, to be attacked by another user";
    }
    m_missing = TracedChild::Missing();
  }

  // Path of the place below the root of an installation that has run once, in a directory that all users
  // can write.
  static std::string openPlace(const std::string& root, const std::string& place) {
    chmod(fs::path(root).parent_path().c_str(), 0755);
    ExpectStart("ok");
    std::string path = root + "/" + place;
    fs::create_directories(fs::path(path).parent_path());
    chmod(fs::path(path).parent_path().c_str(), 0777);
    return path;
  }

  // Plants at the place below the root, in a fresh installation that has run once, and starts.
  void attack(const std::string& place, Kind kind, uid_t victim) {
    HostileInstallation b;
    Secrets secrets(victim);
    std::string path = openPlace(b.root(), place);
    std::error_code ignored;
    fs::remove_all(path, ignored);
    plant(path, kind, secrets);
    finish(b.root(), path, place, kind, victim, secrets);
  }

  void finish(const std::string& root, const std::string& path, const std::string& place, Kind kind,
              uid_t victim, const Secrets& secrets) {
    bool opened = false;
    int code = start(IsNoFile(kind) ? path : "", &opened);
    // What the first one has copied, and kept private, the next one may give away.
    Child(StartAndSave).wait(kDeadlineSeconds * 1000);
    std::string found, shown;
    secrets.areAsTheyWere(&found);
    if (opened) found += " opened";
    if (code < 0 || code > 7) found += " no proper end";
    for (const auto& entry : fs::recursive_directory_iterator(root)) {
      std::string file = entry.path();
      if (!entry.is_regular_file() || entry.is_symlink()) continue;
      if ((StatOf(file).mode & 0004) && Contains(file, kSecretText)) {
        shown += " disclosed:" + file.substr(root.size());
      }
    }
    // A file that has two names is a file: what is read from it is used. A kernel with
    // fs.protected_hardlinks lets no user make such a name; its mode and bytes are ours to leave
    // alone.
    if (kind == Kind::HardLink) {
      shown = shown.empty() ? "" : " (read:" + shown + ")";
    } else {
      found += shown;
      shown.clear();
    }
    printf("%-42s %-32s of %-5u | %-28s | %s\n", place.c_str(), NameOf(kind), victim,
           NameOfRefusal(code).c_str(), ((found.empty() ? "nothing" : found) + shown).c_str());
    // Leftovers in the temporary files' places are nothing that keeps a save from being made.
    if (place.ends_with(".TMP") && kind != Kind::Directory && code != 0) {
      found += " " + NameOfRefusal(code);
    }
    ++m_attacks;
    m_successes += !found.empty();
    EXPECT_EQ(found, "") << place << ", " << NameOf(kind) << " of " << victim;
  }

  void plant(const std::string& path, Kind kind, const Secrets& secrets) const {
    switch (kind) {
      case Kind::LinkToFile:
        return asAttacker([&] { return symlink(secrets.file().c_str(), path.c_str()); });
      case Kind::DanglingLink:
        return asAttacker([&] { return symlink(secrets.missing().c_str(), path.c_str()); });
      case Kind::LinkToDirectory:
        return asAttacker([&] { return symlink(secrets.directory().c_str(), path.c_str()); });
      case Kind::LinkInThePath:
        return asAttacker([&] {
          std::string middle = fs::path(path).parent_path();
          return rename(middle.c_str(), (middle + ".was").c_str()) ||
                 symlink(secrets.directory().c_str(), middle.c_str());
        });
      case Kind::Pipe:
        return asAttacker([&] { return mkfifo(path.c_str(), 0666); });
      case Kind::Socket:
        return asAttacker([&] {
          int fd = socket(AF_UNIX, SOCK_STREAM, 0);
          sockaddr_un address = {AF_UNIX, ""};
          if (path.size() >= sizeof address.sun_path) {
            if (chdir(fs::path(path).parent_path().c_str()) != 0) return 1;
            strcpy(address.sun_path, fs::path(path).filename().c_str());
          } else {
            strcpy(address.sun_path, path.c_str());
          }
          return bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof address);
        });
      case Kind::Directory:
        return asAttacker(
            [&] { return mkdir(path.c_str(), 0755) || mkdir((path + "/full").c_str(), 0755); });
      // A user cannot make these two everywhere, but where he can they are the same attack.
      case Kind::Device:
        EXPECT_EQ(mknod(path.c_str(), S_IFCHR | 0666, makedev(1, 5)), 0);
        EXPECT_EQ(chown(path.c_str(), kAttacker, kAttacker), 0);
        return;
      case Kind::HardLink:
        EXPECT_EQ(link(secrets.file().c_str(), path.c_str()), 0) << path;
        return;
    }
  }

  static void asAttacker(const std::function<int()>& body) {
    EXPECT_EQ(Child([&] {
                if (setresgid(kAttacker, kAttacker, kAttacker) != 0 ||
                    setresuid(kAttacker, kAttacker, kAttacker) != 0) {
                  return 97;
                }
                return body() == 0 ? 0 : 1;
              }).wait(),
              0)
        << "the attack itself was not possible";
  }

  // The superuser's start; with a path, whether it was opened for reading or writing.
  int start(const std::string& path, bool* opened) const {
    if (path.empty() || !m_missing.empty()) {
      return Child(StartAndSave).wait(kDeadlineSeconds * 1000);
    }
    return TracedChild::Run(
        StartAndSave, {},
        [&](const SystemCall& call) {
          std::string name = call.name();
          bool at = name == "openat";
          if ((!at && name != "open") || call.result < 0) return;
          if (call.args[at ? 2 : 1] & O_PATH) return;
          if (call.what() == path) {
            struct stat info;
            // What was removed, and made again as a file, is a file.
            *opened |= lstat(path.c_str(), &info) == 0 && !S_ISREG(info.st_mode);
          }
        },
        kDeadlineSeconds);
  }

  void TearDown() override {
    if (m_attacks) printf("%d attacks, %d of them with success\n", m_attacks, m_successes);
  }

  static const std::vector<std::string>& Files() {
    static const std::vector<std::string> files = {
        "Experts/Planted.vle/Resources/Info.vlr",
        "Data Dictionaries/P.framework/Resources/Info.vlr",
        "Data/vltjar.ini",
        "Data/vltjar.vl5",
        "Data/vltjar.TMP",
        "Data/vltjar.vl5.TMP",
        "Data/kor.ini",
        "Data/kor.vl5",
        "Data/kor.TMP",
        "vlt.vlr",
        "vlt.vl5",
        "vlt.TMP",
        "vlt.vl5.TMP",
        "vlt.vlr.durable"};
    return files;
  }

  void attackFiles(Kind kind, const std::vector<uid_t>& victims = {0, kVictim}) {
    for (const std::string& place : Files()) {
      for (uid_t victim : victims) attack(place, kind, victim);
    }
  }

  std::string m_missing;
  int m_attacks = 0, m_successes = 0;
};

TEST_F(Planted, LinksToPrivateFiles) { attackFiles(Kind::LinkToFile); }

TEST_F(Planted, LinksToWhatOnlyTheSuperuserCanMake) { attackFiles(Kind::DanglingLink, {0}); }

TEST_F(Planted, SecondNamesOfPrivateFiles) { attackFiles(Kind::HardLink); }

TEST_F(Planted, Pipes) { attackFiles(Kind::Pipe, {0}); }

TEST_F(Planted, Devices) { attackFiles(Kind::Device, {0}); }

TEST_F(Planted, Sockets) { attackFiles(Kind::Socket, {0}); }

// What cannot be removed may have a save refused, but not the process kept.
TEST_F(Planted, Directories) {
  for (const char* place : {"Data/vltjar.TMP", "Data/vltjar.vl5.TMP", "Data/kor.TMP", "vlt.TMP",
                            "vlt.vl5.TMP", "vlt.vlr.durable"}) {
    attack(place, Kind::Directory, kAttacker);
  }
}

TEST_F(Planted, LinksToPrivateDirectories) {
  for (const char* place : {"Data", "Data Dictionaries", "Data Dictionaries/Last", "Experts",
                            "Experts/Planted.vle", "Experts/Planted.vle/Resources"}) {
    for (uid_t victim : {uid_t{0}, kVictim}) attack(place, Kind::LinkToDirectory, victim);
  }
}

TEST_F(Planted, LinksInTheMiddleOfAPath) {
  for (const char* place :
       {"Data/vltjar.ini", "Data/kor.ini", "Data Dictionaries/Last/Old.framework",
        "Experts/Planted.vle/Resources/Info.vlr"}) {
    for (uid_t victim : {uid_t{0}, kVictim}) {
      HostileInstallation b;
      Secrets secrets(victim);
      std::string path = openPlace(b.root(), place);
      chmod(fs::path(path).parent_path().parent_path().c_str(), 0777);
      plant(path, Kind::LinkInThePath, secrets);
      finish(b.root(), path, place, Kind::LinkInThePath, victim, secrets);
    }
  }
}

// The directory of the locks, and the level above it.
TEST_F(Planted, LinksToPrivateDirectoriesInPlaceOfTheSharedOnes) {
  for (const char* place : {"shared", "shared/mutex"}) {
    HostileInstallation b;
    Secrets secrets(0);
    TempDir open;
    chmod(open.path().c_str(), 0777);
    std::string path = open / place;
    fs::create_directories(fs::path(path).parent_path());
    chmod(fs::path(path).parent_path().c_str(), 0777);
    plant(path, Kind::LinkToDirectory, secrets);
    std::string before = getenv("ZTFNDTMPSHAREDFILEDIR");
    setenv("ZTFNDTMPSHAREDFILEDIR", (open / "shared").c_str(), 1);
    finish(b.root(), path, place, Kind::LinkToDirectory, 0, secrets);
    setenv("ZTFNDTMPSHAREDFILEDIR", before.c_str(), 1);
  }
}

// What the administrator has linked on purpose counts.
TEST_F(Planted, LinksOfTheSuperuserAreFollowed) {
  HostileInstallation b;
  TempDir elsewhere;
  std::string data = elsewhere.makeDir("Data");
  chmod(data.c_str(), 0777);
  fs::remove_all(b.root() + "/Data");
  fs::create_directory_symlink(data, b.root() + "/Data");
  fs::create_directories(b.root() + "/Experts/Linked.vle/Resources");
  WriteBytes(elsewhere / "Info.vlr", Component("Linked", 0x117));
  fs::create_symlink(elsewhere / "Info.vlr", b.root() + "/Experts/Linked.vle/Resources/Info.vlr");
  EXPECT_EQ(Child(StartAndSave).wait(), 0);
  EXPECT_TRUE(Contains(data + "/vltjar.ini", "LastServerCookie = 5"));
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(0x117)), S_OK); });
}

// ---- The lock file of the database

TEST_F(Planted, WhatIsNoLockFileInPlaceOfOne) {
  for (Kind kind : {Kind::LinkToFile, Kind::DanglingLink, Kind::HardLink, Kind::Pipe, Kind::Device,
                    Kind::Socket, Kind::Directory}) {
    HostileInstallation b;
    Secrets secrets(0);
    ExpectStart("ok");
    std::string lock;
    for (char c : b.database()) {
      if (c != '/' && c != '.') lock += static_cast<char>(toupper(c));
    }
    std::string path = std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex/" + lock;
    ASSERT_TRUE(Exists(path)) << path;
    unlink(path.c_str());
    chmod(getenv("ZTFNDTMPSHAREDFILEDIR"), 0777);
    chmod(fs::path(path).parent_path().c_str(), 0777);
    plant(path, kind, secrets);
    finish(b.root(), path, "lock file", kind, 0, secrets);
  }
}

// ---- What must go on working

class PlantedBundle : public Planted {
 protected:
  // A bundle of another user's, registered while it was open, and closed after that.
  void expectStartOfNobody(const std::string& closed, mode_t mode) {
    HostileInstallation b;
    chmod(b.root().c_str(), 0777);
    chmod(fs::path(b.root()).parent_path().c_str(), 0755);
    chmod(getenv("ZTFNDTMPSHAREDFILEDIR"), 0777);
    b.plant(Component("Closed", 0xC105ED), "x.vle");
    ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(0xC105ED)), S_OK); });
    for (const auto& entry : fs::recursive_directory_iterator(b.root() + "/Experts")) {
      EXPECT_EQ(lchown(entry.path().c_str(), kVictim, kVictim), 0);
    }
    chmod((b.root() + "/Experts/" + closed).c_str(), mode);
    SCOPED_TRACE(closed);
    ExpectInChild([&] {
      ASSERT_EQ(setresgid(kAttacker, kAttacker, kAttacker), 0);
      ASSERT_EQ(setresuid(kAttacker, kAttacker, kAttacker), 0);
      for (int start = 0; start < 2; ++start) {
        IvltRegistrar* r = nullptr;
        EXPECT_EQ(GetRegistrar(&r), "ok") << closed;
        if (!r) return;
        EXPECT_EQ(Find(*r, G(kGood)), S_OK);
        EXPECT_EQ(Find(*r, G(0xC105ED)), S_OK) << "what was registered from it is gone";
      }
    });
    ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(0xC105ED)), S_OK); });
  }
};

TEST_F(PlantedBundle, OfAnotherUserWithMode700) { expectStartOfNobody("x.vle", 0700); }

TEST_F(PlantedBundle, OfAnotherUserWithPrivateResources) {
  expectStartOfNobody("x.vle/Resources", 0700);
}

TEST_F(PlantedBundle, OfAnotherUserWithAPrivateRegistrationFile) {
  expectStartOfNobody("x.vle/Resources/Info.vlr", 0600);
}

// Never registered before: the other components are there all the same.
TEST_F(PlantedBundle, MadeUnderAPrivateUmask) {
  HostileInstallation b;
  chmod(b.root().c_str(), 0777);
  chmod(fs::path(b.root()).parent_path().c_str(), 0755);
  chmod(getenv("ZTFNDTMPSHAREDFILEDIR"), 0777);
  ExpectStart("ok");
  {
    ScopedUmask umask(077);
    b.plant(Component("Closed", 0xC105ED), "x.vle");
  }
  ExpectInChild([&] {
    ASSERT_EQ(setresgid(kAttacker, kAttacker, kAttacker), 0);
    ASSERT_EQ(setresuid(kAttacker, kAttacker, kAttacker), 0);
    IvltRegistrar* r = nullptr;
    EXPECT_EQ(GetRegistrar(&r), "ok");
    if (!r) return;
    EXPECT_EQ(Find(*r, G(kGood)), S_OK);
  });
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(0xC105ED)), S_OK); });
}

TEST_F(PlantedBundle, ARelativePathInTheDatabaseIsDropped) {
  HostileInstallation b;
  ExpectStart("ok");
  std::string bytes = ReadBytes(b.database());
  std::string section = "[VLRContentsSection]\n";
  size_t at = bytes.find(section);
  ASSERT_NE(at, std::string::npos);
  bytes.insert(at + section.size(), "Planted = \"relative/path/Info.vlr\"\n");
  WriteBytes(b.database(), bytes);
  for (int start = 0; start < 2; ++start) {
    ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  }
  EXPECT_EQ(DatabaseText(b.database()).quoted("VLRContentsSection", "Planted"), "(none)");
}

}  // namespace
}  // namespace vlt::test

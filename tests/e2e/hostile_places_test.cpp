// What an enemy puts in the places of files, and resources that run out.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>

#include "tests/e2e/HostileInstallation.h"
#include "tests/support/MemoryLimit.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

// ---- What is in a file's place

void MakePipe(const std::string& path) { ASSERT_EQ(mkfifo(path.c_str(), 0666), 0) << path; }

TEST(HostilePlaces, PipesPlainFilesAndLinksInBundles) {
  HostileInstallation b;
  std::string experts = b.root() + "/Experts/", dictionaries = b.root() + "/Data Dictionaries/";
  fs::create_directories(experts + "pipe-inside.vle/Resources");
  MakePipe(experts + "pipe-inside.vle/Resources/Info.vlr");
  MakePipe(experts + "pipe.vle");
  MakePipe(dictionaries + "pipe.framework");
  fs::create_directories(experts + "pipe-between.vle");
  MakePipe(experts + "pipe-between.vle/Resources");
  WriteBytes(experts + "file.vle", "plain");
  WriteBytes(dictionaries + "file.framework", "plain");
  fs::create_symlink("loop.vle", experts + "loop.vle");
  fs::create_symlink("two.vle", experts + "one.vle");
  fs::create_symlink("one.vle", experts + "two.vle");
  fs::create_directories(experts + "inner.vle/Resources");
  fs::create_symlink("Info.vlr", experts + "inner.vle/Resources/Info.vlr");
  fs::create_directory_symlink("..", experts + "up.vle");
  fs::create_directory_symlink(b.root(), experts + "root.vle");
  fs::create_directories(experts + "device.vle/Resources");
  fs::create_symlink("/dev/zero", experts + "device.vle/Resources/Info.vlr");
  fs::create_directories(experts + "dangling.vle/Resources");
  fs::create_symlink("/nowhere", experts + "dangling.vle/Resources/Info.vlr");
  fs::create_directories(experts + "directory.vle/Resources/Info.vlr");
  b.expectGood();
}

TEST(HostilePlaces, ALinkToTheDatabaseAsRegistrationFile) {
  HostileInstallation b;
  fs::create_directories(b.root() + "/Experts/self.vle/Resources");
  fs::create_symlink(b.database(), b.root() + "/Experts/self.vle/Resources/Info.vlr");
  b.expectGood();
}

TEST(HostilePlaces, APipeInTheDatabasesPlaceIsRefusedAndStays) {
  HostileInstallation b;
  MakePipe(b.database());
  ExpectStart("int 1");
  ExpectStart("int 1");
  unlink(b.database().c_str());
  b.expectGood();
}

TEST(HostilePlaces, ADirectoryInTheDatabasesPlaceIsRefusedAndStays) {
  HostileInstallation b;
  fs::create_directories(b.database() + "/kept");
  ExpectStart("int 1");
  EXPECT_TRUE(Exists(b.database() + "/kept"));
  fs::remove_all(b.database());
  b.expectGood();
}

// ---- The sidecar's place

// It says nothing about the database, which is taken as it is.
TEST(HostilePlaces, APipeInTheSidecarsPlaceLosesNothing) {
  HostileInstallation b;
  ExpectStart("ok");
  unlink(b.sidecar().c_str());
  MakePipe(b.sidecar());
  for (int start = 0; start < 3; ++start) {
    ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  }
  EXPECT_TRUE(DatabaseText(b.database()).has("Good"));
}

// A sidecar that opens but is short: one process without components, and the next starts are whole.
TEST(HostilePlaces, ADirectoryInTheSidecarsPlaceCostsOneStart) {
  HostileInstallation b;
  ExpectStart("ok");
  std::string contents = ReadBytes(b.database());
  unlink(b.sidecar().c_str());
  fs::create_directories(b.sidecar() + "/full");
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), E_INVALIDARG); });
  for (int start = 0; start < 2; ++start) {
    ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  }
  EXPECT_EQ(Hex(ReadBytes(b.sidecar())), Md5Sum(b.database()));
  int copies = 0;
  for (const auto& entry : fs::directory_iterator(b.root())) {
    if (entry.is_regular_file() && entry.path().extension() == ".bad") {
      EXPECT_EQ(ReadBytes(entry.path()), contents);
      ++copies;
    }
  }
  EXPECT_EQ(copies, 1);
}

TEST(HostilePlaces, ALinkInTheSidecarsPlaceIsNotWrittenThrough) {
  HostileInstallation b;
  ExpectStart("ok");
  TempDir elsewhere;
  WriteBytes(elsewhere / "target", "a sixteen bytes!");
  unlink(b.sidecar().c_str());
  fs::create_symlink(elsewhere / "target", b.sidecar());
  ExpectStart([&](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  EXPECT_EQ(ReadBytes(elsewhere / "target"), "a sixteen bytes!");
}

// ---- Paths

TEST(HostilePlaces, BundleNamesThatAnIniFileCannotHold) {
  HostileInstallation b;
  uint32_t n = 1;
  for (const char* name : {"a=b", ";x", "[x]", "\"q\"", "tab\there", "back\\slash", "x Line0001",
                           " blank", "\x01\x7F", "Info]", "%s%n", "*", "?"}) {
    b.plant(Component("C" + std::to_string(n), n), std::string(name) + ".vle");
    ++n;
  }
  b.plant(Component("LF", 100), "line\nfeed.vle");
  b.plant(Component("CR", 101), "carriage\rreturn.vle");
  b.expectGood([&](IvltRegistrar& r) {
    for (uint32_t k = 1; k < n; ++k) EXPECT_EQ(Find(r, G(k)), S_OK) << k;
  });
  DatabaseText db(b.database());
  EXPECT_EQ(db.sections()[0], "KOR");
  EXPECT_FALSE(db.has("feed.vle/Resources/Info.vlr"));
}

TEST(HostilePlaces, RootsThatAnIniFileCannotHold) {
  for (const char* name : {"a=b", "[x]", ";x", "x Line0001", " x "}) {
    HostileInstallation b;
    TempDir place;
    std::string root = place.makeDir(name);
    fs::copy(b.root(), root, fs::copy_options::recursive);
    Installation::setDir(root);
    SCOPED_TRACE(name);
    for (int start = 0; start < 2; ++start) {
      ExpectStart("ok", [](IvltRegistrar& r) {
        EXPECT_EQ(Find(r, G(kGood)), S_OK);
        EXPECT_EQ(Find(r, kVltdd), S_OK);
      });
    }
    EXPECT_EQ(Hex(ReadBytes(root + "/vlt.vl5")), Md5Sum(root + "/vlt.vlr"));
  }
}

// The lock of a file is named after its path: too long for an entry of a directory.
TEST(HostilePlaces, AVeryLongRootHasItsLockAndItsComponents) {
  HostileInstallation b;
  TempDir place;
  std::string root = place.path();
  while (root.size() < 900) root += "/" + std::string(60, 'r');
  fs::create_directories(root);
  fs::copy(b.root(), root, fs::copy_options::recursive);
  Installation::setDir(root);
  for (int start = 0; start < 2; ++start) {
    ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  }
  EXPECT_TRUE(Exists(root + "/Data Dictionaries/Good.framework/Resources/Info.vlr"));
  EXPECT_EQ(Hex(ReadBytes(root + "/vlt.vl5")), Md5Sum(root + "/vlt.vlr"));
}

TEST(HostilePlaces, InvalidTextInNamesUnderAnUtf8Locale) {
  HostileInstallation b;
  b.plant(Component("caf\xC3\xA9", 1), "caf\xC3\xA9.vle");
  b.plant(Component("bad\xFF\xFE", 2), "bad\xFF\xFE.vle");
  for (const char* locale : {"C.UTF-8", "C"}) {
    SCOPED_TRACE(locale);
    ExpectInChild([&] {
      ASSERT_NE(setlocale(LC_ALL, locale), nullptr);
      IvltRegistrar* r = nullptr;
      ASSERT_EQ(GetRegistrar(&r), "ok");
      EXPECT_EQ(Find(*r, G(kGood)), S_OK);
      if (std::string(locale) != "C") {
        EXPECT_EQ(Find(*r, G(1)), S_OK);
      }
      r->Release();
    });
  }
}

// ---- Scarce resources

// A full table of descriptors, at each degree: a refusal by result or exception, never a loss.
TEST(HostilePlaces, AFullDescriptorTableLosesNothing) {
  if (!kCanLimitMemory) GTEST_SKIP() << "a sanitizer opens descriptors for its own checks";
  HostileInstallation b;
  b.plant(Component("Other", 1, "FileName = \"Other\"\n"));
  ExpectStart("ok");
  std::string good = b.root() + "/Data Dictionaries/Good.framework/Resources/Info.vlr";
  time_t time = Installation::kInstalled;
  int worked = 0;
  for (rlim_t spare = 0; spare < 12; ++spare) {
    Installation::touch(good, ++time);
    SCOPED_TRACE(spare);
    ExpectInChild([&] {
      int next = dup(0);
      rlimit limit = {static_cast<rlim_t>(next) + spare, static_cast<rlim_t>(next) + spare};
      close(next);
      ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &limit), 0);
      IvltRegistrar* r = nullptr;
      if (GetRegistrar(&r) == "ok") {
        r->Release();
      }
    });
    EXPECT_TRUE(Exists(good)) << spare;
    EXPECT_TRUE(DatabaseText(b.database()).has("Other")) << spare;
    ExpectStart("ok", [&](IvltRegistrar& r) {
      EXPECT_EQ(Find(r, G(kGood)), S_OK) << spare;
      EXPECT_EQ(Find(r, G(1)), S_OK) << spare;
      ++worked;
    });
    ExpectWhole(b);
    EXPECT_EQ(DatabaseText(b.database()).quoted("Registration", good), Installation::stamp(time));
  }
}

// A medium that is full: the file size limit stops every write.
TEST(HostilePlaces, AWriteThatFailsLosesNothing) {
  HostileInstallation b;
  ExpectStart("ok");
  std::string before = ReadBytes(b.database());
  Installation::touch(b.root() + "/Data Dictionaries/Good.framework/Resources/Info.vlr", 1);
  ExpectInChild([&] {
    signal(SIGXFSZ, SIG_IGN);
    rlimit limit = {100, 100};
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
    IvltRegistrar* r = nullptr;
    ASSERT_EQ(GetRegistrar(&r), "ok");
    EXPECT_EQ(r->SetSchemaVersion(7), E_FAIL);
    r->Release();
  });
  EXPECT_EQ(ReadBytes(b.database()), before);
  b.expectGood();
}

}  // namespace
}  // namespace vlt::test

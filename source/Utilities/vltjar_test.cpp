#include "source/Utilities/vltjar.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <climits>
#include <filesystem>
#include <functional>
#include <thread>
#include <vector>

#include "source/Common/vltFileSecurity.h"
#include "source/Common/vltHookPoints.h"
#include "source/Common/vltTestHook.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/BuildModule.h"
#include "tests/support/Child.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/Modules.h"

namespace {

using namespace vlt::test;
using zt::fnd::String;

std::wstring Wide(const std::string& text) { return std::wstring(text.begin(), text.end()); }

std::string BadName(const std::string& file) {
  return file + zt::fnd::AnsiString(vlrGetCurrentLocalTime()).c_str() + ".bad";
}

// An installation with (at first) an empty data directory. The install directory is looked up once a
// process, so whatever asks for it runs in a child; its exit code is the body's result.
class vltjar : public testing::Test {
 protected:
  std::string data() const { return installation.root() + "/Data"; }
  std::string jar() const { return data() + "/vltjar.ini"; }
  std::string sidecar() const { return data() + "/vltjar.vl5"; }
  void makeData() { std::filesystem::create_directory(data()); }
  int run(const std::function<int()>& body) { return Child(body).wait(); }

  void expectSealed() const { EXPECT_EQ(Hex(ReadBytes(sidecar())), Md5Sum(jar())); }

  Installation installation;
};

TEST_F(vltjar, PathNeedsTheDataDirectoryAndMakesNone) {
  EXPECT_EQ(run([] { return GetJarFilePath() == nullptr ? 0 : 1; }), 0);
  EXPECT_FALSE(Exists(data()));
  makeData();
  EXPECT_EQ(run([&] {
              std::unique_ptr<wchar_t[]> path(GetJarFilePath());
              return path && Wide(jar()) == path.get() ? 0 : 1;
            }),
            0);
  EXPECT_FALSE(Exists(jar()));
}

TEST_F(vltjar, WithoutAnInstallDirectoryNothingWorks) {
  Installation::setDir("");
  EXPECT_EQ(run([] {
              GUID guid;
              wchar_t* text = nullptr;
              return vltSetServerCookie(1) == E_FAIL &&
                             vltAddSvrProcessIDToJar(L"s", 1) == E_FAIL &&
                             vltGetServerIdentity(&guid) == E_FAIL &&
                             GetOfflineEndpt(nullptr, &text) == E_FAIL && !text
                         ? 0
                         : 1;
            }),
            0);
}

TEST_F(vltjar, CookieIsKeptWithItsSidecarAndModes) {
  makeData();
  ScopedUmask strict(077);
  EXPECT_EQ(run([] { return vltSetServerCookie(-17); }), 0);
  EXPECT_EQ(ReadBytes(jar()), "[CookieSection]\nLastServerCookie = -17\n\n");
  EXPECT_EQ(ModeOf(jar()), 0777);
  EXPECT_EQ(ModeOf(sidecar()), 0777);
  expectSealed();
  EXPECT_EQ(run([] {
              int cookie = 0;
              String dataDir;
              return vltGetServerCookieFromFile(&cookie, dataDir) == S_OK && cookie == -17 ? 0 : 1;
            }),
            0);
}

TEST_F(vltjar, CookieWithoutADataDirectoryFailsAndMakesNone) {
  EXPECT_EQ(run([] { return vltSetServerCookie(1) == E_FAIL ? 0 : 1; }), 0);
  EXPECT_FALSE(Exists(data()));
}

TEST_F(vltjar, AMissingCookieIsZeroAndWritten) {
  EXPECT_EQ(run([] {
              int cookie = 5;
              String dataDir;
              return vltGetServerCookieFromFile(&cookie, dataDir) == S_OK && cookie == 0 ? 0 : 1;
            }),
            0);
  EXPECT_EQ(ReadBytes(jar()), "[CookieSection]\nLastServerCookie = 0\n\n");
  EXPECT_EQ(ModeOf(data()), 0777);
  expectSealed();
}

TEST_F(vltjar, ProcessIdMakesTheDataDirectory) {
  ScopedUmask strict(077);
  EXPECT_EQ(run([] { return vltAddSvrProcessIDToJar(L"Server A", 4711); }), 0);
  EXPECT_EQ(ModeOf(data()), 0777);
  EXPECT_EQ(ReadBytes(jar()), "[Server A]\nServerProcessID = 4711\n\n");
  expectSealed();
  // Later sections are set apart only in the save that brings them.
  EXPECT_EQ(run([] { return vltSetServerCookie(3); }), 0);
  EXPECT_EQ(ReadBytes(jar()),
            "[Server A]\nServerProcessID = 4711\n\n[CookieSection]\nLastServerCookie = 3\n\n");
}

// No section has an empty name, so nothing is kept, and what was kept before stays.
TEST_F(vltjar, AProcessIdThatCannotBeSetFails) {
  EXPECT_EQ(run([] {
              return vltAddSvrProcessIDToJar(L"", 1) == E_FAIL &&
                             vltAddSvrProcessIDToJar(nullptr, 1) == E_FAIL
                         ? 0
                         : 1;
            }),
            0);
  EXPECT_EQ(ReadBytes(jar()), "");
  EXPECT_EQ(run([] { return vltAddSvrProcessIDToJar(L"A", 7); }), 0);
  EXPECT_EQ(run([] { return vltAddSvrProcessIDToJar(L"", 1) == E_FAIL ? 0 : 1; }), 0);
  EXPECT_EQ(ReadBytes(jar()), "[A]\nServerProcessID = 7\n\n");
  expectSealed();
}

TEST_F(vltjar, IdentityNeedsItsLibraryAndLeavesNoKey) {
  makeData();
  EXPECT_EQ(run([] {
              GUID guid;
              return vltGetServerIdentity(&guid) == E_FAIL && vltGetServerIdentity(&guid) == E_FAIL
                         ? 0
                         : 1;
            }),
            0);
  EXPECT_EQ(ReadBytes(jar()), "");  // begun by the open, and not saved
  EXPECT_FALSE(Exists(sidecar()));
  EXPECT_EQ(vltGetServerIdentity(nullptr), E_POINTER);
}

TEST_F(vltjar, IdentityIsReadByEveryLaterCaller) {
  makeData();
  WriteBytes(jar(), "[ServerSection]\nServerIdentity={00000001-0002-0003-0405-060708090A0B}\n");
  auto first = [] {
    GUID guid = {};
    if (vltGetServerIdentity(&guid) != S_OK) return 99;
    return static_cast<int>(guid.Data1);
  };
  EXPECT_EQ(run(first), 1);
  EXPECT_EQ(run(first), 1);
  WriteBytes(jar(), "[ServerSection]\nServerIdentity=nonsense\n");
  EXPECT_EQ(run(first), 0);  // bad text is the null GUID
}

// A library whose every identity is another one, in place of the one that makes them.
class Identities {
 public:
  Identities() {
    BuildModule(m_dir / "libZT-RPC.so",
                "extern \"C\" int UuidCreate(unsigned* id) { static unsigned n; id[0] = ++n; "
                "return 0; }\n");
  }
  // For this process.
  bool load() const { return LoadForItsName(m_dir / "libZT-RPC.so"); }

 private:
  TempDir m_dir;
};

TEST_F(vltjar, IdentityIsMadeOnce) {
  Identities identities;
  makeData();
  auto ask = [&] {
    GUID first = {}, second = {};
    if (!identities.load() || vltCreateGuid2(&first) != S_OK) return 1;
    if (vltGetServerIdentity(&first) != S_OK || vltGetServerIdentity(&second) != S_OK) return 2;
    return first.Data1 == 2 && second.Data1 == 2 ? 0 : 3;
  };
  EXPECT_EQ(run(ask), 0);
  EXPECT_EQ(run(ask), 0);
  expectSealed();
}

TEST_F(vltjar, AnIdentityWithoutATextIsNotTold) {
  Identities identities;
  makeData();
  WriteBytes(installation.root() + "/VLTHooks.ini",
             std::string("[Hook]\nName = ") + vlt::hook::kStringFromClsid +
                 "\nSimulateMemoryAllocationFailure = true\n");
  EXPECT_EQ(run([&] {
              GUID id = {};
              vltRefreshHook();
              return identities.load() && vltGetServerIdentity(&id) == E_OUTOFMEMORY ? 0 : 1;
            }),
            0);
  EXPECT_EQ(ReadBytes(jar()), "");
}

// ---- Endpoints

std::string Endpoint(const wchar_t* storage) {
  wchar_t* text = nullptr;
  if (GetOfflineEndpt(const_cast<wchar_t*>(storage), &text) < 0) return "failed";
  std::string narrow = zt::fnd::AnsiString(text).c_str();
  vltFree(text);
  return narrow;
}

TEST_F(vltjar, EndpointsRunInACircle) {
  makeData();
  EXPECT_EQ(run([] { return Endpoint(L"a") == "61901" && Endpoint(L"a") == "61902" ? 0 : 1; }), 0);
  EXPECT_EQ(ReadBytes(jar()), "[OfflineStorageSection]\nNextEndpt = 61903\n");
  WriteBytes(jar(), "[OfflineStorageSection]\nNextEndpt=62100\n");
  EXPECT_EQ(run([] { return Endpoint(nullptr) == "62100" ? 0 : 1; }), 0);
  EXPECT_EQ(ReadBytes(jar()), "[OfflineStorageSection]\nNextEndpt = 61901\n");
  expectSealed();
}

TEST_F(vltjar, AStoragesEntryIsItsEndpoint) {
  makeData();
  WriteBytes(jar(), "[OfflineStorageSection]\nmine=7000\nNextEndpt=61950\n61950=mine\n");
  EXPECT_EQ(run([] {
              if (Endpoint(L"mine") != "7000") return 1;
              if (Endpoint(L"NextEndpt") != "61950") return 2;
              return Endpoint(L"other") == "61950" ? 0 : 3;  // taken, but that cannot be found out
            }),
            0);
}

// Numbers of the file, and what they are read as. The greatest long is cut like any other.
constexpr struct {
  const char* text;
  int number;
} kHostileNumbers[] = {{"2147483647", INT_MAX},
                       {"99999999999999999999", static_cast<int>(LONG_MAX)},
                       {"-99999999999999999999", static_cast<int>(LONG_MIN)},
                       {"-5", -5},
                       {"abc", 0}};

TEST_F(vltjar, AHostileCounterOverflowsNothing) {
  makeData();
  for (const auto& row : kHostileNumbers) {
    WriteBytes(jar(), std::string("[OfflineStorageSection]\nNextEndpt=") + row.text + "\n");
    EXPECT_EQ(run([&] { return Endpoint(L"x") == std::to_string(row.number) ? 0 : 1; }), 0)
        << row.text;
  }
}

TEST_F(vltjar, AHostileCookieIsCut) {
  makeData();
  for (const auto& row : kHostileNumbers) {
    WriteBytes(jar(), std::string("[CookieSection]\nLastServerCookie=") + row.text + "\n");
    EXPECT_EQ(run([&] {
                int cookie = 1;
                String dataDir;
                if (vltGetServerCookieFromFile(&cookie, dataDir) != S_OK) return 1;
                return cookie == row.number ? 0 : 2;
              }),
              0)
        << row.text;
  }
}

TEST_F(vltjar, NoEndpointIsHandedOutTwice) {
  makeData();
  constexpr int kProcesses = 4, kThreads = 4, kEach = 25;
  std::vector<Child> children;
  for (int p = 0; p < kProcesses; ++p) {
    children.emplace_back([&] {
      std::vector<std::thread> threads;
      for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([] {
          for (int i = 0; i < kEach; ++i) {
            if (Endpoint(L"s") == "failed") _exit(1);
          }
        });
      }
      for (auto& thread : threads) thread.join();
      return 0;
    });
  }
  for (Child& child : children) EXPECT_EQ(child.wait(), 0);
  // 400 requests went twice round the circle of 200.
  EXPECT_EQ(ReadBytes(jar()), "[OfflineStorageSection]\nNextEndpt = 61901\n");
  expectSealed();
}

// ---- Guarded files

class vltjarGuardedFile : public testing::Test {
 protected:
  vltjarGuardedFile() : file(dir / "x.ini"), wide(Wide(file)) {}

  HRESULT open() { return VltjarOpen(wide.c_str(), &ini); }
  std::string value(const char* section, const char* item) const {
    std::string text;
    return ini && ini->GetItem(section, item, &text) == S_OK ? text : "(none)";
  }

  TempDir dir;
  std::string file;
  std::wstring wide;
  std::unique_ptr<CvlIniMgr> ini;
};

TEST_F(vltjarGuardedFile, WithoutASidecarOpensAsItIsAndTheSaveMakesOne) {
  WriteBytes(file, "[s]\na=1\n");
  EXPECT_EQ(open(), S_OK);
  EXPECT_EQ(value("s", "a"), "1");
  EXPECT_FALSE(VltjarChecksumFileExists(wide.c_str()));
  ini->SetItem("s", "a", "2", false);
  EXPECT_EQ(VltjarSaveChanges(wide.c_str(), ini.get()), S_OK);
  EXPECT_TRUE(VltjarChecksumFileExists(wide.c_str()));
  EXPECT_EQ(Hex(ReadBytes(dir / "x.vl5")), Md5Sum(file));
}

TEST_F(vltjarGuardedFile, AShortSidecarGivesUpTheFile) {
  WriteBytes(file, "[s]\na=1\n");
  WriteBytes(dir / "x.vl5", std::string(15, 'x'));
  EXPECT_EQ(open(), E_FAIL);
  ASSERT_TRUE(ini);
  EXPECT_EQ(value("s", "a"), "(none)");
  EXPECT_EQ(ReadBytes(BadName(file)), "[s]\na=1\n");
  EXPECT_EQ(ReadBytes(file), "");
  EXPECT_FALSE(Exists(dir / "x.vl5"));
}

// Every opening would set the file aside, the second one the empty file over the copy of the first.
TEST_F(vltjarGuardedFile, ADirectoryInTheSidecarsPlaceCostsTheFileOnce) {
  WriteBytes(file, "[s]\na=1\n");
  WriteBytes(dir.makeDir("x.vl5") + "/inside", "kept");
  EXPECT_EQ(open(), E_FAIL);
  EXPECT_EQ(ReadBytes(BadName(file)), "[s]\na=1\n");
  EXPECT_EQ(ReadBytes(BadName(dir / "x.vl5") + "/inside"), "kept");
  ini->SetItem("s", "a", "2", false);
  EXPECT_EQ(VltjarSaveChanges(wide.c_str(), ini.get()), S_OK);
  ini.reset();
  EXPECT_EQ(open(), S_OK);
  EXPECT_EQ(value("s", "a"), "2");
  EXPECT_EQ(ReadBytes(BadName(file)), "[s]\na=1\n");
}

TEST_F(vltjarGuardedFile, WithADirectoryThatCannotBeMovedTheFileStays) {
  WriteBytes(file, "[s]\na=1\n");
  WriteBytes(dir.makeDir("x.vl5") + "/inside", "kept");
  ExpectInChild([&] {
    for (long rename : {SYS_renameat2, SYS_renameat}) ASSERT_TRUE(FailSystemCall(rename, EACCES));
    for (int opening = 0; opening < 2; ++opening) {
      EXPECT_EQ(open(), E_FAIL);
      EXPECT_EQ(value("s", "a"), "1");
      ini.reset();
    }
  });
  EXPECT_FALSE(Exists(BadName(file)));
}

// Two that find the sidecar short: the second must see what the first has made of it.
TEST_F(vltjarGuardedFile, AShortSidecarIsJudgedUnderTheLock) {
  WriteBytes(file, "[s]\na=1\n");
  WriteBytes(dir / "x.vl5", std::string(15, 'x'));
  std::unique_ptr<CvlIniMgr> lock(new CvlIniMgr(CvlIniMgr::LockOnly(file)));
  Child second([&] { return open() == S_OK && value("s", "a") == "new" ? 0 : 1; });
  ASSERT_TRUE(Eventually([&] { return BlockedIn(second.pid(), SYS_flock); }));
  ASSERT_EQ(open(), E_FAIL);
  ini->SetItem("s", "a", "new", false);
  ASSERT_EQ(VltjarSaveChanges(wide.c_str(), ini.get()), S_OK);
  ini.reset();
  lock.reset();
  EXPECT_EQ(second.wait(), 0);
  EXPECT_EQ(ReadBytes(BadName(file)), "[s]\na=1\n");
  EXPECT_EQ(Hex(ReadBytes(dir / "x.vl5")), Md5Sum(file));
}

TEST_F(vltjarGuardedFile, AWrongDigestCostsNothingAndIsRepaired) {
  WriteBytes(file, "[s]\na=1\n");
  for (char fill : {'q', '0'}) {
    WriteBytes(dir / "x.vl5", std::string(16, fill));
    EXPECT_EQ(open(), S_OK);
    EXPECT_EQ(value("s", "a"), "1");
    EXPECT_EQ(ReadBytes(dir / "x.vl5"), std::string(16, fill));
    EXPECT_EQ(VltjarSaveChanges(wide.c_str(), ini.get()), S_OK);
    EXPECT_EQ(Hex(ReadBytes(dir / "x.vl5")), Md5Sum(file));
    ini.reset();
  }
}

TEST_F(vltjarGuardedFile, AnUnparsableFileIsSetAside) {
  WriteBytes(file, "\xFE\xFF garbage");
  EXPECT_EQ(open(), S_OK);
  ASSERT_TRUE(ini);
  EXPECT_EQ(ReadBytes(BadName(file)), "\xFE\xFF garbage");
  EXPECT_EQ(ini->GetNumberOfSections(), 0);
}

TEST_F(vltjarGuardedFile, AFailedRetryLeavesAsItsInteger) {
  dir.makeDir("x.ini");
  EXPECT_THROW(open(), int);
  EXPECT_FALSE(ini);
}

TEST_F(vltjarGuardedFile, DeleteRenamesAndRemoves) {
  EXPECT_EQ(VltjarDeleteIniFile(wide.c_str()), S_OK);
  WriteBytes(file, "x");
  WriteBytes(dir / "x.vl5", "y");
  EXPECT_EQ(VltjarDeleteIniFile(wide.c_str()), S_OK);
  EXPECT_EQ(ReadBytes(BadName(file)), "x");
  EXPECT_FALSE(Exists(dir / "x.vl5"));
  EXPECT_EQ(VltjarDeleteIniFile(L"relative.ini"), E_UNEXPECTED);
  WriteBytes(dir / "plain", "");
  EXPECT_EQ(VltjarDeleteIniFile(Wide(dir / "plain/x.ini").c_str()), E_FAIL);  // ENOTDIR
}

TEST_F(vltjarGuardedFile, DigestsAreReadAndWritten) {
  unsigned char* digest = nullptr;
  EXPECT_EQ(VltjarGetChecksumForCacheFile(wide.c_str(), &digest), S_FALSE);
  auto* sixteen = reinterpret_cast<const unsigned char*>("0123456789abcdef");
  EXPECT_EQ(VltjarSetChecksumForCacheFile(wide.c_str(), sixteen), S_OK);
  EXPECT_EQ(VltjarGetChecksumForCacheFile(wide.c_str(), &digest), S_OK);
  EXPECT_EQ(std::string(reinterpret_cast<char*>(digest), 16), "0123456789abcdef");
  delete[] digest;
  EXPECT_EQ(VltjarSetChecksumForCacheFile(Wide(dir / "none/x.ini").c_str(), sixteen), E_FAIL);
}

TEST_F(vltjarGuardedFile, SidecarOfAPathCutsAtTheLastPoint) {
  auto* sixteen = reinterpret_cast<const unsigned char*>("0123456789abcdef");
  EXPECT_EQ(VltjarSetChecksumForCacheFile(Wide(dir / "nodot").c_str(), sixteen), S_OK);
  EXPECT_TRUE(Exists(CvlIniMgr::SidecarName(dir / "nodot")));
}

TEST(vltjarOfflineStorage, TheFamilyIsNotThere) {
  int inUse = 1;
  EXPECT_EQ(ValidateOfflineStorage(String(L"s"), &inUse, nullptr), E_FAIL);
  EXPECT_EQ(UpdateOfflineStorageInfo(String(L"s"), nullptr), E_FAIL);
  EXPECT_EQ(RemoveOfflineStorageInfo(String(L"s"), nullptr), E_FAIL);
}

}  // namespace

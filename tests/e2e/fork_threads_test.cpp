// Programs with several threads that fork: their children can make every call that takes a lock.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <iostream>
#include <string>

#include "tests/e2e/Start.h"
#include "tests/support/ForkStorm.h"
#include "tests/support/Modules.h"
#include "tests/support/Sanitizer.h"
#include "tests/support/ThreadState.h"

namespace vlt::test {
namespace {

class ForkThreads : public testing::Test {
 protected:
  void SetUp() override {
    if (!kCanForkWhileThreadsAllocate) GTEST_SKIP() << "the sanitizer's allocator is not fork-safe";
    MakeModule(m_place.root() + "/dictionary.so");
    m_place.addDictionary("Sample.framework", "Sample", GText(1), 1, "sp");
    m_place.addObjectExpert("Expert.vle", "Expert", GText(2));
    std::filesystem::create_directory(m_place.root() + "/Data");
    WriteBytes(m_place.root() + "/VLTHooks.ini", "[Hook]\nName = sample\n");
  }

  // Has threads and forked children make the call, in a process of its own that `prepare` begins.
  void storm(
      const std::function<bool()>& call, const std::function<void()>& prepare = [] {}) {
    ExpectInChild(
        [&] {
          prepare();
          ForkStorm result = RunForkStorm([&] { call(); }, call);
          std::cout << result << std::endl;
          EXPECT_GT(result.children, 3);
          EXPECT_EQ(0, result.hung);
          EXPECT_EQ(0, result.failed);
        },
        600000);
  }

  static IvltRegistrar* TheRegistrar() {
    IvltRegistrar* registrar = nullptr;
    vltGetRegistrar(&registrar);
    return registrar;
  }

  Installation m_place;
};

TEST_F(ForkThreads, GetRegistrar) {
  storm(
      [] {
        IvltRegistrar* registrar = TheRegistrar();
        if (!registrar) return false;
        registrar->Release();
        return true;
      },
      [] { TheRegistrar(); });
}

// Another process has the database. A thread of the parent waits for it, with the creation's locks;
// the child makes a registrar of its own, and so waits for the database too, and for nothing else.
TEST_F(ForkThreads, ChildOfAProcessThatIsMakingItsRegistrarMakesItsOwn) {
  std::string name;
  for (char c : m_place.database()) {
    if (c != '/' && c != '.') name += static_cast<char>(toupper(c));
  }
  const std::string locks = std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex";
  std::filesystem::create_directories(locks);
  int database = open((locks + "/" + name).c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
  ASSERT_EQ(0, flock(database, LOCK_EX));
  ExpectInChild([&] {
    // Both end with this process.
    auto* maker = new WatchedThread([] { TheRegistrar(); });
    ASSERT_TRUE(maker->blocksIn(SYS_flock));
    Child child([] { return TheRegistrar() ? 0 : 1; });
    EXPECT_TRUE(Eventually([&] { return BlockedIn(child.pid(), SYS_flock); }));
  });
  close(database);
}

TEST_F(ForkThreads, GetComponent) {
  IvltRegistrar* registrar = nullptr;
  storm([&] { return Find(*registrar, G(1)) == S_OK; }, [&] { registrar = TheRegistrar(); });
}

TEST_F(ForkThreads, EnumComponents) {
  IvltRegistrar* registrar = nullptr;
  storm([&] { return Names(*registrar, vltComponentDataDictionary).size() == 2; },
        [&] { registrar = TheRegistrar(); });
}

IvltRegistrar2* SettingsOf(IvltRegistrar* registrar) {
  void* settings = nullptr;
  registrar->QueryInterface(IID_IvltRegistrar2, &settings);
  return static_cast<IvltRegistrar2*>(settings);
}

TEST_F(ForkThreads, GetStorageServerCacheSize) {
  IvltRegistrar2* settings = nullptr;
  storm(
      [&] {
        unsigned sizeBytes = 0;
        return settings->GetStorageServerCacheSize(&sizeBytes) == S_OK && sizeBytes == 0x2000000;
      },
      [&] { settings = SettingsOf(TheRegistrar()); });
}

// The parent has the database: a child's save is refused, and does not wait.
TEST_F(ForkThreads, SetStorageServerCacheSize) {
  IvltRegistrar2* settings = nullptr;
  const pid_t parent = getpid();
  storm(
      [&] {
        HRESULT result = settings->SetStorageServerCacheSize(0x2000000);
        bool inParent = getppid() == parent;
        return inParent ? result == S_OK : result == E_FAIL;
      },
      [&] { settings = SettingsOf(TheRegistrar()); });
}

TEST_F(ForkThreads, LoadDataDictionaries) {
  storm([] { return vltLoadDataDictionaries() >= 0; }, [] { TheRegistrar(); });
}

TEST_F(ForkThreads, CheckComponent) {
  storm(
      [] {
        IEnumString* errors = nullptr;
        vltCheckComponent(G(2), &errors);
        if (errors) errors->Release();
        return errors != nullptr;
      },
      [] { TheRegistrar(); });
}

TEST_F(ForkThreads, GetLocalConfigurationUrl) {
  storm([] {
    wchar_t* url = nullptr;
    HRESULT result = vltGetLocalConfigurationURL(&url);
    bool good = result >= 0 && url;
    vltFree(url);
    return good;
  });
}

TEST_F(ForkThreads, GetServerIdentity) {
  WriteBytes(m_place.root() + "/Data/vltjar.ini",
             "[ServerSection]\nServerIdentity={00000001-0002-0003-0405-060708090A0B}\n");
  storm([] {
    GUID identity;
    return vltGetServerIdentity(&identity) >= 0;
  });
}

TEST_F(ForkThreads, GetClientSettings) {
  storm([] {
    wchar_t* endpoint = nullptr;
    HRESULT result =
        vltGetClientSettings(3, 1, 0, nullptr, nullptr, nullptr, &endpoint, nullptr, nullptr);
    vltFree(endpoint);
    return result >= 0;
  });
}

TEST_F(ForkThreads, GetStringResource) {
  std::wstring file = Wide(m_place.root() + "/dictionary.so");
  storm([&] {
    char text[64];
    char* out = text;
    vltGetStringResource("/", file.c_str(), L"key", &out, sizeof text);
    return true;
  });
}

TEST_F(ForkThreads, RefreshHook) {
  storm([] {
    vltRefreshHook();
    return true;
  });
}

}  // namespace
}  // namespace vlt::test

#include "vlloader/source/vlloader.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <thread>

#include "source/Common/vltcmn.h"
#include "tests/support/BuildModule.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/Modules.h"
#include "zt/fnd/Guid.h"

namespace vlt::test {
namespace {

// Each entry notes its call in the file that the variable names.
constexpr char kStorage[] = R"(
#include <cstdio>
#include <cstdlib>
static void Note(const char* text) {
  if (FILE* f = fopen(getenv("VLT_TEST_NOTES"), "a")) { fprintf(f, "%s\n", text); fclose(f); }
}
static int object;
extern "C" int vltInitialize(void* p) { Note(p ? "initialize?" : "initialize"); return 1; }
extern "C" int vltFinalize() { Note("finalize"); return 2; }
extern "C" int vltGetConfiguration(wchar_t* url, unsigned flags, void** out) {
  Note(*out ? "configuration?" : "configuration");
  if (flags == 1) *out = &object;
  if (flags == 3) return (int)0x80004001;
  return url && *url == L'5' ? 5 : 0;
}
extern "C" int vltGetConfigurationEx(void* options, void** out) {
  Note("configurationEx");
  *out = options;
  return 0;
})";

constexpr char kUtilities[] = R"(
#include <cstdlib>
#include <cwchar>
struct GUID { unsigned a; unsigned short b, c; unsigned char d[8]; };
static wchar_t* Copy(const wchar_t* s) {
  wchar_t* t = (wchar_t*)malloc((wcslen(s) + 1) * sizeof(wchar_t));
  return wcscpy(t, s);
}
extern "C" wchar_t* vltU32ToString(unsigned v) { return Copy(v == 7 ? L"seven" : L"other"); }
extern "C" GUID vltGuidFromString(const wchar_t* s) { GUID g = {(unsigned)wcslen(s)}; return g; }
extern "C" wchar_t* vltGuidToString(GUID g) { return Copy(g.a == 9 ? L"nine" : L"other"); }
extern "C" void vltFree(void* p) { free(p); })";

// An installation with a storage, as bundles or as plain libraries.
class Storage : public Installation {
 public:
  explicit Storage(bool bundles = true) {
    add("vlt", kStorage, bundles);
    add("vltutils", kUtilities, bundles);
    setenv("VLT_TEST_NOTES", (m_notes / "notes").c_str(), 1);
  }

  std::string fileOf(const std::string& name, bool bundles = true) const {
    return root() + (bundles ? "/" + name + ".framework" : "") + "/lib" + name + ".so";
  }
  std::string notes() const {
    return Exists(m_notes / "notes") ? ReadBytes(m_notes / "notes") : "";
  }

 private:
  void add(const std::string& name, const char* source, bool bundles) {
    std::filesystem::create_directories(std::filesystem::path(fileOf(name, bundles)).parent_path());
    BuildModule(fileOf(name, bundles), source);
  }

  TempDir m_notes;
};

TEST_IN_CHILD(vlloader, ThePathIsTheDefaultWithoutAPreference) {
  TempDir empty;
  setenv("XDG_CONFIG_HOME", empty.path().c_str(), 1);
  EXPECT_STREQ(GetCurrentVltPath(), "/Library/Application Support/Zentrex/KOR");
  EXPECT_STREQ(GetCurrentKorPath(), "/Library/Application Support/Zentrex/KOR");
}

TEST_IN_CHILD(vlloader, ThePathIsLookedUpOnce) {
  Installation i;
  EXPECT_EQ(GetCurrentVltPath(), i.root());
  Installation::setDir("/elsewhere");
  EXPECT_EQ(GetCurrentVltPath(), i.root());
  EXPECT_EQ(vlLookUpInstallDirectory(), "/elsewhere");
}

TEST_IN_CHILD(vlloader, AnEmptyPathIsNull) {
  Installation i;
  Installation::setDir("");
  EXPECT_EQ(GetCurrentVltPath(), nullptr);
  EXPECT_EQ(GetCurrentKorPath(), nullptr);
}

TEST_IN_CHILD(vlloader, NothingElseIsKnown) {
  Installation i;
  EXPECT_EQ(GetInstalledVltPath(), nullptr);
  EXPECT_EQ(GetInstalledVltVersion(), nullptr);
  EXPECT_EQ(GetCurrentVltVersion(), nullptr);
  EXPECT_EQ(GetInstalledKorPath(), nullptr);
  EXPECT_EQ(GetInstalledKorVersion(), nullptr);
  EXPECT_EQ(GetInstalledKorCommand(), nullptr);
  EXPECT_EQ(GetCurrentKorCommand(), nullptr);
  EXPECT_STREQ(GetCurrentKorVersion(), "");
}

TEST(vlloader, WithoutAPathTheLoadingIsGivenUpWithAWord) {
  Installation i;
  Installation::setDir("");
  TempDir out;
  ExpectInChild([&] {
    ASSERT_TRUE(freopen((out / "text").c_str(), "w", stdout));
    EXPECT_FALSE(IsKorStoragePresent());
    fflush(stdout);
  });
  EXPECT_EQ(ReadBytes(out / "text"), "Failed to get kor install path.\n");
}

TEST(vlloader, BothModulesMakeTheStoragePresent) {
  for (bool bundles : {true, false}) {
    Storage s(bundles);
    ExpectInChild([&] {
      EXPECT_TRUE(IsKorStoragePresent());
      EXPECT_TRUE(IsMapped(s.fileOf("vlt", bundles)));
      EXPECT_TRUE(IsMapped(s.fileOf("vltutils", bundles)));
      EXPECT_EQ(s.notes(), "");
    });
  }
}

TEST(vlloader, AMissingModuleStaysMissingForTheProcess) {
  for (const char* missing : {"vlt", "vltutils"}) {
    Storage s;
    TempDir aside;
    SCOPED_TRACE(missing);
    ExpectInChild([&] {
      std::string bundle = s.root() + "/" + missing + ".framework";
      std::filesystem::rename(bundle, aside / "bundle");
      EXPECT_FALSE(IsKorStoragePresent());
      std::filesystem::rename(aside / "bundle", bundle);
      EXPECT_FALSE(IsKorStoragePresent());
      int status = 7;
      EXPECT_EQ(GetKorConfiguration2(1, nullptr, &status), nullptr);
      EXPECT_EQ(status, E_FAIL);
    });
  }
}

TEST_IN_CHILD(vlloader, ABundleWithoutItsLibraryIsMissing) {
  Storage s;
  std::filesystem::remove(s.fileOf("vlt"));
  WriteBytes(s.root() + "/libvlt.so", "not asked for where there is a bundle");
  EXPECT_FALSE(IsKorStoragePresent());
}

TEST_IN_CHILD(vlloader, FinalizeWithoutInitializeFails) {
  Storage s;
  EXPECT_EQ(KorFinalize(), E_FAIL);
  EXPECT_TRUE(IsKorStoragePresent());
  EXPECT_EQ(KorFinalize(), E_FAIL);
  EXPECT_EQ(s.notes(), "");
}

TEST_IN_CHILD(vlloader, TheLastFinalizeCleansUp) {
  Storage s;
  EXPECT_EQ(KorInitialize(), 1);  // the storage's own answer
  EXPECT_EQ(KorInitialize(), S_OK);
  EXPECT_EQ(s.notes(), "initialize\n");
  EXPECT_TRUE(IsKorStoragePresent());
  EXPECT_EQ(KorFinalize(), S_OK);
  EXPECT_EQ(s.notes(), "initialize\n");
  EXPECT_TRUE(IsMapped(s.fileOf("vlt")));
  EXPECT_EQ(KorFinalize(), 2);
  EXPECT_EQ(s.notes(), "initialize\nfinalize\n");
  EXPECT_EQ(IsMapped(s.fileOf("vlt")), !kUnloadsModules);
  EXPECT_EQ(IsMapped(s.fileOf("vltutils")), !kUnloadsModules);
  EXPECT_EQ(KorFinalize(), E_FAIL);
}

TEST_IN_CHILD(vlloader, AfterACleanUpThePreferenceIsReadAnew) {
  Storage s;
  KorInitialize();
  EXPECT_EQ(GetCurrentVltPath(), s.root());
  Installation::setDir("/elsewhere");
  KorFinalize();
  EXPECT_STREQ(GetCurrentVltPath(), "/elsewhere");
}

// A caller may still be copying the text while another one cleans up.
TEST_IN_CHILD(vlloader, ThePathOutlivesACleanUp) {
  Storage s;
  KorInitialize();
  const char* text = GetCurrentVltPath();
  EXPECT_GT(s.root().size(), 16u);  // no text that lies in its object
  std::string other = "/elsewhere" + s.root();
  Installation::setDir(other);
  KorFinalize();
  EXPECT_STREQ(text, "");
  EXPECT_EQ(GetCurrentVltPath(), other);
  EXPECT_EQ(text, other);
}

// Each forwarded call before KorInitialize counts a load that nothing takes back.
TEST_IN_CHILD(vlloader, LoadsBeforeInitializeKeepTheModules) {
  Storage s;
  EXPECT_TRUE(IsKorStoragePresent());
  KorInitialize();
  EXPECT_EQ(KorFinalize(), 2);
  EXPECT_TRUE(IsMapped(s.fileOf("vlt")));
}

TEST_IN_CHILD(vlloader, LoadsWhileInitializedAreNotCounted) {
  if (!kUnloadsModules) GTEST_SKIP() << kNothingUnloaded;
  Storage s;
  KorInitialize();
  for (int n = 0; n < 5; ++n) IsKorStoragePresent();
  KorFinalize();
  EXPECT_FALSE(IsMapped(s.fileOf("vlt")));
}

TEST_IN_CHILD(vlloader, InitializeWithoutAStorageSucceedsAndIsInEffect) {
  Installation i;
  EXPECT_EQ(KorInitialize(), S_OK);
  EXPECT_FALSE(IsKorStoragePresent());
  EXPECT_EQ(KorFinalize(), S_OK);
  EXPECT_EQ(KorFinalize(), E_FAIL);
}

TEST_IN_CHILD(vlloader, ASaturatedCountNeverFalls) {
  Installation i;
  for (int n = 0; n < 1000005; ++n) KorInitialize();
  for (int n = 0; n < 1000010; ++n) ASSERT_EQ(KorFinalize(), S_OK);
}

TEST_IN_CHILD(vlloader, ACountBelowSaturationFalls) {
  Installation i;
  for (int n = 0; n < 999998; ++n) KorInitialize();
  for (int n = 0; n < 999998; ++n) ASSERT_EQ(KorFinalize(), S_OK);
  EXPECT_EQ(KorFinalize(), E_FAIL);
}

TEST_IN_CHILD(vlloader, ConfigurationsComeWithTheStoragesResult) {
  Storage s;
  int status = 7;
  EXPECT_NE(GetKorConfiguration2(1, nullptr, &status), nullptr);
  EXPECT_EQ(status, S_OK);
  wchar_t five[] = L"5";
  EXPECT_NE(GetKorConfiguration2(1, five, &status), nullptr);
  EXPECT_EQ(status, 5);
  EXPECT_EQ(GetKorConfiguration2(3, nullptr, &status), nullptr);
  EXPECT_EQ(status, E_NOTIMPL);
  EXPECT_NE(GetKorConfiguration2(1, nullptr, nullptr), nullptr);
  EXPECT_NE(GetKorConfiguration(1, nullptr), nullptr);
  EXPECT_EQ(GetKorConfiguration(0, nullptr), nullptr);
  EXPECT_EQ(s.notes(),
            "configuration\nconfiguration\nconfiguration\nconfiguration\n"
            "configuration\nconfiguration\n");
}

TEST_IN_CHILD(vlloader, SuccessWithoutAConfigurationIsAFailure) {
  Storage s;
  int status = 7;
  EXPECT_EQ(GetKorConfiguration2(0, nullptr, &status), nullptr);
  EXPECT_EQ(status, E_FAIL);
}

TEST_IN_CHILD(vlloader, NullOptionsLoadNothing) {
  Storage s;
  int status = 7;
  EXPECT_EQ(GetKorConfigurationEx(nullptr, &status), nullptr);
  EXPECT_EQ(status, E_POINTER);
  EXPECT_EQ(GetKorConfigurationEx(nullptr, nullptr), nullptr);
  EXPECT_FALSE(IsMapped(s.fileOf("vlt")));
  int options = 0;
  auto* some = reinterpret_cast<_vltStartupOptions*>(&options);
  EXPECT_EQ(GetKorConfigurationEx(some, &status), some);
  EXPECT_EQ(status, S_OK);
}

TEST_IN_CHILD(vlloader, ConversionsAreForwarded) {
  Storage s;
  TaskMem<wchar_t> seven(KorU32ToString(7)), nine(KorGuidToString({9, 0, 0, {}}));
  EXPECT_STREQ(seven.get(), L"seven");
  EXPECT_STREQ(nine.get(), L"nine");
  EXPECT_EQ(KorGuidFromString("twelve chars").Data1, 12u);
  EXPECT_EQ(KorGuidFromString(nullptr).Data1, 0u);
  EXPECT_EQ(KorFree(malloc(1)), nullptr);
}

TEST_IN_CHILD(vlloader, WithoutAStorageConversionsAnswerNothing) {
  Installation i;
  EXPECT_EQ(KorU32ToString(7), nullptr);
  EXPECT_EQ(KorGuidToString({9, 0, 0, {}}), nullptr);
  EXPECT_TRUE(KorGuidFromString("x") == GUID_NULL);
  int here = 0;
  EXPECT_EQ(KorFree(&here), nullptr);
}

TEST_IN_CHILD(vlloader, ANameThatIsNotFoundIsLeftOut) {
  Storage s;
  BuildModule(s.fileOf("vlt"), "extern \"C\" int vltSomething() { return 0; }");
  EXPECT_TRUE(IsKorStoragePresent());
  int status = 7;
  EXPECT_EQ(GetKorConfiguration2(1, nullptr, &status), nullptr);
  EXPECT_EQ(status, E_FAIL);
  EXPECT_EQ(KorInitialize(), S_OK);
  EXPECT_EQ(KorFinalize(), S_OK);
}

TEST_IN_CHILD(vlloader, ThreadsMayAskAtOnce) {
  Storage s;
  std::vector<std::thread> threads;
  for (int n = 0; n < 4; ++n) {
    threads.emplace_back([] {
      for (int k = 0; k < 50; ++k) {
        KorInitialize();
        EXPECT_TRUE(IsKorStoragePresent());
        EXPECT_NE(GetCurrentVltPath(), nullptr);
        KorFinalize();
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(KorFinalize(), E_FAIL);
}

}  // namespace
}  // namespace vlt::test

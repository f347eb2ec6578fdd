// Processes under different locales, one of which folds "i" to another capital than the others, agree on
// the locks of the files that they share: what both write at once is all there.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <wctype.h>

#include <clocale>
#include <filesystem>

#include "tests/e2e/Start.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/Tracing.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr char kTurkish[] = "tr_TR.UTF-8";
constexpr int kLongestMs = 120000;

class Locales : public testing::Test {
 protected:
  void SetUp() override {
    ProgramResult made =
        RunProgram({"localedef", "-i", "tr_TR", "-f", "UTF-8", m_locales / kTurkish});
    if (!Exists(m_locales / kTurkish)) {
      printf("NOT TESTED: two locales; localedef cannot make %s: %s\n", kTurkish, made.err.c_str());
      GTEST_SKIP() << "no localedef, or no source of the locale";
    }
    setenv("LOCPATH", m_locales.path().c_str(), 1);
    // A path in which the letter occurs.
    m_root = m_place.makeDir("installation");
    fs::copy(m_installation.root(), m_root, fs::copy_options::recursive);
    Installation::setDir(m_root);
  }

  static int runs() { return FullSize() ? 5 : 1; }
  static int sections() { return FullSize() ? 300 : kCanLimitMemory ? 100 : 20; }

  // Two processes at once, one under each locale; each is given its name.
  static void expectBoth(const std::function<int(const std::string&)>& body) {
    Signal begin;
    auto under = [&](const char* locale, const char* name) {
      return Child([&, locale, name] {
        if (!setlocale(LC_ALL, locale)) return 90;
        bool foldsToI = towupper(L'i') == static_cast<wint_t>(L'I');
        if (foldsToI != (std::string(locale) == "C")) return 92;
        if (!begin.await()) return 91;
        return body(name);
      });
    };
    Child turkish = under(kTurkish, "tr"), plain = under("C", "c");
    begin.notify();
    begin.notify();
    EXPECT_EQ(turkish.wait(kLongestMs), 0) << "under " << kTurkish;
    EXPECT_EQ(plain.wait(kLongestMs), 0) << "under C";
  }

  // Sections of both that the file has.
  static int Found(const std::string& file) {
    int found = 0;
    DatabaseText text(file);
    for (const char* name : {"tr", "c"}) {
      for (int n = 0; n < sections(); ++n) found += text.has(SectionOf(name, n));
    }
    return found;
  }

  static std::string SectionOf(const std::string& name, int n) {
    return "Section of " + name + " " + std::to_string(n);
  }

  TempDir m_locales, m_place;
  Installation m_installation;
  std::string m_root;
};

TEST_F(Locales, WriteOneGuardedFile) {
  for (int run = 0; run < runs(); ++run) {
    fs::remove_all(m_root + "/Data");
    expectBoth([](const std::string& name) {
      for (int n = 0; n < sections(); ++n) {
        if (vltAddSvrProcessIDToJar(Wide(SectionOf(name, n)).c_str(), n) != S_OK) return 1;
      }
      return 0;
    });
    int found = Found(m_root + "/Data/vltjar.ini");
    printf("guarded file, run %d: %d of %d sections\n", run + 1, found, 2 * sections());
    EXPECT_EQ(found, 2 * sections());
  }
  EXPECT_EQ(FilesSetAside(m_root), 0);
}

TEST_F(Locales, WriteOneDatabase) {
  for (int run = 0; run < runs(); ++run) {
    for (const char* name : {"/vlt.vlr", "/vlt.vl5"}) fs::remove(m_root + name);
    expectBoth([](const std::string& name) {
      IvltRegistrar* r = nullptr;
      if (GetRegistrar(&r) != "ok") return 1;
      for (int n = 0; n < sections(); ++n) {
        auto id = static_cast<uint32_t>((name == "c" ? 0x10000 : 0x20000) + n);
        Offered d(vltComponentDataDictionary, Wide(SectionOf(name, n)), G(id), L"/x/y.framework",
                  L"lo");
        if (r->RegisterComponent(&d.value) != S_OK) return 2;
      }
      return 0;
    });
    int found = Found(m_root + "/vlt.vlr");
    printf("database, run %d: %d of %d sections\n", run + 1, found, 2 * sections());
    EXPECT_EQ(found, 2 * sections());
  }
  EXPECT_EQ(FilesSetAside(m_root), 0);
}

}  // namespace
}  // namespace vlt::test

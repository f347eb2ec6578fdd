#include "source/Utilities/vltRegistrarEntry.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <thread>

#include "source/Utilities/vltutils.h"
#include "tests/support/BuildModule.h"
#include "tests/support/DatabaseText.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/RegistrarClient.h"
#include "zt/fnd/Exception.h"
#include "ztcom/ztcore/ztcom.h"

namespace vlt::test {
namespace {

using Registrar = CztComPtr<IvltRegistrar>;

TEST_IN_CHILD(vltRegistrarEntry, TheFirstCallMakesTheOneOfTheProcess) {
  Installation i;
  Registrar a, b, c;
  EXPECT_EQ(vltGetRegistrar(nullptr), E_POINTER);
  EXPECT_FALSE(Exists(i.database()));
  ASSERT_EQ(vltGetRegistrar(a.out()), S_OK);
  EXPECT_TRUE(Exists(i.database()));
  ASSERT_EQ(vltGetRegistrar(b.out()), S_OK);
  EXPECT_EQ(a.get(), b.get());
  // One reference is the process's own, the others are the callers'.
  EXPECT_EQ(a->AddRef(), 4u);
  EXPECT_EQ(a->Release(), 3u);
  EXPECT_EQ(vltGetRegistrar(nullptr), E_POINTER);
  EXPECT_EQ(vltGetRegistrar2(L"/x", L"/y", nullptr), E_POINTER);
}

TEST_IN_CHILD(vltRegistrarEntry, LaterPathsAreIgnored) {
  Installation i;
  TempDir other;
  Registrar a, b;
  ASSERT_EQ(vltGetRegistrar(a.out()), S_OK);
  std::wstring file = Wide(other / "vlt.vlr"), directory = Wide(other.path());
  ASSERT_EQ(vltGetRegistrar2(file.c_str(), directory.c_str(), b.out()), S_OK);
  EXPECT_EQ(a.get(), b.get());
  EXPECT_FALSE(Exists(other / "vlt.vlr"));
}

TEST(vltRegistrarEntry, ANullFileStandsForThePreferenceWhateverTheDirectory) {
  Installation i;
  i.addObjectExpert("E", "Exp", GText(1));
  for (const wchar_t* directory : {static_cast<const wchar_t*>(nullptr), L"/nowhere", L""}) {
    ExpectInChild([&] {
      Registrar a;
      ASSERT_EQ(vltGetRegistrar2(nullptr, directory, a.out()), S_OK);
      Received c;
      ASSERT_EQ(a->GetComponent(G(1), &c.value), S_OK);
      EXPECT_EQ(c.file(), Wide(i.root()) + L"/Experts/E.vle");
    });
  }
}

TEST(vltRegistrarEntry, FileAndDirectoryMayBeNamed) {
  Installation i;
  i.addObjectExpert("E", "Exp", GText(1));
  TempDir other;
  ExpectInChild([&] {
    Registrar a;
    std::wstring file = Wide(other / "mine.vlr");
    ASSERT_EQ(vltGetRegistrar2(file.c_str(), L"/elsewhere", a.out()), S_OK);
    Received c;
    // Found under the preference, named after the directory given.
    ASSERT_EQ(a->GetComponent(G(1), &c.value), S_OK);
    EXPECT_EQ(c.file(), L"/elsewhere/Experts/E.vle");
  });
  EXPECT_TRUE(Exists(other / "mine.vlr"));
  EXPECT_TRUE(Exists(other / "mine.vl5"));
  EXPECT_FALSE(Exists(i.database()));
}

// What the constructor raises frees the guard and the database, so that the next call can do it.
TEST_IN_CHILD(vltRegistrarEntry, AnExceptionLeavesNothingHeld) {
  Installation i;
  WriteBytes(i.root() + "/Data", "in the way");
  Registrar a;
  EXPECT_THROW(vltGetRegistrar(a.out()), zt::fnd::exception::ObjectAlreadyExists);
  EXPECT_FALSE(a);
  std::filesystem::remove(i.root() + "/Data");
  std::thread([&] { EXPECT_EQ(vltGetRegistrar(a.out()), S_OK); }).join();
  EXPECT_TRUE(a);
}

TEST_IN_CHILD(vltRegistrarEntry, AnEmptyPreferenceOrDirectoryIsRaised) {
  Installation i;
  Installation::setDir("");
  Registrar a;
  EXPECT_THROW(vltGetRegistrar(a.out()), zt::fnd::exception::InvalidArgument);
  std::wstring file = Wide(i.database());
  EXPECT_THROW(vltGetRegistrar2(file.c_str(), nullptr, a.out()),
               zt::fnd::exception::InvalidArgument);
  ASSERT_EQ(vltGetRegistrar2(file.c_str(), L"/x", a.out()), S_OK);
  // The preference is read at each call, also when there is a registrar.
  EXPECT_THROW(vltGetRegistrar(a.out()), zt::fnd::exception::InvalidArgument);
}

TEST_IN_CHILD(vltRegistrarEntry, ThreadsThatComeAtOnceGetTheSame) {
  Installation i;
  for (int n = 0; n < 20; ++n) i.addObjectExpert("E" + std::to_string(n), "X", GText(n + 1));
  std::wstring file = Wide(i.database()), directory = Wide(i.root());
  Registrar found[8];
  std::vector<std::thread> threads;
  for (int n = 0; n < 8; ++n) {
    threads.emplace_back([&, n] {
      HRESULT result = n % 2 ? vltGetRegistrar(found[n].out())
                             : vltGetRegistrar2(file.c_str(), directory.c_str(), found[n].out());
      EXPECT_EQ(result, S_OK);
    });
  }
  for (auto& thread : threads) thread.join();
  for (auto& registrar : found) EXPECT_EQ(registrar.get(), found[0].get());
}

// Answers while other threads ask, register and set; ThreadSanitizer has the last word.
TEST(vltRegistrarEntry, ThreadsMayUseTheRegistrarTogether) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  i.addObjectExpert("E", "Exp", GText(2), "{" + GText(2) + "}:1:{" + GText(9) + "}");
  ExpectInChild([&] {
    Registrar r;
    ASSERT_EQ(vltGetRegistrar(r.out()), S_OK);
    CztComPtr<IvltRegistrar2> two = CztComPtr<IvltRegistrar2>::Attach(
        ZtTryQueryInterface<IvltRegistrar2>(IID_IvltRegistrar2, r.get()));
    std::vector<std::thread> threads;
    for (int n = 0; n < 4; ++n) {
      threads.emplace_back([&, n] {
        for (int k = 0; k < 10; ++k) {
          EXPECT_EQ(Find(*r.get(), G(2)), S_OK);
          EXPECT_EQ(Names(*r.get(), vltComponentDataDictionary).size(), 2u);
          EXPECT_EQ(Bound(*r.get(), vltComponentObjectExpert, G(9)).size(), 1u);
          EXPECT_EQ(two->SetStorageServerCacheSize(static_cast<unsigned>(n)), S_OK);
          Offered d(vltComponentDataDictionary, L"Dict", G(1), L"/x", L"p");
          EXPECT_EQ(r->RegisterComponent(&d.value), S_OK);
        }
      });
    }
    for (auto& thread : threads) thread.join();
  });
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
}

TEST_IN_CHILD(vltRegistrarEntry, DictionariesAreLoadedThroughIt) {
  Installation i;
  i.addDictionary("D", "Dict", GText(1), 3, "d");
  EXPECT_EQ(vltLoadDataDictionaries(), S_OK);
}

// ---- By name

TEST_IN_CHILD(vltRegistrarEntry, ByNameItNeedsTheLibraryAndTheEntry) {
  TempDir dir;
  setenv("LD_LIBRARY_PATH", dir.path().c_str(), 1);
  ASSERT_EQ(chdir(dir.path().c_str()), 0);
  Registrar a;
  EXPECT_EQ(vltGetRegistrarDynamically(a.out()), E_FAIL);
}

}  // namespace
}  // namespace vlt::test

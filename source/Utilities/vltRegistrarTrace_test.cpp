// What the way to the registrar, and the loading test of the dictionaries, report to the log.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <new>

#include "source/Common/ZtUtils/General/vlTracer.h"
#include "source/Common/vltFailure.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/Modules.h"
#include "tests/support/RegistrarClient.h"
#include "ztcom/ztcore/ztcom.h"

namespace vlt::test {
namespace {

using Registrar = CztComPtr<IvltRegistrar>;

const std::string kNoInstallPath = "  Could not get the VLT install path in vltGetRegistrar\n";
const std::string kNoDataPath = "  Could not get the VLT data path in vltGetRegistrar\n";

// What the body traces under the mask, in a process that has the registrar already.
std::string Traced(unsigned mask, const std::function<void(IvltRegistrar&)>& body) {
  TempDir dir;
  ExpectInChild([&] {
    Registrar r;
    ASSERT_EQ(vltGetRegistrar(r.out()), S_OK);
    int log = open((dir / "log").c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600);
    int before = dup(2);
    ASSERT_EQ(dup2(log, 2), 2);
    vlTracer::Initialize(static_cast<vlTracer::SeverityLevel>(mask), vlTracer::kTargetError,
                         nullptr, 0);
    body(*r.get());
    ASSERT_EQ(dup2(before, 2), 2);
  });
  return ReadBytes(dir / "log");
}

// ---- The loading test

class vltRegistrarTraceLoading : public testing::Test {
 protected:
  vltRegistrarTraceLoading() {
    installation.addDictionary("D", "Gone", GText(1), 3, "d");
    installation.addBundle(
        "Data Dictionaries", "N.framework",
        "[KORComponents]\nN=N\n[N]\nIdentifier=" + GText(2) + "\nSchemaVersion=1\n");
    MakeModule(module);
    installation.addBundle("Data Dictionaries", "M.framework",
                           "[KORComponents]\nM=M\n[M]\nIdentifier=" + GText(3) +
                               "\nSchemaVersion=1\nFileName=\"" + module + "\"\n");
  }
  std::string failed(const std::string& bundle) const {
    return "  failed to load dictionary \"" + installation.root() + "/Data Dictionaries/" + bundle +
           ".framework\"\n";
  }

  Installation installation;
  std::string module = installation.root() + "/module.so";
};

TEST_F(vltRegistrarTraceLoading, EachDictionaryThatDoesNotLoadHasItsLine) {
  EXPECT_EQ(
      Traced(kTraceErrors,
             [&](IvltRegistrar& r) {
               EXPECT_EQ(vltLoadDataDictionaries2(&r), S_OK);
               EXPECT_EQ(IsMapped(module), !kUnloadsModules);
             }),
      failed("D") + "  invalid dictionary registration, missing file path\n" + failed("vltdd"));
}

TEST_F(vltRegistrarTraceLoading, WithoutTheErrorBitThereIsNone) {
  for (unsigned mask : {0u, ~kTraceErrors}) {
    EXPECT_EQ(Traced(mask, [](IvltRegistrar& r) { EXPECT_EQ(vltLoadDataDictionaries2(&r), S_OK); }),
              "");
  }
}

// ---- The way to the registrar, where memory is out

TEST(vltRegistrarTrace, TheFailedLookUpIsNamed) {
  Installation i;
  std::string text = Traced(kTraceErrors, [](IvltRegistrar&) {
    for (int n = 1;; ++n) {
      Registrar out;
      HRESULT result = E_OUTOFMEMORY;
      FailAllocation fail(n);
      try {
        result = vltGetRegistrar(out.out());
      } catch (const std::bad_alloc&) {
        // Behind both look-ups.
      }
      EXPECT_EQ(result == S_OK, out.get() != nullptr);
      if (!fail.happened()) break;
      if (result != E_OUTOFMEMORY) {
        EXPECT_EQ(result, E_FAIL) << n;
      }
    }
  });
  // The allocations of the first look-up, then as many of the second.
  size_t first = 0;
  while (text.compare(first * kNoInstallPath.size(), kNoInstallPath.size(), kNoInstallPath) == 0) {
    ++first;
  }
  ASSERT_GT(first, 0u) << text;
  std::string expected;
  for (size_t n = 0; n < first; ++n) expected += kNoInstallPath;
  for (size_t n = 0; n < first; ++n) expected += kNoDataPath;
  EXPECT_EQ(text, expected);
}

TEST(vltRegistrarTrace, TheLoadingTestWithoutARegistrarSaysSo) {
  Installation i;
  EXPECT_EQ(Traced(kTraceErrors,
                   [](IvltRegistrar&) {
                     FailAllocation fail(1);
                     EXPECT_EQ(vltLoadDataDictionaries(), E_FAIL);
                   }),
            kNoInstallPath + "  failed to get registrar\n");
}

}  // namespace
}  // namespace vlt::test

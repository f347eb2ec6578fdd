#include "zt/fnd/osdep/SharedLibrary.h"

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <string>

#include "tests/support/Child.h"
#include "tests/support/Modules.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/Bundle.h"
#include "zt/fnd/osdep/OSException.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::IsCosine;
using vlt::test::IsMapped;
using vlt::test::kNothingUnloaded;
using vlt::test::kUnloadsModules;
using vlt::test::MakeModule;
using vlt::test::TempDir;
using vlt::test::Wide;

TEST(SharedLibrary, EmptyNameLoadsNothing) {
  SharedLibrary none;
  EXPECT_FALSE(none.isLoaded());
  none.load();
  EXPECT_FALSE(none.isLoaded());
  EXPECT_EQ(none.getHandle(), nullptr);
  EXPECT_FALSE(SharedLibrary(String(), true, false).isLoaded());
  none.unload();
}

TEST(SharedLibrary, RelativeNameInAWorkingDirectoryThatIsGoneLoadsNothing) {
  TempDir dir;
  vlt::test::Child child([&] {
    if (chdir(dir.makeDir("gone").c_str()) != 0 || rmdir((dir / "gone").c_str()) != 0) return 1;
    if (SharedLibrary(Wide("./foo"), true, false).isLoaded()) return 2;
    if (SharedLibrary(Wide("sub/foo.framework"), true, false).isLoaded()) return 3;
    if (Bundle(L"./foo").isOpened()) return 4;
    return SharedLibrary(Wide("libm.so.6"), true, false).isLoaded() ? 0 : 5;  // needs no directory
  });
  EXPECT_EQ(child.wait(), 0);
}

TEST(SharedLibrary, NameWithoutADotIsDecoratedInItsDirectory) {
  TempDir dir;
  MakeModule(dir / "libfoo.so");
  {
    SharedLibrary library(Wide(dir / "foo"), true, false);
    EXPECT_TRUE(library.isLoaded());
    EXPECT_TRUE(IsMapped(dir / "libfoo.so"));
    EXPECT_TRUE(IsCosine(library.getFunctionPointer(AnsiString("cos"), false)));
    EXPECT_TRUE(IsCosine(library.getFunctionPointer(String(L"cos"), false)));
  }
  EXPECT_EQ(IsMapped(dir / "libfoo.so"), !kUnloadsModules);
}

TEST(SharedLibrary, NameWithADotGetsNoSuffixInAnyStep) {
  TempDir dir;
  MakeModule(dir / "libfoo.x.so");
  MakeModule(dir / "foo.x");
  dir.makeDir("foo.x.framework");
  MakeModule(dir / "foo.x.framework/libfoo.x.so");
  dir.makeDir("foo.x.bundle");
  MakeModule(dir / "foo.x.bundle/libfoo.x.so");
  SharedLibrary library(Wide(dir / "foo.x"), true, false);
  EXPECT_TRUE(IsMapped(dir / "foo.x"));
  EXPECT_FALSE(IsMapped(dir / "libfoo.x.so"));
  EXPECT_FALSE(IsMapped(dir / "foo.x.framework/libfoo.x.so"));
  EXPECT_FALSE(IsMapped(dir / "foo.x.bundle/libfoo.x.so"));
}

TEST(SharedLibrary, NameWithoutADotIsNeverTriedUndecorated) {
  TempDir dir;
  MakeModule(dir / "foo");
  EXPECT_FALSE(SharedLibrary(Wide(dir / "foo"), true, false).isLoaded());
}

TEST(SharedLibrary, DottedDirectoryDoesNotCountAsADottedName) {
  TempDir dir;
  dir.makeDir("a.b");
  MakeModule(dir / "a.b/libfoo.so");
  EXPECT_TRUE(SharedLibrary(Wide(dir / "a.b/foo"), true, false).isLoaded());
}

TEST(SharedLibrary, SearchOrderIsFrameworkBundleLibrary) {
  TempDir dir;
  const std::string framework = dir / "X.framework/libX.so", bundle = dir / "X.bundle/libX.so",
                    library = dir / "libX.so";
  MakeModule(library);
  {
    SharedLibrary loaded(Wide(dir / "X"), true, false);
    EXPECT_TRUE(IsMapped(library));
  }
  dir.makeDir("X.bundle");
  MakeModule(bundle);
  {
    SharedLibrary loaded(Wide(dir / "X"), true, false);
    EXPECT_TRUE(IsMapped(bundle));
    EXPECT_EQ(IsMapped(library), !kUnloadsModules);
    EXPECT_TRUE(IsCosine(loaded.getFunctionPointer(AnsiString("cos"), false)));
  }
  dir.makeDir("X.framework");
  MakeModule(framework);
  {
    SharedLibrary loaded(Wide(dir / "X"), true, false);
    EXPECT_TRUE(IsMapped(framework));
    EXPECT_EQ(IsMapped(bundle), !kUnloadsModules);
    EXPECT_TRUE(loaded.isLoaded());
  }
  EXPECT_EQ(IsMapped(framework), !kUnloadsModules);
}

TEST(SharedLibrary, FileWithABundlesNameIsLoadedItself) {
  TempDir dir;
  MakeModule(dir / "X.vle");
  SharedLibrary library(Wide(dir / "X.vle"), true, false);
  EXPECT_TRUE(library.isLoaded());
  EXPECT_TRUE(IsMapped(dir / "X.vle"));
}

TEST(SharedLibrary, FailedLoadIsQuiet) {
  TempDir dir;
  vlt::test::WriteBytes(dir / "libbroken.so", "no module");
  ASSERT_EQ(mkfifo((dir / "libpipe.so").c_str(), 0600), 0);
  dir.makeDir("libdir.so");
  for (const char* name : {"missing", "broken", "pipe", "dir", "libdir.so", "libpipe.so"}) {
    SharedLibrary library(Wide(dir / name), true, false);
    EXPECT_FALSE(library.isLoaded()) << name;
    library.load(Wide(dir / name));  // nothing has been loaded: allowed again
    EXPECT_FALSE(library.isLoaded()) << name;
  }
}

TEST(SharedLibrary, LoadByNameAfterALoadIsInvalidEvenWhenUnloaded) {
  TempDir dir;
  MakeModule(dir / "libfoo.so");
  SharedLibrary library;
  library.load(Wide(dir / "foo"));
  ASSERT_TRUE(library.isLoaded());
  EXPECT_THROW(library.load(Wide(dir / "foo")), exception::InvalidOperation);
  library.unload();
  EXPECT_FALSE(library.isLoaded());
  EXPECT_EQ(library.getHandle(), nullptr);
  EXPECT_THROW(library.load(Wide(dir / "foo")), exception::InvalidOperation);
  library.load();  // the requested name has stayed
  EXPECT_TRUE(library.isLoaded());
}

TEST(SharedLibrary, LoadAgainReplacesTheHandle) {
  if (!kUnloadsModules) GTEST_SKIP() << kNothingUnloaded;
  TempDir dir;
  MakeModule(dir / "libfoo.so");
  {
    SharedLibrary library(Wide(dir / "foo"), true, false);
    library.load();
    library.load();
    EXPECT_TRUE(library.isLoaded());
  }
  EXPECT_FALSE(IsMapped(dir / "libfoo.so")) << "a load was not given back";
}

TEST(SharedLibrary, UnloadedLookUp) {
  SharedLibrary library;
  EXPECT_EQ(library.getFunctionPointer(AnsiString("cos"), true), nullptr);
  EXPECT_EQ(library.getFunctionPointer(String(L"cos"), true), nullptr);
  dlerror();
  try {
    library.getFunctionPointer(AnsiString("cos"), false);
    FAIL();
  } catch (const PosixError& e) {
    EXPECT_STREQ(e.what(), "");
    EXPECT_EQ(e.getErrorCode(), 42u);
  }
}

TEST(SharedLibrary, MissingFunctionIsThrownWithTheLoadersText) {
  TempDir dir;
  MakeModule(dir / "libfoo.so");
  SharedLibrary library(AnsiString((dir / "foo").c_str()), true, true);
  EXPECT_EQ(library.getFunctionPointer(AnsiString("no_such_function"), true), nullptr);
  try {
    library.getFunctionPointer(String(L"no_such_function"), false);
    FAIL();
  } catch (const PosixError& e) {
    EXPECT_NE(strstr(e.what(), "no_such_function"), nullptr);
  }
}

TEST(SharedLibrary, ModuleStaysWhenTheObjectIsToldSo) {
  for (bool bundle : {false, true}) {
    TempDir dir;
    dir.makeDir("X.bundle");
    std::string module = bundle ? dir / "X.bundle/libX.so" : dir / "libX.so";
    MakeModule(module);
    void* function;
    {
      SharedLibrary library(Wide(dir / "X"), false, false);
      function = library.getFunctionPointer(AnsiString("cos"), false);
    }
    EXPECT_TRUE(IsMapped(module)) << bundle;
    EXPECT_TRUE(IsCosine(function));
  }
}

TEST(SharedLibrary, CopiesHoldLoadsOfTheirOwn) {
  TempDir dir;
  MakeModule(dir / "libfoo.so");
  MakeModule(dir / "libbar.so");
  {
    auto* first = new SharedLibrary(Wide(dir / "foo"), true, false);
    SharedLibrary copy(*first), assigned(Wide(dir / "bar"), true, false);
    assigned = *first;
    EXPECT_EQ(IsMapped(dir / "libbar.so"), !kUnloadsModules);
    delete first;
    EXPECT_TRUE(copy.isLoaded());
    EXPECT_TRUE(assigned.isLoaded());
    copy.unload();
    SharedLibrary ofUnloaded(copy);
    EXPECT_FALSE(ofUnloaded.isLoaded());
    EXPECT_THROW(ofUnloaded.load(Wide(dir / "bar")), exception::InvalidOperation);
    SharedLibrary& self = assigned;
    assigned = self;
    EXPECT_TRUE(assigned.isLoaded());
  }
  EXPECT_EQ(IsMapped(dir / "libfoo.so"), !kUnloadsModules);
}

TEST(SharedLibrary, SwapExchangesAll) {
  TempDir dir;
  MakeModule(dir / "libfoo.so");
  SharedLibrary loaded(Wide(dir / "foo"), true, false), empty;
  void* handle = loaded.getHandle();
  loaded.swap(empty);
  EXPECT_FALSE(loaded.isLoaded());
  EXPECT_EQ(handle, empty.getHandle());
  loaded.load();
  EXPECT_FALSE(loaded.isLoaded());  // the requested name went along
}

TEST(SharedLibrary, DecorateNameChangesNothing) {
  EXPECT_STREQ("foo", AnsiString(SharedLibrary::decorateName(L"foo")).c_str());
}

// ---- bare names: the loader's own search path, which is read when a process starts

// So this program runs itself: with the variable set it ends, before anything else, with one bit for
// each name that it could load.
constexpr char kNamesOnly[] = "VLT_TEST_BARE_NAMES_ONLY";

[[gnu::constructor]] void LoadBareNames() {
  if (!getenv(kNamesOnly)) return;
  int loaded = 0, bit = 1;
  for (const wchar_t* name : {L"bare", L"libbare.so", L"absent"}) {
    if (SharedLibrary(String(name), true, false).isLoaded()) loaded |= bit;
    bit *= 2;
  }
  _exit(loaded);
}

TEST(SharedLibraryBare, NameGoesToTheLoaderAsLibNameSo) {
  TempDir dir;
  MakeModule(dir / "libbare.so");
  auto run = [&](const std::string& path) {
    return vlt::test::RunProgram({"/proc/self/exe"}, {{kNamesOnly, "1"}, {"LD_LIBRARY_PATH", path}})
        .exitCode;
  };
  EXPECT_EQ(run(dir.path()), 3);
  EXPECT_EQ(run(dir / "elsewhere"), 0);
}

TEST(SharedLibraryBare, WorkingDirectoryIsNotSearched) {
  TempDir dir;
  MakeModule(dir / "libhere.so");
  vlt::test::Child child([&] {
    if (chdir(dir.path().c_str()) != 0) return 1;
    return SharedLibrary(String(L"here"), true, false).isLoaded() ? 2 : 0;
  });
  EXPECT_EQ(child.wait(), 0);
}

}  // namespace
}  // namespace zt::fnd::osdep

#include "zt/fnd/osdep/Bundle.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cmath>
#include <string>

#include "tests/support/Modules.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/OSException.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::IsCosine;
using vlt::test::IsMapped;
using vlt::test::kUnloadsModules;
using vlt::test::MakeModule;
using vlt::test::TempDir;
using vlt::test::Wide;

TEST(Bundle, DecorateName) {
  const char* rows[][2] = {
      {"X", "X.bundle"}, {"X.framework", "X.framework"}, {"/a.b/X", "/a.b/X.bundle"}, {".", "."}};
  for (const auto& row : rows) {
    EXPECT_STREQ(row[1], AnsiString(Bundle::decorateName(Wide(row[0]))).c_str());
  }
  EXPECT_THROW(Bundle::decorateName(String()), exception::InvalidArgument);
}

TEST(Bundle, OpensTheFirstModuleInsideThatLoads) {
  for (const char* inside : {"libX.so", "X.so", "X"}) {
    for (const char* name : {"X.framework", "X.bundle", "X.vle"}) {
      TempDir dir;
      dir.makeDir(name);
      std::string module = dir / (std::string(name) + "/" + inside);
      MakeModule(module);
      {
        Bundle bundle(Wide(dir / name));
        EXPECT_TRUE(bundle.isOpened()) << inside << " in " << name;
        EXPECT_TRUE(bundle.isLoaded());
        EXPECT_TRUE(IsCosine(bundle.getFunctionPointer(L"cos", false)));
        EXPECT_TRUE(IsMapped(module));
      }
      EXPECT_EQ(IsMapped(module), !kUnloadsModules);
    }
  }
}

TEST(Bundle, OrderInsideIsLibraryPlainBare) {
  TempDir dir;
  dir.makeDir("X.bundle");
  vlt::test::WriteBytes(dir / "X.bundle/libX.so", "no module");
  MakeModule(dir / "X.bundle/X.so");
  MakeModule(dir / "X.bundle/X");
  {
    Bundle bundle(Wide(dir / "X"));  // decorated
    EXPECT_TRUE(IsMapped(dir / "X.bundle/X.so"));
    EXPECT_FALSE(IsMapped(dir / "X.bundle/X"));
  }
  MakeModule(dir / "X.bundle/libX.so");
  Bundle bundle(Wide(dir / "X"));
  EXPECT_TRUE(IsMapped(dir / "X.bundle/libX.so"));
  EXPECT_EQ(IsMapped(dir / "X.bundle/X.so"), !kUnloadsModules);
}

TEST(Bundle, WhatIsNoDirectoryIsNoBundle) {
  TempDir dir;
  MakeModule(dir / "X.bundle");
  dir.makeDir("empty.framework");
  dir.makeDir(".bundle");
  dir.makeDir("pipe.bundle");
  ASSERT_EQ(mkfifo((dir / "pipe.bundle/libpipe.so").c_str(), 0600), 0);
  for (const std::string& no :
       {dir / "X.bundle", dir / "missing", dir / "empty.framework", dir / ".bundle", dir / "pipe",
        std::string("libm.so.6"), std::string("X"), std::string()}) {
    Bundle bundle(Wide(no));
    EXPECT_FALSE(bundle.isOpened()) << no;
    EXPECT_FALSE(bundle.isLoaded());
  }
}

TEST(Bundle, LookUpFailures) {
  Bundle closed{String()};
  EXPECT_EQ(closed.getFunctionPointer(L"cos", true), nullptr);
  EXPECT_THROW(closed.getFunctionPointer(L"cos", false), exception::InvalidOperation);
  TempDir dir;
  dir.makeDir("X.bundle");
  MakeModule(dir / "X.bundle/libX.so");
  Bundle bundle(Wide(dir / "X"));
  EXPECT_EQ(bundle.getFunctionPointer(L"no_such_function", true), nullptr);
  try {
    bundle.getFunctionPointer(L"no_such_function", false);
    FAIL();
  } catch (const PosixError& e) {
    EXPECT_NE(strstr(e.what(), "no_such_function"), nullptr);
    EXPECT_EQ(e.getErrorCode(), 42u);
  }
}

TEST(Bundle, CopiesShareTheModule) {
  TempDir dir;
  dir.makeDir("X.bundle");
  MakeModule(dir / "X.bundle/libX.so");
  auto* first = new Bundle(Wide(dir / "X"));
  {
    Bundle copy(*first);
    delete first;
    EXPECT_TRUE(copy.isOpened());
    EXPECT_TRUE(IsCosine(copy.getFunctionPointer(L"cos", false)));
  }
  EXPECT_EQ(IsMapped(dir / "X.bundle/libX.so"), !kUnloadsModules);
}

}  // namespace
}  // namespace zt::fnd::osdep

#include <gtest/gtest.h>

#include "source/Utilities/vltjar.h"
#include "tests/support/InChild.h"
#include "tests/support/TempDir.h"
#include "tests/support/TestIni.h"

namespace {

using namespace vlt::test;

TEST(vltJarFork, AJarIsNotSavedByAChildOfItsHolder) {
  TempDir dir;
  std::string file = dir / "x.ini";
  zt::fnd::String name(file.c_str());
  std::unique_ptr<CvlIniMgr> jar;
  ASSERT_EQ(VltjarOpen(name.c_str(), &jar), S_OK);
  ASSERT_EQ(jar->SetItem("s", "parent", "1", true), S_OK);
  ASSERT_EQ(VltjarSaveChanges(name.c_str(), jar.get()), S_OK);
  std::string sidecar = CvlIniMgr::SidecarName(file);
  std::string before = ReadBytes(file), digestBefore = ReadBytes(sidecar);
  ExpectInChild([&] {
    jar->SetItem("s", "child", "1", true);
    EXPECT_LT(VltjarSaveChanges(name.c_str(), jar.get()), 0);
  });
  EXPECT_EQ(ReadBytes(file), before);
  EXPECT_EQ(ReadBytes(sidecar), digestBefore);
}

}  // namespace

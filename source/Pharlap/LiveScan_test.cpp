#include "source/Pharlap/LiveScan.h"

#include <gtest/gtest.h>

#include "source/vlIniMgr.h"
#include "tests/support/TempDir.h"

namespace registrar {
namespace {

TEST(LiveScan, AFileOpenedBeforeIsTheOneThatIsTaken) {
  vlt::test::TempDir dir;
  CvlIniMgr database = CvlIniMgr::OpenForUpdate(dir / "vlt.vlr");
  LiveScan scan(database);
  vlt::test::WriteBytes(dir / "a.vlr", "[S]\nx = 1\n");
  ASSERT_TRUE(scan.openFragment(dir / "a.vlr"));
  EXPECT_TRUE(scan.takeFragment("/not opened"));
  EXPECT_FALSE(scan.openFragment(dir.makeDir("directory")));
}

}  // namespace
}  // namespace registrar

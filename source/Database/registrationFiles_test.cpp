#include "source/Database/registrationFiles.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "tests/support/TempDir.h"
#include "zt/fnd/osdep/path.h"

namespace registrar {
namespace {

using vlt::test::TempDir;
using vlt::test::WriteBytes;

RegistrationFiles Find(const TempDir& dir) {
  RegistrationFiles files;
  zt::fnd::String directory(dir.path().c_str());
  zt::fnd::osdep::path::MakePathEndInSlash(directory);
  AppendRegistrationFiles(directory, zt::fnd::String(L"*.vle"), files);
  return files;
}

TEST(registrationFiles, AreFoundInBundlesOfTheMask) {
  TempDir dir;
  for (const char* bundle : {"a.vle", "b.framework", "c.vle"}) {
    std::string resources = dir.makeDir(bundle) + "/Resources";
    ASSERT_EQ(mkdir(resources.c_str(), 0777), 0);
    if (bundle[0] != 'c') WriteBytes(resources + "/Info.vlr", "");
  }
  WriteBytes(dir / "file.vle", "");
  RegistrationFiles files = Find(dir);
  ASSERT_EQ(files.size(), 1u);
  EXPECT_EQ(files[0].first.exactCompare(
                zt::fnd::String((dir / "a.vle/Resources/Info.vlr").c_str()).c_str()),
            0);
}

TEST(registrationFiles, APathWithALineEndIsLeftOut) {
  TempDir dir;
  std::string resources = dir.makeDir("a\n.vle") + "/Resources";
  ASSERT_EQ(mkdir(resources.c_str(), 0777), 0);
  WriteBytes(resources + "/Info.vlr", "");
  EXPECT_EQ(Find(dir).size(), 0u);
}

TEST(registrationFiles, OnlyAnAbsolutePathOfARegularFileIsThere) {
  TempDir dir;
  WriteBytes(dir / "file", "");
  ASSERT_EQ(symlink((dir / "loop").c_str(), (dir / "loop").c_str()), 0);
  EXPECT_TRUE(FileIsThere(dir / "file"));
  EXPECT_FALSE(FileIsThere(dir / "none"));
  EXPECT_FALSE(FileIsThere(dir / "file/below"));
  EXPECT_FALSE(FileIsThere(dir / "loop"));
  ASSERT_EQ(chdir(dir.path().c_str()), 0);
  EXPECT_FALSE(FileIsThere("file"));
  ASSERT_EQ(chdir("/"), 0);
}

}  // namespace
}  // namespace registrar

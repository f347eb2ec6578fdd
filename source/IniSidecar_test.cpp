#include "source/IniSidecar.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <thread>

#include "tests/support/Child.h"
#include "tests/support/Installation.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/Exception.h"

namespace {

using namespace vlt::test;

IniSidecar::Digest Sixteen(const std::string& text) {
  IniSidecar::Digest digest;
  std::copy_n(text.begin(), digest.size(), digest.begin());
  return digest;
}

TEST(IniSidecar, ReadsSixteenBytesAndReportsWhatItFinds) {
  TempDir dir;
  std::string name = dir / "x.vl5";
  const IniSidecar::Digest before = Sixteen("untouched bytes.");
  IniSidecar::Digest digest = before;
  EXPECT_EQ(IniSidecar::Read(name, &digest), IniSidecar::State::Missing);
  WriteBytes(name, std::string(15, 'a'));
  EXPECT_EQ(IniSidecar::Read(name, &digest), IniSidecar::State::Short);
  EXPECT_EQ(digest, before);
  WriteBytes(name, std::string(16, 'a') + "more");
  EXPECT_EQ(IniSidecar::Read(name, &digest), IniSidecar::State::Present);
  EXPECT_EQ(digest, Sixteen("aaaaaaaaaaaaaaaa"));
  std::filesystem::remove(name);
  std::filesystem::create_directory(name);
  EXPECT_EQ(IniSidecar::Read(name, &digest), IniSidecar::State::Short);
}

TEST(IniSidecar, IsWrittenWholeWithItsModeAndNothingBesideIt) {
  TempDir dir;
  std::string name = dir / "x.vl5";
  ScopedUmask strict(077);
  const IniSidecar::Digest first = Sixteen("0123456789abcdef");
  EXPECT_EQ(IniSidecar::Write(name, first, true), S_OK);
  EXPECT_EQ(ReadBytes(name), "0123456789abcdef");
  EXPECT_EQ(ModeOf(name), 0777);
  WriteBytes(name, std::string(40, 'x'));
  EXPECT_EQ(IniSidecar::Write(name, IniSidecar::kInvalidMark, false), S_OK);
  EXPECT_EQ(ReadBytes(name), "0000000000000000");
  WriteBytes(name, "short");
  EXPECT_EQ(IniSidecar::Write(name, first, false), S_OK);
  EXPECT_EQ(ReadBytes(name), "0123456789abcdef");
  EXPECT_FALSE(Exists(name + ".TMP"));
}

TEST(IniSidecar, IsNotWrittenThroughALinkNorOverALeftover) {
  TempDir dir;
  WriteBytes(dir / "victim", "precious");
  ASSERT_EQ(symlink((dir / "victim").c_str(), (dir / "x.vl5").c_str()), 0);
  EXPECT_EQ(IniSidecar::Write(dir / "x.vl5", IniSidecar::kInvalidMark, false), E_FAIL);
  EXPECT_EQ(ReadBytes(dir / "victim"), "precious");
  ASSERT_EQ(symlink((dir / "victim").c_str(), (dir / "y.vl5.TMP").c_str()), 0);
  EXPECT_EQ(IniSidecar::Write(dir / "y.vl5", IniSidecar::kInvalidMark, false), S_OK);
  EXPECT_EQ(ReadBytes(dir / "victim"), "precious");
  EXPECT_EQ(ReadBytes(dir / "y.vl5"), "0000000000000000");
}

TEST(IniSidecar, AFileWithASecondNameIsReplacedAndNotOverwritten) {
  TempDir dir;
  WriteBytes(dir / "victim", "precious bytes!!");
  ASSERT_EQ(link((dir / "victim").c_str(), (dir / "x.vl5").c_str()), 0);
  EXPECT_EQ(IniSidecar::Write(dir / "x.vl5", IniSidecar::kInvalidMark, true), S_OK);
  EXPECT_EQ(ReadBytes(dir / "victim"), "precious bytes!!");
  EXPECT_EQ(ReadBytes(dir / "x.vl5"), "0000000000000000");
}

}  // namespace

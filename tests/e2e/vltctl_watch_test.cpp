// watch: what changes in an installation is printed while it happens.
#include <gtest/gtest.h>
#include <signal.h>

#include <filesystem>

#include "tests/e2e/RunningVltctl.h"
#include "tests/e2e/Start.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;
using nlohmann::json;

std::string Named(uint32_t n) { return "object expert Tank {" + GText(n) + "}"; }

struct VltctlWatch : testing::Test {
  Installation i;
  std::string data = i.root() + "/Data";
};

TEST_F(VltctlWatch, ComponentsComeFirstToTheTreeAndThenToTheDatabase) {
  ExpectStart("ok");
  RunningVltctl watch({"watch"});
  ASSERT_TRUE(watch.prints("watching " + i.root() + "\n"));
  i.addObjectExpert("Tank", "Tank", GText(1));
  ASSERT_TRUE(watch.prints("the next start adds " + Named(1) + "\n"));
  ExpectStart("ok");
  ASSERT_TRUE(watch.prints("added: " + Named(1) + "\n"));
  i.removeBundle("Experts", "Tank.vle");
  ASSERT_TRUE(watch.prints("removed: " + Named(1) + "\n"));
  EXPECT_EQ(watch.stop(SIGINT), kGood);
  EXPECT_EQ(watch.err(), "");
}

TEST_F(VltctlWatch, AChangedComponentIsPendingAndThenChanged) {
  i.addDictionary("Core", "Core", GText(1), 7, "co");
  ExpectStart("ok");
  RunningVltctl watch({"watch"});
  ASSERT_TRUE(watch.prints("watching "));
  std::string file = i.addDictionary("Core", "Core", GText(1), 8, "co");
  Installation::touch(file, Installation::kInstalled + 60);
  ASSERT_TRUE(watch.prints("the next start changes dictionary Core {" + GText(1) + "}\n"));
  ExpectStart("ok");
  ASSERT_TRUE(watch.prints("changed: dictionary Core {" + GText(1) + "}\n"));
  EXPECT_EQ(watch.stop(SIGTERM), kGood);
}

TEST_F(VltctlWatch, ASettingIsPrintedWithItsOldAndItsNewValue) {
  fs::create_directory(data);
  WriteBytes(data + "/kor.ini", "[STORAGE]\nNumCheckpoints=1\n");
  RunningVltctl watch({"watch"});
  ASSERT_TRUE(watch.prints("watching "));
  EXPECT_EQ(Vltctl({"settings", "set", "NumCheckpoints", "5"}).exitCode, kGood);
  ASSERT_TRUE(watch.prints("settings changed: NumCheckpoints 1 -> 5\n"));
  fs::remove(data + "/kor.ini");
  ASSERT_TRUE(watch.prints("settings changed: NumCheckpoints 5 -> (not set)\n"));
  EXPECT_EQ(watch.stop(), kGood);
}

TEST_F(VltctlWatch, TheStateOfTheDatabaseIsThatOfVerify) {
  ExpectStart("ok");
  RunningVltctl watch({"watch"});
  ASSERT_TRUE(watch.prints("watching "));
  WriteBytes(i.sidecar(), "short");
  ASSERT_TRUE(watch.prints("database: sound -> sidecar-short\n"));
  EXPECT_EQ(Vltctl({"repair"}).exitCode, kGood);
  ASSERT_TRUE(watch.prints("database: sidecar-short -> sound\n"));
  EXPECT_EQ(watch.stop(), kGood);
}

TEST_F(VltctlWatch, AnInstallationThatIsNotThereYetIsAwaited) {
  TempDir dir;
  const std::string root = dir / "not/yet/here";
  RunningVltctl watch({"watch", "--root", root});
  ASSERT_TRUE(watch.prints("watching " + root + "\n"));
  fs::create_directories(root + "/Experts");
  i.addObjectExpert("Tank", "Tank", GText(1));
  fs::rename(i.root() + "/Experts/Tank.vle", root + "/Experts/Tank.vle");
  ASSERT_TRUE(watch.prints("the next start adds " + Named(1) + "\n"));
  fs::remove_all(dir / "not");
  ASSERT_TRUE(watch.prints("the next start no longer adds " + Named(1) + "\n"));
  EXPECT_EQ(watch.stop(), kGood);
}

TEST_F(VltctlWatch, ItEndsAfterACountOfChanges) {
  RunningVltctl watch({"watch", "--count", "1", "--json"});
  ASSERT_TRUE(watch.prints("\"watching\""));
  i.addObjectExpert("Tank", "Tank", GText(1));
  EXPECT_EQ(watch.wait(), kGood);
  json items = Document(watch.out())["items"];
  json change = items.at(items.size() - 1);
  EXPECT_EQ(change["what"], "pending");
  EXPECT_EQ(change["subject"], "{" + GText(1) + "}");
  EXPECT_EQ(change["before"], nullptr);
}

TEST_F(VltctlWatch, ItEndsAfterATime) {
  EXPECT_EQ(Vltctl({"watch", "--for", "0"}).exitCode, kGood);
  EXPECT_EQ(Vltctl({"watch", "--for", "0", "--count", "1"}).exitCode, kNotFound);
  EXPECT_EQ(Vltctl({"watch", "--for", "soon"}).exitCode, kUsage);
}

TEST_F(VltctlWatch, ReadersAndTheWatchItselfAreNoChange) {
  i.addObjectExpert("Tank", "Tank", GText(1));
  ExpectStart("ok");
  RunningVltctl watch({"watch"});
  ASSERT_TRUE(watch.prints("watching "));
  EXPECT_EQ(Vltctl({"list"}).exitCode, kGood);
  EXPECT_EQ(Vltctl({"verify"}).exitCode, kGood);
  i.addObjectExpert("Last", "Last", GText(2));
  ASSERT_TRUE(watch.prints("adds object expert Last"));
  EXPECT_EQ(watch.stop(), kGood);
  std::string out = watch.out();
  EXPECT_EQ(std::count(out.begin(), out.end(), '\n'), 2) << out;
}

TEST_F(VltctlWatch, NoLinkOfAnImageIsFollowedThatComesLater) {
  RunningVltctl watch({"watch", "--root", i.root()});
  ASSERT_TRUE(watch.prints("watching "));
  fs::create_directory(data);
  fs::create_symlink("/etc/hostname", data + "/kor.ini");
  EXPECT_TRUE(
      Eventually([&] { return watch.err().find("out of the image") != std::string::npos; }));
  EXPECT_EQ(watch.stop(), kGood);
}

}  // namespace
}  // namespace vlt::test

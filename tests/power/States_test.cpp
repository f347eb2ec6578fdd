// The simulator itself: which states it finds legal after a few calls.
#include "tests/power/States.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>
#include <set>

#include "tests/support/DirectoryImage.h"
#include "tests/support/TempDir.h"

namespace vlt::test::power {
namespace {

// What is below the directory in each state: "name=bytes name=bytes".
class States : public testing::Test {
 protected:
  void SetUp() override {
    if (!TracedChild::Missing().empty()) GTEST_SKIP() << TracedChild::Missing();
    reset();
  }
  void reset() const {
    EmptyDirectory(root);
    WriteBytes(root + "/file", "old");
  }

  std::set<std::string> states(Model model, const std::function<void()>& calls) {
    Recorder recorder(root, Promises());
    EXPECT_EQ(recorder.run([&](PromisedClient&) { return calls(), 0; }), 0);
    std::set<std::string> found;
    for (const State& state : StatesOf(recorder.recording(), model, 0)) {
      state.make(recorder.recording(), root);
      std::string text;
      for (const char* name : {"file", "new", "Data", "Data/x"}) {
        std::string path = root + "/" + name;
        struct stat info;
        if (stat(path.c_str(), &info) != 0) continue;
        text += std::string(text.empty() ? "" : " ") + name;
        if (!S_ISDIR(info.st_mode)) text += "=" + ReadBytes(path);
      }
      found.insert(text);
    }
    return found;
  }

  int write(const std::string& name, const char* bytes, bool synced) const {
    int fd = open((root + "/" + name).c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0666);
    if (::write(fd, bytes, strlen(bytes)) < 0 || (synced && fsync(fd) != 0)) return -1;
    return close(fd);
  }
  int rename(const char* from, const char* to) const {
    return ::rename((root + "/" + from).c_str(), (root + "/" + to).c_str());
  }
  void syncDirectory(const std::string& below = "") const {
    int fd = open((root + below).c_str(), O_RDONLY | O_DIRECTORY);
    EXPECT_EQ(fsync(fd), 0);
    close(fd);
  }

  TempDir dir;
  const std::string root = dir.makeDir("root");
  const std::string zeros = std::string(5, '\0');
};

TEST_F(States, ARenameOverAnUnsyncedFileMayLeaveItEmptyOrZeros) {
  auto found = states(Model::OrderedMetadata, [&] {
    write("new", "fresh", false);
    rename("new", "file");
  });
  EXPECT_EQ(found, (std::set<std::string>{"file=old", "file=old new=", "file=old new=fresh",
                                          "file=old new=" + zeros, "file=", "file=fresh",
                                          "file=" + zeros}));
}

TEST_F(States, ARenameOverASyncedFileLeavesTheOldOrTheNew) {
  auto found = states(Model::StrictPosix, [&] {
    write("new", "fresh", true);
    rename("new", "file");
  });
  for (const std::string& state : found) {
    EXPECT_TRUE(state.starts_with("file=old") || state == "file=fresh") << state;
  }
  EXPECT_TRUE(found.count("file=fresh"));
}

TEST_F(States, ANewDirectoryIsThereOnceItsParentIsSynced) {
  auto calls = [&](bool withParent) {
    mkdir((root + "/Data").c_str(), 0777);
    write("Data/x", "1", true);
    syncDirectory("/Data");
    if (withParent) syncDirectory();
    rename("file", "new");  // A later step, after which the cut may fall.
  };
  auto lost = [](const std::set<std::string>& found) { return found.count("new=old") != 0; };
  EXPECT_TRUE(lost(states(Model::StrictPosix, [&] { calls(false); })));
  reset();
  EXPECT_FALSE(lost(states(Model::StrictPosix, [&] { calls(true); })));
  reset();
  EXPECT_FALSE(lost(states(Model::OrderedMetadata, [&] { calls(false); })));
}

TEST_F(States, TwoNamesAreOneFile) {
  auto found = states(Model::OrderedMetadata, [&] {
    EXPECT_EQ(link((root + "/file").c_str(), (root + "/new").c_str()), 0);
    syncDirectory();
    int fd = open((root + "/file").c_str(), O_WRONLY);
    EXPECT_EQ(pwrite(fd, "NEW", 3, 0), 3);
    close(fd);
  });
  EXPECT_EQ(found, (std::set<std::string>{"file=old", "file=old new=old", "file=NEW new=NEW"}));
}

TEST_F(States, ARenameOverOneOfTwoNamesLeavesTheOther) {
  auto found = states(Model::OrderedMetadata, [&] {
    EXPECT_EQ(link((root + "/file").c_str(), (root + "/new").c_str()), 0);
    syncDirectory();
    write("Data", "fresh", true);
    rename("Data", "file");
    syncDirectory();
  });
  EXPECT_TRUE(found.count("file=fresh new=old"));
  for (const std::string& state : found) {
    EXPECT_TRUE(state == "file=old" || state.find("new=old") != std::string::npos) << state;
  }
}

}  // namespace
}  // namespace vlt::test::power

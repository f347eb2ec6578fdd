// Power cuts below real file systems: a client works on a loop device whose every write and flush is
// recorded, beside a neighbour that has the journal committed all the time. The disk is then made as it
// may be after a power cut - all writes before the last flush, some of those after it -, mounted, and the
// next start has to find what was answered with S_OK until then.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <random>

#include "tests/e2e/Promises.h"
#include "tests/power/blocks/BlockLog.h"
#include "tests/support/Tracing.h"

namespace vlt::test::power {
namespace {

namespace fs = std::filesystem;

constexpr uint64_t kDiskBytes = 320u << 20;  // XFS takes no less than 300 MiB.
constexpr int kMostMarks = 512;
constexpr int kRounds = 4;  // of the client

int States() { return FullSize() ? 240 : 60; }

struct FileSystem {
  const char* name;
  std::vector<std::string> make;
  std::string options;
  const char* type;
};

// In memory that the client shares with the test: what was promised at each mark.
struct Marks {
  Promises at[kMostMarks];
  std::atomic<int> count;
  std::atomic<bool> end;
};

class PowerBlocks : public testing::Test {
 protected:
  void SetUp() override {
    std::string missing;
    if (geteuid() != 0)
      missing = "needs root, to mount";
    else if (access("/dev/fuse", R_OK | W_OK) != 0)
      missing = "no /dev/fuse";
    else if (access("/dev/loop-control", R_OK | W_OK) != 0)
      missing = "no loop devices";
    if (missing.empty()) return;
    printf("NOT TESTED: power cuts below real file systems; %s\n", missing.c_str());
    GTEST_SKIP() << missing;
  }

  void run(const FileSystem& system) {
    if (RunProgram({"sh", "-c", "command -v \"$0\"", system.make[0]}).exitCode != 0) {
      printf("NOT TESTED: %s; %s is not installed\n", system.name, system.make[0].c_str());
      GTEST_SKIP() << system.make[0] << " is not installed";
    }
    record(system);
    if (HasFailure()) return;
    check(system);
  }

 private:
  std::string root() const { return m_mount + "/KOR"; }

  static void expectDone(const std::vector<std::string>& argv) {
    ProgramResult result = RunProgram(argv);
    EXPECT_EQ(result.exitCode, 0) << argv[0] << ": " << result.err;
  }

  int mountAt(const FileSystem& system, const std::string& disk) const {
    std::string options = "loop" + (system.options.empty() ? "" : "," + system.options);
    return RunProgram({"mount", "-t", system.type, "-o", options, disk, m_mount}).exitCode;
  }

  void setAside() const {
    EXPECT_TRUE(Eventually([&] { return umount2(m_mount.c_str(), 0) == 0; })) << "umount";
  }

  void addBundle(uint32_t n) const {
    std::string resources = root() + "/Experts/E" + std::to_string(n) + ".vle/Resources";
    fs::create_directories(resources);
    std::string name = "Expert" + std::to_string(n);
    WriteBytes(resources + "/Info.vlr", "[KORComponents]\n" + name + " = \"" + name + "\"\n[" +
                                            name + "]\nIdentifier = \"" + GText(n) +
                                            "\"\nFileName = \"" + name + "\"\n");
  }

  void record(const FileSystem& system) {
    RecordedDisk disk(m_dir.makeDir("fuse"), kDiskBytes, m_dir / "log");
    std::vector<std::string> make = system.make;
    make.push_back(disk.disk());
    expectDone(make);
    ASSERT_EQ(mountAt(system, disk.disk()), 0) << "mount " << system.name;
    fs::create_directory(root());
    Installation::setDir(root());
    for (uint32_t n = 1; n <= 4; ++n) addBundle(n);
    int mark = open(disk.mark().c_str(), O_WRONLY | O_CLOEXEC);
    EXPECT_EQ(client(mark, false), 0) << "the first client";
    sync();
    Child neighbour([&] { return commitAllTheTime(); });
    for (int round = 1; round <= kRounds; ++round) {
      for (uint32_t n = 1; n <= 4; ++n) {
        Installation::touch(root() + "/Experts/E" + std::to_string(n) + ".vle/Resources/Info.vlr",
                            Installation::kInstalled + round);
      }
      EXPECT_EQ(client(mark, true), 0) << "client " << round;
    }
    m_marks->end = true;
    EXPECT_EQ(neighbour.wait(), 0);
    close(mark);
    setAside();
  }

  // Anything that has the journal written: the names of our files are then on the disk, their bytes may
  // not be.
  int commitAllTheTime() const {
    int fd = open((m_mount + "/neighbour").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
    for (int n = 0; !m_marks->end; ++n) {
      if (ftruncate(fd, n % 7) != 0 || fsync(fd) != 0) return 1;
    }
    return 0;
  }

  // One process: a start, and saves where it has to promise something.
  int client(int mark, bool later) {
    int number = m_marks->count;
    return Child([=, this] {
             SharedPromises promises(number ? m_marks->at[number - 1] : Promises());
             auto changed = [&] {
               int n = m_marks->count;
               if (n >= kMostMarks) _exit(77);
               m_marks->at[n] = *promises;
               m_marks->count = n + 1;
               std::string text = std::to_string(n);
               if (pwrite(mark, text.data(), text.size(), 0) < 0) _exit(78);
             };
             PromisedClient client(*promises, changed);
             auto base = static_cast<unsigned>(number);
             // First the scan alone: what it saves must not cost what was promised before.
             bool done = client.start() == "ok";
             if (later) usleep(20000);  // The neighbour works.
             done = done && client.setCacheSize(1000 + base) &&
                    client.registerComponent(200 + base) && client.setCacheSize(2000 + base) &&
                    client.setCookie(number + 1);
             return done ? 0 : 1;
           })
        .wait();
  }

  // The disk after `count` steps: what was flushed, and some of the rest.
  void makeImage(const std::vector<BlockStep>& steps, size_t count, int choice,
                 std::mt19937* random) const {
    size_t flushed = 0;
    for (size_t n = 0; n < count; ++n) {
      if (steps[n].kind == BlockStep::Kind::Flush) flushed = n;
    }
    int fd = open((m_dir / "image").c_str(), O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    ASSERT_GE(fd, 0);
    ASSERT_EQ(ftruncate(fd, kDiskBytes), 0);
    for (size_t n = 0; n < count; ++n) {
      if (steps[n].kind != BlockStep::Kind::Write) continue;
      if (n > flushed && (choice == 0 || (choice > 1 && (*random)() % 2))) continue;
      ASSERT_EQ(pwrite(fd, steps[n].bytes.data(), steps[n].bytes.size(),
                       static_cast<off_t>(steps[n].offset)),
                static_cast<ssize_t>(steps[n].bytes.size()));
    }
    close(fd);
  }

  void check(const FileSystem& system) {
    std::vector<BlockStep> steps = ReadBlockLog(m_dir / "log");
    std::vector<int> markAt(steps.size() + 1, -1);
    size_t first = 0, writes = 0, flushes = 0;
    for (size_t n = 0; n < steps.size(); ++n) {
      bool isMark = steps[n].kind == BlockStep::Kind::Mark;
      markAt[n + 1] = isMark ? static_cast<int>(steps[n].offset) : markAt[n];
      // From the end of the first client on, whose values are synced.
      if (isMark && m_marks->at[steps[n].offset].cookie.promised == 1 && first == 0) first = n + 1;
      writes += first && steps[n].kind == BlockStep::Kind::Write;
      flushes += first && steps[n].kind == BlockStep::Kind::Flush;
    }
    ASSERT_GT(first, 0u);
    ASSERT_GT(writes, 20u);
    std::mt19937 random(1);
    int states = 0, lost = 0, refused = 0, aside = 0, unmountable = 0;
    for (; states < States(); ++states) {
      size_t count = first + random() % (steps.size() - first + 1);
      makeImage(steps, count, states % 4, &random);
      if (HasFatalFailure()) return;
      if (mountAt(system, m_dir / "image") != 0) {
        ++unmountable;  // The file system's own affair, but it must be seen.
        continue;
      }
      int broken =
          Child([&] {
            return WhatIsBroken(m_marks->at[markAt[count]], {kVltdd, G(1), G(2), G(3), G(4)});
          }).wait();
      int bad = FilesSetAside(root());
      setAside();
      lost += (broken & ~kStartRefused) != 0;
      refused += (broken & kStartRefused) != 0;
      aside += bad;
      if (broken || bad) {
        ADD_FAILURE() << system.name << ", cut after step " << count << " of " << steps.size()
                      << ": " << NameOfBroken(broken) << ", " << bad << " set aside";
      }
    }
    printf(
        "%s: %zu writes, %zu flushes; %d states, %d lost a value, %d starts refused, %d files set "
        "aside, %d not mountable\n",
        system.name, writes, flushes, states, lost, refused, aside, unmountable);
    EXPECT_EQ(unmountable, 0);
  }

  TempDir m_dir;
  const std::string m_mount = m_dir.makeDir("mnt");
  Marks* m_marks =
      new (mmap(nullptr, sizeof(Marks), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0))
          Marks();
};

TEST_F(PowerBlocks, Ext4) { run({"ext4", {"mkfs.ext4", "-q", "-F"}, "", "ext4"}); }

TEST_F(PowerBlocks, Ext4WithoutAutoDaAlloc) {
  run({"ext4, noauto_da_alloc", {"mkfs.ext4", "-q", "-F"}, "noauto_da_alloc", "ext4"});
}

TEST_F(PowerBlocks, Xfs) { run({"XFS", {"mkfs.xfs", "-q", "-f"}, "", "xfs"}); }

TEST_F(PowerBlocks, Btrfs) { run({"btrfs", {"mkfs.btrfs", "-q", "-f"}, "", "btrfs"}); }

}  // namespace
}  // namespace vlt::test::power

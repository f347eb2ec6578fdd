// Machines that have no space: no semaphores, a full or read-only place, no descriptors.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sched.h>
#include <sys/file.h>
#include <sys/ipc.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/sem.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <memory>
#include <new>
#include <string>
#include <system_error>
#include <vector>

#include "tests/support/Child.h"
#include "tests/support/EventKinds.h"
#include "tests/support/EventPlace.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"

namespace zt::fnd::osdep {
namespace {

using vlt::test::Allowed;
using vlt::test::Child;
using vlt::test::EventPlace;
using vlt::test::Exists;
using vlt::test::kClear;
using vlt::test::kManual;
using vlt::test::OpenDescriptors;
using vlt::test::PosixErrorOf;
using vlt::test::Wide;
using vlt::test::WriteBytes;
using Clock = std::chrono::steady_clock;
using Names = std::vector<std::string>;

// An opening gives up after two seconds. Far more tells a hang from a slow machine.
constexpr auto kSoon = std::chrono::seconds(20);
// A 32-bit process has two ways to ask for a set.
constexpr long kSemget[] = {
    SYS_semget,
#if defined(SYS_ipc)
    SYS_ipc,
#endif
};
constexpr const char* kEvents = "/tmp/shared/namedEvent";

auto Open(const std::string& name) {
  return std::make_unique<NamedEvent>(Wide(name), kManual, kClear);
}

// The errno of opening, 0 for success, -2 if it took too long.
int SoonErrorOfOpening(const std::string& name) {
  auto begin = Clock::now();
  int error = PosixErrorOf([&] { Open(name); });
  if (Clock::now() - begin > kSoon) return -2;
  return error == -1 ? 0 : error;
}

size_t CountFiles(const std::string& dir) {
  std::error_code failed;
  auto files = std::filesystem::directory_iterator(dir, failed);
  return failed ? 0 : static_cast<size_t>(std::distance(begin(files), end(files)));
}

// Checks inside a child: says which one failed.
#define REQUIRE(condition)                                            \
  do {                                                                \
    if (!(condition)) {                                               \
      fprintf(stderr, "%s:%d: %s\n", __FILE__, __LINE__, #condition); \
      return 1;                                                       \
    }                                                                 \
  } while (false)

#define SKIP_UNLESS(allowed)                                                                 \
  if ((allowed) == Allowed::No) {                                                            \
    GTEST_SKIP() << "NOT TESTED: no right to mount and to make name spaces on this machine"; \
  }

bool SetSemaphoreLimits(const char* limits) {
  std::ofstream out("/proc/sys/kernel/sem");
  out << limits << std::flush;
  return out.good();
}

void RunWithLimits(const char* limits, const std::function<int()>& body) {
  int code;
  Allowed allowed = vlt::test::RunInOwnTmp(
      "size=4m",
      [&] {
        if (!SetSemaphoreLimits(limits)) return 77;
        return body();
      },
      &code);
  SKIP_UNLESS(allowed);
  EXPECT_EQ(code, 0);
}

TEST(NamedEventLimits, NoSemaphoresAtAllIsENOLCKAndLeavesNoFiles) {
  RunWithLimits("250 32000 32 0", [] {
    REQUIRE(SoonErrorOfOpening("name") == ENOLCK);
    REQUIRE(SoonErrorOfOpening("name") == ENOLCK);
    REQUIRE(CountFiles(kEvents) == 0);
    return 0;
  });
}

TEST(NamedEventLimits, SetsThatMayNotHave128SemaphoresAreENOLCK) {
  RunWithLimits("100 32000 32 100", [] {
    REQUIRE(SoonErrorOfOpening("name") == ENOLCK);
    REQUIRE(CountFiles(kEvents) == 0);
    return 0;
  });
}

TEST(NamedEventLimits, OnlySetIsUsedToItsLastSlot) {
  RunWithLimits("250 32000 32 1", [] {
    std::vector<std::unique_ptr<NamedEvent>> events;
    for (int i = 0; i < 128; ++i) events.push_back(Open("e" + std::to_string(i)));
    REQUIRE(SoonErrorOfOpening("e128") == ENOLCK);
    REQUIRE(CountFiles(kEvents) == 129);
    events.pop_back();
    REQUIRE(SoonErrorOfOpening("e128") == 0);
    events.clear();
    REQUIRE(CountFiles(kEvents) == 0);
    return 0;
  });
}

TEST(NamedEventLimits, LimitRaisedLaterIsNoticed) {
  RunWithLimits("250 32000 32 0", [] {
    REQUIRE(SoonErrorOfOpening("name") == ENOLCK);
    REQUIRE(SetSemaphoreLimits("250 32000 32 10"));
    REQUIRE(SoonErrorOfOpening("name") == 0);
    return 0;
  });
}

TEST(NamedEventLimits, KernelWithoutSemaphoresIsENOLCK) {
  EventPlace place;
  Open("warm up");
  Child child([&] {
    for (long number : kSemget) REQUIRE(vlt::test::FailSystemCall(number, ENOSYS));
    REQUIRE(SoonErrorOfOpening("name") == ENOLCK);
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(Names(), place.files());
}

TEST(NamedEventLimits, MarkedSetNumbersAreSkipped) {
  int code;
  SKIP_UNLESS(vlt::test::RunInOwnTmp(
      "size=4m",
      [] {
        std::string marker = "/tmp/zentrex/zt_fnd_osdep_NamedEvent_sem_";
        std::filesystem::create_directories(marker + "2");  // anything counts
        WriteBytes(marker + "1", "");
        WriteBytes(marker + "4", "");
        auto event = Open("name");
        REQUIRE(Exists(std::string(kEvents) + "/sem_3"));
        REQUIRE(CountFiles(kEvents) == 2);
        std::vector<std::unique_ptr<NamedEvent>> more;
        for (int i = 0; i < 128; ++i) more.push_back(Open("e" + std::to_string(i)));
        REQUIRE(Exists(std::string(kEvents) + "/sem_5"));
        REQUIRE(!Exists(std::string(kEvents) + "/sem_4"));
        return 0;
      },
      &code));
  EXPECT_EQ(code, 0);
}

// Two state files whose inodes agree in the bits that make a key.
TEST(NamedEventLimits, SetThatIsAlreadyTheProcesssOwnIsUnusable) {
  int code;
  SKIP_UNLESS(vlt::test::RunInOwnTmp(
      "size=4m",
      [] {
        std::vector<std::unique_ptr<NamedEvent>> events;
        for (int i = 0; i < 128; ++i) events.push_back(Open("e" + std::to_string(i)));
        const std::string first = std::string(kEvents) + "/sem_1", twin = "/tmp/twin";
        for (int i = 0; i < 70000; ++i) {
          WriteBytes(twin, "");
          if (ftok(twin.c_str(), 1) == ftok(first.c_str(), 1)) break;
          unlink(twin.c_str());
        }
        REQUIRE(Exists(twin));
        std::filesystem::rename(twin, std::string(kEvents) + "/sem_2");
        int set = EventPlace::SetOfFile(first);
        auto last = Open("e128");
        REQUIRE(Exists(std::string(kEvents) + "/sem_3"));
        last->set();
        REQUIRE(EventPlace::ValueOf(set, 0) == 1);
        last.reset();
        REQUIRE(EventPlace::ValueOf(set, 0) == 1);  // the set is still there
        events.clear();
        REQUIRE(CountFiles(kEvents) == 1);  // "sem_2" has kept its inode; it is good now
        for (int i = 0; i < 129; ++i) events.push_back(Open("e" + std::to_string(i)));
        events.clear();
        REQUIRE(CountFiles(kEvents) == 0);
        return 0;
      },
      &code));
  EXPECT_EQ(code, 0);
}

// ---- the place

// Open descriptors keep a file system from turning read-only, but not a mount of it on top.
bool MakeReadOnly() {
  return mount("/tmp", "/tmp", nullptr, MS_BIND, nullptr) == 0 &&
         mount(nullptr, "/tmp", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr) == 0;
}

TEST(NamedEventLimits, ReadOnlyPlaceIsAnErrorAtOnce) {
  int code;
  SKIP_UNLESS(vlt::test::RunInOwnTmp(
      "size=4m",
      [] {
        Open("warm up");
        if (!MakeReadOnly()) return 77;
        int error = SoonErrorOfOpening("name");
        REQUIRE(error == EROFS);
        REQUIRE(CountFiles(kEvents) == 0);
        return 0;
      },
      &code));
  EXPECT_EQ(code, 0);
}

TEST(NamedEventLimits, PlaceThatTurnsReadOnlyUnderAnEventLetsItClose) {
  int code;
  SKIP_UNLESS(vlt::test::RunInOwnTmp(
      "size=4m",
      [] {
        Open("warm up");
        int descriptors = OpenDescriptors();
        auto event = Open("name");
        if (!MakeReadOnly()) return 77;
        event->set();
        event.reset();
        REQUIRE(OpenDescriptors() == descriptors);
        return 0;
      },
      &code));
  EXPECT_EQ(code, 0);
}

TEST(NamedEventLimits, PlaceThatMayNotBeWrittenIsEACCES) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  EventPlace place;
  Open("warm up");
  std::string dir = std::filesystem::path(place.file("x")).parent_path();
  chmod(dir.c_str(), 0755);
  Child child([] {
    if (setgid(65534) != 0 || setuid(65534) != 0) return 1;
    REQUIRE(SoonErrorOfOpening("name") == EACCES);
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(Names(), place.files());
}

// The event's own file can be opened, but no state file made, each after three attempts.
TEST(NamedEventLimits, StateFilesThatMayNotBeMadeAreENOLCK) {
  if (geteuid() != 0) GTEST_SKIP() << "NOT TESTED: needs two users, so the superuser";
  EventPlace place;
  Open("warm up");
  std::string dir = std::filesystem::path(place.file("x")).parent_path();
  WriteBytes(place.file("name"), "");
  chmod(place.file("name").c_str(), 0666);
  chmod(dir.c_str(), 0755);
  Child child([] {
    if (setgid(65534) != 0 || setuid(65534) != 0) return 1;
    REQUIRE(SoonErrorOfOpening("name") == ENOLCK);
    return 0;
  });
  EXPECT_EQ(child.wait(), 0);
  EXPECT_EQ(Names{"name"}, place.files());
}

// Fills the file system to its last byte.
void Fill(const std::string& path) {
  std::ofstream out(path, std::ios::binary | std::ios::app);
  const std::string block(4096, 'f');
  while (out.write(block.data(), 4096).flush()) {
  }
}

TEST(NamedEventLimits, FullPlaceIsAnErrorThatLeavesNoFiles) {
  int code;
  SKIP_UNLESS(vlt::test::RunInOwnTmp(
      "size=256k",
      [] {
        Open("warm up");
        Fill("/tmp/fill");
        int error = SoonErrorOfOpening("name");
        REQUIRE(error == ENOLCK || error == ENOSPC);
        REQUIRE(CountFiles(kEvents) == 0);
        unlink("/tmp/fill");
        REQUIRE(SoonErrorOfOpening("name") == 0);
        return 0;
      },
      &code));
  EXPECT_EQ(code, 0);
}

// The state file is there already; only the event's own file has no space.
TEST(NamedEventLimits, FullPlaceBesideALivingSetIsENOLCK) {
  int code;
  SKIP_UNLESS(vlt::test::RunInOwnTmp(
      "size=256k",
      [] {
        auto other = Open("other");
        Fill("/tmp/fill");
        REQUIRE(SoonErrorOfOpening("name") == ENOLCK);
        REQUIRE(CountFiles(kEvents) == 2);
        other->set();
        REQUIRE(other->check());
        other.reset();  // what is there can still be taken away
        REQUIRE(CountFiles(kEvents) == 0);
        return 0;
      },
      &code));
  EXPECT_EQ(code, 0);
}

TEST(NamedEventLimits, PlaceWithoutInodesIsAnErrorThatLeavesNoFiles) {
  int code;
  SKIP_UNLESS(vlt::test::RunInOwnTmp(
      "size=1m,nr_inodes=20",
      [] {
        Open("warm up");
        int made = 0;
        while (::close(::open(("/tmp/i" + std::to_string(made)).c_str(), O_CREAT | O_RDWR, 0600)) ==
               0) {
          ++made;
        }
        REQUIRE(SoonErrorOfOpening("name") == ENOSPC);
        REQUIRE(CountFiles(kEvents) == 0);
        unlink("/tmp/i0");  // room for the event's file, and none for the state file
        REQUIRE(SoonErrorOfOpening("name") == ENOLCK);
        REQUIRE(CountFiles(kEvents) == 0);
        unlink("/tmp/i1");
        REQUIRE(SoonErrorOfOpening("name") == 0);
        return 0;
      },
      &code));
  EXPECT_EQ(code, 0);
}

// ---- bounds

// Makes the set of this number one that cannot be had: its key leads to a smaller one.
void Spoil(const EventPlace& place, int number) {
  std::string path = place.file("sem_" + std::to_string(number));
  WriteBytes(path, "x");
  ASSERT_NE(semget(ftok(path.c_str(), 1), 1, IPC_CREAT | IPC_EXCL | 0600), -1);
}

TEST(NamedEventLimits, ThousandUnusableSetsInARowAreTheEnd) {
  EventPlace place;
  Open("warm up");
  for (int n = 1; n <= 1023; ++n) Spoil(place, n);
  auto event = Open("name");
  EXPECT_EQ((EventPlace::Slot{1024, 0}), place.slotOf("name"));
  event.reset();
  Spoil(place, 1024);
  EXPECT_EQ(SoonErrorOfOpening("name"), ENOLCK);
  EXPECT_FALSE(Exists(place.file("name")));
  EXPECT_FALSE(Exists(place.file("sem_1025")));
  // With a full one among them there are not so many in a row.
  semctl(place.setOf(2), 0, IPC_RMID);
  std::vector<std::unique_ptr<NamedEvent>> full;
  for (int i = 0; i < 128; ++i) full.push_back(Open("e" + std::to_string(i)));
  Spoil(place, 1025);
  event = Open("name");
  EXPECT_EQ((EventPlace::Slot{1026, 0}), place.slotOf("name"));
}

TEST(NamedEventLimits, StateFilesThatCannotBeOpenedCountNothingUpToSomeThousands) {
  EventPlace place;
  Open("warm up");
  auto obstruct = [&](int first, int last) {
    for (int n = first; n <= last; ++n) {
      mkdir(place.file("sem_" + std::to_string(n)).c_str(), 0777);
    }
  };
  obstruct(1, 3000);
  auto event = Open("name");
  EXPECT_EQ((EventPlace::Slot{3001, 0}), place.slotOf("name"));
  event.reset();
  obstruct(3001, 4096 + 255);
  event = Open("name");
  EXPECT_EQ((EventPlace::Slot{4096 + 256, 0}), place.slotOf("name"));
  event.reset();
  obstruct(4096 + 256, 4096 + 256);
  EXPECT_EQ(SoonErrorOfOpening("name"), ENOLCK);
  EXPECT_FALSE(Exists(place.file("name")));
}

TEST(NamedEventLimits, NoDescriptorsLeftIsAnErrorThatPasses) {
  if (!vlt::test::kCanLimitMemory) {
    GTEST_SKIP() << "the sanitizer looks at objects through pipes, and there are none left";
  }
  EventPlace place;
  auto warm = Open("warm up");
  rlimit limit;
  ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &limit), 0);
  const int now = OpenDescriptors();
  for (int spare = 0; spare <= 4; ++spare) {
    rlimit few = limit;
    few.rlim_cur = static_cast<rlim_t>(now + spare);
    std::vector<std::unique_ptr<NamedEvent>> events;
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &few), 0);
    int error = 0;
    for (int i = 0; error == 0 && i < 10; ++i) {
      auto begin = Clock::now();
      error = PosixErrorOf([&] { events.push_back(Open("e" + std::to_string(i))); });
      EXPECT_LT(Clock::now() - begin, kSoon);
      error = error == -1 ? 0 : error;
    }
    setrlimit(RLIMIT_NOFILE, &limit);
    EXPECT_TRUE(error == EMFILE || error == ENOLCK) << error;
    events.clear();
    EXPECT_EQ((Names{"sem_1", "warm up"}), place.files());
    EXPECT_EQ(now, OpenDescriptors());
  }
}

TEST(NamedEventLimits, FailedAllocationsLeaveNothing) {
  EventPlace place;
  Open("warm up");
  const int descriptors = OpenDescriptors();
  bool failed = true;
  for (int nth = 1; failed; ++nth) {
    ASSERT_LT(nth, 1000);
    try {
      vlt::test::FailAllocation fail(nth);
      auto event = std::make_unique<NamedEvent>(String(L"name"), kManual, kClear);
      failed = fail.happened();
    } catch (const std::bad_alloc&) {  // the one that was asked for
    }
    EXPECT_EQ(Names(), place.files()) << nth;
    EXPECT_EQ(descriptors, OpenDescriptors()) << nth;
  }
  EXPECT_EQ(SoonErrorOfOpening("name"), 0);
}

}  // namespace
}  // namespace zt::fnd::osdep

// Every system call of an opening, a save, a merging start and of calls on the jar fails once, with
// each error that fits it, and the process goes on and saves. Whatever it is answered with S_OK, then or
// before, the next process finds; no file is set aside for a call that failed once.
#include <gtest/gtest.h>
#include <sys/syscall.h>

#include <cerrno>
#include <map>

#include "tests/e2e/Promises.h"
#include "tests/support/DirectoryImage.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/TracedChild.h"
#include "tests/support/Tracing.h"

namespace vlt::test {
namespace {

constexpr char kBegin[] = "/vlt-part-begins", kEnd[] = "/vlt-part-ends";

using Errors = std::vector<std::pair<const char*, int>>;

#define VLT_ERROR(name) \
  { #name, name }

// The errors that fit a call; none for those that cannot fail, or have to do with no file.
const Errors& ErrorsOf(const std::string& name) {
  static const Errors opening = {VLT_ERROR(EIO), VLT_ERROR(EMFILE), VLT_ERROR(ENOMEM),
                                 VLT_ERROR(EINTR), VLT_ERROR(ENOSPC)};
  static const Errors reading = {VLT_ERROR(EIO), VLT_ERROR(EINTR), VLT_ERROR(ENOMEM)};
  static const Errors writing = {VLT_ERROR(EIO), VLT_ERROR(EINTR), VLT_ERROR(ENOSPC)};
  static const Errors naming = {VLT_ERROR(EIO), VLT_ERROR(ENOMEM), VLT_ERROR(ENOSPC)};
  static const Errors looking = {VLT_ERROR(EIO), VLT_ERROR(ENOMEM)};
  static const Errors locking = {VLT_ERROR(EINTR), VLT_ERROR(ENOLCK)};
  static const Errors closing = {VLT_ERROR(EIO), VLT_ERROR(EINTR)};
  static const std::map<std::string, const Errors*> rows = {
      {"openat", &opening},     {"open", &opening},      {"read", &reading},
      {"pread64", &reading},    {"readv", &reading},     {"getdents64", &looking},
      {"write", &writing},      {"pwrite64", &writing},  {"writev", &writing},
      {"fsync", &writing},      {"fdatasync", &writing}, {"ftruncate", &writing},
      {"rename", &naming},      {"renameat", &naming},   {"renameat2", &naming},
      {"link", &naming},        {"linkat", &naming},     {"unlink", &naming},
      {"unlinkat", &naming},    {"mkdir", &naming},      {"mkdirat", &naming},
      {"stat", &looking},       {"lstat", &looking},     {"fstat", &looking},
      {"newfstatat", &looking}, {"fstatat64", &looking}, {"statx", &looking},
      {"access", &looking},     {"faccessat", &looking}, {"fchmod", &looking},
      {"fchmodat", &looking},   {"chmod", &looking},     {"readlink", &looking},
      {"readlinkat", &looking}, {"lseek", &looking},     {"fstatfs", &looking},
      {"flock", &locking},      {"close", &closing}};
  static const Errors none;
  auto row = rows.find(name);
  return row == rows.end() ? none : *row->second;
}

#undef VLT_ERROR

bool IsSync(const SystemCall& call) {
  return call.number == SYS_fsync || call.number == SYS_fdatasync;
}

// A call of the part of a run between the marks, by its place among them.
struct Place {
  int index;
  std::string name, what;
};

struct Part {
  const char* name;
  std::function<void(PromisedClient&)> before;  // the marks
  std::function<void(PromisedClient&)> body;    // between them
};

class FailingCall : public testing::Test {
 protected:
  void SetUp() override {
    std::string missing = TracedChild::Missing();
    if (!missing.empty()) {
      printf("NOT TESTED: failing system calls; %s\n", missing.c_str());
      GTEST_SKIP() << missing;
    }
    m_files.push_back(i.addDictionary("Core", "Core", GText(1), 7, "co"));
    m_files.push_back(i.addObjectExpert("Tank", "Tank", GText(2)));
    EXPECT_EQ(Child([&] {
                PromisedClient client(*m_first);
                bool done = client.start() == "ok" && client.setCacheSize(4711) &&
                            client.registerComponent(70) && client.setCookie(17) &&
                            client.askIdentity();
                return done ? 0 : 1;
              }).wait(),
              0);
  }

  // What every process does after the part, whatever has failed in it.
  static int GoOn(PromisedClient& client) {
    client.start();
    client.setCacheSize(101);
    client.registerComponent(71);
    client.setCookie(102);
    client.setCacheSize(103);
    return 0;
  }

  // One run, in which the call at `failing`, if any, fails. The exit code, or 128 + signal.
  int runOnce(const Part& part, Promises& promises, int failing, int error,
              std::vector<Place>* places) {
    bool inside = false;
    int index = 0;
    auto before = [&](const SystemCall& call) {
      std::string name = call.name();
      if (name == "access" || name == "faccessat") {
        std::string what = call.what();
        if (what == kBegin || what == kEnd) return inside = what == kBegin, 0;
        if (what == kPromiseMark) return 0;
      }
      if (inside && !ErrorsOf(name).empty() && isWanted(call.what())) {
        if (places) places->push_back({index, name, call.what()});
        if (index++ == failing) return error;
      }
      // The disk's pace has no part in this.
      return IsSync(call) ? TracedChild::kPretend : 0;
    };
    int code = TracedChild::Run(
        [&] {
          PromisedClient client(promises);
          if (part.before) part.before(client);
          access(kBegin, F_OK);
          part.body(client);
          access(kEnd, F_OK);
          return GoOn(client);
        },
        before, {});
    EXPECT_TRUE(failing < 0 || index > failing) << "the run does not come to call " << failing;
    return code;
  }

  void check(const Part& part, const Promises& promises, const std::string& what, int code) {
    int setAside = FilesSetAside(i.root());
    int broken = Child([&] {
                   FailSystemCall(SYS_fsync, 0);
                   return WhatIsBroken(promises, {kVltdd, G(1), G(2)});
                 }).wait();
    ++m_runs;
    m_stuck += code != 0;
    m_lost += (broken & ~kStartRefused) != 0;
    m_refused += (broken & kStartRefused) != 0;
    m_setAside += setAside;
    std::string found = NameOfBroken(broken);
    if (setAside) found += " " + std::to_string(setAside) + " set aside";
    if (code != 0) found += " the process itself ended with " + std::to_string(code);
    if (!found.empty()) ADD_FAILURE() << part.name << ", " << what << ": " << found;
  }

  void failEach(const Part& part) {
    DirectoryImage image(i.root());
    std::vector<Place> places;
    {
      SharedPromises promises(*m_first);
      ASSERT_EQ(runOnce(part, *promises, -1, 0, &places), 0);
      check(part, *promises, "nothing fails", 0);
    }
    ASSERT_GT(places.size(), 3u);
    int all = 0;
    for (const Place& place : places) {
      for (auto [error, number] : ErrorsOf(place.name)) {
        if (all++ % step() != 0) continue;
        image.restore();
        SharedPromises promises(*m_first);
        int code = runOnce(part, *promises, place.index, number, nullptr);
        check(part, *promises, place.name + " " + place.what + " " + error, code);
      }
    }
    printf(
        "%s: %d of %d failing calls; %d lost a value, %d starts refused, %d files set aside, %d "
        "processes crashed or hung\n",
        part.name, m_runs - 1, all, m_lost, m_refused, m_setAside, m_stuck);
  }

  static int step() { return FullSize() ? 1 : kCanLimitMemory ? 17 : 61; }

  void changeBundles() {
    for (const std::string& file : m_files) Installation::touch(file, Installation::kInstalled + 1);
  }

  // The file that names the installation has a test of its own.
  bool isWanted(const std::string& what) const {
    bool preference = what.find("com.zentrex.kor.ini") != std::string::npos ||
                      what.find("/.config") != std::string::npos;
    return preference == m_ofThePreference;
  }

  Installation i;
  ChangingIdentities m_identities;
  bool m_ofThePreference = false;
  std::vector<std::string> m_files;
  SharedPromises m_first;
  int m_runs = 0, m_lost = 0, m_refused = 0, m_setAside = 0, m_stuck = 0;
};

TEST_F(FailingCall, OfAnOpening) {
  failEach({"opening", {}, [](PromisedClient& client) { client.start(); }});
}

TEST_F(FailingCall, OfASave) {
  failEach({"save", [](PromisedClient& client) { client.start(); },
            [](PromisedClient& client) {
              client.setCacheSize(100);
              client.registerComponent(72);
            }});
}

TEST_F(FailingCall, OfAMergingStart) {
  changeBundles();
  failEach({"merging start", {}, [](PromisedClient& client) { client.start(); }});
}

TEST_F(FailingCall, OfAFirstStart) {
  for (const char* name : {"/vlt.vlr", "/vlt.vl5"}) unlink((i.root() + name).c_str());
  m_first->cacheSize.promise(33554432);
  m_first->components = 0;
  failEach({"first start", {}, [](PromisedClient& client) { client.start(); }});
}

TEST_F(FailingCall, OfCallsOnTheJar) {
  failEach({"jar", {}, [](PromisedClient& client) {
              client.setCookie(100);
              client.askIdentity();
            }});
}

// A process that cannot find out where its installation is must not save elsewhere and call it done.
TEST_F(FailingCall, OnTheFileThatNamesTheInstallation) {
  m_ofThePreference = true;
  failEach({"preference", {}, [](PromisedClient& client) {
              client.start();
              client.setCookie(100);
            }});
}

}  // namespace
}  // namespace vlt::test

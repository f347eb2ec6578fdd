// Power cuts, simulated: what processes do to an installation is recorded, and after each step of it the
// next process is started on the states that the disk may then hold. Every value whose saving was
// answered with S_OK is found, no start is refused, no file is set aside.
#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

#include "tests/e2e/Promises.h"
#include "tests/power/Recording.h"
#include "tests/power/States.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/Tracing.h"

namespace vlt::test::power {
namespace {

namespace fs = std::filesystem;

// Violations that are printed whole.
constexpr int kPrinted = 5;

size_t MostStates() { return FullSize() ? 1200 : kCanLimitMemory ? 40 : 10; }

class PowerCut : public testing::Test {
 protected:
  void SetUp() override {
    std::string missing = TracedChild::Missing();
    if (!missing.empty()) {
      printf("NOT TESTED: power cuts; %s\n", missing.c_str());
      GTEST_SKIP() << missing;
    }
    for (uint32_t n = 1; n <= 3; ++n) {
      std::string name = "Dictionary" + std::to_string(n);
      m_files.push_back(i.addDictionary(name, name, GText(n), 7, "d" + std::to_string(n)));
    }
    m_files.push_back(i.addObjectExpert("Tank", "Tank", GText(4)));
  }

  // An earlier client, whose values are on the disk.
  void setUpClient(bool withJar = false) {
    SharedPromises promises(m_first);
    EXPECT_EQ(Child([&] {
                PromisedClient client(*promises);
                bool done = client.start() == "ok" && client.setCacheSize(4711) &&
                            client.registerComponent(70) && client.registerComponent(71);
                if (withJar) done = done && client.setCookie(17) && client.askIdentity();
                return done ? 0 : 1;
              }).wait(),
              0);
    m_first = *promises;
  }

  void changeBundles() {
    for (const std::string& file : m_files) Installation::touch(file, ++m_time);
  }

  Recorder& recorder() {
    if (!m_recorder) m_recorder = std::make_unique<Recorder>(i.root(), m_first);
    return *m_recorder;
  }

  void record(const std::function<bool(PromisedClient&)>& body,
              const TracedChild::Before& before = {}) {
    ASSERT_EQ(recorder().run([&](PromisedClient& client) { return body(client) ? 0 : 1; }, before),
              0);
  }

  void checkStates(const char* what) {
    check(what, "ordered metadata", Model::OrderedMetadata);
    check(what, "strict POSIX", Model::StrictPosix);
  }

  Installation i;
  Promises m_first;
  std::vector<GUID> m_bundles = {kVltdd, G(1), G(2), G(3), G(4)};
  std::vector<std::string> m_files;

 private:
  void check(const char* what, const char* modelName, Model model) {
    const Recording& recording = recorder().recording();
    std::vector<State> states = StatesOf(recording, model, 0);
    size_t all = states.size();
    if (states.size() > MostStates()) states.resize(MostStates());
    int violated = 0, refused = 0, lost = 0, setAside = 0;
    for (const State& state : states) {
      state.make(recording, i.root());
      int broken = Child([&] {
                     // The disk's pace has no part in this.
                     FailSystemCall(SYS_fsync, 0);
                     return WhatIsBroken(recording.promisedAt(state.steps), m_bundles);
                   }).wait();
      int bad = FilesSetAside(i.root());
      refused += (broken & kStartRefused) != 0;
      lost += (broken & ~kStartRefused) != 0;
      setAside += bad;
      if (broken == 0 && bad == 0) continue;
      if (++violated > kPrinted) continue;
      const std::string& call =
          state.steps ? recording.steps[state.steps - 1].call : std::string("nothing");
      ADD_FAILURE() << what << ", " << modelName << ", cut after step " << state.steps << " ("
                    << call << "), " << state.text << ": " << NameOfBroken(broken) << ", " << bad
                    << " set aside";
    }
    printf(
        "%s, %s: %zu of %zu states after %zu steps; %d violated (%d lost a value, %d starts "
        "refused, %d files set aside)\n",
        what, modelName, states.size(), all, recording.steps.size(), violated, lost, refused,
        setAside);
    EXPECT_EQ(violated, 0);
    EXPECT_GT(states.size(), 1u);
  }

  std::unique_ptr<Recorder> m_recorder;
  time_t m_time = Installation::kInstalled;
};

bool Save(PromisedClient& client, unsigned size, uint32_t id) {
  return client.setCacheSize(size) && client.registerComponent(id) && client.setCacheSize(size + 1);
}

TEST_F(PowerCut, InAFirstStartAndTheSavesAfterIt) {
  record([](PromisedClient& client) { return client.start() == "ok" && Save(client, 100, 80); });
  checkStates("first start");
}

TEST_F(PowerCut, InAStartThatMergesChangedBundles) {
  setUpClient();
  changeBundles();
  record([](PromisedClient& client) { return client.start() == "ok"; });
  checkStates("merging start");
}

TEST_F(PowerCut, InAStartThatMergesAndTheSavesAfterIt) {
  setUpClient();
  changeBundles();
  record([](PromisedClient& client) { return client.start() == "ok" && Save(client, 100, 80); });
  checkStates("merging start and saves");
}

TEST_F(PowerCut, InASecondStartAfterOneThatMerged) {
  setUpClient();
  changeBundles();
  record([](PromisedClient& client) { return client.start() == "ok"; });
  record([](PromisedClient& client) { return client.start() == "ok" && Save(client, 100, 80); });
  checkStates("second start");
}

TEST_F(PowerCut, InSavesOfAClient) {
  setUpClient();
  record([](PromisedClient& client) {
    return client.start() == "ok" && Save(client, 100, 80) && Save(client, 200, 81);
  });
  checkStates("saves");
}

// The scan has merged and saved, and then meets a failure that it raises. What the process does after
// that is its own affair, but it must not cost what others have saved.
TEST_F(PowerCut, InAStartThatEndsInAnException) {
  std::string gone = i.addObjectExpert("Gone", "Gone", GText(5));
  setUpClient();
  i.removeBundle("Experts", "Gone.vle");
  changeBundles();
  int failed = 0;
  record(
      [](PromisedClient& client) {
        client.start();
        return true;
      },
      [&](const SystemCall& call) {
        std::string name = call.name();
        bool isLook = name == "newfstatat" || name == "stat" || name == "statx" ||
                      name == "lstat" || name == "access" || name == "fstatat64";
        if (!isLook || call.what().find("Gone.vle") == std::string::npos) return 0;
        ++failed;
        return EIO;
      });
  EXPECT_GT(failed, 0);
  checkStates("start with an exception");
}

// A process that is killed in its scan, and one after it that finds nothing left to do.
TEST_F(PowerCut, AfterAStartThatWasKilled) {
  setUpClient();
  changeBundles();
  int renames = 0;
  EXPECT_EQ(recorder().run([](PromisedClient& client) { return client.start() == "ok" ? 0 : 1; },
                           [&](const SystemCall& call) {
                             std::string name = call.name();
                             if (name.starts_with("rename") && ++renames == 3) {
                               kill(call.process, SIGKILL);
                             }
                             return 0;
                           }),
            128 + SIGKILL);
  record([](PromisedClient& client) { return client.start() == "ok" && Save(client, 100, 80); });
  checkStates("start after a killed one");
}

class PowerCutJar : public PowerCut {
  ChangingIdentities m_identities;
};

TEST_F(PowerCutJar, InSaves) {
  setUpClient(true);
  record([](PromisedClient& client) {
    return client.setCookie(100) && client.askIdentity() && client.setCookie(101);
  });
  checkStates("jar");
}

TEST_F(PowerCutJar, InAFreshJarInAFreshDirectory) {
  setUpClient();
  fs::remove_all(i.root() + "/Data");
  record([](PromisedClient& client) {
    return client.askIdentity() && client.setCookie(100) && client.setCookie(101);
  });
  checkStates("fresh jar");
}

TEST_F(PowerCutJar, InAFreshJarAndTheFirstStartAfterIt) {
  record([](PromisedClient& client) {
    return client.askIdentity() && client.setCookie(100) && client.start() == "ok" &&
           Save(client, 100, 80);
  });
  checkStates("fresh jar and first start");
}

}  // namespace
}  // namespace vlt::test::power

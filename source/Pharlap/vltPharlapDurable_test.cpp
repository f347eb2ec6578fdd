// The second name of the database: who may remove it, and when.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>

#include "source/DurableCopy.h"
#include "tests/support/Child.h"
#include "tests/support/TestRegistrar.h"

namespace vlt::test {
namespace {

// Does something while the saves of its scan are covered by the second name.
class Interrupted : public CvltPharlapRegistrar {
 public:
  Interrupted(const Installation& i, std::function<void()> inside)
      : CvltPharlapRegistrar(S(i.database()), S(i.root()), false), m_inside(std::move(inside)) {
    Init();
  }
  HRESULT ReadComponent(const wchar_t* section) override {
    if (auto inside = std::exchange(m_inside, nullptr)) inside();
    return CvltPharlapRegistrar::ReadComponent(section);
  }

 private:
  std::function<void()> m_inside;
};

std::string SecondName(const Installation& i) { return DurableCopy::NameFor(i.database()); }

std::string LockFile(const Installation& i) {
  return std::string(getenv("ZTFNDTMPSHAREDFILEDIR")) + "/mutex/" +
         zt::fnd::AnsiString(IniFileLock::NameForFile(i.database().c_str())).c_str();
}

void AddThree(Installation& i) {
  for (int n = 1; n <= 3; ++n) {
    std::string name = "D" + std::to_string(n);
    i.addDictionary(name, name, GText(n), 3, "d");
  }
}

TEST_IN_CHILD(vltPharlapDurable, AChildThatIsForkedInAScanLeavesTheSecondName) {
  Installation i;
  AddThree(i);
  pid_t child = -1;
  Started<Interrupted> r(i, [&] {
    ASSERT_TRUE(Exists(SecondName(i)));
    child = fork();
    if (child == 0) return;
    int status = -1;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    EXPECT_TRUE(Exists(SecondName(i)));
  });
  if (child == 0) _exit(0);
  EXPECT_FALSE(Exists(SecondName(i)));
}

TEST_IN_CHILD(vltPharlapDurable, AScanThatHasLostItsLockLeavesTheSecondName) {
  Installation i;
  AddThree(i);
  Signal held, end;
  std::unique_ptr<Child> other;
  {
    Started<Interrupted> r(i, [&] {
      ASSERT_TRUE(Exists(SecondName(i)));
      std::filesystem::remove(LockFile(i));
      other = std::make_unique<Child>([&] {
        IniFileLock lock(IniFileLock::NameForFile(i.database().c_str()));
        held.notify();
        return end.await() ? 0 : 1;
      });
      ASSERT_TRUE(held.await());
    });
    EXPECT_TRUE(Exists(SecondName(i)));
  }
  EXPECT_TRUE(Exists(SecondName(i)));
  end.notify();
  EXPECT_EQ(other->wait(), 0);
}

// While this process had lost the lock another one may have begun a scan, and been killed. A later opening
// must not prefer what that one has left to what is saved here.
TEST_IN_CHILD(vltPharlapDurable, ASaveRemovesASecondNameThatAnotherProcessHasLeft) {
  Installation i;
  LinuxStart r(i);
  WriteBytes(SecondName(i), ReadBytes(i.database()));
  EXPECT_EQ(r->SetSchemaVersion(9), S_OK);
  EXPECT_FALSE(Exists(SecondName(i)));
}

TEST(vltPharlapDurable, ADirectoryInItsPlaceRefusesNeitherStartsNorSaves) {
  for (bool hasSidecar : {true, false}) {
    Installation i;
    AddThree(i);
    ASSERT_EQ(StartOnce(i), 0);
    if (!hasSidecar) unlink(i.sidecar().c_str());
    std::filesystem::create_directories(SecondName(i) + "/inside");
    ExpectInChild([&] {
      LinuxStart r(i);
      EXPECT_EQ(Find(*r, G(1)), S_OK);
      EXPECT_EQ(r->SetSchemaVersion(9), S_OK);
    });
    EXPECT_TRUE(Exists(SecondName(i) + ".bad/inside"));
  }
}

}  // namespace
}  // namespace vlt::test

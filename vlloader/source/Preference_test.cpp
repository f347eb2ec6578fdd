#include "vlloader/source/Preference.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <new>

#include "tests/support/FailSystemCall.h"
#include "tests/support/InChild.h"
#include "tests/support/TempDir.h"
#include "vlloader/source/vlloader.h"

namespace vlt::test {
namespace {

// Places to configure, none of them made yet. For children: the environment is changed.
class Places {
 public:
  Places() {
    setenv("HOME", home().c_str(), 1);
    unsetenv("XDG_CONFIG_HOME");
    setenv("XDG_CONFIG_DIRS", (m_dir / "first:" + m_dir.path() + "/second").c_str(), 1);
  }
  std::string home() const { return m_dir / "home"; }
  // Puts a file of the domain "d" into the directory.
  void put(const std::string& directory, const std::string& bytes) const {
    WriteBytes(m_dir.makeDir(directory) + "/d.ini", bytes);
  }
  std::string path(const std::string& name) const { return m_dir / name; }

 private:
  TempDir m_dir;
};

std::string Read() { return vlReadPreference("d", "Dir").value_or("(none)"); }

void In(const std::function<void(const Places&)>& body) {
  ExpectInChild([&] {
    Places places;
    body(places);
  });
}

TEST(Preference, NoFileIsNoValueAndNothingIsMade) {
  In([](const Places& p) {
    EXPECT_EQ(Read(), "(none)");
    EXPECT_FALSE(Exists(p.home()));
  });
}

TEST(Preference, TheOwnFileComesFirstThenTheSharedOnesInOrder) {
  In([](const Places& p) {
    p.put("second", "[Preferences]\nDir = second\n");
    EXPECT_EQ(Read(), "second");
    p.put("first", "[Preferences]\nDir = first\n");
    EXPECT_EQ(Read(), "first");
    p.put("home/.config", "[Preferences]\nDir = own\n");
    EXPECT_EQ(Read(), "own");
    p.put("named", "[Preferences]\nDir = named\n");
    setenv("XDG_CONFIG_HOME", p.path("named").c_str(), 1);
    EXPECT_EQ(Read(), "named");
  });
}

TEST(Preference, AFileWithoutTheItemIsPassedOver) {
  In([](const Places& p) {
    p.put("home/.config", "[Other]\nDir = x\n[Preferences]\nDirectory = y\n");
    p.put("first", "[Preferences]\ndir = first\n");
    EXPECT_EQ(Read(), "first");
  });
}

TEST(Preference, AnEmptyValueIsAValue) {
  In([](const Places& p) {
    p.put("home/.config", "[Preferences]\nDir = \"\"\n");
    p.put("first", "[Preferences]\nDir = first\n");
    EXPECT_EQ(Read(), "");
  });
}

TEST(Preference, QuotesOfBothKindsGoAndBackslashesStay) {
  In([](const Places& p) {
    p.put("first", "[Preferences]\nDir = \"/a \\n b\"\n");
    EXPECT_EQ(Read(), "/a \\n b");
    p.put("first", "[Preferences]\nDir = '/a'\n");
    EXPECT_EQ(Read(), "/a");
  });
}

TEST(Preference, RelativeAndEmptyDirectoriesAreIgnored) {
  In([](const Places& p) {
    p.put("first", "[Preferences]\nDir = first\n");
    ASSERT_EQ(chdir(p.path("").c_str()), 0);
    setenv("XDG_CONFIG_HOME", "first", 1);
    setenv("XDG_CONFIG_DIRS", "first::./first", 1);
    EXPECT_EQ(Read(), "(none)");
    setenv("XDG_CONFIG_DIRS", (":x:" + p.path("first")).c_str(), 1);
    EXPECT_EQ(Read(), "first");
    unsetenv("HOME");
    unsetenv("XDG_CONFIG_HOME");
    EXPECT_EQ(Read(), "first");
  });
}

TEST(Preference, WhatIsNoFileDoesNotHoldUp) {
  In([](const Places& p) {
    std::string directory = p.home() + "/.config/d.ini";
    p.put("home/.config", "");
    ASSERT_EQ(unlink(directory.c_str()), 0);
    ASSERT_EQ(mkfifo(directory.c_str(), 0600), 0);
    p.put("first", "[Preferences]\nDir = first\n");
    EXPECT_EQ(Read(), "first");
    ASSERT_EQ(unlink(directory.c_str()), 0);
    ASSERT_EQ(mkdir(directory.c_str(), 0700), 0);
    EXPECT_EQ(Read(), "first");
    p.put("first", std::string("\xFF\xFE", 2));
    EXPECT_EQ(Read(), "(none)");
  });
}

// Otherwise a busy process would work on another installation for the rest of its life.
TEST(Preference, WithoutMemoryOrDescriptorsThereIsNoAnswer) {
  for (int error : {ENOMEM, EMFILE, ENFILE}) {
    In([&](const Places& p) {
      p.put("first", "[Preferences]\nDir = first\n");
      ASSERT_TRUE(FailSystemCall(SYS_openat, error));
      EXPECT_THROW(Read(), std::bad_alloc) << error;
    });
  }
  In([](const Places& p) {
    p.put("first", "[Preferences]\nDir = first\n");
    ASSERT_TRUE(FailSystemCall(SYS_openat, EACCES));
    EXPECT_EQ(Read(), "(none)");
  });
}

TEST(Preference, ALackOfDescriptorsIsNotRemembered) {
  In([](const Places& p) {
    p.put("first", "");
    WriteBytes(p.path("first") + "/com.zentrex.kor.ini", "[Preferences]\nDir = /there\n");
    struct rlimit before, none;
    ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &before), 0);
    none = before;
    none.rlim_cur = 0;
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &none), 0);
    EXPECT_THROW(GetCurrentVltPath(), std::bad_alloc);
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &before), 0);
    EXPECT_STREQ(GetCurrentVltPath(), "/there");
  });
}

TEST(Preference, IsReadAnewAtEachCall) {
  In([](const Places& p) {
    p.put("first", "[Preferences]\nDir = one\n");
    EXPECT_EQ(Read(), "one");
    p.put("first", "[Preferences]\nDir = two\n");
    EXPECT_EQ(Read(), "two");
  });
}

TEST(Preference, TheInstallDirectoryHasItsDefaultAndItsLimit) {
  In([](const Places& p) {
    constexpr const char* kDefault = "/Library/Application Support/Zentrex/KOR";
    EXPECT_EQ(vlLookUpInstallDirectory(), kDefault);
    auto put = [&](const std::string& directory) {
      WriteBytes(p.path("first") + "/com.zentrex.kor.ini",
                 "[Preferences]\nDir = \"" + directory + "\"\n");
    };
    p.put("first", "");
    for (size_t length : {1u, 1022u, 1023u}) {
      put(std::string(length, 'd'));
      EXPECT_EQ(vlLookUpInstallDirectory(), std::string(length, 'd'));
    }
    put(std::string(1024, 'd'));
    EXPECT_EQ(vlLookUpInstallDirectory(), kDefault);
    put("");
    EXPECT_EQ(vlLookUpInstallDirectory(), "");
  });
}

}  // namespace
}  // namespace vlt::test

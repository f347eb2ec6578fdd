// Each state of a guarded file is judged, and then opened: what the judge announces is what happens.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <filesystem>
#include <functional>

#include "source/GuardedIniFile.h"
#include "tests/support/FailSystemCall.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/TempDir.h"

namespace {

using namespace vlt::test;
using Kind = GuardedIniState::Kind;
using Opening = GuardedIniState::Opening;

constexpr GuardedIniKind kBare = {true,    E_FAIL,  nullptr, nullptr, nullptr,
                                  nullptr, nullptr, nullptr, nullptr};
constexpr const char* kGood = "[s]\na=1\n";
const std::string kUtf16 = std::string("\xFF\xFE[\0s\0]\0", 8);

struct Place {
  TempDir dir;
  std::string file = dir / "x.ini", sidecar = dir / "x.vl5";

  void write(const std::string& bytes, const std::string& sidecarBytes) const {
    WriteBytes(file, bytes);
    WriteBytes(sidecar, sidecarBytes);
  }
  std::string digest() const {
    std::string hex = Md5Sum(file), out;
    for (size_t i = 0; i < hex.size(); i += 2) {
      out += static_cast<char>(std::stoi(hex.substr(i, 2), nullptr, 16));
    }
    return out;
  }
  void seal() const { WriteBytes(sidecar, digest()); }
  bool isSetAside() const {
    for (const auto& entry : std::filesystem::directory_iterator(dir.path())) {
      std::string name = entry.path().filename();
      if (name.starts_with("x.ini_") && name.ends_with(".bad")) return true;
    }
    return false;
  }
};

// What an opening does, as it is seen from outside.
Opening Opened(const Place& place) {
  std::unique_ptr<CvlIniMgr> ini;
  bool fails = false;
  try {
    fails = GuardedIniFile(place.file, kBare).open(&ini) < 0;
  } catch (int) {
    fails = true;
  }
  bool isAside = place.isSetAside();
  if (fails) return isAside ? Opening::SetsAsideAndFails : Opening::Fails;
  EXPECT_TRUE(ini);
  bool isEmpty = !ini || ini->GetNumberOfSections() == 0;
  EXPECT_FALSE(isAside && !isEmpty);
  if (isAside) return Opening::SetsAsideAndBegins;
  return isEmpty ? Opening::Begins : Opening::Takes;
}

struct Row {
  const char* name;
  Kind kind;
  Opening opening;
  std::function<void(const Place&)> make;
};

const Row kRows[] = {
    {"sound", Kind::Sound, Opening::Takes,
     [](const Place& p) {
       WriteBytes(p.file, kGood);
       p.seal();
     }},
    {"longer sidecar", Kind::Sound, Opening::Takes,
     [](const Place& p) {
       WriteBytes(p.file, kGood);
       WriteBytes(p.sidecar, p.digest() + "more");
     }},
    {"no sidecar", Kind::NoSidecar, Opening::Takes,
     [](const Place& p) { WriteBytes(p.file, kGood); }},
    {"sidecar is a link", Kind::NoSidecar, Opening::Takes,
     [](const Place& p) {
       WriteBytes(p.file, kGood);
       std::filesystem::create_symlink(p.file, p.sidecar);
     }},
    {"sidecar is a pipe", Kind::NoSidecar, Opening::Takes,
     [](const Place& p) {
       WriteBytes(p.file, kGood);
       ASSERT_EQ(mkfifo(p.sidecar.c_str(), 0666), 0);
     }},
    {"mark of a first save", Kind::FirstSave, Opening::Takes,
     [](const Place& p) { p.write(kGood, std::string(16, '0')); }},
    {"digest differs", Kind::DigestDiffers, Opening::Takes,
     [](const Place& p) { p.write(kGood, std::string(16, 'x')); }},
    {"missing", Kind::Missing, Opening::Begins, [](const Place&) {}},
    {"missing beside a digest", Kind::Missing, Opening::Begins,
     [](const Place& p) { WriteBytes(p.sidecar, std::string(16, 'x')); }},
    {"unparsable", Kind::Unparsable, Opening::SetsAsideAndBegins,
     [](const Place& p) { WriteBytes(p.file, kUtf16); }},
    {"unparsable, digest matches", Kind::Unparsable, Opening::SetsAsideAndBegins,
     [](const Place& p) {
       WriteBytes(p.file, kUtf16);
       p.seal();
     }},
    {"unparsable, digest differs", Kind::UnparsableChanged, Opening::SetsAsideAndFails,
     [](const Place& p) { p.write(kUtf16, std::string(16, 'x')); }},
    {"short sidecar", Kind::SidecarShort, Opening::SetsAsideAndFails,
     [](const Place& p) { p.write(kGood, "short"); }},
    {"empty sidecar", Kind::SidecarShort, Opening::SetsAsideAndFails,
     [](const Place& p) { p.write(kGood, ""); }},
    {"short sidecar of an unparsable file", Kind::SidecarShort, Opening::SetsAsideAndFails,
     [](const Place& p) { p.write(kUtf16, "short"); }},
    {"sidecar is a directory", Kind::SidecarDirectory, Opening::SetsAsideAndFails,
     [](const Place& p) {
       WriteBytes(p.file, kGood);
       p.dir.makeDir("x.vl5");
     }},
    {"file is a directory", Kind::Unreadable, Opening::Fails,
     [](const Place& p) { p.dir.makeDir("x.ini"); }},
    {"file is a directory, with a digest", Kind::Unreadable, Opening::Fails,
     [](const Place& p) {
       p.dir.makeDir("x.ini");
       WriteBytes(p.sidecar, std::string(16, 'x'));
     }},
    {"file is a pipe", Kind::Unreadable, Opening::Fails,
     [](const Place& p) { ASSERT_EQ(mkfifo(p.file.c_str(), 0666), 0); }},
    {"file is too large", Kind::Unreadable, Opening::Fails,
     [](const Place& p) {
       WriteBytes(p.file, kGood);
       ASSERT_EQ(truncate(p.file.c_str(), (off_t{256} << 20) + 1), 0);
     }},
    {"link in a circle", Kind::Unreadable, Opening::Fails,
     [](const Place& p) { std::filesystem::create_symlink(p.file, p.file); }},
};

TEST(GuardedIniFileInspect, EachStateIsJudgedAsItIsOpened) {
  for (const Row& row : kRows) {
    Place place;
    row.make(place);
    GuardedIniState state = GuardedIniFile(place.file, kBare).inspect();
    EXPECT_EQ(state.kind, row.kind) << row.name;
    EXPECT_EQ(state.opening, row.opening) << row.name;
    EXPECT_EQ(Opened(place), row.opening) << row.name;
  }
}

// Names, modes, owners, sizes and times.
std::string Listed(const Place& place) {
  return RunProgram({"ls", "-lnaR", "--time-style=full-iso", place.dir.path()}).out;
}

TEST(GuardedIniFileInspect, LooksAndChangesNothing) {
  for (const Row& row : kRows) {
    Place place;
    row.make(place);
    std::string before = Listed(place);
    GuardedIniFile(place.file, kBare).inspect();
    EXPECT_EQ(Listed(place), before) << row.name;
  }
}

TEST(GuardedIniFileInspect, WhyAFileCannotBeReadIsTheSystemsError) {
  Place place;
  place.dir.makeDir("x.ini");
  EXPECT_EQ(GuardedIniFile(place.file, kBare).inspect().error, EISDIR);
  EXPECT_EQ(GuardedIniFile("/dev/null", kBare).inspect().error, ENXIO);
}

TEST(GuardedIniFileInspect, AnUnreadableSidecarFailsTheOpening) {
  Place place;
  place.write(kGood, std::string(16, 'x'));
  EXPECT_EQ(InChild([&] {
              ASSERT_TRUE(FailSystemCall(SYS_read, EIO));
              GuardedIniState state = GuardedIniFile(place.file, kBare).inspect();
              EXPECT_EQ(state.kind, Kind::SidecarUnreadable);
              EXPECT_EQ(state.opening, Opening::Fails);
              EXPECT_EQ(state.error, EIO);
            }),
            0);
}

}  // namespace

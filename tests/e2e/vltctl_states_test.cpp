// Each state of a database and its sidecar: what verify says, what the snapshot reader says, what the
// next start of a registrar really does, and that repair makes it start with what was there.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <functional>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;
using nlohmann::json;

const std::string kUtf16 = std::string("\xFF\xFE[\0s\0]\0", 8);

// An installation that has started once: its database is sound, and its components are registered.
struct Place : Installation {
  Place() {
    addObjectExpert("Tank", "Tank", GText(1));
    ExpectStart("ok");
    text = ReadBytes(database());
    seal = ReadBytes(sidecar());
  }
  std::string copy() const { return database() + ".durable"; }
  bool isSetAside() const {
    for (const auto& entry : fs::directory_iterator(root())) {
      std::string name = entry.path().filename();
      if (name.starts_with("vlt.vlr_") && name.ends_with(".bad")) return true;
    }
    return false;
  }

  std::string text, seal;
};

struct State {
  const char* code;     // of verify
  const char* opening;  // of verify
  int list;             // exit code of list, which is the snapshot reader's judgement
  const char* start;    // of the first start
  std::function<void(const Place&)> make;
};

const State kStates[] = {
    {"sound", "takes", kGood, "ok", [](const Place&) {}},
    {"no-sidecar", "takes", kGood, "ok", [](const Place& p) { fs::remove(p.sidecar()); }},
    {"first-save", "takes", kGood, "ok",
     [](const Place& p) { WriteBytes(p.sidecar(), std::string(16, '0')); }},
    {"digest-differs", "takes", kGood, "ok",
     [](const Place& p) { WriteBytes(p.sidecar(), std::string(16, 'x')); }},
    {"missing", "begins", kDataUnusable, "ok", [](const Place& p) { fs::remove(p.database()); }},
    {"digest-differs", "takes", kGood, "ok", [](const Place& p) { WriteBytes(p.database(), ""); }},
    {"unparsable", "sets-aside", kDataUnusable, "ok",
     [](const Place& p) {
       WriteBytes(p.database(), kUtf16);
       fs::remove(p.sidecar());
     }},
    {"unparsable-changed", "sets-aside-and-fails", kDataUnusable, "int 1",
     [](const Place& p) { WriteBytes(p.database(), kUtf16); }},
    {"unreadable", "fails", kDataUnusable, "int 1",
     [](const Place& p) {
       fs::remove(p.database());
       fs::create_directory(p.database());
     }},
    {"sidecar-short", "sets-aside-and-fails", kDataUnusable, "ok",
     [](const Place& p) { WriteBytes(p.sidecar(), "short"); }},
    {"sidecar-directory", "sets-aside-and-fails", kDataUnusable, "ok",
     [](const Place& p) {
       fs::remove(p.sidecar());
       fs::create_directory(p.sidecar());
     }},
    // A second name counts only where the first one does not match.
    {"sound", "takes", kGood, "ok", [](const Place& p) { WriteBytes(p.copy(), "[old]\n"); }},
    {"durable-copy", "takes-copy", kGood, "ok",
     [](const Place& p) {
       fs::rename(p.database(), p.copy());
       WriteBytes(p.database(), "[torn");
     }},
    {"durable-copy", "takes-copy", kGood, "ok",
     [](const Place& p) { fs::rename(p.database(), p.copy()); }},
    {"durable-copy", "takes-copy", kGood, "ok",
     [](const Place& p) {
       fs::rename(p.database(), p.copy());
       WriteBytes(p.database(), "");
       WriteBytes(p.sidecar(), std::string(16, 'x'));
     }},
    {"sidecar-short", "sets-aside-and-fails", kDataUnusable, "ok", [](const Place& p) {
       fs::rename(p.database(), p.copy());
       WriteBytes(p.database(), "[torn");
       WriteBytes(p.sidecar(), "short");
     }}};

// What a start does, in the words of verify. A registrar whose opening fails over its file has nothing
// to answer with; so it is after one that begins an empty file, where the scan registers all again.
std::string Happened(const Place& place, const State& state) {
  const bool wasThere = Exists(place.database());
  const bool hadCopy = Exists(place.copy()) && std::string(state.code) != "sound";
  TempDir shared;
  ExpectStart(state.start, [&](IvltRegistrar& registrar) {
    if (Find(registrar, G(1)) == S_OK) WriteBytes(shared / "answers", "");
  });
  bool answers = Exists(shared / "answers");
  if (place.isSetAside()) return answers ? "sets-aside" : "sets-aside-and-fails";
  if (!answers) return "fails";
  if (hadCopy) return "takes-copy";
  return wasThere ? "takes" : "begins";
}

TEST(VltctlStates, VerifyAndTheSnapshotSayWhatAStartDoes) {
  for (const State& state : kStates) {
    Place place;
    state.make(place);
    json said = ItemWith(VltctlJson({"verify", place.database()}).items, "file", place.database());
    EXPECT_EQ(said["state"], state.code);
    EXPECT_EQ(said["opening"], state.opening) << state.code;
    EXPECT_EQ(Vltctl({"list"}).exitCode, state.list) << state.code;
    EXPECT_EQ(Happened(place, state), state.opening) << state.code;
  }
}

TEST(VltctlStates, AfterARepairAStartTakesWhatWasThere) {
  for (const State& state : kStates) {
    Place place;
    state.make(place);
    JsonResult result = VltctlJson({"repair", place.database()});
    json done = ItemWith(result.items, "file", place.database());
    if (state.code == std::string("unreadable")) {
      EXPECT_EQ(result.exitCode, kDataUnusable);
      EXPECT_EQ(done["action"], "impossible");
      continue;
    }
    EXPECT_EQ(result.exitCode, kGood) << state.code << result.err;
    if (done["action"] != "none") {
      EXPECT_EQ(done["after"], "sound") << state.code;
      EXPECT_EQ(done["copy"].is_string(), Exists(done["copy"].is_string() ? done["copy"] : ""));
    }
    ExpectStart("ok");
    EXPECT_EQ(Hex(ReadBytes(place.sidecar())), Md5Sum(place.database())) << state.code;
    EXPECT_FALSE(place.isSetAside()) << state.code;
    EXPECT_EQ(VltctlJson({"list"}).items.size(), 2u) << state.code;
  }
}

}  // namespace
}  // namespace vlt::test

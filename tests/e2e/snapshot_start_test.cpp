// What the reader says of the next start, and what that start then does: on random installations,
// the bytes of the database, the saves, and the registration files that are set aside.
#include <gtest/gtest.h>
#include <locale.h>

#include <algorithm>
#include <filesystem>
#include <nlohmann/json.hpp>

#include "tests/e2e/RandomInstallation.h"
#include "tests/e2e/Start.h"
#include "tests/support/SaveCounter.h"
#include "tests/support/Tracing.h"

namespace vlt::test {
namespace {

using nlohmann::json;

json Rehearse(const RandomInstallation& installation, const char* locale) {
  ProgramResult result =
      RunProgram({std::string(VLT_TEST_BIN) + "/snapshot_client", "--start", installation.root()},
                 {{"LC_ALL", locale}});
  EXPECT_EQ(result.exitCode, 0) << result.err;
  return result.exitCode == 0 ? json::parse(result.out) : json();
}

std::string BytesOf(const json& text) {
  std::string bytes;
  for (const json& byte : text) bytes += static_cast<char>(byte.get<int>());
  return bytes;
}

unsigned BadFiles(const std::string& root) {
  unsigned count = 0;
  for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
    std::string name = entry.path().filename();
    if (name.starts_with("Info.vlr_") && name.ends_with(".bad")) ++count;
  }
  return count;
}

// Names of all components that the start answers with; false without a registrar.
bool StartFor(const char* locale, const std::string& out) {
  ExpectInChild([&] {
    ASSERT_NE(setlocale(LC_ALL, locale), nullptr);
    IvltRegistrar* registrar = nullptr;
    if (GetRegistrar(&registrar) != "ok") return WriteBytes(out, "none");
    json names = json::array();
    for (auto type :
         {vltComponentDataDictionary, vltComponentObjectExpert, vltComponentResourceExpert}) {
      for (const std::wstring& name : Names(*registrar, type)) {
        names.push_back(std::string(name.begin(), name.end()));
      }
    }
    WriteBytes(out, names.dump(-1, ' ', false, json::error_handler_t::replace));
    registrar->Release();
  });
  return ReadBytes(out) != "none";
}

struct Counts {
  int starts = 0, merges = 0, removals = 0, setAside = 0, erasedOnDisk = 0;
};

void CompareOne(unsigned seed, int rounds, Counts* counts) {
  RandomInstallation installation(seed);
  const char* locale = seed % 4 == 0 ? "C" : "C.UTF-8";
  const std::string out = installation.root() + ".names";
  for (int round = 0; round < rounds; ++round) {
    SCOPED_TRACE("seed " + std::to_string(seed) + ", round " + std::to_string(round));
    json foreseen = Rehearse(installation, locale);
    unsigned bad = BadFiles(installation.root());
    SaveCounter saves(installation.root(), "vlt.vlr");
    bool hasRegistrar = StartFor(locale, out);
    if (foreseen["scans"] != true) {
      EXPECT_TRUE(!hasRegistrar || ReadBytes(out) == "[]") << ReadBytes(out);
      EXPECT_EQ(saves.count(), 0);
    } else {
      ASSERT_TRUE(hasRegistrar);
      EXPECT_EQ(ReadBytes(installation.database()), BytesOf(foreseen["text"]));
      // A second name that is taken up is renamed, too.
      int renames = foreseen["saves"].get<int>() + (foreseen["fromDurableCopy"] == true);
      EXPECT_EQ(saves.count(), renames);
      EXPECT_EQ(BadFiles(installation.root()) - bad, foreseen["setAside"].size());
      json names = json::parse(ReadBytes(out));
      for (const json& removed : foreseen["removed"]) {
        EXPECT_EQ(std::count(names.begin(), names.end(), removed), 0) << removed;
      }
      ++counts->starts;
      counts->merges += foreseen["added"].size() + foreseen["changed"].size() > 0;
      counts->removals += !foreseen["removed"].empty();
      counts->setAside += !foreseen["setAside"].empty();
      counts->erasedOnDisk += foreseen["leavesErasedOnDisk"] == true;
    }
    if (testing::Test::HasFailure()) return;
    installation.change();
    installation.damage();
  }
}

TEST(SnapshotStart, IsWhatTheStartThenDoes) {
  const unsigned count = FullSize() ? 1000 : 50;
  const int rounds = FullSize() ? 2 : 4, most = static_cast<int>(count) * rounds;
  Counts counts;
  for (unsigned seed = 1; seed <= count && !testing::Test::HasFailure(); ++seed) {
    CompareOne(seed, rounds, &counts);
  }
  // Each kind of thing was met.
  EXPECT_GT(counts.starts, most * 9 / 10);
  EXPECT_GT(counts.merges, most / 2);
  EXPECT_GT(counts.removals, most / 10);
  EXPECT_GT(counts.setAside, 0);
  EXPECT_GT(counts.erasedOnDisk, 0);
  printf("%d starts: %d merged, %d removed components, %d set files aside, %d left erased ones\n",
         counts.starts, counts.merges, counts.removals, counts.setAside, counts.erasedOnDisk);
}

}  // namespace
}  // namespace vlt::test

// The component check of bundles as they are installed, of many components at once, and beside a server.
#include <gtest/gtest.h>
#include <stdlib.h>

#include <chrono>
#include <filesystem>

#include "tests/e2e/CheckTree.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr const char* kNothing = "int nothing;\n";

// Bundles whose registration files name them, as an installer leaves them.
class CheckBundles : public testing::Test {
 protected:
  std::string dictionary(uint32_t n, const std::string& name) {
    m_installation.addDictionary(name, name, GText(n), 1, "pr");
    return m_installation.root() + "/Data Dictionaries/" + name + ".framework";
  }
  std::string expert(uint32_t n, const std::string& name) {
    m_installation.addObjectExpert(name, name, GText(n));
    return m_installation.root() + "/Experts/" + name + ".vle";
  }
  Installation m_installation;
};

TEST_F(CheckBundles, ADirectoryIsOpenedByTheFirstOfItsThreeNamesThatLoads) {
  const char* const names[] = {"libX.so", "X.so", "X"};
  std::string bundle = expert(1, "X");
  for (const char* name : names) {
    Build(bundle + "/" + name, kGoodEntry);
    JsonResult result = VltctlJson({"check", "X"});
    EXPECT_EQ(result.items.at(0)["code"], nullptr) << result.items;
    EXPECT_EQ(result.items.at(0)["library"], bundle + "/" + name);
    fs::remove(bundle + "/" + name);
  }
  // One that does not load gives way to the next.
  WriteBytes(bundle + "/libX.so", "no library");
  Build(bundle + "/X.so", kGoodEntry);
  EXPECT_EQ(VltctlJson({"check", "X"}).items.at(0)["library"], bundle + "/X.so");
  fs::remove(bundle + "/X.so");
  EXPECT_EQ(Check(1).code, "not-a-library");
}

// What the check says is what the library's own loader does.
TEST_F(CheckBundles, ADictionaryIsLoadedAndAskedForNothing) {
  std::string bundle = dictionary(1, "Core");
  EXPECT_EQ(Check(1).messages, Messages{bundle + " has none of libCore.so, Core.so and Core"});
  Build(bundle + "/libCore.so", kNothing);
  EXPECT_EQ(Check(1).code, "");
  Build(bundle + "/libCore.so", "extern \"C\" int vltGone(); int use() { return vltGone(); }\n");
  EXPECT_EQ(Check(1).code, "undefined-symbol");
}

TEST_F(CheckBundles, TheLibrarysOwnDictionaryNeedsNoFile) {
  ProgramResult result = Vltctl({"check"});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.out, "dictionary vltdd: sound\n1 component: sound\n");
}

TEST_F(CheckBundles, TheLibrarysWordsAreNotesForThoseWhoAsk) {
  std::string bundle = expert(1, "X");
  Build(bundle + "/libX.so", kGoodEntry);
  EXPECT_EQ(Vltctl({"check", "X"}).out, "object expert X: sound\n1 component: sound\n");
  EXPECT_EQ(Vltctl({"check", "X", "--library"}).out,
            "object expert X: sound\n    vltCheckComponent: the object expert \"" + bundle +
                "\" is registered but does not exist\n1 component: sound\n");
}

TEST_F(CheckBundles, OnlyBadLeavesTheSoundOnesOut) {
  Build(expert(1, "Good") + "/libGood.so", kGoodEntry);
  std::string bad = expert(2, "Bad");
  ProgramResult result = Vltctl({"check", "--only-bad"});
  EXPECT_EQ(result.exitCode, kNotFound);
  EXPECT_EQ(result.out, "object expert Bad: NOT SOUND\n  " + bad +
                            " has none of libBad.so, Bad.so and Bad\n"
                            "3 components: 1 not sound\n");
  EXPECT_EQ(VltctlJson({"check", "--only-bad"}).items.size(), 1u);
}

TEST_F(CheckBundles, ANameThatIsMistypedGetsASuggestion) {
  expert(1, "Tank Expert");
  ProgramResult result = Vltctl({"check", "Tank Expret"});
  EXPECT_EQ(result.exitCode, kNotFound);
  EXPECT_EQ(result.err, "vltctl: no component Tank Expret; did you mean \"Tank Expert\"?\n");
}

// ---- Many in a process

// A crash in the middle of a batch costs no other component its verdict, nor does what a library has
// done to the process before it ended.
TEST_F(CheckBundles, OneThatCrashesAmongManyIsTheOnlyOne) {
  TempDir dir;
  Build(dir / "good", kGoodEntry);
  Build(dir / "crash", AtLoad("abort();"));
  Build(dir / "leaves", AtLoad("_exit(0);"));
  for (uint32_t n = 1; n <= 150; ++n) {
    std::string name = "E" + std::to_string(n), file = expert(n, name) + "/lib" + name + ".so";
    fs::copy(dir / (n == 70 ? "crash" : n == 75 ? "leaves" : "good"), file);
  }
  JsonResult result = VltctlJson({"check", "--only-bad"});
  EXPECT_EQ(result.exitCode, kNotFound);
  ASSERT_EQ(result.items.size(), 2u);
  EXPECT_EQ(result.items[0]["name"], "E70");
  EXPECT_EQ(result.items[0]["code"], "died");
  EXPECT_EQ(result.items[1]["name"], "E75");
  EXPECT_EQ(result.items[1]["code"], "ended-its-process");
  EXPECT_EQ(VltctlJson({"check"}).items.size(), 151u);
}

// A name that one library has does not make up for its absence in another.
TEST_F(CheckBundles, LibrariesOfOneProcessDoNotHelpEachOther) {
  Build(expert(1, "First") + "/libFirst.so",
        std::string("extern \"C\" int vltShared() { return 1; }\n") + kGoodEntry);
  Build(expert(2, "Second") + "/libSecond.so",
        std::string("extern \"C\" int vltShared(); int use() { return vltShared(); }\n") +
            kGoodEntry);
  JsonResult result = VltctlJson({"check", "--only-bad"});
  ASSERT_EQ(result.items.size(), 1u);
  EXPECT_EQ(result.items[0]["code"], "undefined-symbol");
}

// While libraries are loaded, the database is free for others: the library here takes its lock.
TEST_F(CheckBundles, TheDatabaseIsNotHeldWhileLibrariesLoad) {
  TempDir dir;
  std::string start =
      kVltctl + " list >" + dir.path() + "/list 2>&1; echo $? >" + dir.path() + "/code";
  Build(expert(1, "X") + "/libX.so", AtLoad("(void)!system(\"" + start + "\");"));
  EXPECT_EQ(Check(1).code, "");
  EXPECT_EQ(ReadBytes(dir / "code"), "0\n");
}

// Each line is out before the next library is loaded.
TEST_F(CheckBundles, WhatIsKnownIsPrintedAtOnce) {
  std::string gate = m_installation.root() + "/gate";
  Build(expert(1, "A") + "/libA.so", kGoodEntry);
  Build(expert(2, "B") + "/libB.so",
        "#include <fcntl.h>\n" + AtLoad("for (int i = 0; i < 500 && access(\"" + gate +
                                        "\", F_OK) != 0; ++i) usleep(10000);"));
  // The reader opens the gate when it has the line of the first one.
  ProgramResult result = RunProgram({"sh", "-c",
                                     "\"$1\" check | while read -r line; do echo \"$line\"; case "
                                     "$line in *\" A: sound\") : >\"$2\";; "
                                     "esac; done",
                                     "sh", kVltctl, gate});
  EXPECT_EQ(result.out,
            "dictionary vltdd: sound\nobject expert A: sound\nobject expert B: sound\n"
            "3 components: all sound\n");
}

TEST_F(CheckBundles, ThousandsTakeSeconds) {
  const uint32_t count = getenv("VLT_FULL") ? 10000 : 1000;
  TempDir dir;
  Build(dir / "good", kGoodEntry);
  for (uint32_t n = 1; n <= count; ++n) {
    std::string name = "E" + std::to_string(n);
    fs::copy(dir / "good", expert(n, name) + "/lib" + name + ".so");
  }
  ASSERT_EQ(RunProgram({kVltctl, "list", "--live"}, {}, 120000).exitCode,
            kGood);  // the first start registers
  auto begin = std::chrono::steady_clock::now();
  ProgramResult result = Vltctl({"check"});
  std::chrono::duration<double> taken = std::chrono::steady_clock::now() - begin;
  printf("a check of %u components: %.2f s\n", count, taken.count());
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_TRUE(result.out.ends_with(std::to_string(count + 1) + " components: all sound\n"));
}

}  // namespace
}  // namespace vlt::test

// The component check over a real tree of libraries that are missing, damaged or hostile: the exact
// messages of the export, and what vltctl says of them and how it ends.
#include <elf.h>
#include <gtest/gtest.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>

#include "tests/e2e/CheckTree.h"
#include "tests/e2e/Start.h"
#include "tests/support/PrivateRoot.h"

namespace vlt::test {
namespace {

// A library for the other word size: by the compiler, or, where it cannot, its head alone.
void BuildForTheOtherWordSize(const std::string& file) {
  TempDir dir;
  WriteBytes(dir / "x.cpp", kGoodEntry);
  ProgramResult built = RunProgram({"c++", sizeof(void*) == 4 ? "-m64" : "-m32", "-shared", "-fPIC",
                                    "-nostdlib", "-o", file, dir / "x.cpp"});
  if (built.exitCode == 0) return;
  std::string head(64, '\0');
  head.replace(0, 7,
               {ELFMAG0, ELFMAG1, ELFMAG2, ELFMAG3, sizeof(void*) == 4 ? ELFCLASS64 : ELFCLASS32,
                ELFDATA2LSB, EV_CURRENT});
  WriteBytes(file, head);
}

std::string DoesNotLoad(const std::string& file) {
  return "failed to load library \"" + file +
         "\" while checking for entry point \"vltCreateObjectExpert\"";
}
std::string HasNoEntry(const std::string& file) {
  return "failed to find entry point \"vltCreateObjectExpert\" in library \"" + file + "\"";
}
std::string IsNot(const char* what, const std::string& file) {
  return "the object expert \"" + file + "\" is registered but " + what;
}

// One component's result and messages by the export, in this process.
std::pair<HRESULT, Messages> Checked(GUID id) {
  IEnumString* list = nullptr;
  HRESULT result = vltCheckComponent(id, &list);
  Messages messages;
  if (!list) return {result, {"no list"}};
  wchar_t* text = nullptr;
  unsigned fetched = 0;
  while (list->Next(1, &text, &fetched) == S_OK) {
    messages.emplace_back(text, text + wcslen(text));
    vltFree(text);
  }
  list->Release();
  return {result, messages};
}

// The library is reported by the export, in a fresh process, with these messages, and by the tool with
// its own.
void ExpectTold(uint32_t n, const Messages& byTheExport, const std::string& code,
                const Messages& messages, const Messages& notes) {
  ExpectStart([&](IvltRegistrar&) {
    auto [result, reported] = Checked(G(n));
    EXPECT_EQ(result, byTheExport.empty() ? S_OK : E_FAIL);
    EXPECT_EQ(reported, byTheExport);
  });
  Found found = Check(n);
  EXPECT_EQ(found.exitCode, code.empty() ? kGood : kNotFound);
  EXPECT_EQ(found.code, code);
  EXPECT_EQ(found.messages, messages);
  EXPECT_EQ(found.notes, notes);
}

// ---- Libraries that are not what they should be

TEST(Check, ASoundLibraryHasNothingToTell) {
  Experts e;
  Build(e.add(1, "good"), kGoodEntry);
  ExpectTold(1, {}, "", {}, {});
  ProgramResult text = Vltctl({"check", GText(1)});
  EXPECT_EQ(text.exitCode, kGood);
  EXPECT_EQ(text.out, "object expert good: sound\n1 component: sound\n");
}

TEST(Check, AMissingEntryPoint) {
  Experts e;
  std::string file = e.add(1, "bare");
  Build(file, "extern \"C\" int vltCreateObjectExpertToo() { return 0; }\n");
  const std::string told = file + " does not export \"vltCreateObjectExpert\"";
  ExpectTold(1, {HasNoEntry(file)}, "no-entry-point", {told}, {});
  ProgramResult text = Vltctl({"check", GText(1)});
  EXPECT_EQ(text.out, "object expert bare: NOT SOUND\n  " + told + "\n1 component: 1 not sound\n");
}

TEST(Check, AMissingDependency) {
  Experts e;
  std::string file = e.add(1, "needy");
  TempDir dir;
  Build(dir / "libvlt_gone.so", "int gone() { return 0; }\n", {"-Wl,-soname,libvlt_gone.so"});
  Build(file, std::string("int gone(); int use() { return gone(); }\n") + kGoodEntry,
        {"-L" + dir.path(), "-lvlt_gone"});
  std::filesystem::remove(dir / "libvlt_gone.so");
  ExpectTold(1, {DoesNotLoad(file)}, "missing-dependency",
             {file + " needs libvlt_gone.so, which is not found"},
             {"libvlt_gone.so: cannot open shared object file: No such file or directory"});
}

TEST(Check, AMissingSymbol) {
  Experts e;
  std::string file = e.add(1, "unresolved");
  Build(file,
        std::string("extern \"C\" int vltGone(); int use() { return vltGone(); }\n") + kGoodEntry);
  ExpectTold(1, {DoesNotLoad(file)}, "undefined-symbol",
             {file + " uses \"vltGone\", which no library that it needs has"},
             {file + ": undefined symbol: vltGone"});
}

TEST(Check, ATextFileAndAnEmptyOne) {
  Experts e;
  std::string text = e.add(1, "text"), empty = e.add(2, "empty");
  WriteBytes(text, std::string(200, 't'));
  WriteBytes(empty, "");
  ExpectTold(1, {DoesNotLoad(text)}, "not-a-library", {text + " is no library"},
             {text + ": invalid ELF header"});
  ExpectTold(2, {DoesNotLoad(empty)}, "not-a-library", {empty + " is no library"},
             {empty + ": file too short"});
}

TEST(Check, ALibraryThatIsCutAtAnyPlaceTakesNothingDown) {
  Experts e;
  std::string file = e.add(1, "cut");
  Build(file, kGoodEntry);
  std::string whole = ReadBytes(file);
  for (size_t size : {size_t{16}, size_t{52}, size_t{64}, size_t{400}, whole.size() / 2}) {
    WriteBytes(file, whole.substr(0, size));
    Found found = Check(1);
    EXPECT_EQ(found.exitCode, kNotFound) << size;
    EXPECT_FALSE(found.sound) << size;
    EXPECT_FALSE(found.messages.empty() && found.notes.empty()) << size;
  }
}

TEST(Check, ALibraryForTheOtherWordSize) {
  Experts e;
  std::string file = e.add(1, "foreign");
  BuildForTheOtherWordSize(file);
  bool is64 = sizeof(void*) == 8;
  ExpectTold(1, {DoesNotLoad(file)}, "wrong-class",
             {file + (is64 ? " is built for 32 bits, this program for 64"
                           : " is built for 64 bits, this program for 32")},
             {file + ": wrong ELF class: " + (is64 ? "ELFCLASS32" : "ELFCLASS64")});
}

TEST(Check, AMissingFileAndADirectoryDoNotExist) {
  Experts e;
  std::string missing = e.add(1, "missing"), directory = e.add(2, "directory");
  std::filesystem::create_directory(directory);
  ExpectTold(1, {IsNot("does not exist", missing)}, "missing", {missing + " does not exist"}, {});
  ExpectTold(2, {IsNot("does not exist", directory)}, "no-library",
             {directory + " has none of libdirectory.so, directory.so and directory"}, {});
}

// Another user may write everywhere in the installation and where the locks are, but for the place whose
// mode is given. What the tests of a process have in common is not writable for others after it: the
// check by root would refuse what is below it.
void OpenAllBut(const Experts& e, const std::string& place, mode_t mode) {
  if (geteuid() == 0) {
    std::string own = std::filesystem::path(e.root()).parent_path();
    RunProgram({"chmod", "-R", "a+rX", getenv("VLT_TEST_ROOT")});
    RunProgram({"chmod", "-R", "a+rwX", own, getenv("ZTFNDTMPSHAREDFILEDIR")});
  }
  ASSERT_EQ(chmod(place.c_str(), mode), 0);
}

TEST(Check, AFileThatMayNotBeRead) {
  Experts e;
  std::string file = e.add(1, "secret");
  Build(file, kGoodEntry);
  OpenAllBut(e, file, 0);
  ExpectStart([&](IvltRegistrar&) {
    if (geteuid() == 0) {
      ASSERT_EQ(setresuid(65534, 65534, 65534), 0);
    }
    EXPECT_EQ(Checked(G(1)),
              (std::pair<HRESULT, Messages>{E_FAIL, {IsNot("is not readable", file)}}));
  });
}

// The same by the tool, which runs as another user from the start.
TEST(Check, TheToolToldOfAFileThatMayNotBeRead) {
  if (!vlt::test::AllMayEnter(VLT_TEST_BIN)) {
    GTEST_SKIP() << "NOT TESTED: another user may not enter the build tree";
  }
  Experts e;
  std::string file = e.add(1, "secret");
  Build(file, kGoodEntry);
  OpenAllBut(e, file, 0);
  ExpectInChild([&] {
    if (geteuid() == 0) {
      ASSERT_EQ(setresuid(65534, 65534, 65534), 0);
    }
    Found found = Check(1);
    EXPECT_EQ(found.exitCode, kNotFound);
    EXPECT_EQ(found.code, "unreadable");
    EXPECT_EQ(found.messages, Messages{file + " cannot be read: Permission denied"});
  });
}

// ---- Paths that the system does not even let the check look at

TEST(Check, ANameThatIsTooLong) {
  Experts e;
  std::string file = e.add(GText(1), "long", e.file(std::string(300, 'x')));
  ExpectTold(1, {IsNot("is not readable", file)}, "unreachable",
             {file + " cannot be reached: File name too long"}, {});
}

// The list has the problems of all, those after such a path too.
TEST(Check, APathThatCannotBeLookedAtHidesNoOther) {
  Experts e;
  std::string circle = e.add(1, "circle"), missing = e.add(2, "missing");
  std::filesystem::create_symlink(circle, circle);
  ExpectStart([&](IvltRegistrar&) {
    auto [result, reported] = Checked(GUID_NULL);
    EXPECT_EQ(result, E_FAIL);
    for (const std::string& text :
         {IsNot("is not readable", circle), IsNot("does not exist", missing)}) {
      EXPECT_EQ(std::count(reported.begin(), reported.end(), text), 1) << text;
    }
  });
}

TEST(Check, LinksThatGoInCircles) {
  Experts e;
  std::string file = e.add(1, "circle");
  std::filesystem::create_symlink(file, file);
  ExpectTold(1, {IsNot("is not readable", file)}, "unreachable",
             {file + " cannot be reached: Too many levels of symbolic links"}, {});
}

TEST(Check, ADirectoryThatMayNotBeEntered) {
  if (geteuid() != 0) {
    printf("NOT TESTED: needs root, to have a directory of another user\n");
    GTEST_SKIP();
  }
  if (!vlt::test::AllMayEnter(VLT_TEST_BIN)) {
    GTEST_SKIP() << "NOT TESTED: another user may not enter the build tree";
  }
  Experts e;
  std::filesystem::create_directory(e.root() + "/locked");
  std::string file = e.add(GText(1), "locked", e.file("locked/expert"));
  Build(file, kGoodEntry);
  OpenAllBut(e, e.root() + "/locked", 0700);
  ExpectInChild([&] {
    ASSERT_EQ(setresuid(65534, 65534, 65534), 0);
    ExpectTold(1, {IsNot("is not readable", file)}, "unreachable",
               {file + " cannot be reached: Permission denied"}, {});
  });
}

// ---- Libraries that do harm while they are loaded. Only the tool survives them.

void ExpectFate(const std::string& statement, const std::string& code, const std::string& fate) {
  Experts e;
  Build(e.add(1, "harm"), AtLoad(statement));
  Found found = Check(1);
  EXPECT_EQ(found.exitCode, kNotFound) << statement;
  EXPECT_FALSE(found.sound) << statement;
  EXPECT_EQ(found.code, code) << statement;
  EXPECT_EQ(found.messages, Messages{fate}) << statement;
  EXPECT_EQ(found.notes, Messages()) << statement;
}

TEST(Check, ACrashAtLoad) {
  ExpectFate("abort();", "died", "the process that loaded the library died: Aborted");
  ExpectFate("signal(SIGSEGV, SIG_DFL); raise(SIGSEGV);", "died",
             "the process that loaded the library died: Segmentation fault");
}

// Whatever the code, none of them means that the component is sound.
TEST(Check, AnExitAtLoadIsNeverSound) {
  for (int code : {0, 1, 7}) {
    std::string text = std::to_string(code);
    ExpectFate("exit(" + text + ");", "ended-its-process",
               "the library ended its process with " + text);
    ExpectFate("_exit(" + text + ");", "ended-its-process",
               "the library ended its process with " + text);
  }
}

TEST(Check, AHangAtLoadEndsAtTheTimeLimit) {
  auto begin = std::chrono::steady_clock::now();
  ExpectFate("for (;;) pause();", "hangs",
             "the library did not load within 10 s; its process was killed");
  std::chrono::duration<double> taken = std::chrono::steady_clock::now() - begin;
  printf("a library that hangs: %.1f s\n", taken.count());
  EXPECT_GE(taken.count(), 10);
  EXPECT_LT(taken.count(), 25);
}

// What a library starts neither holds the check up nor outlives it.
TEST(Check, AProcessStartedAtLoad) {
  Experts e;
  TempDir dir;
  std::string pidFile = dir / "pid";
  std::string writePid = "FILE* f = fopen(\"" + pidFile + ".new\", \"w\"); " +
                         "fprintf(f, \"%d\", (int)getpid()); fclose(f); rename(\"" + pidFile +
                         ".new\", \"" + pidFile + "\"); ";
  Build(e.add(1, "starter"),
        "#include <stdio.h>\n" +
            AtLoad("if (fork() == 0) { " + writePid + "for (;;) pause(); } while (access(\"" +
                   pidFile + "\", F_OK) != 0) usleep(1000);"));
  Found found = Check(1);
  EXPECT_TRUE(found.sound);
  EXPECT_EQ(found.notes, Messages());  // one that was held up says so after ten seconds
  std::string pid = ReadBytes(pidFile);
  EXPECT_FALSE(pid.empty());
  EXPECT_TRUE(Eventually([&] {
    std::string state;
    std::ifstream("/proc/" + pid + "/stat") >> state >> state >> state;
    return state.empty() || state == "Z";  // gone, or not reaped yet
  })) << pid;
}

TEST(Check, WhatALibraryPrintsAtLoadIsNotShown) {
  Experts e;
  Build(e.add(1, "noisy"),
        AtLoad("(void)!write(1, \"MMMnoise\\n\", 9); (void)!write(2, \"E\\n\", 2);"));
  ProgramResult result = Vltctl({"check", GText(1)});
  EXPECT_EQ(result.exitCode, kGood);
  EXPECT_EQ(result.out, "object expert noisy: sound\n1 component: sound\n");
  EXPECT_EQ(result.err, "");
}

// ---- The whole tree

TEST(Check, OneBadLibraryHidesNoOther) {
  Experts e;
  Build(e.add(1, "good"), kGoodEntry);
  Build(e.add(2, "crash"), AtLoad("abort();"));
  std::string missing = e.add(3, "missing");
  ProgramResult result = Vltctl({"check"});
  EXPECT_EQ(result.exitCode, kNotFound);
  EXPECT_NE(result.out.find("object expert good: sound\n"
                            "object expert crash: NOT SOUND\n"
                            "  the process that loaded the library died: Aborted\n"
                            "object expert missing: NOT SOUND\n"
                            "  " +
                            missing + " does not exist\n"),
            std::string::npos)
      << result.out;
  EXPECT_EQ(result.out.find("dictionary vltdd: sound\n"), 0u);
  EXPECT_TRUE(result.out.ends_with("\n4 components: 2 not sound\n"));
}

// The null identifier is the library's word for all components: what the others do, and that one of them
// ends the process, is not this one's.
TEST(Check, AComponentWithoutAnIdentifierIsNotTakenForAll) {
  Experts e;
  Build(e.add(1, "crash"), AtLoad("abort();"));
  Build(e.add("unreadable", "nameless", e.file("nameless")), kGoodEntry);
  const char* const kNull = "00000000-0000-0000-0000-000000000000";
  const std::string reported =
      "object expert nameless: NOT SOUND\n"
      "  it has no identifier of its own, so no program can ask for it\n";
  ProgramResult one = Vltctl({"check", kNull});
  EXPECT_EQ(one.exitCode, kNotFound);
  EXPECT_EQ(one.out, reported + "1 component: 1 not sound\n");
  ProgramResult all = Vltctl({"check"});
  EXPECT_NE(all.out.find(reported + "object expert crash: NOT SOUND\n"), std::string::npos)
      << all.out;
  Experts others;
  ProgramResult none = Vltctl({"check", kNull});
  EXPECT_EQ(none.exitCode, kNotFound);
  EXPECT_EQ(none.out, "");
}

TEST(Check, AnUnknownComponentIsNotFound) {
  Experts e;
  ProgramResult result = Vltctl({"check", GText(77)});
  EXPECT_EQ(result.exitCode, kNotFound);
  EXPECT_EQ(result.out, "");
  EXPECT_EQ(result.err, "vltctl: no component " + GText(77) + "; \"vltctl list\" shows all\n");
  ExpectStart([](IvltRegistrar&) {
    EXPECT_EQ(Checked(G(77)), (std::pair<HRESULT, Messages>{E_INVALIDARG, {}}));
  });
}

}  // namespace
}  // namespace vlt::test

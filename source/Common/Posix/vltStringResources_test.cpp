#include <gtest/gtest.h>

#include <cstdio>
#include <filesystem>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/vltcmn.h"
#include "source/Database/resourceTexts.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/MemoryLimit.h"
#include "vlloader/source/vlloader.h"
#include "ztini/ztini.h"

namespace vlt::test {
namespace {

using namespace std::string_literals;

constexpr char kSource[] = "./source/Utilities/../Common/Posix/vltlinuxos";

struct Answer {
  HRESULT result;
  std::string text;  // "(untouched)" if there is none
};

// Asked in a child: the trace flags, which are read once, must be those of the question's
// installation.
Answer Ask(const char* separator, const wchar_t* file, const wchar_t* key = L"Key",
           unsigned maxLength = 1024) {
  TempDir dir;
  ExpectInChild([&] {
    TaskMem<char> out;
    HRESULT result = vltGetStringResource(separator, file, key, out.out(), maxLength);
    WriteBytes(dir / "result", std::to_string(result));
    WriteBytes(dir / "text", out ? out.get() : "(untouched)");
  });
  return {static_cast<HRESULT>(std::stol(ReadBytes(dir / "result"))), ReadBytes(dir / "text")};
}

void Expect(const Answer& found, HRESULT result, const std::string& text) {
  EXPECT_EQ(found.result, result);
  EXPECT_EQ(found.text, text);
}

// Three components; two of them of one file.
constexpr char kDatabase[] =
    "[KORComponents]\nA = \"A\"\nB = \"B\"\nC = \"C\"\n"
    "[A]\nFileName = \"/x/One.vle\"\nKey = \"first\"\nOnlyA = \"a\"\n"
    "[B]\nFileName = \"/y/one.VLE\"\nKey = \"second\"\nOnlyB = \"b\"\n"
    "[C]\nFileName = \"/x/Two.vle\"\nKey = \"third\"\nEmpty = \"\"\n";

class Database : public Installation {
 public:
  explicit Database(const std::string& bytes = kDatabase) { WriteBytes(database(), bytes); }
};

TEST(vltStringResources, AFileWithoutASlashMatchesNothing) {
  Database d;
  Expect(Ask(";", L"One.vle"), E_FAIL, "(untouched)");
  Expect(Ask(nullptr, L"One.vle"), E_FAIL, "(untouched)");
  Expect(Ask(nullptr, nullptr), E_FAIL, "(untouched)");
}

// A stored name that ends in a slash has no base name either, and is no component's file. The second
// round walks the list as the early trace has it.
TEST(vltStringResources, AnEmptyBaseNameMatchesNothing) {
  for (const char* flags : {"", "2 0"}) {
    Database d("[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/dir/\"\nKey = \"k\"\n");
    WriteBytes(d.root() + "/vlttrace.txt", flags);
    for (const wchar_t* file : {L"/other/", L"none", L"/", L""}) {
      Expect(Ask(nullptr, file), E_FAIL, "(untouched)");
      Expect(Ask(";", file), E_FAIL, "(untouched)");
    }
  }
}

TEST(vltStringResources, ASeparatorJoinsTheTextsInTheOrderOfTheList) {
  Database d;
  Expect(Ask(";", L"/anywhere/ONE.vle"), S_OK, "first;second");
  Expect(Ask("", L"/one.vle"), S_OK, "firstsecond");
  Expect(Ask(" and ", L"/one.vle", L"OnlyB"), S_OK, "b");
  Expect(Ask(";", L"/two.vle"), S_OK, "third");
}

TEST(vltStringResources, WithoutASeparatorTheFirstComponentDecides) {
  Database d;
  Expect(Ask(nullptr, L"/x/one.vle"), S_OK, "first");
  Expect(Ask(nullptr, L"/x/one.vle", L"OnlyA"), S_OK, "a");
  Expect(Ask(nullptr, L"/x/one.vle", L"OnlyB"), E_FAIL, "(untouched)");
}

TEST(vltStringResources, ALongTextIsCutAndTerminated) {
  Database d;
  Expect(Ask(";", L"/one.vle", L"Key", 13), S_OK, "first;second");
  Expect(Ask(";", L"/one.vle", L"Key", 12), S_OK, "first;secon");
  // Each text is cut before it is joined, and the whole again.
  Expect(Ask(";", L"/one.vle", L"Key", 4), S_OK, "fir");
  Expect(Ask(nullptr, L"/one.vle", L"Key", 2), S_OK, "f");
}

TEST(vltStringResources, NoRoomAtAllIsHarmless) {
  Database d;
  EXPECT_EQ(Ask(nullptr, L"/one.vle", L"Key", 0).text, "(untouched)");
  EXPECT_EQ(Ask(nullptr, L"/one.vle", L"Key", 0).result, E_FAIL);
  EXPECT_EQ(Ask(nullptr, L"/one.vle", L"Key", 1).text, "(untouched)");
}

TEST(vltStringResources, AnEmptyTextIsFoundButHandsNothingOut) {
  Database d;
  Expect(Ask(nullptr, L"/two.vle", L"Empty"), S_OK, "(untouched)");
  Expect(Ask(";", L"/two.vle", L"Empty"), S_OK, "(untouched)");
}

TEST(vltStringResources, EscapesAreDecodedAndSingleQuotesStay) {
  Database d(
      "[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/x/a\\x62.vle\"\n"
      "Key = \"tab\\tquote\\\"\"\nSingle = 'q'\n");
  Expect(Ask(nullptr, L"/ab.vle"), S_OK, "tab\tquote\"");
  Expect(Ask(nullptr, L"/ab.vle", L"Single"), S_OK, "'q'");
}

TEST(vltStringResources, WhatIsMissingIsPassedOver) {
  Database d(
      "[KORComponents]\nGone = \"x\"\nNoFile = \"x\"\nA = \"x\"\n[NoFile]\nKey = \"n\"\n"
      "[A]\nFileName = \"/a.vle\"\nKey = \"a\"\n[Unlisted]\nFileName = \"/a.vle\"\n"
      "Key = \"u\"\n");
  Expect(Ask(";", L"/a.vle"), S_OK, "a");
}

TEST_IN_CHILD(vltStringResources, WithoutADatabaseOrItsListThereIsNothing) {
  Installation i;
  Expect(Ask(nullptr, L"/a.vle"), E_FAIL, "(untouched)");
  WriteBytes(i.database(), "[A]\nFileName = \"/a.vle\"\nKey = \"a\"\n");
  Expect(Ask(nullptr, L"/a.vle"), E_FAIL, "(untouched)");
  EXPECT_EQ(vltGetStringResource(nullptr, L"/a", L"k", nullptr, 10), E_POINTER);
}

// A key that is nowhere in the bytes is answered without the parser, which has to make no
// difference: the parser skips a terminator within a long line, and compares names in its own way.
TEST(vltStringResources, AnswersAreTheParsersWhateverTheBytes) {
  const std::string list = "[KORComponents]\nA = \"A\"\n", head = "[A]\nFileName = \"/x/f\"\n";
  const std::string blanks(250, ' ');
  const std::string databases[] = {
      list + head + "key = \"v\"\n",
      list + head + " \t KEY\t = v",
      list + head + "Keys = \"v\"\nMonkey = \"v\"\n",
      list + head + "Other = \"Key\"\n",
      list + head + "Ke = \"v\"",
      list + head + blanks + "   K\rey = \"v\"\n",
      list + head + blanks + "K\rey = \"v\"\n",
      list + head + "K\0ey = \"v\"\n"s,
      blanks + "    [KOR\nComponents]\nA = \"A\"\n" + head + "Key = \"v\"\n",
      "\xEF\xBB\xBF" + list + head + "Key Line0001 = \"v\"\nKey Line0002 = \"w\"\n",
      "\xFF\xFE" + list + head + "Key = \"v\"\n",
      "",
      "Key",
      list + head + "K\u00c9Y = \"v\"\n",
      list + head + "__ = \"u\"\n_ = \"w\"\nA_K_1_K_1 = \"x\"\nk_1 = \"v\"\n",
      list + head + "K_",
  };
  for (const std::string& bytes : databases) {
    Database root(bytes);
    IniStructForwardReferenceTag* document = registrar::ResourceTexts::NewDocument();
    IniReadFromFile(document, root.database().c_str());
    registrar::ResourceTexts parsed(document, nullptr);
    for (const wchar_t* key : {L"Key", L"kEY", L" key\t", L"Ke", L"K\u00c9y", L"No such key", L"",
                               L"K_1", L" k_1 ", L"_K", L"_", L"1", L"k_11"}) {
      registrar::ResourceTexts::Query query{";", "f", zt::fnd::AnsiString(key).c_str(), 1024, ""};
      parsed.answer(query);
      SCOPED_TRACE(bytes + " asked for \"" + query.key + "\"");
      Expect(Ask(";", L"/x/f", key), query.found ? S_OK : E_FAIL,
             query.joined.empty() ? "(untouched)" : query.joined);
    }
  }
}

// The search reads blocks of 65,536 bytes and the key's length.
TEST(vltStringResources, AKeyMayLieAcrossTwoBlocks) {
  constexpr size_t kBlock = 65536 + 3;
  const std::string head = "[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/x/f\"\n;\n";
  for (size_t blocks : {1, 2}) {
    for (size_t before = 0; before <= 5; ++before) {
      std::string filler(blocks * kBlock - before - head.size(), '\n');
      Database root(head + filler + "Key = \"v\"\n");
      SCOPED_TRACE(before);
      Expect(Ask(nullptr, L"/x/f"), S_OK, "v");
      Expect(Ask(nullptr, L"/x/f", L"Kez"), E_FAIL, "(untouched)");
    }
  }
}

TEST(vltStringResources, AKeyMayBeLongerThanABlock) {
  const std::string key(200000, 'k');
  Database root("[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/x/f\"\n" + key + " = \"v\"\n");
  const std::wstring wide(key.begin(), key.end());
  Expect(Ask(nullptr, L"/x/f", wide.c_str()), S_OK, "v");
  Expect(Ask(nullptr, L"/x/f", (wide + L"k").c_str()), E_FAIL, "(untouched)");
}

TEST_IN_CHILD(vltStringResources, AKeyThatIsMissingIsMissingInThatDatabaseOnly) {
  Database d;
  std::filesystem::create_directories(d.root() + "/Last");
  WriteBytes(d.root() + "/Last/vlt.vlr",
             "[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/x/One.vle\"\nGone = \"g\"\n");
  vltStringResources resources;
  auto ask = [&](const std::string& file, const wchar_t* key) {
    TaskMem<char> out;
    resources.get(nullptr, std::wstring(file.begin(), file.end()).c_str(), key, out.out(), 100);
    return std::string(out ? out.get() : "none");
  };
  for (int round = 0; round < 2; ++round) {
    EXPECT_EQ(ask("/two.vle", L"Gone"), "none");
    EXPECT_EQ(ask("/two.vle", L"Key"), "third");
    EXPECT_EQ(ask(d.root() + "/Last/One.vle", L"Gone"), "g");
  }
  WriteBytes(d.database(),
             "[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/two.vle\"\nGone = \"back\"\n");
  resources.forget();
  EXPECT_EQ(ask("/two.vle", L"Gone"), "back");
}

TEST(vltStringResources, PreviousDictionariesHaveADatabaseBesideThem) {
  Database d;
  std::filesystem::create_directories(d.root() + "/Data Dictionaries/Last");
  WriteBytes(d.root() + "/Data Dictionaries/Last/vlt.vlr",
             "[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/x/One.vle\"\nKey = \"previous\"\n");
  std::string file = d.root() + "/Data Dictionaries/Last/One.vle";
  Expect(Ask(nullptr, std::wstring(file.begin(), file.end()).c_str()), S_OK, "previous");
  Expect(Ask(nullptr, L"/nowhere/Last/One.vle"), E_FAIL, "(untouched)");
}

TEST(vltStringResources, TheDatabaseIsLookedForAnewEachTime) {
  Database d;
  Expect(Ask(nullptr, L"/two.vle"), S_OK, "third");
  WriteBytes(d.database(),
             "[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/two.vle\"\nKey = \"n\"\n");
  Expect(Ask(nullptr, L"/two.vle"), S_OK, "n");
  Database other("[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/two.vle\"\nKey = \"o\"\n");
  Expect(Ask(nullptr, L"/two.vle"), S_OK, "o");
}

TEST(vltStringResources, StoredNamesCountUpToTheirLimit) {
  // 259 bytes are read: what follows belongs to no name.
  std::string deep = "/" + std::string(250, 'd') + "/";
  Database d("[KORComponents]\nA = \"A\"\n[A]\nFileName = \"" + deep +
             "1234567890\"\nKey = \"k\"\n");
  Expect(Ask(nullptr, L"/1234567"), S_OK, "k");
  Expect(Ask(nullptr, L"/1234567890"), E_FAIL, "(untouched)");
}

TEST_IN_CHILD(vltStringResources, ManyQuestionsReadTheDatabaseOnce) {
  Database d;
  vltStringResources resources;
  auto ask = [&] {
    TaskMem<char> out;
    EXPECT_EQ(resources.get(nullptr, L"/two.vle", L"Key", out.out(), 100), S_OK);
    return std::string(out.get());
  };
  EXPECT_EQ(ask(), "third");
  WriteBytes(d.database(),
             "[KORComponents]\nA = \"A\"\n[A]\nFileName = \"/two.vle\"\nKey = \"n\"\n");
  EXPECT_EQ(ask(), "third");
  resources.forget();
  EXPECT_EQ(ask(), "n");
}

TEST_IN_CHILD(vltStringResources, AWantOfMemoryIsNotRemembered) {
  if (!kCanLimitMemory) GTEST_SKIP() << "NOT TESTED: the sanitizer owns the address space";
  Database d;
  constexpr unsigned kMuch = 128u << 20;
  vltStringResources resources;
  auto ask = [&] {
    TaskMem<char> out;
    return resources.get(nullptr, L"/two.vle", L"Key", out.out(), kMuch);
  };
  rlimit before;
  getrlimit(RLIMIT_AS, &before);
  LimitMemoryTo(kMuch / 2);
  EXPECT_EQ(ask(), E_FAIL);
  setrlimit(RLIMIT_AS, &before);
  EXPECT_EQ(ask(), S_OK);
}

// ---- Warnings

// What a child prints in an installation with these trace flags.
std::string Printed(const std::string& flags, const std::function<void()>& body) {
  TempDir out;
  ExpectInChild([&] {
    WriteBytes(vlLookUpInstallDirectory() + "/vlttrace.txt", flags);
    ASSERT_TRUE(freopen((out / "text").c_str(), "w", stdout));
    body();
    fflush(stdout);
  });
  return ReadBytes(out / "text");
}

TEST(vltStringResources, ResourcesWarnWhenAskedTo) {
  struct Row {
    const char* database;
    int line;
    std::string message;
  };
  const Row rows[] = {
      {"", 152, "Warning: There should always be KORComponents"},
      {"[KORComponents]\nA = \"A\"\n", 143,
       "Warning: KORComponents section has component A but no section for this component in "
       "vlt.vlr file"}};
  for (const Row& row : rows) {
    for (const char* flags : {"0 0", "1 0", "2 0", "3 9"}) {
      Database d(row.database);
      std::string text = Printed(flags, [] { Ask(nullptr, L"/a.vle"); });
      if (*flags < '2') {
        EXPECT_EQ(text, "") << flags;
        continue;
      }
      EXPECT_EQ(text.find(std::string(kSource) + "(" + std::to_string(row.line) + ") : trace "), 0u)
          << text;
      EXPECT_NE(text.find(": " + row.message + "\n"), std::string::npos) << text;
    }
  }
}

TEST(vltStringResources, AResourceThatCannotBeReadIsToldWhenAskedTo) {
  Database d;
  std::string text = Printed("2 0", [] { Ask(nullptr, L"/one.vle", L"Key", 0); });
  EXPECT_EQ(text.find(std::string(kSource) + "(120) : trace "), 0u) << text;
  EXPECT_NE(text.find(": Warning: Could not get string resource Key from section A, result = 0\n"),
            std::string::npos)
      << text;
}

TEST(vltStringResources, AMissingInstallDirectoryIsToldWhenAskedTo) {
  for (const char* flags : {"0 0", "1 0"}) {
    Database d;
    std::string text = Printed(flags, [] {
      vltGetTraceFlags();
      Installation::setDir("");
      Expect(Ask(nullptr, L"/one.vle"), E_FAIL, "(untouched)");
    });
    if (*flags == '0') {
      EXPECT_EQ(text, "");
      continue;
    }
    EXPECT_EQ(text.find(std::string(kSource) + "(57) : trace "), 0u) << text;
    // The message ends its line itself, and the form does once more.
    const std::string end = ": Could not get path to KOR Data in getstringresourceimpl\n\n";
    ASSERT_GT(text.size(), end.size());
    EXPECT_EQ(text.substr(text.size() - end.size()), end);
  }
}

TEST(vltStringResources, AnswersDoNotDependOnTheFlags) {
  for (const char* flags : {"0 0", "3 0"}) {
    Database d;
    WriteBytes(d.root() + "/vlttrace.txt", flags);
    ExpectInChild([] {
      Expect(Ask(";", L"/one.vle"), S_OK, "first;second");
      Expect(Ask(nullptr, L"/one.vle", L"OnlyB"), E_FAIL, "(untouched)");
      Expect(Ask(";", L"/one.vle", L"OnlyB"), S_OK, "b");
    });
  }
}

}  // namespace
}  // namespace vlt::test

// Registration files and installations as an enemy makes them. Each ends in the outcome that is
// told, or with the component skipped: no crash, no hang, no lost database. What stands beside the
// hostile file stays available.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>

#include "tests/e2e/Start.h"
#include "tests/support/MemoryLimit.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

constexpr uid_t kNobody = 65534;
constexpr uint32_t kGood = 0x600D;

// An installation with a component that must come through whatever else is in it.
class Besieged : public Installation {
 public:
  Besieged() { addDictionary("Good", "Good", GText(kGood), 3, "g"); }

  // The hostile file, with the good one twice around it.
  std::string plant(const std::string& bytes, const std::string& bundle = "Hostile.vle") {
    return addBundle("Experts", bundle, bytes);
  }

  // Two starts that work, with the good component in both; `body` looks at what came of it.
  void expectGood(const std::function<void(IvltRegistrar&)>& body = {},
                  int deadlineMs = kDeadlineMs) const {
    for (int start = 0; start < 2; ++start) {
      ExpectStart(
          "ok",
          [&](IvltRegistrar& r) {
            EXPECT_EQ(Find(r, G(kGood)), S_OK);
            EXPECT_EQ(Find(r, kVltdd), S_OK);
            if (body) body(r);
          },
          deadlineMs);
    }
    ExpectWhole(*this);
  }
};

std::string Component(const std::string& name, uint32_t guid, const std::string& items = "") {
  return "[KORComponents]\n" + name + " = \"" + name + "\"\n[" + name + "]\nIdentifier = \"" +
         GText(guid) + "\"\n" + items;
}

// ---- Long values

TEST(Hostile, LongValuesAreKeptWholeAndReachTheClient) {
  for (size_t length :
       {255u, 259u, 260u, 261u, 1022u, 1023u, 1024u, 1025u, 4096u, 65535u, 65536u}) {
    Besieged b;
    std::string value(length, 'v');
    b.plant(Component("Long", 1,
                      "FileName = \"/" + value + "\"\nPnP = \"" + value + "\"\nOther = \"" + value +
                          "\"\nBINDING_CLASSES = \"" + value + "\"\n"));
    b.expectGood([&](IvltRegistrar& r) {
      Received c;
      ASSERT_EQ(r.GetComponent(G(1), &c.value), S_OK) << length;
      EXPECT_EQ(c.file(), L"/" + Wide(value) + L".vle");
      EXPECT_EQ(c.pnp(), Wide(value));
    });
    EXPECT_EQ(DatabaseText(b.database()).quoted("Long", "Other"), value);
  }
}

TEST(Hostile, LongNamesOfSectionsAndItems) {
  for (size_t length : {1023u, 1024u, 65536u}) {
    Besieged b;
    std::string name(length, 'n');
    b.plant(Component(name, 1, name + "i = \"x\"\nFileName = \"f\"\n"));
    b.expectGood([&](IvltRegistrar& r) {
      Received c;
      ASSERT_EQ(r.GetComponent(G(1), &c.value), S_OK) << length;
      EXPECT_EQ(c.name(), Wide(name));
    });
  }
}

TEST(Hostile, LongIdentifiersAndNumbersAreNoNumbers) {
  Besieged b;
  std::string digits(65536, '9');
  b.plant("[KORComponents]\nA = \"A\"\n[A]\nIdentifier = \"" + digits +
          "\"\nSchemaVersion = " + digits + "\nLastInstalledSchemaVersion = -" + digits + "\n");
  b.expectGood([&](IvltRegistrar& r) {
    Received c;
    EXPECT_EQ(r.GetComponent(GUID_NULL, &c.value), S_OK);
  });
}

// ---- Odd bytes

TEST(Hostile, NulBytesEndLinesAndDecodedOnesEndValues) {
  using namespace std::string_literals;
  Besieged b;
  b.plant(Component("Nul", 1, "FileName = \"a\0b\"\nPnP = \"x\\x00y\"\n"s + "\0\0\0[\0]\0=\0"s));
  b.expectGood([&](IvltRegistrar& r) {
    Received c;
    ASSERT_EQ(r.GetComponent(G(1), &c.value), S_OK);
    EXPECT_EQ(c.pnp(), L"x");
  });
}

TEST(Hostile, LineEndsInValuesStayValues) {
  Besieged b;
  b.plant(
      Component("Line", 1, "FileName = \"f\"\nPnP = \"a\\n[KOR]\\nConfigFile = x\\x0d[vltdd]\"\n"));
  b.expectGood([&](IvltRegistrar& r) {
    Received c;
    ASSERT_EQ(r.GetComponent(G(1), &c.value), S_OK);
    EXPECT_EQ(c.pnp(), L"a\n[KOR]\nConfigFile = x\r[vltdd]");
  });
  EXPECT_EQ(DatabaseText(b.database()).quoted("KOR", "ConfigFile"), b.root() + "/Data/config3.vlt");
}

// A value of the list becomes the name of an item, where these would write lines of their own.
TEST(Hostile, ListedValuesThatAreNoNamesBringNoLines) {
  const char* const values[] = {R"(x\n[KOR]\nConfigFile = \"/evil\")",
                                R"(x\x0d[KOR]\x0dConfigFile = evil)",
                                "[KOR]",
                                "[VLRContentsSection",
                                ";comment",
                                "a=b",
                                "=",
                                "",
                                "   ",
                                R"(a\x00b)",
                                R"(\t)"};
  for (const char* value : values) {
    Besieged b;
    b.plant("[KORComponents]\nName = \"" + std::string(value) +
            "\"\nConfigFile = \"ConfigFile\"\n[Name]\nIdentifier = \"" + GText(1) + "\"\n");
    SCOPED_TRACE(value);
    b.expectGood([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); });
    DatabaseText db(b.database());
    EXPECT_EQ(db.quoted("KOR", "ConfigFile"), b.root() + "/Data/config3.vlt");
    for (const auto& [component, file] : db.items("VLRContentsSection")) {
      EXPECT_EQ(file.substr(0, 2), "\"/") << component;
    }
    // And it all goes again with its bundle.
    b.removeBundle("Experts", "Hostile.vle");
    b.expectGood();
  }
}

TEST(Hostile, EveryByteInNamesAndValues) {
  Besieged b;
  std::string bytes = "[KORComponents]\nBytes = \"Bytes\"\n[Bytes]\nIdentifier = \"" + GText(1) +
                      "\"\nFileName = \"";
  for (int c = 1; c < 256; ++c) {
    if (c != '\n' && c != '\r' && c != '"') bytes += static_cast<char>(c);
  }
  bytes += "\"\n";
  for (int c = 1; c < 256; ++c) bytes += std::string("k") + static_cast<char>(c) + "y = v\n";
  b.plant(bytes);
  b.expectGood([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); });
}

TEST(Hostile, BrokenEscapesAtTheEndOfValues) {
  for (const char* tail : {"\\", "\\x", "\\x4", "\\xZZ", "\\q", "\\\\\\"}) {
    Besieged b;
    b.plant(
        Component("Esc", 1, std::string("FileName = \"f") + tail + "\"\nPnP = p" + tail + "\n"));
    b.expectGood([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); });
  }
}

TEST(Hostile, RandomBytesAndMarks) {
  const std::string texts[] = {std::string("\xFF\xFE[\0K\0O\0R\0]\0", 12),
                               std::string("\xFE\xFF\0[\0K", 6),
                               std::string("\xFF\xFE\0\0", 4),
                               std::string("\0\0\xFE\xFF", 4),
                               "\xEF\xBB\xBF" + Component("Marked", 1),
                               std::string(100000, '['),
                               std::string(100000, '='),
                               std::string(100000, '\0'),
                               std::string(100000, '"'),
                               "]]]]\n[[[[\n====\n\"\"\"\"\n"};
  for (const std::string& text : texts) {
    Besieged b;
    std::string file = b.plant(text);
    b.expectGood();
    bool utf16Or32 =
        text[0] == '\xFF' || text[0] == '\xFE' || text.substr(0, 3) == std::string("\0\0\xFE", 3);
    EXPECT_EQ(Exists(file), !utf16Or32);
  }
}

// ---- Many

TEST(Hostile, AMillionSectionsTakeBoundedTime) {
  Besieged b;
  std::string text = "[KORComponents]\nLast = \"Last\"\n";
  for (int n = 0; n < 1000000; ++n) text += "[s" + std::to_string(n) + "]\nk=1\n";
  b.plant(text + "[Last]\nIdentifier = \"" + GText(1) + "\"\n");
  auto begin = std::chrono::steady_clock::now();
  b.expectGood([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); }, 120000);
  std::chrono::duration<double> taken = std::chrono::steady_clock::now() - begin;
  printf("two starts with a million sections: %.1f s\n", taken.count());
}

TEST(Hostile, AHundredThousandComponentsTakeBoundedTime) {
  Besieged b;
  std::string list = "[KORComponents]\n", sections;
  for (uint32_t n = 0; n < 100000; ++n) {
    std::string name = "c" + std::to_string(n);
    list += name + "=\"" + name + "\"\n";
    sections +=
        "[" + name + "]\nIdentifier=" + GText(n + 0x10000) + "\nFileName=/x/" + name + ".vle\n";
  }
  b.plant(list + sections);
  b.expectGood([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(0x10000 + 99999)), S_OK); }, 120000);
  // And so does their removal.
  b.removeBundle("Experts", "Hostile.vle");
  ExpectStart(
      "ok", [](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(0x10000)), E_INVALIDARG); }, 120000);
}

TEST(Hostile, AHundredThousandComponentsOfOneFileNameTakeBoundedTime) {
  Besieged b;
  std::string list = "[KORComponents]\n", sections;
  for (uint32_t n = 0; n < 100000; ++n) {
    std::string name = "c" + std::to_string(n);
    list += name + "=\"" + name + "\"\n";
    sections += "[" + name + "]\nIdentifier=" + GText(n + 0x10000) + "\nFileName=/x/" +
                std::to_string(n) + "/same.vle\nBINDING_CLASSES=\"\"\n";
  }
  b.plant(list + sections);
  b.expectGood([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(0x10000 + 99999)), S_OK); }, 120000);
}

TEST(Hostile, ACountOfTwoThousandMillionClasses) {
  for (const char* count : {"2000000000", "99999999999999999999", "-1", "2147483648"}) {
    Besieged b;
    std::string classes = "{" + GText(1) + "}:" + count + ":{" + GText(2) + "}";
    b.plant(Component("Many", 1, "FileName = \"Many\"\nBINDING_CLASSES = \"" + classes + "\"\n"));
    b.expectGood([&](IvltRegistrar& r) {
      bool positive = *count != '-';
      auto bound = Bound(r, vltComponentObjectExpert, G(2), positive ? S_OK : VLT_E_NO_COMPONENT);
      EXPECT_EQ(bound.size(), positive ? 1u : 0u);
    });
  }
}

// ---- What stands in a file's place

void MakePipe(const std::string& path) { ASSERT_EQ(mkfifo(path.c_str(), 0666), 0) << path; }

TEST(Hostile, PipesPlainFilesAndLinksInBundles) {
  Besieged b;
  std::string experts = b.root() + "/Experts/", dictionaries = b.root() + "/Data Dictionaries/";
  fs::create_directories(experts + "pipe-inside.vle/Resources");
  MakePipe(experts + "pipe-inside.vle/Resources/Info.vlr");
  MakePipe(experts + "pipe.vle");
  MakePipe(dictionaries + "pipe.framework");
  fs::create_directories(experts + "pipe-between.vle");
  MakePipe(experts + "pipe-between.vle/Resources");
  WriteBytes(experts + "file.vle", "plain");
  WriteBytes(dictionaries + "file.framework", "plain");
  fs::create_symlink("loop.vle", experts + "loop.vle");
  fs::create_symlink("two.vle", experts + "one.vle");
  fs::create_symlink("one.vle", experts + "two.vle");
  fs::create_directories(experts + "inner.vle/Resources");
  fs::create_symlink("Info.vlr", experts + "inner.vle/Resources/Info.vlr");
  fs::create_directory_symlink("..", experts + "up.vle");
  fs::create_directory_symlink(b.root(), experts + "root.vle");
  fs::create_directories(experts + "device.vle/Resources");
  fs::create_symlink("/dev/zero", experts + "device.vle/Resources/Info.vlr");
  fs::create_directories(experts + "dangling.vle/Resources");
  fs::create_symlink("/nowhere", experts + "dangling.vle/Resources/Info.vlr");
  fs::create_directories(experts + "directory.vle/Resources/Info.vlr");
  b.expectGood();
}

TEST(Hostile, ALinkToTheDatabaseAsRegistrationFile) {
  Besieged b;
  fs::create_directories(b.root() + "/Experts/self.vle/Resources");
  fs::create_symlink(b.database(), b.root() + "/Experts/self.vle/Resources/Info.vlr");
  b.expectGood();
}

TEST(Hostile, APipeInTheDatabasesPlaceIsRefusedAndStays) {
  Besieged b;
  MakePipe(b.database());
  ExpectStart("int 1");
  ExpectStart("int 1");
  unlink(b.database().c_str());
  b.expectGood();
}

TEST(Hostile, ADirectoryInTheDatabasesPlaceIsRefusedAndStays) {
  Besieged b;
  fs::create_directories(b.database() + "/kept");
  ExpectStart("int 1");
  EXPECT_TRUE(Exists(b.database() + "/kept"));
  fs::remove_all(b.database());
  b.expectGood();
}

// ---- The sidecar's place

// It says nothing about the database, which is taken as it is.
TEST(Hostile, APipeInTheSidecarsPlaceLosesNothing) {
  Besieged b;
  ExpectStart("ok");
  unlink(b.sidecar().c_str());
  MakePipe(b.sidecar());
  for (int start = 0; start < 3; ++start) {
    ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  }
  EXPECT_TRUE(DatabaseText(b.database()).has("Good"));
}

// A sidecar that opens but is short: one process without components, and the next starts are whole.
TEST(Hostile, ADirectoryInTheSidecarsPlaceCostsOneStart) {
  Besieged b;
  ExpectStart("ok");
  std::string contents = ReadBytes(b.database());
  unlink(b.sidecar().c_str());
  fs::create_directories(b.sidecar() + "/full");
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), E_INVALIDARG); });
  for (int start = 0; start < 2; ++start) {
    ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  }
  EXPECT_EQ(Hex(ReadBytes(b.sidecar())), Md5Sum(b.database()));
  int copies = 0;
  for (const auto& entry : fs::directory_iterator(b.root())) {
    if (entry.is_regular_file() && entry.path().extension() == ".bad") {
      EXPECT_EQ(ReadBytes(entry.path()), contents);
      ++copies;
    }
  }
  EXPECT_EQ(copies, 1);
}

TEST(Hostile, ALinkInTheSidecarsPlaceIsNotWrittenThrough) {
  Besieged b;
  ExpectStart("ok");
  TempDir elsewhere;
  WriteBytes(elsewhere / "target", "a sixteen bytes!");
  unlink(b.sidecar().c_str());
  fs::create_symlink(elsewhere / "target", b.sidecar());
  ExpectStart([&](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  EXPECT_EQ(ReadBytes(elsewhere / "target"), "a sixteen bytes!");
}

// ---- Names that mean something

// The list of contents is an exception: its items are paths, and one that is relative is raised.
std::string OutcomeOfList(const std::string& name) {
  return name == "VLRContentsSection" ? "InvalidArgument" : "ok";
}

TEST(Hostile, ComponentsThatBearTheNamesOfTheLists) {
  for (const char* name : {"KOR", "KORComponents", "Registration", "VLRContentsSection"}) {
    Besieged b;
    SCOPED_TRACE(name);
    b.plant(Component(name, 1));
    for (int start = 0; start < 2; ++start) {
      ExpectStart(OutcomeOfList(name), [](IvltRegistrar& r) {
        EXPECT_EQ(Find(r, G(kGood)), S_OK);
        EXPECT_EQ(Find(r, kVltdd), S_OK);
      });
    }
    ExpectWhole(b);
    EXPECT_TRUE(DatabaseText(b.database()).has("Good"));
  }
}

// Each start writes the built-in dictionary first, and merges over it only what has changed.
TEST(Hostile, AComponentThatBearsTheBuiltInDictionarysNameHasItOnce) {
  Besieged b;
  b.plant(Component("vltdd", 1));
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, kVltdd), E_INVALIDARG); });
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, kVltdd), S_OK); });
}

// A start that notices that the file has gone erases the section of that name in memory. The file
// on the disk keeps every component.
TEST(Hostile, RemovingAComponentThatBearsAListsNameLosesNoComponentOnTheDisk) {
  for (const char* name : {"KOR", "KORComponents", "Registration", "VLRContentsSection"}) {
    Besieged b;
    SCOPED_TRACE(name);
    b.plant(Component(name, 1));
    ExpectStart(OutcomeOfList(name));
    b.removeBundle("Experts", "Hostile.vle");
    for (int start = 0; start < 3; ++start) ExpectStart(OutcomeOfList(name));
    DatabaseText db(b.database());
    EXPECT_TRUE(db.has("Good"));
    EXPECT_TRUE(db.raw("KORComponents", "Good"));
    ExpectWhole(b);
  }
}

TEST(Hostile, AFileThatBringsTheListsThemselves) {
  Besieged b;
  b.plant("[KOR]\nSchemaVersion = 99\nConfigFile = \"/evil\"\nCacheSize = words\n[Registration]\n" +
          b.root() + "/Data Dictionaries/Good.framework/Resources/Info.vlr = \"1 1\"\n" +
          "[VLRContentsSection]\nvltdd = \"/gone\"\nOther = \"" + b.root() + "/gone/Info.vlr\"\n");
  // The vanished file takes the built-in dictionary along in memory, and each start brings it back.
  for (int start = 0; start < 3; ++start) {
    ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  }
  ExpectWhole(b);
}

// Raised at each start, with the lock free and the database as it was: a client can put it right.
TEST(Hostile, ARelativePathPlantedInTheContentsIsRaised) {
  Besieged b;
  ExpectStart("ok");
  std::string file = b.plant("[VLRContentsSection]\nx = \"relative/path\"\n");
  ExpectStart("InvalidArgument");
  ExpectStart("InvalidArgument");
  ExpectWhole(b);
  EXPECT_TRUE(DatabaseText(b.database()).has("Good"));
}

// The name of the section that is written without a header: its items must not fall to the list of
// contents, or to any other section that happens to stand before.
TEST(Hostile, TheHeaderlessSectionIsLeftOut) {
  Besieged b;
  b.plant("[KORComponents]\nN = \"N\"\n");
  ExpectStart("ok");
  b.plant("[(null)]\nSchemaVersion = 5\nx = \"relative\"\n[ (null) ]\ny = \"z\"\n" +
              Component("M", 1, "FileName = \"M\"\n"),
          "Second.vle");
  b.expectGood([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); });
  std::string bytes = ReadBytes(b.database());
  EXPECT_EQ(bytes.find("relative"), std::string::npos);
  EXPECT_EQ(bytes.find("y = "), std::string::npos);
}

TEST(Hostile, TwoSectionsWithOneIdentifierAndAListWithoutSections) {
  Besieged b;
  b.plant(
      "[KORComponents]\nA = \"A\"\nB = \"B\"\nNowhere = \"Nowhere\"\nNowhere2 = \"x\"\n[A]\n"
      "Identifier = " +
      GText(1) + "\nPnP = \"a\"\n[B]\nIdentifier = {" + GText(1) + "}\nSchemaVersion = 4\n");
  b.expectGood([](IvltRegistrar& r) {
    Received c;
    ASSERT_EQ(r.GetComponent(G(1), &c.value), S_OK);
    EXPECT_EQ(c.name(), L"B");
    Received none;
    ASSERT_EQ(r.GetComponent(GUID_NULL, &none.value), S_OK);
    EXPECT_EQ(none.value.fileName, nullptr);
  });
}

TEST(Hostile, ANewFileMayTakeTheGoodOnesIdentifierButNotItsPlace) {
  Besieged b;
  b.plant(Component("Thief", kGood, "FileName = \"Thief\"\n"));
  ExpectStart("ok", [](IvltRegistrar& r) {
    Received c;
    ASSERT_EQ(r.GetComponent(G(kGood), &c.value), S_OK);
    EXPECT_EQ(c.name(), L"Thief");  // later in the list
  });
  b.removeBundle("Experts", "Hostile.vle");
  ExpectStart("ok", [](IvltRegistrar& r) {
    Received c;
    ASSERT_EQ(r.GetComponent(G(kGood), &c.value), S_OK);
    EXPECT_EQ(c.name(), L"Good");
  });
}

// ---- Paths

TEST(Hostile, BundleNamesThatAnIniFileCannotHold) {
  Besieged b;
  uint32_t n = 1;
  for (const char* name : {"a=b", ";x", "[x]", "\"q\"", "tab\there", "back\\slash", "x Line0001",
                           " blank", "\x01\x7F", "Info]", "%s%n", "*", "?"}) {
    b.plant(Component("C" + std::to_string(n), n), std::string(name) + ".vle");
    ++n;
  }
  b.plant(Component("LF", 100), "line\nfeed.vle");
  b.plant(Component("CR", 101), "carriage\rreturn.vle");
  b.expectGood([&](IvltRegistrar& r) {
    for (uint32_t k = 1; k < n; ++k) EXPECT_EQ(Find(r, G(k)), S_OK) << k;
  });
  DatabaseText db(b.database());
  EXPECT_EQ(db.sections()[0], "KOR");
  EXPECT_FALSE(db.has("feed.vle/Resources/Info.vlr"));
}

TEST(Hostile, RootsThatAnIniFileCannotHold) {
  for (const char* name : {"a=b", "[x]", ";x", "x Line0001", " x "}) {
    Besieged b;
    TempDir place;
    std::string root = place.makeDir(name);
    fs::copy(b.root(), root, fs::copy_options::recursive);
    Installation::setDir(root);
    SCOPED_TRACE(name);
    for (int start = 0; start < 2; ++start) {
      ExpectStart("ok", [](IvltRegistrar& r) {
        EXPECT_EQ(Find(r, G(kGood)), S_OK);
        EXPECT_EQ(Find(r, kVltdd), S_OK);
      });
    }
    EXPECT_EQ(Hex(ReadBytes(root + "/vlt.vl5")), Md5Sum(root + "/vlt.vlr"));
  }
}

// The lock of a file is named after its path: too long for an entry of a directory.
TEST(Hostile, AVeryLongRootHasItsLockAndItsComponents) {
  Besieged b;
  TempDir place;
  std::string root = place.path();
  while (root.size() < 900) root += "/" + std::string(60, 'r');
  fs::create_directories(root);
  fs::copy(b.root(), root, fs::copy_options::recursive);
  Installation::setDir(root);
  for (int start = 0; start < 2; ++start) {
    ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  }
  EXPECT_TRUE(Exists(root + "/Data Dictionaries/Good.framework/Resources/Info.vlr"));
  EXPECT_EQ(Hex(ReadBytes(root + "/vlt.vl5")), Md5Sum(root + "/vlt.vlr"));
}

TEST(Hostile, InvalidTextInNamesUnderAnUtf8Locale) {
  Besieged b;
  b.plant(Component("caf\xC3\xA9", 1), "caf\xC3\xA9.vle");
  b.plant(Component("bad\xFF\xFE", 2), "bad\xFF\xFE.vle");
  for (const char* locale : {"C.UTF-8", "C"}) {
    int code = InChild([&] {
      ASSERT_NE(setlocale(LC_ALL, locale), nullptr);
      IvltRegistrar* r = nullptr;
      ASSERT_EQ(GetRegistrar(&r), "ok");
      EXPECT_EQ(Find(*r, G(kGood)), S_OK);
      if (std::string(locale) != "C") {
        EXPECT_EQ(Find(*r, G(1)), S_OK);
      }
      r->Release();
    });
    EXPECT_EQ(code, 0) << locale;
  }
}

// ---- Scarce resources

// A full table of descriptors, at each degree: a refusal by result or exception, never a loss.
TEST(Hostile, AFullDescriptorTableLosesNothing) {
  if (!kCanLimitMemory) GTEST_SKIP() << "a sanitizer opens descriptors for its own checks";
  Besieged b;
  b.plant(Component("Other", 1, "FileName = \"Other\"\n"));
  ExpectStart("ok");
  std::string good = b.root() + "/Data Dictionaries/Good.framework/Resources/Info.vlr";
  time_t time = Installation::kInstalled;
  int worked = 0;
  for (rlim_t spare = 0; spare < 12; ++spare) {
    Installation::touch(good, ++time);
    int code = InChild([&] {
      int next = dup(0);
      rlimit limit = {static_cast<rlim_t>(next) + spare, static_cast<rlim_t>(next) + spare};
      close(next);
      ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &limit), 0);
      IvltRegistrar* r = nullptr;
      if (GetRegistrar(&r) == "ok") {
        r->Release();
      }
    });
    EXPECT_EQ(code, 0) << spare;
    EXPECT_TRUE(Exists(good)) << spare;
    EXPECT_TRUE(DatabaseText(b.database()).has("Other")) << spare;
    ExpectStart("ok", [&](IvltRegistrar& r) {
      EXPECT_EQ(Find(r, G(kGood)), S_OK) << spare;
      EXPECT_EQ(Find(r, G(1)), S_OK) << spare;
      ++worked;
    });
    ExpectWhole(b);
    EXPECT_EQ(DatabaseText(b.database()).quoted("Registration", good), Installation::stamp(time));
  }
}

// A medium that is full: the file size limit stops every write.
TEST(Hostile, AWriteThatFailsLosesNothing) {
  Besieged b;
  ExpectStart("ok");
  std::string before = ReadBytes(b.database());
  Installation::touch(b.root() + "/Data Dictionaries/Good.framework/Resources/Info.vlr", 1);
  int code = InChild([&] {
    signal(SIGXFSZ, SIG_IGN);
    rlimit limit = {100, 100};
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
    IvltRegistrar* r = nullptr;
    ASSERT_EQ(GetRegistrar(&r), "ok");
    EXPECT_EQ(r->SetSchemaVersion(7), E_FAIL);
    r->Release();
  });
  EXPECT_EQ(code, 0);
  EXPECT_EQ(ReadBytes(b.database()), before);
  b.expectGood();
}

// ---- Other users

class HostileUsers : public testing::Test {
 protected:
  void SetUp() override {
    if (geteuid() != 0) GTEST_SKIP() << "needs root, to become a user without rights";
    chmod(fs::path(b.root()).parent_path().c_str(), 0755);
    chmod(getenv("ZTFNDTMPSHAREDFILEDIR"), 0777);
  }

  static void ExpectStartAsNobody(const std::string& expected,
                                  const std::function<void(IvltRegistrar&)>& body = {}) {
    int code = InChild([&] {
      ASSERT_EQ(setresgid(kNobody, kNobody, kNobody), 0);
      ASSERT_EQ(setresuid(kNobody, kNobody, kNobody), 0);
      IvltRegistrar* r = nullptr;
      EXPECT_EQ(GetRegistrar(&r), expected);
      if (r && body) body(*r);
      if (r) r->Release();
    });
    EXPECT_EQ(code, 0);
  }

  Besieged b;
};

TEST_F(HostileUsers, AnUnreadableRegistrationFileIsSkippedAndNotLost) {
  chmod(b.root().c_str(), 0777);
  std::string file = b.plant(Component("Hidden", 1));
  chmod(file.c_str(), 0);
  ExpectStartAsNobody("ok", [](IvltRegistrar& r) {
    EXPECT_EQ(Find(r, G(kGood)), S_OK);
    EXPECT_EQ(Find(r, G(1)), E_INVALIDARG);
  });
  EXPECT_TRUE(Exists(file));
  ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); });
}

// What keeps a look into a bundle from being taken is the client's to know; the database and its lock
// are as they were, and users with the right are served.
TEST_F(HostileUsers, ABundleThatIsClosedToAUserIsRaisedForThatUser) {
  chmod(b.root().c_str(), 0777);
  ExpectStart("ok");
  fs::create_directories(b.root() + "/Experts/closed.vle/Resources");
  chmod((b.root() + "/Experts/closed.vle").c_str(), 0700);
  ExpectStartAsNobody("PosixError " + std::to_string(EACCES));
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
  ExpectWhole(b);
}

// A client without any rights still reads what another user's process has registered.
TEST_F(HostileUsers, WithoutRightsTheDatabaseIsReadAndNothingIsChanged) {
  ExpectStart("ok");
  std::string before = ReadBytes(b.database());
  Installation::touch(b.root() + "/Data Dictionaries/Good.framework/Resources/Info.vlr", 1);
  // The directory allows no temporary file beside the database.
  ExpectStartAsNobody("ok", [](IvltRegistrar& r) {
    EXPECT_EQ(Find(r, G(kGood)), S_OK);
    EXPECT_LT(r.SetSchemaVersion(7), 0);
  });
  EXPECT_EQ(ReadBytes(b.database()), before);
  ExpectWhole(b);
}

TEST_F(HostileUsers, UsersTakeTurnsWithOneDatabase) {
  chmod(b.root().c_str(), 0777);
  for (int turn = 0; turn < 2; ++turn) {
    ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(r.SetSchemaVersion(7), S_OK); });
    ExpectStartAsNobody("ok", [](IvltRegistrar& r) { EXPECT_EQ(r.SetSchemaVersion(8), S_OK); });
  }
  EXPECT_EQ(ModeOf(b.database()), 0777);
  ExpectWhole(b);
}

// What another user's killed process leaves beside the database stands in nobody's way.
TEST_F(HostileUsers, LeftoversOfAnotherUserDoNotStopASave) {
  chmod(b.root().c_str(), 0777);
  ExpectStart("ok");
  for (const char* name : {"/vlt.TMP", "/vlt.vl5.TMP"}) {
    WriteBytes(b.root() + name, "left over");
    chmod((b.root() + name).c_str(), 0600);
  }
  unlink(b.sidecar().c_str());
  ExpectStartAsNobody("ok", [](IvltRegistrar& r) { EXPECT_EQ(r.SetSchemaVersion(8), S_OK); });
  ExpectWhole(b);
}

// A link planted where everybody may write must not make a root process open foreign files up.
TEST_F(HostileUsers, ModesAreNotChangedThroughPlantedLinks) {
  TempDir secrets;
  WriteBytes(secrets / "secret", "[KORComponents]\n");
  chmod((secrets / "secret").c_str(), 0600);
  fs::create_directories(b.root() + "/Experts/planted.vle/Resources");
  fs::create_symlink(secrets / "secret", b.root() + "/Experts/planted.vle/Resources/Info.vlr");
  b.expectGood();
  EXPECT_EQ(ModeOf(secrets / "secret"), 0600);
}

}  // namespace
}  // namespace vlt::test

// What an enemy writes into registration files.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>

#include "tests/e2e/HostileInstallation.h"

namespace vlt::test {
namespace {

namespace fs = std::filesystem;

// ---- Long values

TEST(Hostile, LongValuesAreKeptWholeAndReachTheClient) {
  for (size_t length :
       {255u, 259u, 260u, 261u, 1022u, 1023u, 1024u, 1025u, 4096u, 65535u, 65536u}) {
    HostileInstallation b;
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
    HostileInstallation b;
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
  HostileInstallation b;
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
  HostileInstallation b;
  b.plant(Component("Nul", 1, "FileName = \"a\0b\"\nPnP = \"x\\x00y\"\n"s + "\0\0\0[\0]\0=\0"s));
  b.expectGood([&](IvltRegistrar& r) {
    Received c;
    ASSERT_EQ(r.GetComponent(G(1), &c.value), S_OK);
    EXPECT_EQ(c.pnp(), L"x");
  });
}

TEST(Hostile, LineEndsInValuesStayValues) {
  HostileInstallation b;
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
    HostileInstallation b;
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
  HostileInstallation b;
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
    HostileInstallation b;
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
    HostileInstallation b;
    std::string file = b.plant(text);
    b.expectGood();
    bool utf16Or32 =
        text[0] == '\xFF' || text[0] == '\xFE' || text.substr(0, 3) == std::string("\0\0\xFE", 3);
    EXPECT_EQ(Exists(file), !utf16Or32);
  }
}

// ---- Many

TEST(Hostile, AMillionSectionsTakeBoundedTime) {
  HostileInstallation b;
  std::string text = "[KORComponents]\nLast = \"Last\"\n";
  for (int n = 0; n < 1000000; ++n) text += "[s" + std::to_string(n) + "]\nk=1\n";
  b.plant(text + "[Last]\nIdentifier = \"" + GText(1) + "\"\n");
  auto begin = std::chrono::steady_clock::now();
  b.expectGood([](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(1)), S_OK); }, 120000);
  std::chrono::duration<double> taken = std::chrono::steady_clock::now() - begin;
  printf("two starts with a million sections: %.1f s\n", taken.count());
}

TEST(Hostile, AHundredThousandComponentsTakeBoundedTime) {
  HostileInstallation b;
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
  HostileInstallation b;
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
    HostileInstallation b;
    std::string classes = "{" + GText(1) + "}:" + count + ":{" + GText(2) + "}";
    b.plant(Component("Many", 1, "FileName = \"Many\"\nBINDING_CLASSES = \"" + classes + "\"\n"));
    b.expectGood([&](IvltRegistrar& r) {
      bool positive = *count != '-';
      auto bound = Bound(r, vltComponentObjectExpert, G(2), positive ? S_OK : VLT_E_NO_COMPONENT);
      EXPECT_EQ(bound.size(), positive ? 1u : 0u);
    });
  }
}

// ---- Names that mean something

TEST(Hostile, ComponentsThatBearTheNamesOfTheLists) {
  for (const char* name : {"KOR", "KORComponents", "Registration", "VLRContentsSection"}) {
    HostileInstallation b;
    SCOPED_TRACE(name);
    b.plant(Component(name, 1));
    for (int start = 0; start < 2; ++start) {
      ExpectStart("ok", [](IvltRegistrar& r) {
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
  HostileInstallation b;
  b.plant(Component("vltdd", 1));
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, kVltdd), E_INVALIDARG); });
  ExpectStart([](IvltRegistrar& r) { EXPECT_EQ(Find(r, kVltdd), S_OK); });
}

// A start that notices that the file has gone erases the component, not the section of that name.
TEST(Hostile, RemovingAComponentThatBearsAListsNameLosesNoOtherComponent) {
  for (const char* name : {"KOR", "KORComponents", "Registration", "VLRContentsSection"}) {
    HostileInstallation b;
    SCOPED_TRACE(name);
    b.plant(Component(name, 1));
    ExpectStart("ok");
    b.removeBundle("Experts", "Hostile.vle");
    for (int start = 0; start < 3; ++start) {
      ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
    }
    DatabaseText db(b.database());
    EXPECT_TRUE(db.has("Good"));
    EXPECT_TRUE(db.raw("KORComponents", "Good"));
    ExpectWhole(b);
  }
}

TEST(Hostile, AFileThatBringsTheListsThemselves) {
  HostileInstallation b;
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
// It names no registration file. The component that it was planted for goes, and nothing is raised.
TEST(Hostile, ARelativePathPlantedInTheContentsGoes) {
  HostileInstallation b;
  ExpectStart("ok");
  std::string file = b.plant("[VLRContentsSection]\nx = \"relative/path\"\n");
  for (int start = 0; start < 2; ++start) {
    ExpectStart("ok", [](IvltRegistrar& r) { EXPECT_EQ(Find(r, G(kGood)), S_OK); });
    EXPECT_EQ(DatabaseText(b.database()).quoted("VLRContentsSection", "x"), "(none)");
  }
  ExpectWhole(b);
  EXPECT_TRUE(DatabaseText(b.database()).has("Good"));
}

// The name of the section that is written without a header: its items must not fall to the list of
// contents, or to any other section that happens to come before.
TEST(Hostile, TheHeaderlessSectionIsLeftOut) {
  HostileInstallation b;
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
  HostileInstallation b;
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
  HostileInstallation b;
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

}  // namespace
}  // namespace vlt::test

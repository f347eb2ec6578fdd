#include "tools/common/Arguments.h"

#include <gtest/gtest.h>

#include "tools/common/Output.h"

namespace vltctl {
namespace {

Parsed Parse(std::vector<std::string> words) {
  words.insert(words.begin(), "vltctl");
  std::vector<char*> argv;
  for (std::string& word : words) argv.push_back(word.data());
  return vltctl::Parse(static_cast<int>(argv.size()), argv.data());
}

TEST(Arguments, AreThoseOfTheTable) {
  Parsed parsed = Parse({"hook", "arm", "point", "hang=1", "fail", "--json"});
  ASSERT_EQ(parsed.kind, Parsed::Kind::Run);
  EXPECT_EQ(parsed.arguments.command().name, std::string("hook arm"));
  EXPECT_EQ(parsed.arguments.text("POINT"), "point");
  EXPECT_EQ(parsed.arguments.list("FLAG"), (std::vector<std::string>{"hang=1", "fail"}));
  EXPECT_TRUE(parsed.arguments.json());
  EXPECT_FALSE(parsed.arguments.has("--client"));
}

TEST(Arguments, NumbersAreDigits) {
  EXPECT_EQ(Parse({"settings"}).arguments.number("--index", 3), 3u);
  EXPECT_EQ(Parse({"settings", "--index", "12"}).arguments.number("--index", 3), 12u);
  for (const char* text : {"12 potatoes", "0x1", "", "4294967296", "1.5"}) {
    Parsed parsed = Parse({"settings", "--index", text});
    if (parsed.kind == Parsed::Kind::Wrong) continue;
    EXPECT_THROW(parsed.arguments.number("--index", 3), Failure) << text;
  }
}

struct WrongRow {
  std::vector<std::string> words;
  std::string what, next;
};

TEST(Arguments, WhatIsWrongSaysWhatToDo) {
  const WrongRow rows[] = {
      {{}, "no command", "see \"vltctl --help\""},
      {{"lsit"}, "no such command: lsit", "did you mean \"list\"?"},
      {{"xxxxxxxx"}, "no such command: xxxxxxxx", "see \"vltctl --help\""},
      {{"hook"}, "hook needs one more word", "see \"vltctl hook --help\""},
      {{"hook", "lits"}, "no such command: hook lits", "did you mean \"list\"?"},
      {{"settings", "--jsno"},
       "The following argument was not expected: --jsno",
       "did you mean \"--json\"?"},
      {{"list", "more"},
       "The following argument was not expected: more",
       "see \"vltctl list --help\""},
      {{"show"}, "COMPONENT is required", "see \"vltctl show --help\""},
      {{"--root", "/", "list"}, "the command comes before --root", "see \"vltctl --help\""},
      {{"--json", "list"}, "the command comes before --json", "see \"vltctl --help\""},
      {{"list", "--root"}, "--root needs a value", "see \"vltctl list --help\""},
      {{"list", "--root", ""}, "--root: is empty", "see \"vltctl list --help\""},
      {{"check", ""}, "COMPONENT: is empty", "see \"vltctl check --help\""},
      {{"lint", "a", ""}, "PATH: is empty", "see \"vltctl lint --help\""}};
  for (const WrongRow& row : rows) {
    Parsed parsed = Parse(row.words);
    EXPECT_EQ(parsed.kind, Parsed::Kind::Wrong) << row.what;
    EXPECT_EQ(parsed.whatIsWrong, row.what);
    EXPECT_EQ(parsed.next, row.next);
  }
}

TEST(Arguments, ASettingMayBeEmpty) {
  Parsed parsed = Parse({"settings", "set", "EventNameAppend3", ""});
  EXPECT_EQ(parsed.kind, Parsed::Kind::Run) << parsed.whatIsWrong;
  EXPECT_EQ(parsed.arguments.text("VALUE"), "");
}

TEST(Arguments, HelpAndVersionAreAskedForAnywhere) {
  EXPECT_EQ(Parse({"--version"}).kind, Parsed::Kind::Version);
  EXPECT_EQ(Parse({"--help"}).kind, Parsed::Kind::Help);
  EXPECT_EQ(Parse({"hook", "arm", "--help"}).helpFor, "hook arm");
  EXPECT_EQ(Parse({"hook", "-h"}).helpFor, "hook");
}

TEST(Arguments, GuidsHaveOneForm) {
  const std::string bare = "0000000a-1111-4222-8333-444444444444";
  EXPECT_TRUE(IsGuidText(bare));
  EXPECT_TRUE(IsGuidText("{" + bare + "}"));
  for (const std::string& text :
       {"{" + bare, bare + "}", bare + "0", std::string("words"), std::string("g") + bare.substr(1),
        bare.substr(1), std::string()}) {
    EXPECT_FALSE(IsGuidText(text)) << text;
  }
}

TEST(Arguments, NearestIsAMistypedWord) {
  const std::vector<std::string> words = {"list", "lint", "settings"};
  EXPECT_EQ(Nearest("SETINGS", words), "settings");
  EXPECT_EQ(Nearest("lits", words), "list");
  EXPECT_EQ(Nearest("potato", words), "");
  EXPECT_EQ(Nearest("", words), "");
}

}  // namespace
}  // namespace vltctl

#include "tools/common/Output.h"

#include <gtest/gtest.h>

#include "tests/support/ScopedLocale.h"

namespace vltctl {
namespace {

// What a command prints on standard output.
template <class Body>
std::string Printed(bool json, Body body) {
  testing::internal::CaptureStdout();
  {
    Output output("test", json);
    EXPECT_EQ(output.finish((body(output), kGood)), kGood);
  }
  return testing::internal::GetCapturedStdout();
}

TEST(Output, TextIsTextAndJsonIsOneDocument) {
  auto body = [](Output& output) {
    output.line("one\x1B");
    output.item({{"a", 1}});
    output.item({{"a", nullptr}});
  };
  EXPECT_EQ(Printed(false, body), "one\\x1B\n");
  Json document = Json::parse(Printed(true, body));
  EXPECT_EQ(document, (Json{{"schema", "vltctl/1"},
                            {"command", "test"},
                            {"items", Json::array({{{"a", 1}}, {{"a", nullptr}}})},
                            {"problems", Json::array()}}));
}

TEST(Output, ProblemsAreInTheDocumentAndOnStandardError) {
  testing::internal::CaptureStderr();
  std::string printed = Printed(true, [](Output& output) {
    output.problem({"busy", "/x", "is held", "", "wait"});
  });
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "vltctl: /x: is held; wait\n");
  EXPECT_EQ(Json::parse(printed)["problems"][0], (Json{{"code", "busy"},
                                                       {"where", "/x"},
                                                       {"what", "is held"},
                                                       {"why", nullptr},
                                                       {"next", "wait"}}));
}

TEST(Output, BytesThatAreNoTextAreReplacedInJson) {
  std::string printed = Printed(true, [](Output& output) { output.item({{"a", "x\xFF"}}); });
  EXPECT_EQ(Json::parse(printed)["items"][0]["a"], "x\xEF\xBF\xBD");
}

TEST(Output, TablesAreAlignedByWhatIsShown) {
  vlt::test::ScopedLocale locale(LC_ALL, "C.UTF-8");
  Table table({"NAME", "VALUE", "ORIGIN"});
  table.add(
      {"Gr\xC3\xB6\xC3\x9F"
       "e",
       "1", ""});
  table.add({"\xE6\x97\xA5\xE6\x9C\xAC\xE8\xAA\x9E\xE8\xAA\x9E", "2", "x"});
  EXPECT_EQ(table.text(),
            "NAME      VALUE  ORIGIN\n"
            "Gr\xC3\xB6\xC3\x9F"
            "e     1\n"
            "\xE6\x97\xA5\xE6\x9C\xAC\xE8\xAA\x9E\xE8\xAA\x9E  2      x\n");
}

}  // namespace
}  // namespace vltctl

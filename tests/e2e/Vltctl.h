#pragma once

// The command as its users start it. Every JSON document that a test reads is checked against the schema.

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "tests/e2e/JsonSchema.h"
#include "tests/support/Child.h"
#include "tests/support/TempDir.h"

namespace vlt::test {

// Exit codes of vltctl.
inline constexpr int kGood = 0, kNotFound = 1, kUsage = 2, kDataUnusable = 3, kBusy = 4,
                     kCannotWrite = 5;

inline const std::string kVltctl = std::string(VLT_TEST_BIN) + "/vltctl";

inline ProgramResult Vltctl(std::vector<std::string> arguments, const Environment& extra = {}) {
  arguments.insert(arguments.begin(), kVltctl);
  return RunProgram(arguments, extra);
}

// The document that a run has printed.
inline nlohmann::json Document(const std::string& text) {
  static const JsonSchema schema(nlohmann::json::parse(
      ReadBytes(std::string(VLT_TEST_SOURCE) + "/tools/vltctl-1.schema.json")));
  nlohmann::json document = nlohmann::json::parse(text, nullptr, false);
  EXPECT_EQ(schema.against(document), "") << text;
  if (document.is_object()) return document;
  return {{"items", nlohmann::json::array()}, {"problems", nlohmann::json::array()}};
}

struct JsonResult {
  int exitCode;
  nlohmann::json items, problems;
  std::string err;
};

inline JsonResult VltctlJson(std::vector<std::string> arguments, const Environment& extra = {}) {
  arguments.push_back("--json");
  ProgramResult result = Vltctl(arguments, extra);
  nlohmann::json document = Document(result.out);
  return {result.exitCode, document["items"], document["problems"], result.err};
}

// The item whose member has this value; null if there is none.
inline nlohmann::json ItemWith(const nlohmann::json& items, const std::string& member,
                               const nlohmann::json& value) {
  for (const nlohmann::json& item : items) {
    if (item[member] == value) return item;
  }
  return nullptr;
}

// Lines of a trace that would change something. Writing to standard output and error is allowed.
inline std::vector<std::string> Changes(const std::string& trace) {
  std::vector<std::string> found;
  std::istringstream lines(trace);
  for (std::string line; std::getline(lines, line);) {
    if (line.find(".gcda") != std::string::npos) continue;  // the coverage build's own counters
    for (const char* mark :
         {"O_CREAT", "O_WRONLY", "O_RDWR", "chmod(", "fchmod(", "fchmodat(", "unlink", "rename",
          "mkdir", "flock(", "ftruncate(", " link(", "chown(", "F_SETLK"}) {
      if (line.find(mark) != std::string::npos) found.push_back(line);
    }
  }
  return found;
}

}  // namespace vlt::test

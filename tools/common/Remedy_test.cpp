#include "tools/common/Remedy.h"

#include <gtest/gtest.h>

namespace vltctl {
namespace {

TEST(Remedy, RepeatsTheRootWhereACommandTakesIt) {
  struct Row {
    const char *root, *text, *expected;
  };
  const Row rows[] = {
      {"", "\"vltctl list\" shows all", "\"vltctl list\" shows all"},
      {"/a", "remove it", "remove it"},
      {"/a", "\"vltctl list\" shows all", "\"vltctl list --root /a\" shows all"},
      {"/a", "'vltctl scan --dry-run' lists them", "'vltctl scan --dry-run --root /a' lists them"},
      {"../a", "wait, or \"vltctl hook clear\"", "wait, or \"vltctl hook clear --root ../a\""},
      {"/a", "\"vltctl list\" and \"vltctl why\"",
       "\"vltctl list --root /a\" and \"vltctl why --root /a\""},
      // Not about that installation, no command, or no quoted one.
      {"/a", "\"vltctl list --live\" starts one", "\"vltctl list --live\" starts one"},
      {"/a", "\"vltctl hook list\" shows all", "\"vltctl hook list\" shows all"},
      {"/a", "\"vltctl nothing\" does nothing", "\"vltctl nothing\" does nothing"},
      {"/a", "vltctl list", "vltctl list"},
      {"/a", "run vltctl list", "run vltctl list"},
      {"/a", "\"vltctl list", "\"vltctl list"},
      // What a shell would take apart.
      {"/a b/$x", "\"vltctl list\"", "\"vltctl list --root /a\\ b/\\$x\""},
      {"/a\"'", "\"vltctl list\"", "\"vltctl list --root /a\\\"\\'\""},
      {"/\xC3\xA4", "\"vltctl list\"", "\"vltctl list --root /\xC3\xA4\""},
  };
  for (const Row& row : rows) EXPECT_EQ(RemedyAt(row.root, row.text), row.expected);
}

}  // namespace
}  // namespace vltctl

#pragma once

// An installation of libraries to be checked, and what "vltctl check" says of them.

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/e2e/Start.h"
#include "tests/e2e/Vltctl.h"

namespace vlt::test {

using Messages = std::vector<std::string>;

inline constexpr const char* kGoodEntry =
    "extern \"C\" int vltCreateObjectExpert() { return 0; }\n";

// Compiles the text to a shared object of this word size, without the C library's start files.
inline void Build(const std::string& file, const std::string& source,
                  const std::vector<std::string>& more = {}) {
  TempDir dir;
  WriteBytes(dir / "x.cpp", source);
  std::vector<std::string> command = {
      "c++", sizeof(void*) == 4 ? "-m32" : "-m64", "-shared", "-fPIC", "-o", file, dir / "x.cpp"};
  command.insert(command.end(), more.begin(), more.end());
  ProgramResult built = RunProgram(command);
  ASSERT_EQ(built.exitCode, 0) << built.err;
}

// An installation whose object expert number n has its library at file(name).
class Experts : public Installation {
 public:
  std::string file(const std::string& name) const { return root() + "/" + name + ".so"; }
  // Registers the library, which need not be there.
  std::string add(uint32_t n, const std::string& name) { return add(GText(n), name, file(name)); }
  std::string add(const std::string& identifier, const std::string& name,
                  const std::string& library) {
    addBundle("Experts", name + ".vle",
              "[KORComponents]\n" + name + " = \"" + name + "\"\n[" + name + "]\nIdentifier = \"" +
                  identifier + "\"\nFileName = \"" + library + "\"\n");
    return library;
  }
};

struct Found {
  int exitCode;
  bool sound;
  std::string code;  // empty for a sound one
  Messages messages, notes;
};

// What "vltctl check GUID --json" says of one component.
inline Found Check(uint32_t n) {
  JsonResult result = VltctlJson({"check", GText(n)});
  const nlohmann::json& out = result.items;
  if (out.size() != 1) {
    ADD_FAILURE() << out << result.err;
    return {result.exitCode, false, {}, {}, {}};
  }
  std::string code = out[0]["code"].is_null() ? "" : out[0]["code"];
  EXPECT_EQ(out[0]["sound"], code.empty());
  return {result.exitCode, out[0]["sound"], code, out[0]["messages"], out[0]["notes"]};
}

inline std::string AtLoad(const std::string& statement) {
  return "#include <signal.h>\n#include <stdlib.h>\n#include "
         "<unistd.h>\n__attribute__((constructor)) void start() { " +
         statement + " }\n" + kGoodEntry;
}

}  // namespace vlt::test

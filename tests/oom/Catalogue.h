#pragma once

// Every function that the library exports, and every operation of its interfaces, as a call that can be
// made again and again: what is tried with failing allocations, at each point of fault injection and with
// failing system calls.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "tests/oom/RegistrarCalls.h"
#include "tests/oom/ScalarCalls.h"
#include "tests/oom/SettingsCalls.h"
#include "tests/oom/ValueCalls.h"
#include "tests/support/Child.h"
#include "tests/support/Installation.h"
#include "tests/support/TempDir.h"

namespace vlt::test::oom {

inline std::vector<Call> AllCalls() {
  std::vector<Call> all;
  for (auto topic :
       {MemoryAndTextCalls, VocabularyCalls, DiagnosticCalls, SettingsCalls, ValueCalls, EntryCalls,
        CheckListCalls, EnumeratorCalls, RegistrarCalls, OtherInterfaceCalls}) {
    std::vector<Call> calls = topic();
    all.insert(all.end(), calls.begin(), calls.end());
  }
  return all;
}

inline void MakeInstallation(Installation& installation) {
  g_root = installation.root();
  std::string guid = "00000001-0000-0000-0000-000000000000";
  installation.addObjectExpert("a", "A", guid,
                               "{" + guid + "}:1:{0000000A-0000-0000-0000-000000000000}");
  installation.addResourceExpert("r", "R", "00000003-0000-0000-0000-000000000000", "pnp");
  // Two: the second is met where the first could not be copied.
  installation.addResourceExpert("s", "S", "00000004-0000-0000-0000-000000000000", "pnp");
  installation.addDictionary("d", "D", "00000002-0000-0000-0000-000000000000", 3, "d");
  std::filesystem::create_directories(g_root + "/Data Dictionaries/Last");
  WriteBytes(g_root + "/VLTHooks.ini", "[Hook]\nName = no such point\nHang = false\n");
}

// A source of identifiers, loaded into this process, and so into all children.
inline void LoadGuidSource() {
  static TempDir dir;
  std::string source = dir / "source.cpp", library = dir / "libZT-RPC.so";
  WriteBytes(source,
             "extern \"C\" int UuidCreate(unsigned* guid) { return guid[0] = 5, guid[1] = 6, 0; }");
  ProgramResult built = RunProgram({"c++", sizeof(void*) == 4 ? "-m32" : "-m64", "-shared", "-fPIC",
                                    "-Wl,-soname,libZT-RPC.so", "-o", library, source});
  ASSERT_EQ(built.exitCode, 0) << built.err;
  ASSERT_NE(dlopen(library.c_str(), RTLD_NOW), nullptr) << dlerror();
}

inline bool HasRegistrar() { return vltGetRegistrar(&g_registrar) >= 0 && g_registrar; }

// In a process that finds all components, with nothing set aside as damaged.
inline int FindsEverything(const std::string& root) {
  if (!HasRegistrar()) return 1;
  for (const GUID& id : {kExpert, kDictionary, kResourceExpert}) {
    Record record;
    if (g_registrar->GetComponent(id, &record) != S_OK || !record.name) return 2;
  }
  for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
    std::string name = entry.path().filename();
    if (name.find(".bad") != std::string::npos) return 3;
  }
  return 0;
}

}  // namespace vlt::test::oom

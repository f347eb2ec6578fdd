// The surface of the shared library: exactly these names, and exceptions that programs can catch.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <set>
#include <sstream>

#include "tests/e2e/Start.h"
#include "zt/fnd/Exception.h"

namespace vlt::test {
namespace {

// Functions. A new one is added here and in cmake/exports.map, and nowhere else.
const char* const kFunctions[] = {
    // memory
    "vltAlloc", "vltFree", "vltutilsFreeComponent2",
    // registrar
    "vltGetRegistrar", "vltGetRegistrar2", "vltGetNamedRegistrar", "vltGetNamedRegistrar2",
    "vltGetOldRegistrar", "vltLoadDataDictionaries", "vltLoadDataDictionaries2",
    "vltCheckComponent",
    // settings and rendezvous
    "vltGetClientSettings", "vltGetClientCacheSettings", "vltGetServerSettings",
    "vltGetServerIdentity", "vltSetServerCookie", "vltAddSvrProcessIDToJar",
    "vltGetLocalConfigurationURL", "vltIsDefaultStorage", "vltIsOfflineStorage",
    // resources and files
    "vltGetStringResource", "vltGetBinaryResource", "vltSetFileSecurity", "vltGetTraceFlags",
    // diagnostics
    "vltTestHook", "vltRefreshHook", "_ZN12vlt_vlTracer11TraceOutputEcPKcb",
    "_ZN12vlt_vlTracer12GetTraceMaskEv", "_ZN12vlt_vlTracer15TraceArgsHelperEv",
    // text case
    "vltStrupr", "vltWcsupr",
    // scalars and GUIDs
    "vltU32ToString", "vltU32FromString", "vltI32ToString", "vltI32FromString", "vltF64ToString",
    "vltF64FromString", "vltBoolToString", "vltBoolFromString", "vltCreateGuid",
    "vltDceGuidCompare", "vltGuidFromString", "vltGuidToString", "vltGuidToStructString",
    // type vocabulary
    "vltAttributeStorageFromString", "vltAttributeStorageToString", "vltAttributeTypeFromString",
    "vltAttributeTypeToString", "vltAttributeTypeToString2", "vltClientFromString",
    "vltClientToString", "vltAttributeTypeToVltTypeString", "vltAttributeTypeToLumTypeString",
    "vltAttributeTypeToLumTypeName", "vltAttributeTypeToLumDataTypeString",
    "vltAttributeTypeToExternalLumDataType", "vltAttributeTypeToInternalLumDataType",
    "vltAttributeIDExternalToInternal", "vltAttributeIDInternalToExternal",
    "vltMakeExternalAttributeID", "vltMakeInternalAttributeID", "vltIsLumBlob",
    "vltLumMakeTypedTag",
    // attribute values
    "vltGetAttributeValueAsString", "vltSetAttributeValueFromString",
    // fixed answers
    "vltUseZTRPC", "vltStandAlone"};

// Classes of zt::fnd::exception and of zt::fnd::osdep whose type information is shown.
const char* const kExceptions[] = {"9Exception",
                                   "10OutOfRange",
                                   "13BoundExceeded",
                                   "19ObjectAlreadyExists",
                                   "20NonexistentException",
                                   "16InvalidOperation",
                                   "15InvalidArgument",
                                   "21InitializationFailure",
                                   "15FileWriteFailed",
                                   "14FileReadFailed",
                                   "20DeserializationError",
                                   "14BufferOverflow",
                                   "17FileAlreadyExists",
                                   "13InvalidLocale",
                                   "15InvalidSequence",
                                   "13BadGuidString",
                                   "15UnableToConvert",
                                   "14NotImplemented",
                                   "11OutOfRange2",
                                   "14BoundExceeded2",
                                   "16InvalidArgument2",
                                   "12AccessDenied"};
const char* const kOsExceptions[] = {"11OSException", "10PosixError", "11CarbonError"};

std::set<std::string> Expected() {
  std::set<std::string> names(std::begin(kFunctions), std::end(kFunctions));
  for (const char* prefix : {"_ZTIN2zt3fnd", "_ZTSN2zt3fnd"}) {
    for (const char* name : kExceptions)
      names.insert(prefix + ("9exception" + std::string(name)) + "E");
    for (const char* name : kOsExceptions)
      names.insert(prefix + ("5osdep" + std::string(name)) + "E");
  }
  return names;
}

std::set<std::string> Exported() {
  ProgramResult result = RunProgram({"nm", "-D", "--defined-only", VLT_TEST_LIBRARY});
  EXPECT_EQ(result.exitCode, 0) << result.err;
  std::set<std::string> names;
  std::istringstream in(result.out);
  for (std::string line; std::getline(in, line);) {
    std::string address, type, name;
    std::istringstream(line) >> address >> type >> name;
    // The node of the version script itself.
    if (type == "A") continue;
    names.insert(name.substr(0, name.find('@')));
  }
  return names;
}

TEST(Exports, AreExactlyTheseNames) {
  std::set<std::string> expected = Expected(), exported = Exported();
  for (const std::string& name : exported) {
    // A sanitizer marks what it instruments.
    bool sanitizer = name.find("asan") != std::string::npos;
    EXPECT_TRUE(sanitizer || expected.count(name)) << name << " is exported";
  }
  for (const std::string& name : expected) {
    EXPECT_TRUE(exported.count(name)) << name << " is not exported";
  }
}

TEST(Exports, EveryFunctionIsFoundByName) {
  void* library = dlopen(VLT_TEST_LIBRARY, RTLD_NOW);
  ASSERT_NE(library, nullptr) << dlerror();
  for (const char* name : kFunctions) EXPECT_NE(dlsym(library, name), nullptr) << name;
  dlclose(library);
}

#if defined(_LIBCPP_VERSION)
constexpr const char* kCppRuntime[] = {"libc++.so.1", "libc++abi.so.1", "libunwind.so.1"};
#else
constexpr const char* kCppRuntime[] = {"libstdc++.so.6"};
#endif

TEST(Exports, TheLibraryNeedsTheCppRuntimeAndTheSystemOnly) {
  ProgramResult result = RunProgram({"objdump", "-p", VLT_TEST_LIBRARY});
  ASSERT_EQ(result.exitCode, 0) << result.err;
  std::istringstream in(result.out);
  std::set<std::string> allowed = {"libgcc_s.so.1",   "libm.so.6",  "libc.so.6",
                                   "libpthread.so.0", "libdl.so.2", "ld-linux-x86-64.so.2",
                                   "ld-linux.so.2"};
  allowed.insert(std::begin(kCppRuntime), std::end(kCppRuntime));
  int needed = 0;
  for (std::string key, value; in >> key;) {
    if (key == "SONAME") {
      in >> value;
      EXPECT_EQ(value, "libvltutils.so.1");
    }
    if (key != "NEEDED") continue;
    in >> value;
    ++needed;
    bool sanitizer = value.find("san.so") != std::string::npos;
    EXPECT_TRUE(sanitizer || allowed.count(value)) << value;
  }
  EXPECT_GT(needed, 1);
}

TEST_IN_CHILD(Exports, ExceptionsAreCaughtByClass) {
  Installation i;
  Installation::setDir("");
  IvltRegistrar* registrar = nullptr;
  bool caught = false;
  try {
    vltGetRegistrar(&registrar);
  } catch (const zt::fnd::exception::OutOfRange&) {
    ADD_FAILURE() << "another class";
  } catch (const zt::fnd::exception::InvalidArgument& error) {
    caught = true;
    EXPECT_STREQ(error.what(), "Invalid argument(s)");
    EXPECT_NE(error.getErrorCode(), 0u);
    EXPECT_NE(dynamic_cast<const zt::fnd::exception::Exception*>(&error), nullptr);
  }
  EXPECT_TRUE(caught);
  EXPECT_EQ(registrar, nullptr);
}

TEST_IN_CHILD(Exports, ExceptionsAreCaughtByTheirBases) {
  Installation i;
  WriteBytes(i.root() + "/Data", "in the way");
  IvltRegistrar* registrar = nullptr;
  EXPECT_THROW(vltGetRegistrar(&registrar), zt::fnd::exception::ObjectAlreadyExists);
  EXPECT_THROW(vltGetRegistrar(&registrar), zt::fnd::exception::Exception);
  EXPECT_THROW(vltGetRegistrar(&registrar), std::exception);
}

TEST(Exports, FailuresOfTheSystemCarryItsNumber) {
  Installation i;
  Child child([&] {
    // No file can be locked here: the place of the locks is a plain file.
    WriteBytes(i.root() + "/locks", "");
    setenv("ZTFNDTMPSHAREDFILEDIR", (i.root() + "/locks").c_str(), 1);
    IvltRegistrar* registrar = nullptr;
    try {
      vltGetRegistrar(&registrar);
    } catch (const zt::fnd::osdep::PosixError& error) {
      return error.whatcode() == ENOTDIR ? 0 : 2;
    } catch (const zt::fnd::exception::AccessDenied&) {
      return 0;
    }
    return 1;
  });
  EXPECT_EQ(child.wait(), 0);
}

}  // namespace
}  // namespace vlt::test

#include "source/Common/vltcmn.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <cwchar>

#include "source/Utilities/vltutils.h"
#include "tests/support/Child.h"
#include "tests/support/Modules.h"
#include "tests/support/TempDir.h"

namespace {

// Owns a text that an export returned.
std::wstring Take(wchar_t* text) {
  if (!text) return L"(null)";
  std::wstring copy = text;
  vltFree(text);
  return copy;
}

constexpr GUID kGuid = {
    0x00112233, 0x4455, 0x6677, {0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF}};
constexpr const wchar_t* kGuidText = L"{00112233-4455-6677-8899-AABBCCDDEEFF}";

bool Same(const GUID& a, const GUID& b) { return memcmp(&a, &b, sizeof a) == 0; }

TEST(vltcmnExports, AllocRefusesFromTwoGibibytesUp) {
  EXPECT_EQ(vltAlloc(0x80000000u), nullptr);
  EXPECT_EQ(vltAlloc(static_cast<size_t>(-1)), nullptr);
  void* p = vltAlloc(0x7FFFFFFF);  // The heap is asked; on a small machine it may refuse.
  vltFree(p);
  p = vltAlloc(0);
  EXPECT_NE(p, nullptr);
  vltFree(p);
  vltFree(nullptr);
}

TEST(vltcmnExports, FixedAnswers) {
  EXPECT_EQ(vltUseZTRPC(), 1);
  EXPECT_EQ(vltStandAlone(), 1);
  EXPECT_EQ(vltGetBinaryResource(), 0);
  void* p = &p;
  EXPECT_EQ(vltGetOldRegistrar(&p), E_NOTIMPL);
  EXPECT_EQ(p, nullptr);
  EXPECT_EQ(vltGetOldRegistrar(nullptr), E_POINTER);
}

TEST(vltcmnExports, FreeComponentEndsTheTextsOfItsType) {
  _vltComponent2 r;
  memset(&r, 0, sizeof r);
  r.type = vltComponentResourceExpert;
  r.name = Dup(L"n");
  r.fileName = Dup(L"f");
  r.resource.pnp = Dup(L"p");
  wchar_t* name = r.name;
  EXPECT_EQ(vltutilsFreeComponent2(r), 0);
  EXPECT_EQ(r.name, name);  // not nulled
  memset(&r, 0, sizeof r);
  EXPECT_EQ(vltutilsFreeComponent2(r), 0);
}

TEST(vltcmnNumberText, Unsigned) {
  EXPECT_EQ(Take(vltU32ToString(0)), L"0");
  EXPECT_EQ(Take(vltU32ToString(4294967295u)), L"4294967295");
  EXPECT_EQ(vltU32FromString(L"12abc"), 12u);
  EXPECT_EQ(vltU32FromString(L""), 0u);
  EXPECT_EQ(vltU32FromString(L"x1"), 0u);
  EXPECT_EQ(vltU32FromString(L" +7"), 7u);
  EXPECT_EQ(vltU32FromString(L"-1"), 0xFFFFFFFFu);
  EXPECT_EQ(vltU32FromString(nullptr), 0u);
  // Cut to 32 bits where long has 64, saturated where it has 32.
  EXPECT_EQ(vltU32FromString(L"4294967298"), sizeof(long) == 8 ? 2u : 0xFFFFFFFFu);
}

TEST(vltcmnNumberText, SignedPrintsItsPatternWhereLongHas64Bits) {
  EXPECT_EQ(Take(vltI32ToString(17)), L"17");
  EXPECT_EQ(Take(vltI32ToString(-1)), sizeof(long) == 8 ? L"4294967295" : L"-1");
  EXPECT_EQ(vltI32FromString(L"-17"), -17);
  EXPECT_EQ(vltI32FromString(L"4294967295"), sizeof(long) == 8 ? -1 : INT32_MAX);
  EXPECT_EQ(vltI32FromString(nullptr), 0);
}

TEST(vltcmnNumberText, Doubles) {
  EXPECT_EQ(Take(vltF64ToString(0.1)), L"0.1");
  EXPECT_EQ(Take(vltF64ToString(1e300)), L"1e+300");
  EXPECT_EQ(Take(vltF64ToString(-2.5)), L"-2.5");
  EXPECT_EQ(Take(vltF64ToString(1.0 / 3)), L"0.333333333333333");
  EXPECT_EQ(Take(vltF64ToString(INFINITY)), L"inf");
  EXPECT_DOUBLE_EQ(vltF64FromString(L"2.5e3x"), 2500.0);
  EXPECT_EQ(vltF64FromString(L"abc"), 0.0);
  EXPECT_EQ(vltF64FromString(nullptr), 0.0);
}

TEST(vltcmnNumberText, Booleans) {
  EXPECT_STREQ(vltBoolToString(0), L"False");
  EXPECT_STREQ(vltBoolToString(1), L"True");
  EXPECT_STREQ(vltBoolToString(-5), L"True");
  for (const wchar_t* yes : {L"True", L"T", L"YES", L"y", L"Y"}) {
    EXPECT_EQ(vltBoolFromString(yes), 1) << yes;
  }
  for (const wchar_t* no : {L"1", L"", L" true", L"yes ", L"false"}) {
    EXPECT_EQ(vltBoolFromString(no), 0) << no;
  }
  EXPECT_EQ(vltBoolFromString(nullptr), 0);
}

TEST(vltcmnGuidText, PrintsInCapitalsWithBraces) {
  EXPECT_EQ(Take(vltGuidToString(kGuid)), kGuidText);
}

TEST(vltcmnGuidText, StructTextIsAnInitialiser) {
  EXPECT_EQ(Take(vltGuidToStructString(kGuid)),
            L"{0x112233,0x4455,0x6677,{0x88,0x99,0xaa,0xbb,0xcc,0xdd,0xee,0xff}}");
  EXPECT_EQ(Take(vltGuidToStructString(GUID{})), L"{0,0,0,{0,0,0,0,0,0,0,0}}");
}

TEST(vltcmnGuidText, ReadsWithAndWithoutBraces) {
  EXPECT_TRUE(Same(vltGuidFromString(kGuidText), kGuid));
  EXPECT_TRUE(Same(vltGuidFromString(L"00112233-4455-6677-8899-aabbccddeeff"), kGuid));
}

TEST(vltcmnGuidText, BadTextReadsAsTheNullGuid) {
  const wchar_t* bad[] = {L"",
                          L"{",
                          L"00112233-4455-6677-8899-AABBCCDDEEFF0",
                          L"{00112233-4455-6677-8899-AABBCCDDEEFF",
                          L"00112233-4455-6677-8899-AABBCCDDEEFF}",
                          L"00112233-4455-6677-8899-AABBCCDDEE{F",
                          L"0011223g-4455-6677-8899-AABBCCDDEEFF",
                          nullptr};
  for (const wchar_t* text : bad) EXPECT_TRUE(Same(vltGuidFromString(text), GUID{}));
  GUID out = kGuid;
  EXPECT_EQ(vltCLSIDFromString(L"bad", &out), 1);
  EXPECT_TRUE(Same(out, GUID{}));
  EXPECT_EQ(vltCLSIDFromString(kGuidText, &out), 0);
  EXPECT_TRUE(Same(out, kGuid));
}

TEST(vltcmnGuidText, StringFromClsidNeedsItsPointers) {
  wchar_t* text = nullptr;
  EXPECT_EQ(vltStringFromCLSID(nullptr, &text), E_POINTER);
  EXPECT_EQ(vltStringFromCLSID(&kGuid, nullptr), E_POINTER);
  EXPECT_EQ(vltStringFromCLSID(&kGuid, &text), S_OK);
  EXPECT_EQ(Take(text), kGuidText);
}

TEST(vltcmnGuidOrder, ComparesFieldsAsNumbers) {
  struct Row {
    GUID a, b;
    int order;
  };
  const Row rows[] = {
      {kGuid, kGuid, 0},
      {{0x100, 0, 0, {}}, {0x200, 0, 0, {}}, -1},
      {{0x200, 0, 0, {}}, {0x1FF, 0, 0, {}}, 1},
      {{0xFFFFFFFF, 0, 0, {}}, {1, 0, 0, {}}, 1},
      {{1, 2, 0, {}}, {1, 0xFFFF, 0, {}}, -1},
      {{1, 2, 0x100, {}}, {1, 2, 0xFF, {}}, 1},
      {{1, 2, 3, {0, 0, 0, 0, 0, 0, 0, 1}}, {1, 2, 3, {0, 0, 0, 0, 0, 0, 0, 0xFF}}, -1},
      {{1, 2, 3, {0x80}}, {1, 2, 3, {0x7F}}, 1}};
  for (const Row& row : rows) {
    EXPECT_EQ(vltDceGuidCompare(row.a, row.b), row.order);
    EXPECT_EQ(vltDceGuidCompare(row.b, row.a), -row.order);
  }
}

TEST(vltcmnCreateGuid, WithoutItsLibraryFailsEachTimeAndLeavesTheOutput) {
  GUID out = kGuid;
  EXPECT_EQ(vltCreateGuid(&out), VLT_E_UUID_LIBRARY);
  EXPECT_EQ(vltCreateGuid(&out), VLT_E_UUID_LIBRARY);
  EXPECT_TRUE(Same(out, kGuid));
}

// Builds libZT-RPC.so with this source where the loader finds it, and asks once in a child.
int CreateWith(const std::string& source) {
  vlt::test::TempDir dir;
  vlt::test::WriteBytes(dir / "rpc.cpp", source);
  std::vector<std::string> command = {
      "g++",          "-shared", "-fPIC", "-Wl,-soname,libZT-RPC.so", "-o", dir / "libZT-RPC.so",
      dir / "rpc.cpp"};
  if (sizeof(void*) == 4) command.push_back("-m32");
  auto built = vlt::test::RunProgram(command);
  EXPECT_EQ(built.exitCode, 0) << built.err;
  return vlt::test::Child([&] {
           if (!vlt::test::LoadForItsName(dir / "libZT-RPC.so")) return 50;
           GUID out = {};
           HRESULT result = vltCreateGuid(&out);
           if (result == S_OK) return vltCreateGuid(&out) == S_OK && out.Data1 == 7 ? 0 : 51;
           return result == E_FAIL ? 1 : result == VLT_E_UUID_ENTRY ? 2 : 3;
         })
      .wait();
}

TEST(vltcmnCreateGuid, ComesFromTheLibrarysEntry) {
  EXPECT_EQ(CreateWith("extern \"C\" int UuidCreate(unsigned* p) { p[0] = 7; return 0; }"), 0);
}

TEST(vltcmnCreateGuid, ReportsARefusalAndAMissingEntry) {
  EXPECT_EQ(CreateWith("extern \"C\" int UuidCreate(unsigned*) { return 5; }"), 1);
  EXPECT_EQ(CreateWith("extern \"C\" int Other(unsigned*) { return 0; }"), 2);
}

TEST(vltcmnTextCopy, DuplicatesAndNeedsItsPointers) {
  for (auto duplicate : {vltDuplicateString, vltDuplicateString2}) {
    wchar_t* out = nullptr;
    EXPECT_EQ(duplicate(nullptr, &out), E_POINTER);
    EXPECT_EQ(duplicate(L"a", nullptr), E_POINTER);
    EXPECT_EQ(duplicate(L"text", &out), S_OK);
    EXPECT_EQ(Take(out), L"text");
  }
  EXPECT_EQ(Take(Dup("narrow")), L"narrow");
  EXPECT_EQ(Dup(static_cast<const char*>(nullptr)), nullptr);
  EXPECT_EQ(Dup(static_cast<const wchar_t*>(nullptr)), nullptr);
}

// A vltAlloc text of `capacity` characters.
wchar_t* Buffer(const wchar_t* text, size_t capacity) {
  auto* buffer = static_cast<wchar_t*>(vltAlloc(capacity * sizeof(wchar_t)));
  wcscpy(buffer, text);
  return buffer;
}

TEST(vltcmnTextAppend, GrowsBySteps) {
  struct Row {
    size_t capacity;
    const wchar_t *text, *tail;
    size_t expected;
  };
  const std::wstring longTail(360, L'x');
  const Row rows[] = {{10, L"123456789", L"0", 370},  // needed 11
                      {12, L"123456789", L"0", 12},   // fits
                      {11, L"123456789", L"0", 371},  // needed equals the capacity
                      {10, L"123456789", longTail.c_str(), 730},
                      {10, L"", L"", 10}};
  for (const Row& row : rows) {
    wchar_t* buffer = Buffer(row.text, row.capacity);
    size_t capacity = row.capacity;
    EXPECT_EQ(vltAppendString2(&buffer, row.tail, &capacity), S_OK);
    EXPECT_EQ(capacity, row.expected);
    EXPECT_EQ(Take(buffer), std::wstring(row.text) + row.tail);
  }
}

TEST(vltcmnTextAppend, TakesItsOwnTextAsTail) {
  size_t capacity = 4;
  wchar_t* buffer = Buffer(L"abc", capacity);
  EXPECT_EQ(vltAppendString2(&buffer, buffer, &capacity), S_OK);
  EXPECT_EQ(Take(buffer), L"abcabc");
}

TEST(vltcmnTextAppend, NeedsItsPointers) {
  size_t capacity = 4;
  wchar_t* null = nullptr;
  wchar_t* buffer = Buffer(L"a", capacity);
  EXPECT_EQ(vltAppendString2(nullptr, L"b", &capacity), E_POINTER);
  EXPECT_EQ(vltAppendString2(&null, L"b", &capacity), E_POINTER);
  EXPECT_EQ(vltAppendString2(&buffer, nullptr, &capacity), E_POINTER);
  EXPECT_EQ(vltAppendString2(&buffer, L"b", nullptr), E_POINTER);
  EXPECT_EQ(Take(buffer), L"a");
}

TEST(vltcmnTextCase, UpperCasesInPlace) {
  char narrow[] = "aB1z";
  EXPECT_EQ(vltStrupr(narrow), 0);
  EXPECT_STREQ(narrow, "AB1Z");
  wchar_t wide[] = L"aB\u00df\u0161z";
  EXPECT_EQ(vltWcsupr(wide), 0);
  EXPECT_STREQ(wide, L"AB\u00df\u0161Z");
  char empty[] = "";
  wchar_t wideEmpty[] = L"";
  EXPECT_EQ(vltStrupr(empty), 1);
  EXPECT_EQ(vltStrupr(nullptr), 1);
  EXPECT_EQ(vltWcsupr(wideEmpty), 1);
  EXPECT_EQ(vltWcsupr(nullptr), 1);
}

}  // namespace

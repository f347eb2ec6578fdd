#include "source/Common/vltBindingClasses.h"

#include <gtest/gtest.h>
#include <malloc.h>

#include "source/Common/vltcmn.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/InChild.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/RegistrarClient.h"

namespace vlt::test {
namespace {

using zt::fnd::String;
using zt::fnd::Vector;

std::string B(uint32_t n) { return "{" + GText(n) + "}"; }

CvltBindingClasses Parse(const std::string& text) {
  return CvltBindingClasses(String(text.c_str()));
}

std::vector<GUID> Classes(const CvltBindingClasses& table, GUID component) {
  Vector<GUID> classes;
  classes.push_back(G(999));  // what is there for an unknown component stays
  table.GetBindingClassesForComponent(component, classes);
  return std::vector<GUID>(classes.begin(), classes.end());
}

std::vector<GUID> Components(const CvltBindingClasses& table) {
  Vector<GUID> components = table.GetComponentVector();
  return std::vector<GUID>(components.begin(), components.end());
}

struct Row {
  std::string text;
  std::vector<std::pair<uint32_t, std::vector<uint32_t>>> table;  // in GUID order; 0 is no GUID
};

GUID N(uint32_t n) { return n ? G(n) : GUID_NULL; }

void ExpectTable(const Row& row) {
  CvltBindingClasses table = Parse(row.text);
  std::vector<GUID> components;
  for (const auto& [component, classes] : row.table) {
    components.push_back(N(component));
    std::vector<GUID> wanted;
    for (uint32_t c : classes) wanted.push_back(N(c));
    EXPECT_TRUE(Classes(table, N(component)) == wanted) << row.text;
  }
  EXPECT_TRUE(Components(table) == components) << row.text;
}

TEST(vltBindingClasses, TextsAndTheirTables) {
  const std::string p = B(1), q = B(2), r = B(3), s = B(4);
  const Row rows[] = {{"", {}},
                      {p, {}},
                      {p + ":", {}},
                      {p + ":0", {{1, {}}}},
                      {p + ":0:", {{1, {}}}},
                      {p + ":1:" + q, {{1, {2}}}},
                      {p + ":1:" + q + ":", {{1, {2}}}},
                      {p + ":2:" + q + ":" + r + ":" + s + ":0", {{1, {2, 3}}, {4, {}}}},
                      {s + ":1:" + q + ":" + p + ":1:" + r, {{1, {3}}, {4, {2}}}},
                      // The later entry of one component counts.
                      {p + ":1:" + q + ":" + p + ":1:" + r, {{1, {3}}}},
                      {p + ":1:" + q + ":" + p + ":0", {{1, {}}}},
                      // Braces may be missing, and a class may be named twice.
                      {GText(1) + ":2:" + GText(2) + ":" + GText(2), {{1, {2, 2}}}},
                      // Counts as wcstol reads them.
                      {p + ":2x:" + q + ":" + r, {{1, {2, 3}}}},
                      {p + ": 1:" + q, {{1, {2}}}},
                      {p + ":-1:" + q + ":0", {{1, {}}, {2, {}}}},
                      {p + ":x:" + q + ":0", {{1, {}}, {2, {}}}},
                      {p + "::" + q + ":0", {{1, {}}, {2, {}}}},
                      // What is no GUID is the null one.
                      {"words:1:" + q, {{0, {2}}}},
                      {p + ":1:words", {{1, {0}}}},
                      {p + ":1:", {{1, {0}}}},
                      {":0", {{0, {}}}},
                      // Fewer classes than the count says.
                      {p + ":5:" + q + ":" + r, {{1, {2, 3}}}},
                      {p + ":2000000000:" + q, {{1, {2}}}},
                      {p + ":-99999999999999999999:" + q + ":0", {{1, {}}, {2, {}}}},
                      {p + ":99999999999999999999:" + q, {{1, {2}}}}};
  for (const Row& row : rows) ExpectTable(row);
}

TEST(vltBindingClasses, ComponentsComeInTheOrderOfTheirNumbers) {
  // By the fields as numbers: byte order would put the second one first.
  GUID low = {0x00000001, 0, 0, {}}, high = {0x00000100, 0, 0, {}};
  GUID byData4 = {0x00000001, 0, 0, {0x80}};
  String text = vltGUIDToString(high) + L":0:" + vltGUIDToString(byData4) + L":0:" +
                vltGUIDToString(low) + L":0";
  std::vector<GUID> found = Components(CvltBindingClasses(text));
  EXPECT_TRUE((found == std::vector<GUID>{low, byData4, high}));
}

TEST(vltBindingClasses, AnUnknownComponentLeavesTheVector) {
  std::vector<GUID> classes = Classes(Parse(B(1) + ":1:" + B(2)), G(3));
  ASSERT_EQ(classes.size(), 1u);
  EXPECT_TRUE(classes[0] == G(999));
}

TEST(vltBindingClasses, NoDictionaryManagesClasses) {
  Vector<GUID> components;
  components.push_back(G(1));
  EXPECT_EQ(Parse(B(1) + ":1:" + B(2)).GetDictionaryManagedClasses(components).size(), 0u);
}

TEST_IN_CHILD(vltBindingClasses, ALongTextTakesTimeInProportion) {
  std::string text = B(1) + ":100000";
  for (int n = 0; n < 100000; ++n) text += ":" + B(2);
  EXPECT_EQ(Classes(Parse(text), G(1)).size(), 100000u);
}

// ---- The map

std::vector<std::pair<GUID, GUID>> Pairs(const BindingClassesMap& map) {
  return std::vector<std::pair<GUID, GUID>>(map.begin(), map.end());
}

TEST(vltBindingClasses, EntersEveryClassOfTheRecordsComponent) {
  CvltBindingClasses table = Parse(B(1) + ":2:" + B(8) + ":" + B(7) + ":" + B(2) + ":1:" + B(8));
  BindingClassesMap map;
  Offered one(vltComponentObjectExpert, L"1", G(1), L"/f");
  Offered stranger(vltComponentObjectExpert, L"3", G(3), L"/f");
  vltAddBindingClasses(&one.value, table, &map);
  vltAddBindingClasses(&stranger.value, table, &map);
  EXPECT_EQ(Pairs(map).size(), 2u);
  EXPECT_TRUE(map.find(G(7))->second == G(1));
  EXPECT_TRUE(map.find(G(8))->second == G(1));
}

TEST(vltBindingClasses, OutOfMemoryEntersNothing) {
  CvltBindingClasses table = Parse(B(1) + ":3:" + B(7) + ":" + B(8) + ":" + B(9));
  Offered one(vltComponentObjectExpert, L"1", G(1), L"/f");
  int failures = 0;
  for (int nth = 1; nth < 100; ++nth) {
    BindingClassesMap map;
    map.emplace(G(8), G(5));
    bool happened;
    {
      FailAllocation fail(nth);
      vltAddBindingClasses(&one.value, table, &map);
      happened = fail.happened();
    }
    if (!happened) {
      EXPECT_EQ(map.size(), 4u);
      break;
    }
    ++failures;
    ASSERT_EQ(map.size(), 1u) << nth;
    EXPECT_TRUE(map.begin()->second == G(5));
  }
  EXPECT_GE(failures, 3);
}

// Blocks of this size come from the system one by one, so that a limit is felt at once.
constexpr int kLargeBlock = 65536;
constexpr unsigned kMany = 200000;

// The expectations need memory of their own.
void LiftMemoryLimit() {
  rlimit limit;
  getrlimit(RLIMIT_AS, &limit);
  limit.rlim_cur = limit.rlim_max;
  setrlimit(RLIMIT_AS, &limit);
}

TEST_IN_CHILD(vltBindingClasses, OutOfMemoryGivesAnEmptyComponentVector) {
  if (!kCanLimitMemory) GTEST_SKIP() << "a sanitizer has the address space";
  mallopt(M_MMAP_THRESHOLD, kLargeBlock);
  std::string text;
  for (unsigned n = 0; n < kMany; ++n) text += B(n) + ":0:";
  CvltBindingClasses table = Parse(text);
  EXPECT_EQ(table.GetComponentVector().size(), kMany);
  LimitMemoryTo(kLargeBlock);
  UseUpBlocksOf(kLargeBlock);
  unsigned found = table.GetComponentVector().size();
  LiftMemoryLimit();
  EXPECT_EQ(found, 0u);
}

TEST(vltBindingClasses, AnswersInTheOrderOfEntry) {
  BindingClassesMap map;
  for (uint32_t n : {5u, 3u, 4u}) map.emplace(G(8), G(n));
  map.emplace(G(9), G(1));
  unsigned count = 0;
  GUID* components = nullptr;
  ASSERT_EQ(vltGetComponentsForBindingClass(G(8), &count, &map, &components), S_OK);
  TaskMem<GUID> owned(components);
  ASSERT_EQ(count, 3u);
  EXPECT_TRUE(components[0] == G(5) && components[1] == G(3) && components[2] == G(4));
}

TEST(vltBindingClasses, NobodyServesAnUnknownClassAndNothingIsTouched) {
  BindingClassesMap map;
  map.emplace(G(8), G(1));
  unsigned count = 7;
  GUID mark;
  GUID* components = &mark;
  // Before, between and after the classes of the map.
  for (uint32_t n : {1u, 9u}) {
    EXPECT_EQ(vltGetComponentsForBindingClass(G(n), &count, &map, &components), VLT_E_NO_COMPONENT);
  }
  BindingClassesMap empty;
  EXPECT_EQ(vltGetComponentsForBindingClass(G(8), &count, &empty, &components), VLT_E_NO_COMPONENT);
  EXPECT_EQ(count, 7u);
  EXPECT_EQ(components, &mark);
  EXPECT_EQ(static_cast<uint32_t>(VLT_E_NO_COMPONENT), 0x80040301u);
}

TEST_IN_CHILD(vltBindingClasses, OutOfMemoryIsAResultOfTheQuery) {
  if (!kCanLimitMemory) GTEST_SKIP() << "a sanitizer has the address space";
  mallopt(M_MMAP_THRESHOLD, kLargeBlock);
  BindingClassesMap map;
  for (unsigned n = 0; n < kMany; ++n) map.emplace(G(8), G(n));
  unsigned count = 7;
  GUID* components = nullptr;
  LimitMemoryTo(kLargeBlock);
  UseUpBlocksOf(kLargeBlock);
  HRESULT result = vltGetComponentsForBindingClass(G(8), &count, &map, &components);
  LiftMemoryLimit();
  EXPECT_EQ(result, E_OUTOFMEMORY);
  EXPECT_EQ(count, 7u);
  EXPECT_EQ(components, nullptr);
}

}  // namespace
}  // namespace vlt::test

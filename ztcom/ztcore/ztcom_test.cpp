#include "ztcom/ztcore/ztcom.h"

#include <gtest/gtest.h>

#include <climits>
#include <string>
#include <thread>
#include <vector>

#include "ztcom/ztcore/ztmemmgr.h"
#include "ztcom/ztcore/zttrace.h"

namespace {

constexpr GUID kThing = {1, 2, 3, {4, 5, 6, 7, 8, 9, 10, 11}};
constexpr GUID kSecond = {1, 2, 3, {4, 5, 6, 7, 8, 9, 10, 12}};
constexpr GUID kAsked = {1, 2, 3, {4, 5, 6, 7, 8, 9, 10, 13}};
constexpr GUID kUnknown = {0xFFFFFFFF, 0, 0, {}};

struct IThing : IUnknown {
  virtual int Value() = 0;

 protected:
  ~IThing() = default;
};

int g_alive = 0;
bool g_queryWhileDying = false;
HRESULT g_rowResult = S_OK;
std::vector<uintptr_t> g_arguments;

class Thing : public IThing, public CZTComObjectRootEx<CZTComMultiThreadModelNoCS> {
 public:
  Thing() { ++g_alive; }
  int Value() override { return 42; }
  static HRESULT Row(void* object, const GUID&, void** out, uintptr_t argument) {
    g_arguments.push_back(argument);
    if (g_rowResult == S_OK) {
      static_cast<IUnknown*>(static_cast<Thing*>(object))->AddRef();
      *out = object;
    }
    return g_rowResult;
  }
  static const _ZTCOM_INTMAP_ENTRY* _GetEntries() {
    static const _ZTCOM_INTMAP_ENTRY rows[] = {{&kThing, 0, kZtComSimpleEntry},
                                               {&kAsked, 7, reinterpret_cast<uintptr_t>(&Row)},
                                               {nullptr, 8, reinterpret_cast<uintptr_t>(&Row)},
                                               {&kSecond, 0, kZtComSimpleEntry},
                                               {nullptr, 0, 0}};
    return rows;
  }

 protected:
  ~Thing() {
    --g_alive;
    if (g_queryWhileDying) {
      ++m_refCount;  // What a QueryInterface would do,
      --m_refCount;  // and the Release after it; at 0 it would delete again.
      EXPECT_EQ(m_refCount, 1);
    }
  }
};

class ztcomObject : public testing::Test {
 protected:
  void SetUp() override {
    g_alive = 0;
    g_rowResult = E_FAIL;
    g_arguments.clear();
  }
};

TEST_F(ztcomObject, StartsAtZeroFromCreateInstanceAndAtOneFromNew) {
  CZTComObject<Thing>* object = nullptr;
  ASSERT_EQ(CZTComObject<Thing>::CreateInstance(&object), S_OK);
  EXPECT_EQ(object->m_refCount, 0);
  EXPECT_EQ(object->AddRef(), 1u);
  EXPECT_EQ(object->Release(), 0u);
  EXPECT_EQ(g_alive, 0);
  object = ZtATLNew<Thing>();
  EXPECT_EQ(object->m_refCount, 1);
  object->Release();
}

TEST_F(ztcomObject, UnknownAndFirstInterfaceAreOnePointer) {
  CZTComObject<Thing>* object = ZtATLNew<Thing>();
  void *unknown = nullptr, *thing = nullptr;
  EXPECT_EQ(object->QueryInterface(IID_IUnknown, &unknown), S_OK);
  EXPECT_EQ(object->m_refCount, 2);
  EXPECT_EQ(object->QueryInterface(kThing, &thing), S_OK);
  EXPECT_EQ(unknown, thing);
  EXPECT_EQ(object->m_refCount, 3);
  GUID otherOrder = {0, 0, 0, {0, 0xC0, 0, 0, 0, 0, 0, 0x46}};
  EXPECT_EQ(object->QueryInterface(otherOrder, &unknown), S_OK);
  for (int i = 0; i < 4; ++i) object->Release();
  EXPECT_EQ(g_alive, 0);
}

TEST_F(ztcomObject, UnknownIdNullsTheOutPointer) {
  CZTComObject<Thing>* object = ZtATLNew<Thing>();
  void* out = object;
  EXPECT_EQ(object->QueryInterface(kUnknown, &out), E_NOINTERFACE);
  EXPECT_EQ(out, nullptr);
  object->Release();
}

TEST_F(ztcomObject, RowFunctionsDecideByTheirResult) {
  CZTComObject<Thing>* object = ZtATLNew<Thing>();
  void* out = nullptr;
  g_rowResult =
      E_FAIL;  // Refused by a row with an id: the end. By a blind row: the search goes on.
  EXPECT_EQ(object->QueryInterface(kAsked, &out), E_FAIL);
  EXPECT_EQ(g_arguments, std::vector<uintptr_t>{7});
  EXPECT_EQ(object->QueryInterface(kSecond, &out), S_OK);
  object->Release();
  g_arguments.clear();
  g_rowResult = S_FALSE;  // Neither a yes nor a no.
  EXPECT_EQ(object->QueryInterface(kAsked, &out), E_NOINTERFACE);
  EXPECT_EQ(g_arguments, (std::vector<uintptr_t>{7, 8}));
  g_rowResult = S_OK;
  EXPECT_EQ(object->QueryInterface(kAsked, &out), S_OK);
  object->Release();
  object->Release();
}

TEST_F(ztcomObject, AReferenceTakenWhileDyingDoesNotDeleteTwice) {
  g_queryWhileDying = true;
  ZtATLNew<Thing>()->Release();
  EXPECT_EQ(g_alive, 0);
  g_queryWhileDying = false;
}

using ztcomObjectDeathTest = ztcomObject;

TEST_F(ztcomObjectDeathTest, BrokenContractsAbort) {
  CZTComObject<Thing>* object = nullptr;
  CZTComObject<Thing>::CreateInstance(&object);
  EXPECT_EXIT(object->Release(), testing::KilledBySignal(SIGABRT), "");
  EXPECT_EXIT((object->m_refCount = -1, object->AddRef()), testing::KilledBySignal(SIGABRT), "");
  EXPECT_EXIT(object->QueryInterface(kThing, nullptr), testing::KilledBySignal(SIGABRT), "");
  EXPECT_EXIT(CZTComObject<Thing>::CreateInstance(nullptr), testing::KilledBySignal(SIGABRT), "");
  void* out;
  const _ZTCOM_INTMAP_ENTRY noFirst[] = {{nullptr, 0, 0}};
  EXPECT_EXIT(ZTComInternalQueryInterface(object, noFirst, kThing, &out),
              testing::KilledBySignal(SIGABRT), "");
  const _ZTCOM_INTMAP_ENTRY blind[] = {{&kThing, 0, 1}, {nullptr, 0, 1}, {nullptr, 0, 0}};
  EXPECT_EXIT(ZTComInternalQueryInterface(object, blind, kUnknown, &out),
              testing::KilledBySignal(SIGABRT), "");
  object->AddRef();
  object->Release();
}

TEST_F(ztcomObject, TryQueryInterfaceGivesAReferenceOrNull) {
  CZTComObject<Thing>* object = ZtATLNew<Thing>();
  EXPECT_EQ((ZtTryQueryInterface<IThing, IThing>(kThing, nullptr)), nullptr);
  EXPECT_EQ((ZtTryQueryInterface<IThing>(kUnknown, static_cast<IThing*>(object))), nullptr);
  IThing* thing = ZtTryQueryInterface<IThing>(kThing, static_cast<IThing*>(object));
  ASSERT_NE(thing, nullptr);
  EXPECT_EQ(thing->Value(), 42);
  thing->Release();
  object->Release();
  EXPECT_EQ(ZtAddRef<IThing>(nullptr), nullptr);
}

TEST_F(ztcomObject, PointerHoldsOneReferenceAndLeavesEqualObjectsAlone) {
  CZTComObject<Thing>* object = ZtATLNew<Thing>();
  {
    CztComPtr<IThing> held(object);
    EXPECT_EQ(object->m_refCount, 2);
    held = static_cast<IThing*>(object);
    EXPECT_EQ(object->m_refCount, 2);
    CztComPtr<IThing> copy(held);
    EXPECT_EQ(object->m_refCount, 3);
    CZTComObject<Thing>* other = ZtATLNew<Thing>();
    copy = static_cast<IThing*>(other);
    EXPECT_EQ(object->m_refCount, 2);
    EXPECT_EQ(other->m_refCount, 2);
    other->Release();
  }
  EXPECT_EQ(object->m_refCount, 1);
  object->Release();
  EXPECT_EQ(g_alive, 0);
}

TEST_F(ztcomObject, CountsFromManyThreadsAddUp) {
  CZTComObject<Thing>* object = ZtATLNew<Thing>();
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([object] {
      for (int i = 0; i < 10000; ++i) object->AddRef();
      for (int i = 0; i < 10000; ++i) object->Release();
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(object->m_refCount, 1);
  object->Release();
}

TEST(ztcomResult, MapsNegativeResults) {
  EXPECT_EQ(HResultFromZTResult(-5), static_cast<HRESULT>(0x800A0005));
  EXPECT_EQ(HResultFromZTResult(7), 0);
  EXPECT_EQ(HResultFromZTResult(0), 0);
  EXPECT_EQ(HResultFromZTResult(INT_MIN), static_cast<HRESULT>(0x800A0000));
}

TEST(ztcomMutex, NestsOnlyForItsOwnerWhileHeld) {
  CZTMutex mutex;
  EXPECT_FALSE(mutex.IsNesting());
  mutex.Lock();
  EXPECT_TRUE(mutex.IsNesting());
  bool elsewhere = true;
  std::thread([&] { elsewhere = mutex.IsNesting(); }).join();
  EXPECT_FALSE(elsewhere);
  mutex.Unlock();
  EXPECT_FALSE(mutex.IsNesting());
}

TEST(ztcomMutex, InterlockedReturnsTheNewValue) {
  int counter = 5;
  EXPECT_EQ(ZTInterlockedInc(&counter), 6);
  EXPECT_EQ(ZTInterlockedDec(&counter), 5);
  EXPECT_TRUE(pthread_equal(ZTGetThreadId(), pthread_self()));
}

struct Sink final : IZTDebugOutputStream {
  void Write(const char* text) override {
    got = text;
    if (nest) ZTTrace("nested");
  }
  std::string got;
  bool nest = false;
};

TEST(ztcomTrace, FormatsForTheSinkAndCuts) {
  ZTTrace("nobody %d", 1);
  Sink sink;
  g_pZTDebugOutputStream = &sink;
  ZTTrace("%s-%d", "a", 1);
  EXPECT_EQ(sink.got, "a-1");
  ZTTrace("%s", std::string(3000, 'x').c_str());
  EXPECT_EQ(sink.got, std::string(1023, 'x'));
  g_pZTDebugOutputStream = nullptr;
}

TEST(ztcomTraceDeathTest, ANestedTraceAborts) {
  Sink sink;
  sink.nest = true;
  g_pZTDebugOutputStream = &sink;
  EXPECT_EXIT(ZTTrace("outer"), testing::KilledBySignal(SIGABRT), "");
  g_pZTDebugOutputStream = nullptr;
}

TEST(ztcomMemory, SystemStringsCountTheirCharacters) {
  wchar_t* text = ZtSysAllocString(L"abc");
  ASSERT_NE(text, nullptr);
  EXPECT_STREQ(text, L"abc");
  EXPECT_EQ(reinterpret_cast<uint32_t*>(text)[-1], 3u);
  ZtSysFreeString(text);
  EXPECT_EQ(ZtSysAllocString(nullptr), nullptr);
  wchar_t* null = nullptr;
  ZtSysFreeString(null);
  void* block = ZtTaskMemAlloc(10);
  EXPECT_NE(block, nullptr);
  ZtTaskMemFree(block);
  ZtTaskMemFree(nullptr);
}

}  // namespace

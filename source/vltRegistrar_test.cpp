#include "source/vltRegistrar.h"

#include <gtest/gtest.h>
#include <string.h>
#include <wchar.h>

#include <atomic>
#include <thread>
#include <vector>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/Sanitizer.h"
#include "tests/support/TempDir.h"
#include "ztcom/ztcore/ztcom.h"

namespace {

namespace heap = vlt::test::heap;

// The base class with what it leaves open.
class TestRegistrar : public CvltRegistrar {
 public:
  HRESULT Scan() override {
    ++scans;
    return scanResult;
  }
  HRESULT GetSnapshotPath(wchar_t**) override { return E_NOTIMPL; }
  HRESULT SetSnapshotPath(const wchar_t*) override { return E_NOTIMPL; }
  size_t count() { return ComponentMap::Hold(components())->size(); }

  std::atomic<int> scans{0};
  HRESULT scanResult = S_OK;
};

GUID Id(uint32_t n) { return {n, 0, 0, {}}; }

// Registers a component that owns nothing of the caller's.
HRESULT Register(CvltRegistrar& registrar, uint32_t n, _vltComponentType type,
                 const wchar_t* name = L"name", const wchar_t* pnp = L"") {
  std::wstring text = name, file = L"/file", pnpText = pnp;
  _vltComponent2 r;
  memset(&r, 0, sizeof r);
  r.size = sizeof r;
  r.type = type;
  r.name = text.data();
  r.identifier = Id(n);
  r.fileName = file.data();
  if (type == vltComponentResourceExpert) r.resource.pnp = pnpText.data();
  return registrar.RegisterComponent(&r);
}

class vltRegistrar : public testing::Test {
 protected:
  vltRegistrar() : registrar(new TestRegistrar) { registrar->AddRef(); }
  ~vltRegistrar() override { registrar->Release(); }

  TestRegistrar* registrar;
};

TEST_F(vltRegistrar, WhatASubclassDidNotReplaceIsNotImplemented) {
  wchar_t* text = nullptr;
  unsigned number = 7;
  EXPECT_EQ(registrar->GetConfigurationPath(&text), E_NOTIMPL);
  EXPECT_EQ(registrar->SetConfigurationPath(L"x"), E_NOTIMPL);
  EXPECT_EQ(registrar->GetSDKPath(&text), E_NOTIMPL);
  EXPECT_EQ(registrar->SetSDKPath(L"x"), E_NOTIMPL);
  EXPECT_EQ(registrar->GetSchemaVersion(&number), E_NOTIMPL);
  EXPECT_EQ(registrar->SetSchemaVersion(1), E_NOTIMPL);
  EXPECT_EQ(registrar->GetStorageServerCacheSize(&number), E_NOTIMPL);
  EXPECT_EQ(registrar->SetStorageServerCacheSize(1), E_NOTIMPL);
  EXPECT_EQ(registrar->GetStorageClientCacheSize(&number), E_NOTIMPL);
  EXPECT_EQ(registrar->SetStorageClientCacheSize(1), E_NOTIMPL);
  EXPECT_EQ(number, 7u);
}

TEST_F(vltRegistrar, AnswersToItsInterfaces) {
  void* out = nullptr;
  for (const GUID& iid : {IID_IUnknown, IID_IvltRegistrar, IID_IvltRegistrar2}) {
    EXPECT_EQ(registrar->QueryInterface(iid, &out), S_OK);
    EXPECT_EQ(out, static_cast<IvltRegistrar2*>(registrar));
    EXPECT_EQ(registrar->Release(), 1u);
  }
  EXPECT_EQ(registrar->QueryInterface(IID_IEnumString, &out), E_NOINTERFACE);
  EXPECT_EQ(out, nullptr);
  EXPECT_EQ(registrar->QueryInterface(IID_IUnknown, nullptr), E_POINTER);
}

TEST_F(vltRegistrar, RegisterChecksItsRecord) {
  _vltComponent2 r;
  memset(&r, 0, sizeof r);
  wchar_t text[] = L"x";
  EXPECT_EQ(registrar->RegisterComponent(nullptr), E_POINTER);
  r.identifier = Id(1);
  r.fileName = text;
  EXPECT_EQ(registrar->RegisterComponent(&r), E_POINTER);
  r.name = text;
  r.fileName = nullptr;
  EXPECT_EQ(registrar->RegisterComponent(&r), E_POINTER);
  r.fileName = text;
  r.identifier = GUID_NULL;
  EXPECT_EQ(registrar->RegisterComponent(&r), E_POINTER);
  EXPECT_EQ(registrar->count(), 0u);
  EXPECT_EQ(registrar->scans, 0);
}

TEST_F(vltRegistrar, ASecondComponentOfOneIdentifierReplacesTheFirst) {
  EXPECT_EQ(Register(*registrar, 1, vltComponentObjectExpert, L"first"), S_OK);
  EXPECT_EQ(Register(*registrar, 1, vltComponentUIProvider, L"second"), S_OK);
  EXPECT_EQ(registrar->count(), 1u);
  _vltComponent2 r;
  ASSERT_EQ(registrar->GetComponent(Id(1), &r), S_OK);
  EXPECT_STREQ(r.name, L"second");
  vltutilsFreeComponent2(r);
}

TEST_F(vltRegistrar, GetComponentHandsOutCopies) {
  Register(*registrar, 1, vltComponentObjectExpert);
  _vltComponent2 a, b;
  EXPECT_EQ(registrar->GetComponent(Id(1), nullptr), E_POINTER);
  EXPECT_EQ(registrar->GetComponent(Id(2), &a), E_INVALIDARG);
  ASSERT_EQ(registrar->GetComponent(Id(1), &a), S_OK);
  ASSERT_EQ(registrar->GetComponent(Id(1), &b), S_OK);
  EXPECT_NE(a.name, b.name);
  vltutilsFreeComponent2(a);
  vltutilsFreeComponent2(b);
}

TEST_F(vltRegistrar, UnregisterRemovesAndToleratesTheUnknown) {
  Register(*registrar, 1, vltComponentObjectExpert);
  EXPECT_EQ(registrar->UnregisterComponent(Id(2)), S_OK);
  EXPECT_EQ(registrar->UnregisterComponent(Id(1)), S_OK);
  EXPECT_EQ(registrar->count(), 0u);
  registrar->scanResult = S_FALSE;
  EXPECT_EQ(registrar->UnregisterComponent(Id(2)), S_FALSE);  // what Scan said
  CvltComponent unknown;
  EXPECT_EQ(registrar->RemoveComponent(&unknown), S_FALSE);
}

TEST_F(vltRegistrar, AFailedScanIsTheResult) {
  Register(*registrar, 1, vltComponentObjectExpert);
  registrar->scanResult = E_OUTOFMEMORY;
  _vltComponent2 r;
  IvltEnumComponent* enumerator = nullptr;
  CvltComponent* component = nullptr;
  EXPECT_EQ(Register(*registrar, 2, vltComponentObjectExpert), E_OUTOFMEMORY);
  EXPECT_EQ(registrar->GetComponent(Id(1), &r), E_OUTOFMEMORY);
  EXPECT_EQ(registrar->UnregisterComponent(Id(1)), E_OUTOFMEMORY);
  EXPECT_EQ(registrar->EnumComponents(vltComponentObjectExpert, &enumerator), E_OUTOFMEMORY);
  EXPECT_EQ(registrar->InternalGetComponent(Id(1), component), E_OUTOFMEMORY);
  EXPECT_EQ(registrar->InternalGetComponentNoScan(Id(1), component), S_OK);
  EXPECT_NE(component, nullptr);
  EXPECT_EQ(registrar->count(), 1u);
}

// Names that an enumerator returns one by one.
std::vector<std::wstring> Names(IvltEnumComponent* enumerator) {
  std::vector<std::wstring> names;
  for (;;) {
    _vltComponent2 r;
    unsigned fetched = 0;
    if (enumerator->Next(1, &r, &fetched) != S_OK) return names;
    EXPECT_EQ(fetched, 1u);
    names.push_back(r.name);
    vltutilsFreeComponent2(r);
  }
}

TEST_F(vltRegistrar, EnumeratorWalksOneTypeInIdentifierOrder) {
  Register(*registrar, 0x200, vltComponentObjectExpert, L"b");
  Register(*registrar, 0x1FF, vltComponentObjectExpert, L"a");  // sorts first as a number only
  Register(*registrar, 3, vltComponentUIProvider, L"other");
  CztComPtr<IvltEnumComponent> e;
  ASSERT_EQ(registrar->EnumComponents(vltComponentObjectExpert, e.out()), S_OK);
  EXPECT_EQ(Names(e.get()), (std::vector<std::wstring>{L"a", L"b"}));
  EXPECT_EQ(e->Reset(), S_OK);
  EXPECT_EQ(Names(e.get()).size(), 2u);
}

TEST_F(vltRegistrar, NextAddsToWhatWasFetched) {
  Register(*registrar, 1, vltComponentObjectExpert);
  CztComPtr<IvltEnumComponent> e;
  ASSERT_EQ(registrar->EnumComponents(vltComponentObjectExpert, e.out()), S_OK);
  _vltComponent2 r[3];
  unsigned fetched = 5;
  EXPECT_EQ(e->Next(0, r, &fetched), E_INVALIDARG);
  EXPECT_EQ(e->Next(1, nullptr, &fetched), E_POINTER);
  EXPECT_EQ(e->Next(1, r, nullptr), E_POINTER);
  EXPECT_EQ(fetched, 5u);
  EXPECT_EQ(e->Next(3, r, &fetched), S_FALSE);
  EXPECT_EQ(fetched, 6u);
  vltutilsFreeComponent2(r[0]);
  EXPECT_EQ(e->Skip(1), E_NOTIMPL);
  EXPECT_EQ(e->Clone(nullptr), E_NOTIMPL);
}

TEST_F(vltRegistrar, NoTypeMeansNoComponent) {
  Register(*registrar, 1, vltComponentDataDictionary);
  for (auto type : {vltComponentNone, vltComponentObjectExpert}) {
    CztComPtr<IvltEnumComponent> e;
    ASSERT_EQ(registrar->EnumComponents(type, e.out()), S_OK);
    _vltComponent2 r;
    unsigned fetched = 0;
    EXPECT_EQ(e->Next(1, &r, &fetched), S_FALSE);
    EXPECT_EQ(fetched, 0u);
  }
  EXPECT_EQ(registrar->EnumComponents(vltComponentObjectExpert, nullptr), E_POINTER);
}

TEST_F(vltRegistrar, EnumeratorSeesItsSnapshotLessWhatIsGone) {
  for (uint32_t n = 1; n <= 3; ++n) Register(*registrar, n, vltComponentObjectExpert);
  CztComPtr<IvltEnumComponent> e;
  ASSERT_EQ(registrar->EnumComponents(vltComponentObjectExpert, e.out()), S_OK);
  registrar->UnregisterComponent(Id(2));
  Register(*registrar, 4, vltComponentObjectExpert);
  EXPECT_EQ(Names(e.get()).size(), 2u);
}

TEST_F(vltRegistrar, EnumeratorKeepsTheRegistrarAndAnswersToItsInterfaces) {
  IvltEnumComponent* e = nullptr;
  ASSERT_EQ(registrar->EnumComponents(vltComponentObjectExpert, &e), S_OK);
  EXPECT_EQ(registrar->AddRef(), 3u);
  EXPECT_EQ(registrar->Release(), 2u);
  void* out = nullptr;
  EXPECT_EQ(e->QueryInterface(IID_IUnknown, &out), S_OK);
  EXPECT_EQ(out, e);
  EXPECT_EQ(e->QueryInterface(IID_IvltRegistrar, &out), E_NOINTERFACE);
  EXPECT_EQ(out, nullptr);
  EXPECT_EQ(e->QueryInterface(IID_IUnknown, nullptr), E_POINTER);
  EXPECT_EQ(e->Release(), 1u);
  EXPECT_EQ(e->Release(), 0u);
  EXPECT_EQ(registrar->AddRef(), 2u);
  registrar->Release();
}

TEST_F(vltRegistrar, OlderRecordsCanBeEnumeratedToo) {
  Register(*registrar, 1, vltComponentObjectExpert, L"old");
  IvltEnumComponent* raw = nullptr;
  ASSERT_EQ(registrar->EnumComponents(vltComponentObjectExpert, &raw), S_OK);
  auto* e = static_cast<CvltEnumComponentRegistrar*>(raw);
  _vltComponent2point2 r;
  EXPECT_EQ(e->Next(&r), S_OK);
  EXPECT_STREQ(r.name, L"old");
  vltFree(r.name);
  vltFree(r.fileName);
  EXPECT_EQ(e->Next(&r), S_FALSE);
  e->Release();
}

// ---- Copies that fail

// The next component stands in for the one that could not be copied; a record that could not be filled
// holds no text.
TEST_F(vltRegistrar, NextGoesOnBehindACopyThatFails) {
  if (!vlt::test::kCanLimitMemory) {
    printf("NOT TESTED: the sanitizer has a malloc of its own\n");
    GTEST_SKIP();
  }
  Register(*registrar, 1, vltComponentResourceExpert, L"first", L"pnp");
  Register(*registrar, 2, vltComponentResourceExpert, L"second", L"pnp");
  CztComPtr<IvltEnumComponent> e;
  ASSERT_EQ(registrar->EnumComponents(vltComponentResourceExpert, e.out()), S_OK);
  for (long n = 0; n < 3; ++n) {  // name, file, pnp
    _vltComponent2 r;
    unsigned fetched = 0;
    e->Reset();
    long before = heap::LiveBlocks();
    EXPECT_EQ(heap::Attempt([&] { return e->Next(1, &r, &fetched); }, n, false), heap::kWorks);
    ASSERT_EQ(fetched, 1u);
    EXPECT_STREQ(r.name, L"second") << n;
    vltutilsFreeComponent2(r);
    EXPECT_EQ(heap::LiveBlocks(), before) << n;
  }
  for (long n = 0; n < 3; ++n) {
    _vltComponent2 r;
    unsigned fetched = 0;
    HRESULT result = S_OK;
    e->Reset();
    long before = heap::LiveBlocks();
    heap::Attempt([&] { return result = e->Next(1, &r, &fetched); }, n, true);
    EXPECT_EQ(result, S_FALSE);
    EXPECT_EQ(fetched, 0u);
    EXPECT_EQ(r.name, nullptr);
    EXPECT_EQ(r.fileName, nullptr);
    EXPECT_EQ(heap::LiveBlocks(), before) << n;
  }
}

TEST_F(vltRegistrar, ACopyThatFailsIsGetComponentsResult) {
  if (!vlt::test::kCanLimitMemory) {
    printf("NOT TESTED: the sanitizer has a malloc of its own\n");
    GTEST_SKIP();
  }
  Register(*registrar, 1, vltComponentResourceExpert, L"first", L"pnp");
  for (long n = 0; n < 3; ++n) {
    _vltComponent2 r;
    long before = heap::LiveBlocks();
    HRESULT result = S_OK;
    heap::Attempt([&] { return result = registrar->GetComponent(Id(1), &r); }, n, false);
    EXPECT_EQ(result, E_OUTOFMEMORY);
    EXPECT_EQ(r.name, nullptr);
    EXPECT_EQ(r.fileName, nullptr);
    EXPECT_EQ(heap::LiveBlocks(), before) << n;
  }
}

// What cannot be looked up is passed over; only Reset leads back to it.
TEST_F(vltRegistrar, NextPassesOverWhatAFailedScanHides) {
  Register(*registrar, 1, vltComponentObjectExpert, L"first");
  Register(*registrar, 2, vltComponentObjectExpert, L"second");
  CztComPtr<IvltEnumComponent> e;
  ASSERT_EQ(registrar->EnumComponents(vltComponentObjectExpert, e.out()), S_OK);
  _vltComponent2 r;
  unsigned fetched = 0;
  int before = registrar->scans;
  registrar->scanResult = E_FAIL;
  EXPECT_EQ(e->Next(1, &r, &fetched), S_FALSE);
  EXPECT_EQ(registrar->scans, before + 2);
  registrar->scanResult = S_OK;
  EXPECT_EQ(e->Next(1, &r, &fetched), S_FALSE);
  EXPECT_EQ(fetched, 0u);
  e->Reset();
  EXPECT_EQ(Names(e.get()), (std::vector<std::wstring>{L"first", L"second"}));
}

TEST_F(vltRegistrar, ManyThreadsRegisterAndRead) {
  std::vector<std::thread> threads;
  for (uint32_t t = 0; t < 4; ++t) {
    threads.emplace_back([this, t] {
      for (uint32_t n = 0; n < 200; ++n) {
        Register(*registrar, t * 1000 + n + 1, vltComponentObjectExpert);
        _vltComponent2 r;
        if (registrar->GetComponent(Id(n + 1), &r) == S_OK) vltutilsFreeComponent2(r);
      }
    });
  }
  for (auto& thread : threads) thread.join();
  EXPECT_EQ(registrar->count(), 800u);
}

TEST(vltRegistrarKeys, AreExact) {
  EXPECT_EQ(CvltRegistrar::MapStringToType(L"Data Dictionaries"), vltComponentDataDictionary);
  EXPECT_EQ(CvltRegistrar::MapStringToType(L"Object Experts"), vltComponentObjectExpert);
  EXPECT_EQ(CvltRegistrar::MapStringToType(L"Resource Experts"), vltComponentResourceExpert);
  EXPECT_EQ(CvltRegistrar::MapStringToType(L"UI Providers"), vltComponentUIProvider);
  EXPECT_EQ(CvltRegistrar::MapStringToType(L"data dictionaries"), vltComponentNone);
  EXPECT_EQ(CvltRegistrar::MapStringToType(L""), vltComponentNone);
  EXPECT_EQ(CvltRegistrar::MapStringToType(nullptr), vltComponentNone);
}

TEST(vltRegistrarHelpers, GuidTexts) {
  GUID g = {1, 2, 3, {4, 5, 6, 7, 8, 9, 10, 11}};
  zt::fnd::String text = vlrGuidToString(g);
  EXPECT_STREQ(text.c_str(), L"{00000001-0002-0003-0405-060708090A0B}");
  EXPECT_TRUE(vlrGuidFromString(text) == g);
  EXPECT_TRUE(vlrGuidFromString(text.substr(1, 36)) == g);
  EXPECT_TRUE(vlrGuidFromString(zt::fnd::String(L"bad")) == GUID_NULL);
}

TEST(vltRegistrarHelpers, DuplicateStringLeavesTheTargetOnFailure) {
  wchar_t text[] = L"t";
  wchar_t* out = text;
  EXPECT_EQ(vlrDuplicateString(nullptr, &out), E_POINTER);
  EXPECT_EQ(vlrDuplicateString(text, nullptr), E_POINTER);
  EXPECT_EQ(out, text);
  EXPECT_EQ(vlrDuplicateString(text, &out), S_OK);
  EXPECT_STREQ(out, L"t");
  EXPECT_NE(out, text);
  vltFree(out);
}

TEST(vltRegistrarHelpers, ComponentNamesFromADirectory) {
  vlt::test::TempDir dir;
  dir.makeDir("a.framework");
  dir.makeDir("b.vle");
  zt::fnd::Vector<zt::fnd::String> names;
  zt::fnd::String directory((dir.path() + "/").c_str());
  EXPECT_EQ(vltGetComponentNamesFromDirectory(directory, zt::fnd::String(L"framework"), names),
            S_OK);
  ASSERT_EQ(names.size(), 1u);
  EXPECT_STREQ(zt::fnd::AnsiString(names[0]).c_str(), (dir / "a.framework").c_str());
  EXPECT_EQ(vltGetComponentNamesFromDirectory(directory, zt::fnd::String(L"none"), names), S_FALSE);
  EXPECT_EQ(vlrGetComponentNamesFromDirectory(zt::fnd::String(dir.path().c_str()),
                                              zt::fnd::String(L"vle"), names),
            S_OK);
  EXPECT_EQ(names.size(), 1u);
}

}  // namespace

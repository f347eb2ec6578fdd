#include "source/Common/vltQuery.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <cstring>
#include <deque>
#include <functional>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"
#include "tests/support/ArmedHook.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/MemoryLimit.h"

namespace vlt::test {
namespace {

constexpr HRESULT kFailure = E_UNEXPECTED;
constexpr GUID kGuid = {
    0x00112233, 0x4455, 0x6677, {0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF}};
const std::wstring kGuidText = L"{00112233-4455-6677-8899-AABBCCDDEEFF}";

// ---- Streams of the storage: a tape of typed items, with a failure at the nth call, from 1.

struct Item {
  std::string kind;
  int64_t number = 0;
  double f64 = 0;
  GUID guid = GUID_NULL;
  std::wstring text = {};

  std::string told() const {
    if (kind == "f64") return kind + " " + std::to_string(f64);
    if (kind == "guid") return kind + (memcmp(&guid, &kGuid, sizeof guid) == 0 ? "" : " other");
    if (kind == "string") return kind + " " + std::string(text.begin(), text.end());
    return kind + " " + std::to_string(number);
  }
};

Item I32(int64_t v) { return {.kind = "i32", .number = v}; }
Item U32(int64_t v) { return {.kind = "u32", .number = v}; }
Item Id(int64_t v) { return {.kind = "id", .number = v}; }
Item TypeItem(int64_t v) { return {.kind = "type", .number = v}; }
Item F64(double v) { return {.kind = "f64", .f64 = v}; }
Item GuidItem() { return {.kind = "guid", .guid = kGuid}; }
Item Text(const std::wstring& v) { return {.kind = "string", .text = v}; }

template <class I>
class Tape : public I {
 public:
  std::deque<Item> items;
  int failAt = 0;
  HRESULT result = S_OK;  // of the calls that succeed
  int calls = 0;
  int references = 1;

  virtual ~Tape() = default;
  HRESULT QueryInterface(const GUID&, void**) override { return E_NOINTERFACE; }
  uint32_t AddRef() override { return static_cast<uint32_t>(++references); }
  uint32_t Release() override { return static_cast<uint32_t>(--references); }

 protected:
  bool fails() { return ++calls == failAt; }
};

class Writer : public Tape<IvltOutputStream> {
 public:
  HRESULT WriteType(_vltAttributeType v) override { return put(TypeItem(v)); }
  HRESULT WriteID(vltAttributeID v) override { return put(Id(v)); }
  HRESULT WriteI32(int32_t v) override { return put(I32(v)); }
  HRESULT WriteU32(uint32_t v) override { return put(U32(v)); }
  HRESULT WriteF64(double v) override { return put(F64(v)); }
  HRESULT WriteGuid(GUID v) override { return put({.kind = "guid", .guid = v}); }
  HRESULT WriteString(const wchar_t* v) override { return put(Text(v ? v : L"(null)")); }

  std::vector<std::string> told() const {
    std::vector<std::string> all;
    for (const Item& item : items) all.push_back(item.told());
    return all;
  }

 private:
  HRESULT put(const Item& item) {
    if (fails()) return kFailure;
    items.push_back(item);
    return result;
  }
};

// A failing read leaves garbage in its output, as a storage may.
class Reader : public Tape<IvltInputStream> {
 public:
  HRESULT ReadType(_vltAttributeType* v) override {
    return take(
        "type", [&](const Item& i) { *v = static_cast<_vltAttributeType>(i.number); },
        [&] { *v = vltStringType; });
  }
  HRESULT ReadID(vltAttributeID* v) override { return number("id", v); }
  HRESULT ReadI32(int32_t* v) override { return number("i32", v); }
  HRESULT ReadU32(uint32_t* v) override { return number("u32", v); }
  HRESULT ReadF64(double* v) override {
    return take(
        "f64", [&](const Item& i) { *v = i.f64; }, [&] { *v = -1; });
  }
  HRESULT ReadGuid(GUID* v) override {
    return take(
        "guid", [&](const Item& i) { *v = i.guid; }, [&] { memset(v, 0x77, sizeof *v); });
  }
  HRESULT ReadString(wchar_t** v) override {
    return take(
        "string", [&](const Item& i) { *v = Dup(i.text.c_str()); },
        [&] { *v = reinterpret_cast<wchar_t*>(uintptr_t{1}); });
  }

 private:
  template <class T>
  HRESULT number(const char* kind, T* v) {
    return take(
        kind, [&](const Item& i) { *v = static_cast<T>(i.number); },
        [&] { *v = static_cast<T>(0x77777777); });
  }
  template <class Give, class Spoil>
  HRESULT take(const char* kind, Give give, Spoil spoil) {
    if (fails() || items.empty()) {
      spoil();
      return kFailure;
    }
    EXPECT_EQ(items.front().kind, kind);
    give(items.front());
    items.pop_front();
    return result;
  }
};

// ---- Queries in tests

_vltQueryTerm Term(uint32_t id, int type) {
  _vltQueryTerm term;
  memset(&term, 0, sizeof term);
  term.attributeID = id;
  term.attributeType = static_cast<_vltAttributeType>(type);
  return term;
}
_vltQueryTerm I32Term(uint32_t id, int32_t v) {
  _vltQueryTerm term = Term(id, vltI32Type);
  term.value.i32 = v;
  return term;
}
_vltQueryTerm TextTerm(uint32_t id, uint32_t tilde, const wchar_t* v) {
  _vltQueryTerm term = Term(id, vltStringType);
  term.tildeFlag = tilde;
  term.value.string = const_cast<wchar_t*>(v);
  return term;
}

// One term of each type that has a value, and one that has none.
std::vector<_vltQueryTerm> AllTerms() {
  std::vector<_vltQueryTerm> terms = {I32Term(5, 42)};
  terms.push_back(Term(6, vltU32Type));
  terms.back().value.u32 = 4294967295u;
  terms.push_back(Term(7, vltF64Type));
  terms.back().value.f64 = 1.5;
  terms.push_back(TextTerm(9, 1, L"abc"));
  terms.push_back(Term(10, vltGuidType));
  terms.back().value.guid = kGuid;
  terms.push_back(Term(11, vltReferenceType));
  return terms;
}

_vltQuery Query(std::vector<_vltQueryTerm>& terms, int32_t tFlag = 1, int32_t orFlag = 0) {
  return {kGuid, tFlag, orFlag, static_cast<uint32_t>(terms.size()), terms.data()};
}

TEST(vltQuery, FieldsStandInOrder) {
  EXPECT_EQ(offsetof(_vltQuery, tFlag), 16u);
  EXPECT_EQ(offsetof(_vltQuery, termCount), 24u);
  EXPECT_EQ(offsetof(_vltQueryTerm, attributeType), 8u);
  EXPECT_EQ(sizeof(((_vltQueryTerm*)nullptr)->value), 16u);
}

// ---- Writing

TEST(vltQuery, WritesFrameAndTermsInOrder) {
  std::vector<_vltQueryTerm> terms = AllTerms();
  _vltQuery query = Query(terms, 5, 7);
  Writer writer;
  EXPECT_EQ(vltMarshalQueryToStream(&query, &writer), S_OK);
  EXPECT_EQ(writer.told(), (std::vector<std::string>{
                               "i32 1", "guid",   "i32 5",          "i32 7",      "u32 6",  //
                               "id 5",  "type 1", "i32 42",                                 //
                               "id 6",  "type 2", "u32 4294967295",                         //
                               "id 7",  "type 3", "f64 1.500000",                           //
                               "id 9",  "type 4", "i32 1",          "string abc",           //
                               "id 10", "type 6", "guid",                                   //
                               "id 11", "type 5"}));
  EXPECT_EQ(writer.references, 1);
}

TEST(vltQuery, TypesWithoutAValueAreIdAndType) {
  for (int type : {0, 5, 7, 8, 13, 14, 99, -1}) {
    std::vector<_vltQueryTerm> terms = {Term(3, type)};
    _vltQuery query = Query(terms);
    Writer writer;
    writer.result = S_FALSE;
    EXPECT_EQ(vltMarshalQueryToStream(&query, &writer), S_FALSE);
    EXPECT_EQ(writer.items.size(), 7u);
    EXPECT_EQ(writer.items.back().number, type);
  }
}

TEST(vltQuery, TheLastResultIsReturned) {
  std::vector<_vltQueryTerm> none;
  _vltQuery query = Query(none);
  Writer writer;
  writer.result = S_FALSE;
  EXPECT_EQ(vltMarshalQueryToStream(&query, &writer), S_FALSE);
  EXPECT_EQ(writer.items.size(), 5u);
}

TEST(vltQuery, EachFailingWriteEndsTheWork) {
  std::vector<_vltQueryTerm> terms = AllTerms();
  _vltQuery query = Query(terms);
  Writer whole;
  vltMarshalQueryToStream(&query, &whole);
  for (int nth = 1; nth <= whole.calls; ++nth) {
    Writer writer;
    writer.failAt = nth;
    bool tilde = nth == 17;  // whose fate is not looked at
    EXPECT_EQ(vltMarshalQueryToStream(&query, &writer), tilde ? S_OK : kFailure) << nth;
    EXPECT_EQ(writer.calls, tilde ? whole.calls : nth);
  }
}

// ---- Reading

std::deque<Item> Recorded(const _vltQuery& query) {
  Writer writer;
  EXPECT_EQ(vltMarshalQueryToStream(&query, &writer), S_OK);
  return writer.items;
}

TEST(vltQuery, ComesBackAsItWasWritten) {
  std::vector<_vltQueryTerm> terms = AllTerms();
  _vltQuery query = Query(terms), read = {};
  Reader reader;
  reader.items = Recorded(query);
  EXPECT_EQ(vltMarshalQueryFromStream(&reader, &read), S_OK);
  EXPECT_TRUE(reader.items.empty());
  EXPECT_EQ(memcmp(&read.queryGuid, &kGuid, sizeof kGuid), 0);
  ASSERT_EQ(read.termCount, 6u);
  EXPECT_EQ(read.terms[0].attributeID, 5u);
  EXPECT_EQ(read.terms[0].value.i32, 42);
  EXPECT_EQ(read.terms[1].value.u32, 4294967295u);
  EXPECT_EQ(read.terms[2].value.f64, 1.5);
  EXPECT_EQ(read.terms[3].tildeFlag, 1u);
  EXPECT_STREQ(read.terms[3].value.string, L"abc");
  EXPECT_EQ(memcmp(&read.terms[4].value.guid, &kGuid, sizeof kGuid), 0);
  EXPECT_EQ(read.terms[5].attributeType, vltReferenceType);
  EXPECT_EQ(read.terms[5].value.string, nullptr);  // never read
  EXPECT_EQ(reader.references, 1);
  EXPECT_EQ(vltFreeQuery(&read), 0);
}

TEST(vltQuery, OnlySomeFlagsAreNormalised) {
  std::vector<_vltQueryTerm> terms = {TextTerm(1, 7, L"x"), TextTerm(2, 0, L"y")};
  for (auto [tFlag, orFlag] : {std::pair(5, 5), std::pair(-1, -1), std::pair(0, 0)}) {
    _vltQuery query = Query(terms, tFlag, orFlag), read = {};
    Reader reader;
    reader.items = Recorded(query);
    EXPECT_EQ(vltMarshalQueryFromStream(&reader, &read), S_OK);
    EXPECT_EQ(read.tFlag, tFlag != 0);
    EXPECT_EQ(read.orFlag, orFlag);
    EXPECT_EQ(read.terms[0].tildeFlag, 1u);
    EXPECT_EQ(read.terms[1].tildeFlag, 0u);
    vltFreeQuery(&read);
  }
}

TEST(vltQuery, AnotherVersionIsASuccessThatReadsNothing) {
  for (int version : {2, 0, -1}) {
    Reader reader;
    reader.items = {I32(version), GuidItem()};
    _vltQuery query, before;
    memset(&query, 0x5A, sizeof query);
    memcpy(&before, &query, sizeof query);
    EXPECT_EQ(vltMarshalQueryFromStream(&reader, &query), S_OK);
    EXPECT_EQ(memcmp(&query, &before, sizeof query), 0);
    EXPECT_EQ(reader.calls, 1);
  }
  Reader reader;
  reader.items = {I32(2)};
  reader.result = S_FALSE;
  _vltQuery query = {};
  EXPECT_EQ(vltMarshalQueryFromStream(&reader, &query), S_FALSE);
}

TEST(vltQuery, NoTermsAreABlockOfTheirOwn) {
  std::vector<_vltQueryTerm> none;
  _vltQuery query = Query(none), read = {};
  Reader reader;
  reader.items = Recorded(query);
  EXPECT_EQ(vltMarshalQueryFromStream(&reader, &read), S_OK);
  EXPECT_EQ(read.termCount, 0u);
  EXPECT_NE(read.terms, nullptr);
  _vltQueryTerm* terms = read.terms;
  EXPECT_EQ(vltFreeQuery(&read), 0);
  EXPECT_EQ(read.terms, terms);  // not cleared
}

TEST(vltQuery, EachFailingReadIsReturnedAndTheQueryCanBeFreed) {
  std::vector<_vltQueryTerm> terms = AllTerms();
  terms.push_back(TextTerm(12, 0, L"last"));
  _vltQuery query = Query(terms);
  std::deque<Item> items = Recorded(query);
  for (int nth = 1; nth <= static_cast<int>(items.size()); ++nth) {
    Reader reader;
    reader.items = items;
    reader.failAt = nth;
    _vltQuery read = {};
    EXPECT_EQ(vltMarshalQueryFromStream(&reader, &read), kFailure) << nth;
    EXPECT_EQ(reader.calls, nth);
    EXPECT_EQ(read.termCount, nth > 5 ? 7u : 0u);
    vltFreeQuery(&read);
  }
}

TEST(vltQuery, CountsThatCannotBeAreOutOfMemory) {
  for (uint32_t count : {0xFFFFFFFFu, 0x80000000u, 0x66666667u, 0x05000000u}) {
    Reader reader;
    reader.items = {I32(1), GuidItem(), I32(1), I32(1), U32(count)};
    _vltQuery read = {};
    read.terms = reinterpret_cast<_vltQueryTerm*>(uintptr_t{1});
    EXPECT_EQ(vltMarshalQueryFromStream(&reader, &read), E_OUTOFMEMORY) << count;
    EXPECT_EQ(read.termCount, count);
    EXPECT_EQ(read.terms, nullptr);
    vltFreeQuery(&read);
    wchar_t* text = nullptr;
    EXPECT_EQ(vltConvertQueryToString(&read, &text), E_OUTOFMEMORY);
    EXPECT_EQ(text, nullptr);
  }
}

TEST(vltQuery, NullPointersAreRefused) {
  std::vector<_vltQueryTerm> none;
  _vltQuery query = Query(none);
  Writer writer;
  Reader reader;
  wchar_t* text = nullptr;
  EXPECT_EQ(vltMarshalQueryToStream(nullptr, &writer), E_POINTER);
  EXPECT_EQ(vltMarshalQueryToStream(&query, nullptr), E_POINTER);
  EXPECT_EQ(vltMarshalQueryFromStream(nullptr, &query), E_POINTER);
  EXPECT_EQ(vltMarshalQueryFromStream(&reader, nullptr), E_POINTER);
  EXPECT_EQ(vltConvertQueryToString(&query, nullptr), E_POINTER);
  EXPECT_EQ(vltConvertQueryToString(nullptr, &text), E_POINTER);
  EXPECT_EQ(vltFreeQuery(nullptr), 0);
}

// ---- Printing

std::wstring LineOf(const _vltQuery& query) {
  wchar_t* text = nullptr;
  EXPECT_EQ(vltConvertQueryToString(&query, &text), S_OK);
  std::wstring line = text ? text : L"(null)";
  vltFree(text);
  return line;
}

std::wstring LineOf(std::vector<_vltQueryTerm> terms) { return LineOf(Query(terms)); }

TEST(vltQuery, PrintsAsOneLine) {
  EXPECT_EQ(LineOf({I32Term(5, 42), TextTerm(9, 1, L"abc")}), kGuidText + L",t,a,5=42,9=~abc");
  std::vector<_vltQueryTerm> none;
  EXPECT_EQ(LineOf(Query(none, 0, 0)), kGuidText + L",f,a");
  EXPECT_EQ(LineOf(Query(none, 5, -1)), kGuidText + L",t,o");
}

TEST(vltQuery, PrintsTheValueOfEachType) {
  EXPECT_EQ(LineOf(AllTerms()),
            kGuidText + L",t,a,5=42,6=4294967295,7=1.5,9=~abc,10=" + kGuidText + L",11=");
  for (int type : {0, 5, 7, 8, 14, 99, -1}) {
    EXPECT_EQ(LineOf({Term(3, type)}), kGuidText + L",t,a,3=");
  }
  EXPECT_EQ(LineOf({TextTerm(1, 0, L"x"), TextTerm(2, 8, nullptr), TextTerm(3, 0, L"")}),
            kGuidText + L",t,a,1=x,2=~,3=");
}

TEST(vltQuery, PrintsIdsAndNumbersByTheirPattern) {
  bool wide = sizeof(long) == 8;
  EXPECT_EQ(LineOf({I32Term(0x5AC00001, -1), I32Term(0xE2C0C005, 0)}),
            kGuidText + (wide ? L",t,a,1522532353=4294967295,3804282885=0"
                              : L",t,a,1522532353=-1,-490684411=0"));
}

TEST(vltQuery, LongTextsGrowTheLine) {
  // The first block has space for 40 characters and 72 a term.
  for (size_t length :
       {60u, 61u, 62u, 63u, 64u, 65u, 66u, 67u, 68u, 69u, 70u, 71u, 72u, 430u, 431u, 432u, 5000u}) {
    std::wstring text(length, L'x');
    EXPECT_EQ(LineOf({TextTerm(1, 1, text.c_str()), I32Term(2, 3)}),
              kGuidText + L",t,a,1=~" + text + L",2=3");
  }
}

TEST(vltQuery, ManyLongTextsTakeTimeInProportion) {
  std::wstring text(500, L'x');
  std::vector<_vltQueryTerm> terms(40000, TextTerm(1, 0, text.c_str()));
  EXPECT_EQ(LineOf(terms).size(), 42u + 40000u * 503u);
}

// ---- Hook points

TEST(vltQuery, AnArmedReadIsOutOfMemory) {
  ExpectInArmedChild("TestHookNT\"./source/Common/vltcmn\"1257", kFailedAllocation, [] {
    std::vector<_vltQueryTerm> terms = AllTerms();
    _vltQuery query = Query(terms), read = {};
    Reader reader;
    reader.items = Recorded(query);
    read.terms = reinterpret_cast<_vltQueryTerm*>(uintptr_t{1});
    EXPECT_EQ(vltMarshalQueryFromStream(&reader, &read), E_OUTOFMEMORY);
    EXPECT_EQ(reader.calls, 5);
    EXPECT_EQ(read.termCount, 6u);
    EXPECT_EQ(read.terms, nullptr);
    vltFreeQuery(&read);
  });
}

TEST(vltQuery, AnArmedPrintIsOutOfMemory) {
  ExpectInArmedChild("TestHookNT\"./source/Common/vltcmn\"1132", kFailedAllocation, [] {
    std::vector<_vltQueryTerm> terms = AllTerms();
    _vltQuery query = Query(terms);
    wchar_t* text = nullptr;
    EXPECT_EQ(vltConvertQueryToString(&query, &text), E_OUTOFMEMORY);
    EXPECT_EQ(text, nullptr);
  });
}

TEST(vltQuery, WhatCannotBeAppendedIsLeftOut) {
  ExpectInArmedChild(hook::kAppendString2, kFailedAllocation, [] {
    std::wstring text(1000, L'x');
    EXPECT_EQ(LineOf({TextTerm(1, 1, text.c_str()), TextTerm(2, 0, text.c_str()), I32Term(3, 4)}),
              kGuidText + L",t,a,1=~,2=,3=4");
  });
}

}  // namespace
}  // namespace vlt::test

// Queries and attribute values over a heap that refuses: every allocation of every call in turn.
#include <gtest/gtest.h>
#include <stdio.h>
#include <string.h>

#include <iterator>

#include "source/Common/vltQuery.h"
#include "source/Common/vltcmn.h"
#include "tests/support/Child.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/Sanitizer.h"
#include "tests/support/TempDir.h"

namespace vlt::test {
namespace {

template <class I>
class Uncounted : public I {
 public:
  virtual ~Uncounted() = default;
  HRESULT QueryInterface(const GUID&, void**) override { return E_NOINTERFACE; }
  uint32_t AddRef() override { return 1; }
  uint32_t Release() override { return 1; }
};

// Takes everything.
class Sink : public Uncounted<IvltOutputStream> {
 public:
  HRESULT WriteType(_vltAttributeType) override { return S_OK; }
  HRESULT WriteID(vltAttributeID) override { return S_OK; }
  HRESULT WriteI32(int32_t) override { return S_OK; }
  HRESULT WriteU32(uint32_t) override { return S_OK; }
  HRESULT WriteF64(double) override { return S_OK; }
  HRESULT WriteGuid(GUID) override { return S_OK; }
  HRESULT WriteString(const wchar_t*) override { return S_OK; }
};

constexpr uint32_t kTerms = 5;
const std::wstring kLong(1000, L'v');  // passes the first capacity of a printed query

// A query of five terms, of every second a long text.
class Source : public Uncounted<IvltInputStream> {
 public:
  HRESULT ReadType(_vltAttributeType* v) override {
    *v = m_term++ % 2 == 0 ? vltStringType : vltF64Type;
    return S_OK;
  }
  HRESULT ReadID(vltAttributeID* v) override { return *v = m_term, S_OK; }
  HRESULT ReadI32(int32_t* v) override { return *v = 1, S_OK; }
  HRESULT ReadU32(uint32_t* v) override { return *v = kTerms, S_OK; }
  HRESULT ReadF64(double* v) override { return *v = 0.5, S_OK; }
  HRESULT ReadGuid(GUID* v) override { return *v = GUID_NULL, S_OK; }
  HRESULT ReadString(wchar_t** v) override {
    *v = Dup(kLong.c_str());
    return *v ? S_OK : E_OUTOFMEMORY;
  }

 private:
  uint32_t m_term = 0;
};

// Ended as a caller may: also when it was read to the half.
struct Query : _vltQuery {
  Query() { memset(static_cast<_vltQuery*>(this), 0, sizeof(_vltQuery)); }
  ~Query() {
    if (terms) vltFreeQuery(this);
  }
};

HRESULT Receive(Query* query) {
  Source source;
  return vltMarshalQueryFromStream(&source, query);
}

HRESULT Print() {
  Query query;
  HRESULT result = Receive(&query);
  if (result < 0) return result;
  wchar_t* text = nullptr;
  result = vltConvertQueryToString(&query, &text);
  if (result >= 0 && !text) abort();  // what cannot be appended is left out
  vltTaskMemFree(text);
  return result;
}

const heap::Call kCalls[] = {{"vltMarshalQueryFromStream",
                              [] {
                                Query query;
                                return Receive(&query);
                              }},
                             {"vltMarshalQueryToStream",
                              [] {
                                Query query;
                                HRESULT result = Receive(&query);
                                Sink sink;
                                return result < 0 ? result : vltMarshalQueryToStream(&query, &sink);
                              }},
                             {"vltConvertQueryToString", Print}};

TEST(vltQueryMemory, EveryCallSurvivesEveryFailedAllocation) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer has a malloc of its own";
  for (bool forEver : {false, true}) {
    long total = 0;
    for (const heap::Call& call : kCalls) {
      TempDir dir;
      Child child([&] {
        long tried = 0;
        // The first report of a failure makes what all later ones use.
        for (long n = 0; n < 8; ++n) heap::Attempt(call.run, n, false);
        heap::Trouble trouble = heap::Sweep(call, forEver, &tried);
        WriteBytes(dir / "tried", std::to_string(tried));
        return static_cast<int>(trouble);
      });
      EXPECT_EQ(child.wait(), heap::kNone) << call.name;
      total += std::stol(ReadBytes(dir / "tried"));
    }
    printf("%zu calls on queries, %ld allocations failed (%s)\n", std::size(kCalls), total,
           forEver ? "and all behind them" : "one at a time");
    EXPECT_GT(total, 10);
  }
}

}  // namespace
}  // namespace vlt::test

// Component records over a heap that refuses, and cut records over one that is counted.
#include <gtest/gtest.h>
#include <stdio.h>

#include "source/xcomponentStream.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/InChild.h"
#include "tests/support/StreamBytes.h"
#include "tests/support/TempDir.h"

namespace vlt::test {
namespace {

// A record of the type as a reader asks for it, with texts long enough for the heap.
std::string Record(int32_t type, Order order) {
  auto text = [order](size_t size) { return LongNumber(size, order) + std::string(size, 't'); };
  std::string bytes = Header(0, 0, 0, order) + Number(sizeof(_vltComponent2), 4, order) +
                      Number(3, 4, order) + Number(static_cast<uint32_t>(type), 4, order) +
                      text(40) + LongNumber(1, order) + Number(2, 2, order) + Number(3, 2, order) +
                      std::string(8, 'g') + text(50) + "12345678" + Number(9, 4, order);
  if (type == vltComponentResourceExpert) return bytes + text(30);
  return bytes + Number(1, 4, order) + text(20) + text(21) + Number(0, 4, order) + text(22) +
         Number(5, 4, order);
}

HRESULT Read(const std::string& bytes, CvltComponent& component) {
  auto stream = MemoryPtr::Attach(CztMemoryStream::CreateStream());
  if (!stream) return E_OUTOFMEMORY;
  if (stream->Write(bytes.data(), static_cast<unsigned int>(bytes.size()), nullptr) < 0) {
    return E_OUTOFMEMORY;
  }
  stream->Seek(0, ztSeekBegin, nullptr);
  try {
    CztInStream in(stream.get());
    in >> component;
    return S_OK;
  } catch (const CztStreamException&) {
    return E_FAIL;
  }
}

std::vector<heap::Call> Calls() {
  std::vector<heap::Call> calls;
  for (int32_t type : {2, 5}) {
    static const std::string dictionary = Record(2, Order::Little), expert = Record(5, Order::Big);
    const std::string* bytes = type == 2 ? &dictionary : &expert;
    calls.push_back({"reading type " + std::to_string(type), [bytes] {
                       CvltComponent component;
                       return Read(*bytes, component);
                     }});
    calls.push_back({"reading and writing type " + std::to_string(type), [bytes] {
                       CvltComponent component;
                       HRESULT result = Read(*bytes, component);
                       if (result < 0) return result;
                       auto stream = MemoryPtr::Attach(CztMemoryStream::CreateStream());
                       if (!stream) return E_OUTOFMEMORY;
                       try {
                         CztOutStream out(stream.get());
                         out << component;
                         return S_OK;
                       } catch (const CztStreamException&) {
                         return E_FAIL;
                       }
                     }});
  }
  return calls;
}

TEST(xcomponentStreamMemory, ReadingAndWritingSurviveEveryFailedAllocation) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer has a malloc of its own";
  for (bool forEver : {false, true}) {
    long total = 0;
    for (const heap::Call& call : Calls()) {
      TempDir dir;
      Child child([&] {
        long tried = 0;
        heap::Trouble trouble = heap::Sweep(call, forEver, &tried);
        WriteBytes(dir / "tried", std::to_string(tried));
        return static_cast<int>(trouble);
      });
      EXPECT_EQ(child.wait(), heap::kNone) << call.name;
      total += std::stol(ReadBytes(dir / "tried"));
    }
    printf("%zu calls on component records, %ld allocations failed (%s)\n", Calls().size(), total,
           forEver ? "and all behind them" : "one at a time");
    EXPECT_GT(total, 20);
  }
}

TEST(xcomponentStreamMemory, EveryTruncationLeavesNothing) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer counts its own blocks, and tells of leaks";
  for (Order order : {Order::Little, Order::Big}) {
    for (int32_t type : {2, 5}) {
      std::string whole = Record(type, order);
      auto readAll = [&] {
        for (size_t size = 0; size < whole.size(); ++size) {
          CvltComponent component;
          Read(whole.substr(0, size), component);
        }
        return heap::g_live.load();
      };
      readAll();
      long before = heap::g_live;
      EXPECT_EQ(readAll(), before) << type;
    }
  }
}

}  // namespace
}  // namespace vlt::test

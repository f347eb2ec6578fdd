// Streams whose heap refuses: every allocation of every operation in turn. And a heap that is counted:
// input that is cut anywhere leaves nothing in it.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdio>

#include "tests/support/FailingHeap.h"
#include "tests/support/InChild.h"
#include "tests/support/StreamBytes.h"
#include "tests/support/TempDir.h"
#include "ztcom/ztcore/ztmemmgr.h"

namespace vlt::test {
namespace {

using heap::Call;

// A stream's exceptions as results, since a sweep knows those of the foundation only.
template <class Body>
HRESULT Told(Body body) {
  try {
    return body();
  } catch (const CztStreamException&) {
    return E_FAIL;
  }
}

const std::string& NestedBytes() {
  static const std::string bytes =
      WithArea("data", {{L"a", WithArea("1", {{L"deep", "d"}})}, {L"b", std::string(200, 'b')}});
  return bytes;
}

// Bytes attached, or an exception.
HRESULT Load(const MemoryPtr& stream, const std::string& bytes) {
  auto* block = static_cast<unsigned char*>(malloc(bytes.size() + 1));
  if (!block) return E_OUTOFMEMORY;
  memcpy(block, bytes.data(), bytes.size());
  return stream->AttachBuffer(block, bytes.size(), false);
}

// A fresh memory stream over the nested bytes, for what `body` does with it.
template <class Body>
std::function<HRESULT()> WithLoaded(Body body) {
  return [body] {
    return Told([&]() -> HRESULT {
      MemoryPtr stream = NewMemory();
      if (!stream) return E_OUTOFMEMORY;
      HRESULT result = Load(stream, NestedBytes());
      return result < 0 ? result : body(stream);
    });
  };
}

std::vector<Call> MemoryCalls() {
  return {
      {"CztMemoryStream::CreateStream", [] { return NewMemory() ? S_OK : E_OUTOFMEMORY; }},
      {"AttachBuffer and LoadSubStreamInfo", WithLoaded([](const MemoryPtr&) { return S_OK; })},
      {"Write", WithLoaded([](const MemoryPtr& s) {
         s->Seek(0, ztSeekEnd, nullptr);
         static const std::string bytes(5000, 'w');
         return s->Write(bytes.data(), 5000, nullptr);
       })},
      {"Read", WithLoaded([](const MemoryPtr& s) {
         char bytes[4];
         return s->Read(bytes, 4, nullptr);
       })},
      {"SetSize", WithLoaded([](const MemoryPtr& s) { return s->SetSize(100000); })},
      {"OpenSubStream", WithLoaded([](const MemoryPtr& s) {
         CztComPtr<IztStream> out;
         HRESULT result = s->OpenSubStream(L"b", out.out());
         return result == S_OK && !out ? E_UNEXPECTED : result;
       })},
      {"CreateSubStream", WithLoaded([](const MemoryPtr& s) {
         CztComPtr<IztStream> out;
         HRESULT result = s->CreateSubStream(L"new", out.out());
         unsigned int count = 0;
         s->NumSubStreams(&count);
         if (count != (out ? 3u : 2u)) abort();  // made whole or not at all
         return result;
       })},
      {"DeleteSubStream", WithLoaded([](const MemoryPtr& s) { return s->DeleteSubStream(L"a"); })},
      {"GetSubStreamInfo", WithLoaded([](const MemoryPtr& s) {
         wchar_t** names = nullptr;
         unsigned int count = 0;
         HRESULT result = s->GetSubStreamInfo(&names, &count);
         if (result < 0 && (names || count)) abort();
         for (unsigned int i = 0; i < count; ++i) ZtSysFreeString(names[i]);
         ZtTaskMemFree(names);
         return result;
       })},
      {"WriteSubStreamInfo and DetachBuffer", WithLoaded([](const MemoryPtr& s) {
         HRESULT result = s->WriteSubStreamInfo();
         int64_t size = 0;
         s->Seek(0, ztSeekEnd, &size);
         unsigned char* block = s->DetachBuffer();
         // A failure leaves the data alone behind.
         if (result < 0 && (size != 4 || memcmp(block, "data", 4) != 0)) abort();
         free(block);
         return result;
       })},
      {"Clone", WithLoaded([](const MemoryPtr& s) {
         MemoryPtr target = NewMemory();
         return target ? s->Clone(target.get()) : E_OUTOFMEMORY;
       })},
      {"ResetStreams", WithLoaded([](const MemoryPtr& s) { return s->ResetStreams(); })},
      {"ClearStreams", WithLoaded([](const MemoryPtr& s) { return s->ClearStreams(); })},
      {"QueryInterface", WithLoaded([](const MemoryPtr& s) {
         return ZtTryQueryInterface<IztStream3>(IID_IztStream3, s.get()) && s->Release() ? S_OK
                                                                                         : E_FAIL;
       })},
  };
}

std::vector<Call> TypedCalls() {
  return {
      {"CztOutStream", WithLoaded([](const MemoryPtr& s) {
         s->Seek(0, ztSeekEnd, nullptr);
         CztOutStream out(s.get(), 1, 2, 3);
         out << 1 << GUID_NULL << zt::fnd::AnsiString("a text that is long enough for the heap");
         CztOutStream inner(out);
         inner << uint16_t{5};
         return S_OK;
       })},
      {"CztInStream",
       [] {
         static const std::string bytes =
             Header() + LongNumber(50) + std::string(50, 't') + LongNumber(0);
         return Told([]() -> HRESULT {
           MemoryPtr stream = NewMemory();
           if (!stream) return E_OUTOFMEMORY;
           HRESULT result = Load(stream, bytes);
           if (result < 0) return result;
           CztInStream in(stream.get());
           zt::fnd::AnsiString text, empty;
           in >> text >> empty;
           return text.length() == 50 ? S_OK : E_UNEXPECTED;
         });
       }},
      {"CztOutStream::CreateSubStream", WithLoaded([](const MemoryPtr& s) {
         CztOutStream out(s.get());
         auto made = CztComPtr<IztStream>::Attach(out.CreateSubStream(zt::fnd::String(L"x")));
         return made ? S_OK : E_OUTOFMEMORY;
       })},
      {"CztInStream::OpenSubStream", WithLoaded([](const MemoryPtr& s) {
         { CztOutStream out(s.get()); }
         s->Seek(0, ztSeekBegin, nullptr);
         CztInStream in(s.get());
         auto found = CztComPtr<IztStream>::Attach(in.OpenSubStream(zt::fnd::String(L"b")));
         return found ? S_OK : E_OUTOFMEMORY;
       })},
  };
}

// A file with an area is opened, changed and closed. Its own data stands there after every attempt.
std::vector<Call> FileCalls(const std::string& file) {
  auto open = [file](bool truncate, bool write) {
    return Told([&]() -> HRESULT {
      auto stream = CztComPtr<CztFileStream>::Attach(
          CztFileStream::CreateStream(zt::fnd::String(file.c_str()), truncate, true, write));
      if (!stream) return E_FAIL;
      CztComPtr<IztStream> out;
      if (!write) return stream->OpenSubStream(L"b", out.out());
      return stream->CreateSubStream(L"another", out.out());
    });
  };
  auto keepsItsData = [file](bool) { return ReadBytes(file).substr(0, 4) == "data"; };
  return {{"CztFileStream for reading", [file, open] { return open(false, false); },
           [file](bool) { return ReadBytes(file) == NestedBytes(); }},
          {"CztFileStream for writing",
           [file, open] {
             // Where the reader's lengths have the writer's width the file reads back as it is.
             HRESULT result = open(false, true);
             int fd = ::open(file.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC);
             if (write(fd, NestedBytes().data(), NestedBytes().size()) < 0) result = E_FAIL;
             close(fd);
             return result;
           },
           keepsItsData}};
}

class ztStreamMemory : public testing::TestWithParam<bool> {
 protected:
  void SetUp() override {
    if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer has a malloc of its own";
  }
};

TEST_P(ztStreamMemory, EveryOperationSurvivesEveryFailedAllocation) {
  TempDir dir;
  WriteBytes(dir / "file", NestedBytes());
  std::vector<Call> calls = MemoryCalls();
  for (auto& more : {TypedCalls(), FileCalls(dir / "file")}) {
    calls.insert(calls.end(), more.begin(), more.end());
  }
  long total = 0;
  for (const Call& call : calls) {
    Child child([&] {
      long tried = 0;
      heap::Trouble trouble = heap::Sweep(call, GetParam(), &tried);
      WriteBytes(dir / "tried", std::to_string(tried));
      return static_cast<int>(trouble);
    });
    EXPECT_EQ(child.wait(), heap::kNone) << call.name;
    total += std::stol(ReadBytes(dir / "tried"));
  }
  printf("%zu operations of streams, %ld allocations failed (%s)\n", calls.size(), total,
         GetParam() ? "and all behind them" : "one at a time");
  EXPECT_GT(total, 200);
}

INSTANTIATE_TEST_SUITE_P(Failures, ztStreamMemory, testing::Bool(),
                         [](const auto& info) { return info.param ? "ForEver" : "Once"; });

// ---- What is cut leaves nothing

// Blocks more than before after all truncations of the bytes were read.
template <class ReadOne>
long Left(const std::string& bytes, ReadOne read) {
  for (size_t size = 0; size < bytes.size(); ++size) read(bytes.substr(0, size));
  long before = heap::g_live;
  for (size_t size = 0; size < bytes.size(); ++size) read(bytes.substr(0, size));
  return heap::g_live - before;
}

TEST(ztStreamMemoryOfCutInput, AreasLeaveNothing) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer counts its own blocks, and tells of leaks";
  std::string area = NestedBytes().substr(0, NestedBytes().size() - 24);
  EXPECT_EQ(Left(area,
                 [](const std::string& cut) {
                   MemoryPtr stream = NewMemory();
                   WhatThrows([&] { Load(stream, cut + Trailer(4)); });
                 }),
            0);
}

TEST(ztStreamMemoryOfCutInput, TypedValuesLeaveNothing) {
  if (!kCanLimitMemory) GTEST_SKIP() << "the sanitizer counts its own blocks, and tells of leaks";
  for (Order order : {Order::Little, Order::Big}) {
    std::string bytes = Header(1, 2, 3, order) + LongNumber(100, order) + std::string(100, 't') +
                        LongNumber(1, order) + Number(2, 2, order) + Number(3, 2, order) +
                        std::string(8, 'g');
    EXPECT_EQ(Left(bytes,
                   [](const std::string& cut) {
                     MemoryPtr stream = MemoryOf(cut);
                     WhatThrows([&] {
                       CztInStream in(stream.get());
                       zt::fnd::AnsiString text;
                       GUID guid;
                       in >> text >> guid;
                     });
                   }),
              0);
  }
}

}  // namespace
}  // namespace vlt::test

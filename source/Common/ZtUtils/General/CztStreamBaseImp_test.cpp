#include "source/Common/ZtUtils/General/CztStreamBaseImp.h"

#include <gtest/gtest.h>

#include "tests/support/FailingHeap.h"
#include "tests/support/SlotOf.h"
#include "tests/support/StreamBytes.h"
#include "zt/fnd/Guid.h"
#include "ztcom/ztcore/ztmemmgr.h"

namespace vlt::test {
namespace {

TEST(CztStreamBaseImpInterfaces, SlotsStandInOrder) {
  EXPECT_EQ(SlotOf(&IUnknown::Release), 2u);
  EXPECT_EQ(SlotOf(&IztStream::Read), 3u);
  EXPECT_EQ(SlotOf(&IztStream::Write), 4u);
  EXPECT_EQ(SlotOf(&IztStream::Seek), 5u);
  EXPECT_EQ(SlotOf(&IztStream::SetSize), 6u);
  EXPECT_EQ(SlotOf(&IztStream::Flush), 7u);
  EXPECT_EQ(SlotOf(&IztStream2::LoadSubStreamInfo), 8u);
  EXPECT_EQ(SlotOf(&IztStream2::WriteSubStreamInfo), 9u);
  EXPECT_EQ(SlotOf(&IztStream2::OpenSubStream), 10u);
  EXPECT_EQ(SlotOf(&IztStream2::CreateSubStream), 11u);
  EXPECT_EQ(SlotOf(&IztStream2::DeleteSubStream), 12u);
  EXPECT_EQ(SlotOf(&IztStream2::ResetStreams), 13u);
  EXPECT_EQ(SlotOf(&IztStream2::ClearStreams), 14u);
  EXPECT_EQ(SlotOf(&IztStream2::NumSubStreams), 15u);
  EXPECT_EQ(SlotOf(&IztStream2::GetSubStreamInfo), 16u);
  EXPECT_EQ(SlotOf(&IztStream3::Clone), 17u);
}

TEST(CztStreamBaseImp, EveryInterfaceIsTheSamePointer) {
  MemoryPtr stream = NewMemory();
  for (const GUID& iid : {IID_IUnknown, IID_IztStream, IID_IztStream2, IID_IztStream3}) {
    void* out = nullptr;
    EXPECT_EQ(stream->QueryInterface(iid, &out), S_OK);
    EXPECT_EQ(out, static_cast<IztStream3*>(stream.get()));
    stream->Release();
  }
  void* out = stream.get();
  EXPECT_EQ(stream->QueryInterface(GUID{1, 2, 3, {}}, &out), E_NOINTERFACE);
  EXPECT_EQ(out, nullptr);
}

TEST(CztStreamBaseImp, MarkerBytesAreThoseOfTheFormat) {
  const auto bytes = zt::fnd::GuidBytes(CztStreamBaseImp::s_SubStreamMarker);
  EXPECT_EQ(Hexed(std::string(bytes.begin(), bytes.end())),
            "A1 BB 00 D3 D6 C3 CF 47 B7 52 CB 9F FD 8A BC CC ");
}

TEST(CztStreamBaseImp, OpenOfAMissingOneNullsThePointer) {
  MemoryPtr stream = NewMemory();
  auto* out = reinterpret_cast<IztStream*>(1);
  EXPECT_EQ(stream->OpenSubStream(L"one", &out), S_FALSE);
  EXPECT_EQ(out, nullptr);
}

TEST(CztStreamBaseImp, CreateMakesOnceAndOpensAfterwards) {
  MemoryPtr stream = NewMemory();
  CztComPtr<IztStream> one = Made(stream.get(), L"one", "abc");
  EXPECT_EQ(Made(stream.get(), L"one").get(), one.get());
  EXPECT_EQ(Opened(stream.get(), L"one").get(), one.get());
  EXPECT_EQ(Position(one.get()), 3);  // where it was left
  EXPECT_EQ(Count(stream.get()), 1u);
  EXPECT_EQ(one->AddRef(), 3u);  // mine, the map's, this
  one->Release();
}

TEST(CztStreamBaseImp, ANullNameIsAnEmptyOne) {
  MemoryPtr stream = NewMemory();
  CztComPtr<IztStream> one = Made(stream.get(), nullptr);
  EXPECT_EQ(Opened(stream.get(), L"").get(), one.get());
  EXPECT_EQ(Opened(stream.get(), nullptr).get(), one.get());
  EXPECT_EQ(stream->DeleteSubStream(nullptr), S_OK);
}

TEST(CztStreamBaseImp, NullPointersAreRefused) {
  MemoryPtr stream = NewMemory();
  wchar_t** names = nullptr;
  unsigned count = 0;
  EXPECT_EQ(stream->OpenSubStream(L"a", nullptr), E_POINTER);
  EXPECT_EQ(stream->CreateSubStream(L"a", nullptr), E_POINTER);
  EXPECT_EQ(stream->NumSubStreams(nullptr), E_POINTER);
  EXPECT_EQ(stream->GetSubStreamInfo(nullptr, &count), E_POINTER);
  EXPECT_EQ(stream->GetSubStreamInfo(&names, nullptr), E_POINTER);
  EXPECT_EQ(stream->Clone(nullptr), E_FAIL);
  EXPECT_EQ(Count(stream.get()), 0u);
}

TEST(CztStreamBaseImp, DeleteTakesTheNameAndLeavesReferences) {
  MemoryPtr stream = NewMemory();
  CztComPtr<IztStream> one = Made(stream.get(), L"one", "abc");
  EXPECT_EQ(stream->DeleteSubStream(L"two"), S_FALSE);
  EXPECT_EQ(stream->DeleteSubStream(L"ONE"), S_OK);
  EXPECT_EQ(stream->DeleteSubStream(L"one"), S_FALSE);
  EXPECT_EQ(Count(stream.get()), 0u);
  EXPECT_EQ(Contents(one.get()), "abc");
  EXPECT_EQ(one->AddRef(), 2u);
  one->Release();
}

TEST(CztStreamBaseImp, OnAStreamThatIsNotWritable) {
  std::string bytes = "abc";
  MemoryPtr stream = NewMemory();
  stream->AttachBuffer(reinterpret_cast<unsigned char*>(bytes.data()), 3, true);
  Made(stream.get(), L"one", "1");  // can be made,
  EXPECT_EQ(stream->DeleteSubStream(L"one"), E_FAIL);
  EXPECT_EQ(stream->DeleteSubStream(L"missing"), E_FAIL);
  EXPECT_EQ(stream->ClearStreams(), E_FAIL);
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);  // and is not written
  EXPECT_EQ(Contents(stream.get()), "abc");
  EXPECT_EQ(Count(stream.get()), 1u);
}

std::vector<std::wstring> NamesOf(IztStream2* stream) {
  wchar_t** names = nullptr;
  unsigned count = 99;
  EXPECT_EQ(stream->GetSubStreamInfo(&names, &count), S_OK);
  EXPECT_EQ(names != nullptr, count > 0);
  std::vector<std::wstring> found;
  for (unsigned i = 0; i < count; ++i) {
    found.push_back(names[i]);
    ZtSysFreeString(names[i]);
  }
  ZtTaskMemFree(names);
  return found;
}

TEST(CztStreamBaseImp, NamesComeInOrderWhateverTheCase) {
  MemoryPtr stream = NewMemory();
  EXPECT_TRUE(NamesOf(stream.get()).empty());
  for (const wchar_t* name : {L"b", L"C", L"a", L"", L"_", L"A"}) Made(stream.get(), name);
  EXPECT_EQ(Count(stream.get()), 5u);
  EXPECT_EQ(NamesOf(stream.get()), (std::vector<std::wstring>{L"", L"a", L"b", L"C", L"_"}));
}

TEST(CztStreamBaseImp, ResetGoesThroughAllLevels) {
  MemoryPtr stream = MemoryOf("abc");
  stream->Seek(2, ztSeekBegin, nullptr);
  CztComPtr<IztStream> one = Made(stream.get(), L"one", "abc");
  CztComPtr<IztStream> deep = Made(Nested(one).get(), L"deep", "abcd");
  EXPECT_EQ(stream->ResetStreams(), S_OK);
  EXPECT_EQ(Position(stream.get()), 0);
  EXPECT_EQ(Position(one.get()), 0);
  EXPECT_EQ(Position(deep.get()), 0);
  EXPECT_EQ(Contents(deep.get()), "abcd");
}

TEST(CztStreamBaseImp, ClearLetsThemBeLoadedAndWrittenAgain) {
  MemoryPtr stream = Attached(WithArea("data", {{L"one", "1"}}));
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  EXPECT_EQ(stream->ClearStreams(), S_OK);
  EXPECT_EQ(Count(stream.get()), 0u);
  EXPECT_EQ(Contents(stream.get()), "");
  Put(stream.get(), WithArea("new", {{L"two", "2"}}));
  EXPECT_EQ(stream->LoadSubStreamInfo(1), S_OK);
  EXPECT_EQ(Contents(stream.get()), "new");
  EXPECT_EQ(stream->WriteSubStreamInfo(), S_OK);
  EXPECT_EQ(Contents(stream.get()), WithArea("new", {{L"two", "2"}}, Width::Writer));
}

// ---- Clone

TEST(CztStreamBaseImp, CloneCopiesContentsAndSubStreams) {
  MemoryPtr source = MemoryOf("data");
  CztComPtr<IztStream> one = Made(source.get(), L"one", "first");
  Made(Nested(one).get(), L"deep", "d");
  Made(source.get(), L"empty");
  MemoryPtr target = MemoryOf("in front ");
  target->Seek(0, ztSeekEnd, nullptr);
  Made(target.get(), L"ONE", "[");
  EXPECT_EQ(source->Clone(target.get()), S_OK);
  EXPECT_EQ(Contents(target.get()), "in front data");
  EXPECT_EQ(Position(source.get()), 4);
  EXPECT_EQ(Count(target.get()), 2u);
  EXPECT_EQ(ContentsOf(target.get(), L"one"), "[first");
  EXPECT_EQ(ContentsOf(target.get(), L"empty"), "");
  EXPECT_EQ(ContentsOf(Nested(Opened(target.get(), L"one")).get(), L"deep"), "d");
  EXPECT_EQ(target->AddRef(), 2u);  // no reference was kept
  target->Release();
}

TEST(CztStreamBaseImp, CloneOfAnEmptyStreamWritesNothing) {
  MemoryPtr target = NewMemory();
  EXPECT_EQ(NewMemory()->Clone(target.get()), S_OK);
  EXPECT_EQ(target->GetBuffer(), nullptr);
}

TEST(CztStreamBaseImp, CloneOfAReadOnlyStreamCopiesAreaAndSubStreams) {
  std::string bytes = WithArea("data", {{L"one", "1"}});
  MemoryPtr source = NewMemory();
  source->AttachBuffer(reinterpret_cast<unsigned char*>(bytes.data()), bytes.size(), true);
  MemoryPtr target = NewMemory();
  EXPECT_EQ(source->Clone(target.get()), S_OK);
  EXPECT_EQ(Contents(target.get()), bytes);
  EXPECT_EQ(ContentsOf(target.get(), L"one"), "1");
}

TEST(CztStreamBaseImp, CloneNeedsSubStreamsAndRoomInTheTarget) {
  ForeignStream foreign;
  MemoryPtr source = MemoryOf("data");
  EXPECT_EQ(source->Clone(&foreign), E_FAIL);
  EXPECT_TRUE(foreign.pieces.empty());
  EXPECT_EQ(foreign.references, 1);
  std::string bytes = "fixed";
  MemoryPtr fixed = NewMemory();
  fixed->AttachBuffer(reinterpret_cast<unsigned char*>(bytes.data()), bytes.size(), true);
  Made(source.get(), L"one", "1");
  EXPECT_EQ(source->Clone(fixed.get()), E_OUTOFMEMORY);
  EXPECT_EQ(Count(fixed.get()), 0u);
}

// ---- Memory runs out

// Fails each allocation in turn until the operation succeeds; returns how many there were.
template <class Operation>
int FailEach(Operation operation) {
  for (int nth = 1;; ++nth) {
    MemoryPtr target = NewMemory();
    FailAllocation fail(nth);
    HRESULT result = operation(target.get());
    if (!fail.happened()) {
      EXPECT_EQ(result, S_OK);
      return nth - 1;
    }
    EXPECT_EQ(result, E_OUTOFMEMORY) << nth;
    EXPECT_EQ(Count(target.get()), 0u);
  }
}

TEST(CztStreamBaseImp, CreateWithoutMemoryMakesNothing) {
  int failures = FailEach([&](CztMemoryStream* stream) {
    CztComPtr<IztStream> out;
    return stream->CreateSubStream(L"one", out.out());
  });
  EXPECT_EQ(failures, 2);  // the stream and its place in the map
}

TEST(CztStreamBaseImp, CloneWithoutMemoryTellsIt) {
  MemoryPtr source = MemoryOf("data");
  Made(source.get(), L"one", "1");
  int failures = FailEach([&](CztMemoryStream* target) { return source->Clone(target); });
  EXPECT_EQ(failures, 2);
}

}  // namespace
}  // namespace vlt::test

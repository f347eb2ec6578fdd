#include "source/xcomponentStream.h"

#include <gtest/gtest.h>

#include <clocale>
#include <set>

#include "source/vlrHelpers.h"
#include "tests/support/FailingHeap.h"
#include "tests/support/InChild.h"
#include "tests/support/MemoryLimit.h"
#include "tests/support/ScopedLocale.h"
#include "tests/support/StreamBytes.h"
#include "ztcom/ztcore/ztmemmgr.h"

namespace vlt::test {
namespace {

constexpr bool kLongIs8 = sizeof(unsigned long) == 8;
constexpr uint32_t kRecordSize = sizeof(void*) == 8 ? 112 : 72;
constexpr GUID kGuid = {
    0x00112233, 0x4455, 0x6677, {0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF}};

wchar_t* Text(const wchar_t* text) {
  wchar_t* copy = nullptr;
  CvltComponent::DuplicateStringNullOK(text, &copy);
  return copy;
}

// A component with every field set; `texts` null gives null pointers.
void Fill(CvltComponent& component, int32_t type, bool texts = true) {
  auto text = [texts](const wchar_t* t) { return texts ? Text(t) : nullptr; };
  _vltComponent2& r = component.record();
  r.version = 3;
  r.type = static_cast<_vltComponentType>(type);
  r.name = text(L"Name");
  r.identifier = kGuid;
  r.fileName = text(L"/f");
  memcpy(r.opaqueQuad, "12345678", 8);
  r.opaqueWord = -2;
  if (type == vltComponentDataDictionary) {
    r.dictionary = {0x01020304, text(L"aux"), text(L"vl"), 1, text(L""), 0xFFFFFFFF};
  } else if (type == vltComponentResourceExpert) {
    r.resource.pnp = text(L"PNP0");
  } else if (type >= 4 && type <= 7) {
    r.expert = {5, -6};
  }
}

// A record in bytes: in the writer's widths, or those that a reader asks for.
class RecordBytes {
 public:
  explicit RecordBytes(Width width, Order order = Order::Little) : m_width(width), m_order(order) {}

  RecordBytes& number(uint64_t value, size_t sizeBytes = 4) {
    bytes += Number(value, sizeBytes, m_order);
    return *this;
  }
  RecordBytes& wide(uint64_t value) {
    return number(value, m_width == Width::Writer ? 4 : sizeof(unsigned long));
  }
  RecordBytes& text(const std::string& t) {
    wide(t.size());
    return raw(t);
  }
  RecordBytes& raw(const std::string& t) {
    bytes += t;
    return *this;
  }
  RecordBytes& common(int32_t type, bool texts = true) {
    number(kRecordSize).number(3).number(static_cast<uint32_t>(type));
    text(texts ? "Name" : "").wide(0x00112233).number(0x4455, 2).number(0x6677, 2);
    raw(FromHex("8899AABBCCDDEEFF")).text(texts ? "/f" : "").raw("12345678");
    return number(0xFFFFFFFE);
  }
  RecordBytes& variant(int32_t type, bool texts = true) {
    if (type == vltComponentDataDictionary) {
      number(0x01020304).text(texts ? "aux" : "").text(texts ? "vl" : "").number(1);
      return text("").number(0xFFFFFFFF);
    }
    if (type == vltComponentResourceExpert) return text(texts ? "PNP0" : "");
    if (type >= 4 && type <= 7) return number(5).number(0xFFFFFFFA);
    return *this;
  }

  std::string bytes;

 private:
  Width m_width;
  Order m_order;
};

std::string Record(int32_t type, Width width, Order order = Order::Little) {
  return RecordBytes(width, order).common(type).variant(type).bytes;
}

std::string Written(const CvltComponent& component) {
  MemoryPtr stream = NewMemory();
  CztOutStream out(stream.get());
  out << component;
  return Contents(stream.get()).substr(13);
}

constexpr int32_t kTypes[] = {0, 1, 2, 3, 4, 5, 6, 7, 8, 99, -1};

// ---- Writing

TEST(xcomponentStream, BytesOfADictionary) {
  CvltComponent component;
  Fill(component, vltComponentDataDictionary);
  EXPECT_EQ(Hexed(Written(component)),
            (kRecordSize == 112 ? "70 00 00 00 " : "48 00 00 00 ") +
                std::string("03 00 00 00 02 00 00 00 "
                            "04 00 00 00 4E 61 6D 65 "
                            "33 22 11 00 55 44 77 66 88 99 AA BB CC DD EE FF "
                            "02 00 00 00 2F 66 "
                            "31 32 33 34 35 36 37 38 FE FF FF FF "
                            "04 03 02 01 03 00 00 00 61 75 78 02 00 00 00 76 6C 01 00 00 00 "
                            "00 00 00 00 FF FF FF FF "));
}

TEST(xcomponentStream, EveryTypeHasItsVariant) {
  for (int32_t type : kTypes) {
    CvltComponent component;
    Fill(component, type);
    EXPECT_EQ(Hexed(Written(component)), Hexed(Record(type, Width::Writer))) << type;
  }
}

TEST(xcomponentStream, NullTextsAreFourZeroBytes) {
  for (int32_t type : {2, 5}) {
    CvltComponent component;
    Fill(component, type, false);
    EXPECT_EQ(Hexed(Written(component)),
              Hexed(RecordBytes(Width::Writer).common(type, false).variant(type, false).bytes));
  }
}

TEST(xcomponentStream, TextsGoOutInTheLocalesEncoding) {
  CvltComponent component;
  component.record().name = Text(L"\u00E9");
  EXPECT_EQ(Hexed(Written(component).substr(12, 5)), "01 00 00 00 3F ");
  ScopedLocale utf8(LC_CTYPE, "C.UTF-8");
  EXPECT_EQ(Hexed(Written(component).substr(12, 6)), "02 00 00 00 C3 A9 ");
}

TEST(xcomponentStream, OneWriteAField) {
  CvltComponent component;
  Fill(component, vltComponentResourceExpert);
  ForeignStream stream;
  CztOutStream out(&stream);
  out << component;
  std::vector<size_t> sizes;
  for (size_t i = 4; i < stream.pieces.size(); ++i) sizes.push_back(stream.pieces[i].size());
  EXPECT_EQ(sizes, (std::vector<size_t>{4, 4, 4, 4, 4, 4, 2, 2, 1, 1, 1,
                                        1, 1, 1, 1, 1, 4, 2, 8, 4, 4, 4}));
}

// The calls of a dictionary's record, after the header's four, whose results do not matter.
TEST(xcomponentStream, AFailedNumberThrowsAndAFailedTextDoesNot) {
  CvltComponent component;
  Fill(component, vltComponentDataDictionary);
  ForeignStream whole;
  CztOutStream first(&whole);
  first << component;
  int unexamined = 0;
  for (int nth = 5; nth <= whole.calls(); ++nth) {
    ForeignStream stream;
    stream.failAt = nth;
    CztOutStream out(&stream);
    Thrown thrown = WhatThrows([&] { out << component; });
    const std::string& piece = whole.pieces[static_cast<size_t>(nth - 1)];
    bool opaque =
        piece == "Name" || piece == "/f" || piece == "12345678" || piece == "aux" || piece == "vl";
    unexamined += opaque;
    EXPECT_EQ(thrown, opaque ? Thrown::Nothing : Thrown::Stream) << nth;
  }
  EXPECT_EQ(unexamined, 5);
}

// ---- Reading

std::wstring W(const wchar_t* text) { return text ? text : L"(null)"; }

void ExpectFilled(const CvltComponent& component, int32_t type) {
  const _vltComponent2& r = component.record();
  EXPECT_EQ(r.size, kRecordSize);
  EXPECT_EQ(r.version, 3u);
  EXPECT_EQ(r.type, type);
  EXPECT_EQ(W(r.name), L"Name");
  EXPECT_EQ(memcmp(&r.identifier, &kGuid, sizeof kGuid), 0);
  EXPECT_EQ(W(r.fileName), L"/f");
  EXPECT_EQ(memcmp(r.opaqueQuad, "12345678", 8), 0);
  EXPECT_EQ(r.opaqueWord, -2);
  if (type == vltComponentDataDictionary) {
    EXPECT_EQ(r.dictionary.schemaVersion, 0x01020304u);
    EXPECT_EQ(W(r.dictionary.auxString1), L"aux");
    EXPECT_EQ(W(r.dictionary.prefix), L"vl");
    EXPECT_EQ(r.dictionary.fragmentRegistered, 1u);
    EXPECT_EQ(W(r.dictionary.auxString2), L"");  // length 0 is an empty text, not a null
    EXPECT_EQ(r.dictionary.lastInstalledSchemaVersion, 0xFFFFFFFFu);
  } else if (type == vltComponentResourceExpert) {
    EXPECT_EQ(W(r.resource.pnp), L"PNP0");
  } else if (type >= 4 && type <= 7) {
    EXPECT_EQ(r.expert.expertWord0, 5);
    EXPECT_EQ(r.expert.expertWord1, -6);
  }
}

// Reads a record after a header of that order; returns what came, with the stream at its end.
Thrown Read(const std::string& record, CvltComponent& component, Order order = Order::Little,
            size_t* consumed = nullptr) {
  MemoryPtr stream = MemoryOf(Header(0, 0, 0, order) + record);
  CztInStream in(stream.get());
  Thrown thrown = WhatThrows([&] { in >> component; });
  if (consumed) *consumed = static_cast<size_t>(Position(stream.get())) - 13;
  return thrown;
}

TEST(xcomponentStream, EveryTypeReadsBackInBothByteOrders) {
  for (Order order : {Order::Little, Order::Big}) {
    for (int32_t type : kTypes) {
      std::string record = Record(type, Width::Reader, order);
      CvltComponent component;
      size_t consumed = 0;
      EXPECT_EQ(Read(record + "behind", component, order, &consumed), Thrown::Nothing) << type;
      EXPECT_EQ(consumed, record.size()) << type;
      ExpectFilled(component, type);
    }
  }
}

TEST(xcomponentStream, DataOneKeepsTheLowHalfOfALong) {
  if (!kLongIs8) GTEST_SKIP() << "a long has no upper half";
  for (Order order : {Order::Little, Order::Big}) {
    std::string record = Record(4, Width::Reader, order);
    // Behind size, version, type and the name; the upper half of the eight bytes.
    record[12 + 8 + 4 + (order == Order::Little ? 7 : 0)] = 0x55;
    CvltComponent component;
    EXPECT_EQ(Read(record, component, order), Thrown::Nothing);
    EXPECT_EQ(component.record().identifier.Data1, 0x00112233u);
  }
}

TEST(xcomponentStream, OwnRecordsReadBackWhereLongIsFourBytes) {
  for (int32_t type : kTypes) {
    CvltComponent written, read;
    Fill(written, type);
    Thrown thrown = Read(Written(written), read);
    if (kLongIs8) {
      EXPECT_EQ(thrown, Thrown::OutOfRange) << type;  // the length takes four characters with it
    } else {
      EXPECT_EQ(thrown, Thrown::Nothing) << type;
      ExpectFilled(read, type);
    }
  }
}

TEST(xcomponentStream, AnotherRecordSizeIsAnotherVersion) {
  for (uint32_t size : {kRecordSize == 112 ? 72u : 112u, 120u, 76u, 0u, 0x70000000u}) {
    CvltComponent component;
    size_t consumed = 0;
    std::string record = Number(size, 4) + Record(2, Width::Reader).substr(4);
    EXPECT_EQ(Read(record, component, Order::Little, &consumed), Thrown::Version) << size;
    EXPECT_EQ(consumed, 4u);
    EXPECT_EQ(component.record().size, size);
    EXPECT_EQ(component.record().version, 0xFFFFFFFFu);
    EXPECT_EQ(component.record().name, nullptr);
  }
}

TEST(xcomponentStream, OldTextsAreNotFreed) {
  CvltComponent component;
  Fill(component, 5);
  wchar_t *name = component.record().name, *file = component.record().fileName,
          *pnp = component.record().resource.pnp;
  EXPECT_EQ(Read(Record(5, Width::Reader), component), Thrown::Nothing);
  ExpectFilled(component, 5);
  EXPECT_NE(component.record().name, name);
  EXPECT_EQ(W(name) + W(file) + W(pnp), L"Name/fPNP0");
  for (wchar_t* text : {name, file, pnp}) ZtTaskMemFree(text);
}

TEST(xcomponentStream, TextsEndAtTheirFirstZero) {
  RecordBytes record(Width::Reader);
  record.number(kRecordSize).number(3).number(0).text(std::string("ab\0cd", 5)).wide(1);
  record.number(2, 2).number(3, 2).raw(std::string(8, 'g')).text("file").raw("12345678").number(9);
  CvltComponent component;
  EXPECT_EQ(Read(record.bytes, component), Thrown::Nothing);
  EXPECT_EQ(W(component.record().name), L"ab");
  EXPECT_EQ(W(component.record().fileName), L"file");
  EXPECT_EQ(component.record().opaqueWord, 9);
}

TEST(xcomponentStream, LongTextsReadWhole) {
  std::string name(200000, 'n');
  RecordBytes record(Width::Reader);
  record.number(kRecordSize).number(3).number(0).text(name).wide(1).number(2, 2).number(3, 2);
  record.raw(std::string(8, 'g')).text("").raw("12345678").number(9);
  CvltComponent component;
  EXPECT_EQ(Read(record.bytes, component), Thrown::Nothing);
  EXPECT_EQ(W(component.record().name), std::wstring(200000, L'n'));
}

// ---- Failures

TEST(xcomponentStream, EveryTruncationPoint) {
  for (Order order : {Order::Little, Order::Big}) {
    for (int32_t type : kTypes) {
      std::string whole = Record(type, Width::Reader, order);
      for (size_t size = 0; size < whole.size(); ++size) {
        CvltComponent component;
        // The bytes of a text are not examined, and after those of pnp nothing follows.
        bool inPnp = type == vltComponentResourceExpert && size >= whole.size() - 4;
        EXPECT_EQ(Read(whole.substr(0, size), component, order),
                  inPnp ? Thrown::Nothing : Thrown::EndOfStream)
            << type << " " << size;
        if (inPnp) {
          EXPECT_EQ(W(component.record().resource.pnp),
                    std::wstring(L"PNP0", size - (whole.size() - 4)));
        }
      }
    }
  }
}

TEST(xcomponentStream, WhatWasReadStays) {
  std::string whole = Record(2, Width::Reader);
  CvltComponent component;
  // Without fragmentRegistered and what follows it.
  size_t cut = 4 + LongNumber(0).size() + 4;
  EXPECT_EQ(Read(whole.substr(0, whole.size() - cut), component), Thrown::EndOfStream);
  EXPECT_EQ(W(component.record().name), L"Name");
  EXPECT_EQ(W(component.record().fileName), L"/f");
  EXPECT_EQ(W(component.record().dictionary.prefix), L"vl");
  EXPECT_EQ(component.record().dictionary.auxString2, nullptr);
}

TEST(xcomponentStream, FailedReadsByTheirPlace) {
  ForeignStream whole;
  whole.input = Header() + Record(2, Width::Reader);
  {
    CztInStream in(&whole);
    CvltComponent component;
    in >> component;
  }
  ASSERT_EQ(whole.calls(), 32);
  // The bytes of name, fileName, opaqueQuad, auxString1 and prefix.
  const std::set<int> unexamined = {9, 22, 23, 27, 29};
  for (int nth = 5; nth <= whole.calls(); ++nth) {
    for (HRESULT failure : {ZT_E_END_OF_STREAM, E_FAIL}) {
      ForeignStream stream;
      stream.input = whole.input;
      stream.failAt = nth;
      stream.failure = failure;
      CztInStream in(&stream);
      CvltComponent component;
      Thrown expected = failure == E_FAIL ? Thrown::Stream : Thrown::EndOfStream;
      if (unexamined.count(nth) > 0) expected = Thrown::Nothing;
      EXPECT_EQ(WhatThrows([&] { in >> component; }), expected) << nth;
      EXPECT_TRUE(nth != 9 || W(component.record().name).empty());
    }
  }
}

TEST(xcomponentStream, LengthsBeyond32BitsAreOutOfRange) {
  if (!kLongIs8) GTEST_SKIP() << "a length has 32 bits";
  for (uint64_t length : {uint64_t{0x100000000}, ~uint64_t{0}}) {
    CvltComponent component;
    std::string record = Number(kRecordSize, 4) + Number(3, 4) + Number(2, 4) + Number(length, 8);
    EXPECT_EQ(Read(record + std::string(100, 'x'), component), Thrown::OutOfRange);
    EXPECT_EQ(component.record().name, nullptr);
  }
}

TEST_IN_CHILD(xcomponentStream, UntrueLengthsTakeNoMemory) {
  if (kCanLimitMemory) LimitMemoryTo(32 << 20);
  CvltComponent component;
  std::string record =
      Number(kRecordSize, 4) + Number(3, 4) + Number(2, 4) + LongNumber(0xFFFFFFFF) + "abc";
  EXPECT_EQ(Read(record, component), Thrown::EndOfStream);
  EXPECT_EQ(W(component.record().name), L"abc");  // the missing bytes are zeros
}

TEST(xcomponentStream, AnotherTypesVariantIsNeverTakenForTexts) {
  std::string whole = Record(2, Width::Reader);
  for (size_t size = 12; size < whole.size(); ++size) {
    CvltComponent component;
    Fill(component, vltComponentObjectExpert, false);
    component.record().expert = {0x41414141, 0x41414141};
    EXPECT_EQ(Read(whole.substr(0, size), component), Thrown::EndOfStream);
  }
  CvltComponent cleared;
  Fill(cleared, vltComponentDataDictionary);
  cleared.Clear();  // leaves dangling pointers in the variant
  EXPECT_EQ(Read(whole.substr(0, 12), cleared), Thrown::EndOfStream);
}

TEST(xcomponentStream, WithoutMemoryTheComponentStaysSafe) {
  RecordBytes record(Width::Reader);
  std::string text(100, 't');
  record.number(kRecordSize).number(3).number(5).text(text).wide(1).number(2, 2).number(3, 2);
  record.raw(std::string(8, 'g')).text(text).raw("12345678").number(9).text(text);
  int failures = 0;
  for (int nth = 1;; ++nth) {
    MemoryPtr stream = MemoryOf(Header() + record.bytes);
    CvltComponent component;
    CztInStream in(stream.get());
    FailAllocation fail(nth);
    Thrown thrown = WhatThrows([&] { in >> component; });
    if (!fail.happened()) break;
    EXPECT_EQ(thrown, Thrown::BadAlloc);
    ++failures;
  }
  EXPECT_GE(failures, 3);
}

}  // namespace
}  // namespace vlt::test

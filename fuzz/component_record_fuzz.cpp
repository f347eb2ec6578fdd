// Component records of any bytes, in both byte orders, read, written, and read again.
//
// The first byte says what is in front of the rest: nothing, or a header, or a header and the right
// record size; and in which order and which locale.
#include <locale.h>

#include "fuzz/Bytes.h"
#include "source/xcomponentStream.h"
#include "zt/fnd/Exception.h"

namespace {

constexpr uint8_t kWithHeader = 1, kWithSize = 2, kReversed = 4, kUtf8 = 8, kInRecord = 16;

std::string Narrow(const wchar_t* text) {
  zt::fnd::AnsiString narrow(text);
  return std::string(narrow.c_str());
}

// The record's bytes as a reader asks for them, by a writer of that order.
class Encoder {
 public:
  explicit Encoder(uint8_t order) : m_order(order), bytes(fuzz::Header(order, 0, 0, 0)) {}

  template <class T>
  Encoder& number(T value) {
    bytes += fuzz::InOrder(value, m_order);
    return *this;
  }
  Encoder& text(const wchar_t* text) {
    std::string narrow = Narrow(text);
    number(static_cast<unsigned long>(narrow.size()));
    bytes += narrow;
    return *this;
  }
  Encoder& raw(const void* from, size_t count) {
    bytes.append(static_cast<const char*>(from), count);
    return *this;
  }

 private:
  uint8_t m_order;

 public:
  std::string bytes;
};

std::string Encoded(const _vltComponent2& r, uint8_t order) {
  Encoder e(order);
  e.number(r.size).number(r.version).number(static_cast<int32_t>(r.type)).text(r.name);
  e.number(static_cast<unsigned long>(r.identifier.Data1));
  e.number(r.identifier.Data2).number(r.identifier.Data3).raw(r.identifier.Data4, 8);
  e.text(r.fileName).raw(r.opaqueQuad, 8).number(r.opaqueWord);
  if (r.type == vltComponentDataDictionary) {
    const vltDictVariant& d = r.dictionary;
    e.number(d.schemaVersion).text(d.auxString1).text(d.prefix).number(d.fragmentRegistered);
    e.text(d.auxString2).number(d.lastInstalledSchemaVersion);
  } else if (r.type == vltComponentResourceExpert) {
    e.text(r.resource.pnp);
  } else if (r.type == vltComponentObjectExpert || r.type == vltComponentUIProvider ||
             r.type == vltComponentType7) {
    e.number(r.expert.expertWord0).number(r.expert.expertWord1);
  }
  return e.bytes;
}

// Components of certain names keep their texts indefinitely, as some have returned them.
struct Component : CvltComponent {
  using CvltComponent::CvltComponent;
  ~Component() { forgetName(); }
  void forgetName() {
    if (record().name) record().name[0] = 0;
  }
};

// True if a whole record was read. Nothing but the documented exceptions may come.
bool Read(const std::string& bytes, CvltComponent& component) {
  fuzz::MemoryPtr stream = fuzz::MemoryOf(bytes);
  try {
    CztInStream in(stream.get());
    in >> component;
    return true;
  } catch (const CztStreamException&) {
  } catch (const zt::fnd::exception::OutOfRange&) {
  }
  return false;
}

void WriteAndReadBack(const CvltComponent& component, uint8_t order) {
  std::string bytes = Encoded(component.record(), order);
  Component again;
  fuzz::Demand(Read(bytes, again));
  fuzz::Demand(Encoded(again.record(), order) == bytes);
  fuzz::MemoryPtr stream = fuzz::NewMemory();
  CztOutStream out(stream.get());
  out << component;
  std::string written = fuzz::Contents(stream.get());
  if (sizeof(unsigned long) == 4) {
    fuzz::Demand(written == Encoded(component.record(), 0));
  } else {
    fuzz::Demand(written.size() < bytes.size());  // Data1 and the lengths are 4 bytes shorter each
  }
}

struct Locale {
  explicit Locale(bool utf8) { setlocale(LC_ALL, utf8 ? "C.UTF-8" : "C"); }
  ~Locale() { setlocale(LC_ALL, "C"); }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  fuzz::Cursor input(data, sizeBytes);
  uint8_t what = input.byte();
  uint8_t order = what & kReversed ? 1 : 0;
  Locale locale(what & kUtf8);
  std::string bytes;
  if (what & kWithHeader) bytes += fuzz::Header(order, 0, 0, 0);
  if (what & kWithSize) bytes += fuzz::InOrder(uint32_t{sizeof(_vltComponent2)}, order);
  bytes += input.rest();
  Component component;
  bool whole = Read(bytes, component);
  // A reader that stops half-way leaves a record that can be copied and used again.
  Component copy(&component.record(), false);
  if (whole) WriteAndReadBack(component, order);
  if (what & kInRecord) {
    copy.forgetName();
    copy.Clear();
    Read(bytes, copy);
  }
  return 0;
}

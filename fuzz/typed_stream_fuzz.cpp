// Typed streams of any bytes, read as any row of values, and any row of values written and read back.
//
// The first byte counts the reads, the next ones say what each is; the rest is the stream.
#include "fuzz/Bytes.h"

namespace {

constexpr int kKinds = 8;

// What the n-th value of a stream of that byte order must be, from its bytes.
template <class T>
T Expected(const std::string& bytes, int64_t at, int32_t order) {
  std::string there = bytes.substr(static_cast<size_t>(at), sizeof(T));
  if (order != 0) std::reverse(there.begin(), there.end());
  T value;
  memcpy(&value, there.data(), sizeof value);
  return value;
}

template <class T>
void ReadNumber(CztInStream& in, const std::string& bytes) {
  int64_t at = fuzz::Position(in.GetStream());
  T value = 0;
  in >> value;
  fuzz::Demand(value == Expected<T>(bytes, at, in.GetByteOrder()));
  fuzz::Demand(fuzz::Position(in.GetStream()) == at + static_cast<int64_t>(sizeof value));
}

void ReadText(CztInStream& in, const std::string& bytes) {
  auto at = static_cast<size_t>(fuzz::Position(in.GetStream()));
  zt::fnd::AnsiString text("before");
  try {
    in >> text;
  } catch (const CztStreamException&) {
    fuzz::Demand(strcmp(text.c_str(), "before") == 0);
    throw;
  }
  at += sizeof(unsigned long);
  fuzz::Demand(at + text.length() <= bytes.size());
  fuzz::Demand(memcmp(text.c_str(), bytes.data() + at, text.length()) == 0);
}

void ReadGuid(CztInStream& in, const std::string& bytes) {
  auto at = fuzz::Position(in.GetStream());
  GUID guid = {};
  in >> guid;
  auto data1 = Expected<unsigned long>(bytes, at, in.GetByteOrder());
  fuzz::Demand(guid.Data1 == static_cast<uint32_t>(data1));
  fuzz::Demand(memcmp(guid.Data4, bytes.data() + fuzz::Position(in.GetStream()) - 8, 8) == 0);
}

void ReadOne(uint8_t kind, CztInStream& in, const std::string& bytes) {
  switch (kind % kKinds) {
    case 0:
      return ReadNumber<int32_t>(in, bytes);
    case 1:
      return ReadNumber<uint16_t>(in, bytes);
    case 2:
      return ReadNumber<unsigned char>(in, bytes);
    case 3:
      return ReadNumber<uint64_t>(in, bytes);
    case 4:
      return ReadText(in, bytes);
    case 5:
      return ReadGuid(in, bytes);
    case 6:
      in.ReadLong();
      return;
    default: {
      CztInStream inner(in);
      ReadNumber<uint32_t>(inner, bytes);
    }
  }
}

void ReadAny(const std::string& kinds, const std::string& bytes) {
  fuzz::MemoryPtr stream = fuzz::MemoryOf(bytes);
  try {
    CztInStream in(stream.get());
    for (char kind : kinds) ReadOne(static_cast<uint8_t>(kind), in, bytes);
  } catch (const CztStreamException&) {
    // The bytes ended, or gave a length that cannot be. Nothing else may come.
  }
}

// The reader's width for lengths, in which the present writer cannot write on every build.
std::string LongText(const std::string& text, uint8_t order) {
  return fuzz::InOrder(static_cast<unsigned long>(text.size()), order) + text;
}

// Values in a stream of either byte order read back as they are.
void ReadBack(uint8_t order, uint32_t number, uint16_t half, uint64_t quad,
              const std::string& text) {
  using fuzz::InOrder;
  fuzz::MemoryPtr stream = fuzz::MemoryOf(fuzz::Header(order, 1, static_cast<int32_t>(number), -3) +
                                          InOrder(number, order) + LongText(text, order) +
                                          InOrder(half, order) + InOrder(quad, order));
  CztInStream in(stream.get());
  uint32_t n;
  uint16_t h;
  uint64_t q;
  zt::fnd::AnsiString t;
  in >> n >> t >> h >> q;
  fuzz::Demand(n == number && h == half && q == quad);
  fuzz::Demand(std::string(t.c_str(), t.length()) == text);
  fuzz::Demand(in.GetMajorVersion() == 1 && in.GetSequenceNumber() == -3);
  fuzz::Demand(in.GetMinorVersion() == static_cast<int32_t>(number));
}

// What CztOutStream writes is to the byte what the format says.
void WriteAndCompare(uint32_t number, uint16_t half, uint64_t quad, const std::string& text) {
  using fuzz::InOrder;
  fuzz::MemoryPtr stream = fuzz::NewMemory();
  CztOutStream out(stream.get(), 1, 2, static_cast<int32_t>(number));
  out << number << half << quad;
  out << zt::fnd::AnsiString(text.data(), static_cast<unsigned int>(text.size()));
  CztOutStream inner(out, 4, 5, 6);
  inner << static_cast<unsigned char>(half);
  std::string expected = fuzz::Header(0, 1, 2, static_cast<int32_t>(number)) + InOrder(number, 0) +
                         InOrder(half, 0) + InOrder(quad, 0) +
                         InOrder(static_cast<uint32_t>(text.size()), 0) + text +
                         fuzz::Header(0, 4, 5, 6) + std::string(1, static_cast<char>(half));
  fuzz::Demand(fuzz::Contents(stream.get()) == expected);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  fuzz::Cursor input(data, sizeBytes);
  std::string kinds = input.text(input.byte() % 32);
  std::string bytes = input.rest();
  ReadAny(kinds, bytes);
  fuzz::Cursor values(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size());
  auto order = values.byte();
  auto number = values.number<uint32_t>();
  auto half = values.number<uint16_t>();
  auto quad = values.number<uint64_t>();
  std::string text = values.rest();
  ReadBack(order, number, half, quad, text);
  WriteAndCompare(number, half, quad, text);
  return 0;
}

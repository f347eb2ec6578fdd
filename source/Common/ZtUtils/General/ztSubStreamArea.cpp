// The reader knows how many bytes the area has and takes each value off that number before it reads
// it. Counts and lengths come from the file: a count is held against the smallest entry there can
// be, a length against what is left, and memory is taken only after that, so that no number in a
// damaged file costs more than the file's own size.
#include "source/Common/ZtUtils/General/ztSubStreamArea.h"

#include <bit>
#include <cstring>
#include <new>

#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/Guid.h"

using zt::fnd::little_endian::FromLittleEndian;
using zt::fnd::little_endian::ToLittleEndian;

namespace {

constexpr int64_t kHeaderSize = 13;
constexpr int64_t kCountSize = 4;
constexpr int64_t kDataLengthSize = 4;
constexpr uint64_t kLongestName = UINT32_MAX / sizeof(wchar_t) - 1;  // and a terminator

// Reads an area value by value and knows how many of its bytes are left.
class AreaReader {
 public:
  AreaReader(IztStream* stream, int64_t sizeBytes)
      : m_left(sizeBytes - kHeaderSize), m_in(stream) {}

  int32_t readCount() {
    take(kCountSize);
    int32_t count = 0;
    m_in >> count;
    if (count < 0 || count > m_left / kSmallestEntry) throw CztStreamException();
    return count;
  }

  CztSubStreamBlock readEntry() {
    CztSubStreamBlock entry;
    entry.name = readName();
    entry.sizeBytes = readDataLength();
    entry.data = readData(entry.sizeBytes);
    return entry;
  }

 private:
  // The reader's width for a name's length is that of long.
  static constexpr int64_t kSmallestEntry = sizeof(unsigned long) + kDataLengthSize;

  void take(int64_t sizeBytes) {
    if (m_left < sizeBytes) throw CztEndOfStreamException();
    m_left -= sizeBytes;
  }

  // The characters do not follow the header's byte order: they are little-endian.
  zt::fnd::String readName() {
    take(sizeof(unsigned long));
    uint64_t length = m_in.ReadLong();
    uint64_t there = static_cast<uint64_t>(m_left) / sizeof(wchar_t);
    if (length > there || length > kLongestName) throw CztStreamException();
    auto count = static_cast<uint32_t>(length);
    take(static_cast<int64_t>(count * sizeof(wchar_t)));
    std::vector<wchar_t> characters(count);
    readBytes(characters.data(), static_cast<uint32_t>(count * sizeof(wchar_t)));
    for (wchar_t& character : characters) character = FromLittleEndian(character);
    return zt::fnd::String(characters.data(), count);
  }

  uint32_t readDataLength() {
    take(kDataLengthSize);
    int32_t length = 0;
    m_in >> length;
    if (length < 0 || length > m_left) throw CztStreamException();
    return static_cast<uint32_t>(length);
  }

  CztOwnedBlock readData(uint32_t sizeBytes) {
    take(sizeBytes);
    // Never a block of 0 bytes, which some heaps answer with null.
    CztOwnedBlock data(static_cast<unsigned char*>(malloc(sizeBytes > 0 ? sizeBytes : 1)));
    if (!data) throw std::bad_alloc();
    readBytes(data.get(), sizeBytes);
    return data;
  }

  void readBytes(void* bytes, uint32_t count) {
    if (count > 0) ztReadStreamBytes(m_in.GetStream(), bytes, count);
  }

  int64_t m_left;
  CztInStream m_in;
};

void WriteBytes(IztStream* stream, const void* bytes, uint32_t count) {
  if (count > 0) ztWriteStreamBytes(stream, bytes, count);
}

void WriteName(IztStream* stream, const zt::fnd::String& name) {
  const uint32_t sizeBytes = name.length() * uint32_t{sizeof(wchar_t)};
  if constexpr (std::endian::native == std::endian::little) {
    WriteBytes(stream, name.c_str(), sizeBytes);
  } else {
    std::vector<wchar_t> characters(name.begin(), name.end());
    for (wchar_t& character : characters) character = ToLittleEndian(character);
    WriteBytes(stream, characters.data(), sizeBytes);
  }
}

}  // namespace

bool ReadSubStreamTrailer(IztStream* stream, int64_t streamSize, int64_t* offset) {
  const zt::fnd::GuidByteArray marker = zt::fnd::GuidBytes(kSubStreamMarker);
  unsigned char trailer[kSubStreamTrailerSize];
  stream->Seek(streamSize - kSubStreamTrailerSize, ztSeekBegin, nullptr);
  ztReadStreamBytes(stream, trailer, sizeof trailer);
  *offset = zt::fnd::little_endian::Get<int64_t>(trailer + marker.size());
  // -1 is what a stream without an area remembers, and no place.
  return memcmp(trailer, marker.data(), marker.size()) == 0 && *offset != -1;
}

std::vector<CztSubStreamBlock> ReadSubStreamArea(IztStream* stream, int64_t offset,
                                                 int64_t areaEnd) {
  if (offset < 0 || offset > areaEnd - kHeaderSize) throw CztStreamException();
  stream->Seek(offset, ztSeekBegin, nullptr);
  AreaReader reader(stream, areaEnd - offset);
  std::vector<CztSubStreamBlock> blocks;
  for (int32_t left = reader.readCount(); left > 0; --left) blocks.push_back(reader.readEntry());
  return blocks;
}

CztSubStreamAreaWriter::CztSubStreamAreaWriter(IztStream* stream, size_t count)
    : m_out(stream, 1, 0, 0) {
  // After the typed header, which the writer's constructor has put at the cursor: that is where the
  // area begins.
  m_out << static_cast<int32_t>(count);
}

void CztSubStreamAreaWriter::add(const zt::fnd::String& name, const unsigned char* bytes,
                                 int64_t sizeBytes) {
  m_out << name.length();
  WriteName(m_out.GetStream(), name);
  m_out << static_cast<int32_t>(sizeBytes);
  WriteBytes(m_out.GetStream(), bytes, static_cast<uint32_t>(sizeBytes));
}

void CztSubStreamAreaWriter::finish(int64_t start) {
  const zt::fnd::GuidByteArray marker = zt::fnd::GuidBytes(kSubStreamMarker);
  WriteBytes(m_out.GetStream(), marker.data(), marker.size());
  start = ToLittleEndian(start);
  WriteBytes(m_out.GetStream(), &start, sizeof start);
}

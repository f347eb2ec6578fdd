// Values have no tags: reader and writer agree on their order, and the header says in which byte
// order the numbers are. It is little-endian in all that this library writes, on every machine.
#include "source/Common/ZtUtils/General/ztTypedStream.h"

#include <algorithm>
#include <bit>

#include "ztcom/ztcore/ztcom.h"

namespace {

CztComPtr<IztStream2> SubStreamsOf(IztStream* stream) {
  return CztComPtr<IztStream2>::Attach(ZtTryQueryInterface<IztStream2>(IID_IztStream2, stream));
}

}  // namespace

void ztReadStreamBytes(IztStream* stream, void* bytes, unsigned int count) {
  HRESULT result = stream->Read(bytes, count, nullptr);
  // It is negative as well: the more exact class goes first.
  if (result == ZT_E_END_OF_STREAM) throw CztEndOfStreamException();
  if (result < 0) throw CztStreamException();
}

void ztWriteStreamBytes(IztStream* stream, const void* bytes, unsigned int count) {
  if (stream->Write(bytes, count, nullptr) < 0) throw CztStreamException();
}

constinit int32_t CztStreamBase::s_ModuleMajorVersion = 0;
constinit int32_t CztStreamBase::s_ModuleMinorVersion = 0;
constinit int32_t CztStreamBase::s_ModuleSequenceNumber = 0;
constinit const int32_t CztStreamBase::s_SystemByteOrder = 0;

CztStreamBase::CztStreamBase(IztStream* stream)
    : m_stream(stream),
      m_majorVersion(s_ModuleMajorVersion),
      m_minorVersion(s_ModuleMinorVersion),
      m_sequenceNumber(s_ModuleSequenceNumber),
      m_byteOrder(s_SystemByteOrder) {}

void CztStreamBase::SetModuleStreamVersion(int major, int minor, int sequence) {
  s_ModuleMajorVersion = major;
  s_ModuleMinorVersion = minor;
  s_ModuleSequenceNumber = sequence;
}

CztOutStream::CztOutStream(IztStream* stream) : CztStreamBase(stream) { writeHeader(); }

CztOutStream::CztOutStream(IztStream* stream, int major, int minor, int sequence)
    : CztStreamBase(stream) {
  m_majorVersion = major;
  m_minorVersion = minor;
  m_sequenceNumber = sequence;
  writeHeader();
}

CztOutStream::CztOutStream(const CztOutStream& outer) : CztOutStream(outer.m_stream) {}

CztOutStream::CztOutStream(const CztOutStream& outer, int major, int minor, int sequence)
    : CztOutStream(outer.m_stream, major, minor, sequence) {}

void CztOutStream::writeHeader() {
  // The byte order first and in one byte, as the rest of the header is already written in it.
  *this << static_cast<unsigned char>(m_byteOrder) << m_majorVersion << m_minorVersion
        << m_sequenceNumber;
}

CztOutStream& CztOutStream::operator<<(const zt::fnd::AnsiString& text) {
  *this << text.length();
  if (!text.empty()) ztWriteStreamBytes(m_stream, text.c_str(), text.length());
  return *this;
}

CztOutStream& CztOutStream::operator<<(const GUID& guid) {
  *this << guid.Data1 << guid.Data2 << guid.Data3;
  for (unsigned char byte : guid.Data4) *this << byte;
  return *this;
}

IztStream* CztOutStream::CreateSubStream(const zt::fnd::String& name) {
  IztStream* out = nullptr;
  CztComPtr<IztStream2> streams = SubStreamsOf(m_stream);
  return streams && streams->CreateSubStream(name.c_str(), &out) >= 0 ? out : nullptr;
}

CztInStream::CztInStream(IztStream* stream) : CztStreamBase(stream) { readHeader(); }
CztInStream::CztInStream(CztInStream& outer) : CztInStream(outer.m_stream) {}

void CztInStream::readHeader() {
  unsigned char order = 0;
  ztReadStreamBytes(m_stream, &order, sizeof order);
  // From here on numbers are read in that order, those of the header included.
  m_byteOrder = order;
  *this >> m_majorVersion >> m_minorVersion >> m_sequenceNumber;
}

void CztInStream::readNumber(void* number, unsigned int sizeBytes) {
  ztReadStreamBytes(m_stream, number, sizeBytes);
  constexpr bool kLittleHost = std::endian::native == std::endian::little;
  if ((m_byteOrder == s_SystemByteOrder) == kLittleHost) return;
  auto* bytes = static_cast<unsigned char*>(number);
  std::reverse(bytes, bytes + sizeBytes);
}

uint64_t CztInStream::ReadLong() {
  unsigned long number = 0;
  readNumber(&number, sizeof number);
  return number;
}

CztInStream& CztInStream::operator>>(zt::fnd::AnsiString& text) {
  uint64_t left = ReadLong();
  if (left > kLongestStreamText) throw CztStreamException();
  zt::fnd::AnsiString read;
  while (left > 0) {
    // The length is the writer's word; memory is taken as the bytes really come.
    auto piece = static_cast<unsigned int>(std::min(left, kStreamTextPiece));
    unsigned int start = read.length();
    read.append(piece, '\0');
    ztReadStreamBytes(m_stream, read.begin() + start, piece);
    left -= piece;
  }
  // Only now: a text that does not come whole leaves the target as it was.
  text = read;
  return *this;
}

CztInStream& CztInStream::operator>>(GUID& guid) {
  GUID read = {};
  read.Data1 = static_cast<uint32_t>(ReadLong());
  *this >> read.Data2 >> read.Data3;
  for (unsigned char& byte : read.Data4) *this >> byte;
  guid = read;
  return *this;
}

IztStream* CztInStream::OpenSubStream(const zt::fnd::String& name) {
  IztStream* out = nullptr;
  CztComPtr<IztStream2> streams = SubStreamsOf(m_stream);
  return streams && streams->OpenSubStream(name.c_str(), &out) >= 0 ? out : nullptr;
}

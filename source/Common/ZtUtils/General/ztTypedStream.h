#pragma once

#include "source/Common/ZtUtils/General/ztStreamException.h"
#include "source/Common/ZtUtils/General/ztStreamInterfaces.h"
#include "zt/fnd/ByteOrder.h"
#include "zt/fnd/String.h"

// Exactly `count` bytes, raw, by one call. A negative result throws: CztEndOfStreamException for
// ZT_E_END_OF_STREAM on reading, CztStreamException for any other.
void ztReadStreamBytes(IztStream* stream, void* bytes, unsigned int count);
void ztWriteStreamBytes(IztStream* stream, const void* bytes, unsigned int count);

// Longest text of a stream, and how much of one is read at a time, so that a length that is not
// true costs no memory. In bytes.
inline constexpr uint64_t kLongestStreamText = 0xFFFFFFFF;
inline constexpr uint64_t kStreamTextPiece = 64 * 1024;

// Stream and version of a typed stream. The byte stream is not counted: the caller keeps it alive
// for the wrapper's life.
class CztStreamBase {
 public:
  virtual ~CztStreamBase() = default;
  CztStreamBase& operator=(const CztStreamBase&) = delete;

  // The version that streams of this module get from now on. Not for use beside other threads.
  static void SetModuleStreamVersion(int major, int minor, int sequence);

  // The byte stream, without a reference: for bytes beside the typed values.
  IztStream* GetStream() const { return m_stream; }
  // Version and byte order of the header; the library itself gives them no meaning.
  int32_t GetMajorVersion() const { return m_majorVersion; }
  int32_t GetMinorVersion() const { return m_minorVersion; }
  int32_t GetSequenceNumber() const { return m_sequenceNumber; }
  int32_t GetByteOrder() const { return m_byteOrder; }

 protected:
  explicit CztStreamBase(IztStream* stream);
  CztStreamBase(const CztStreamBase&) = default;

  static int32_t s_ModuleMajorVersion, s_ModuleMinorVersion, s_ModuleSequenceNumber;
  // Of the streams that are written, on every machine. 0: little-endian; any other value of
  // m_byteOrder is the other order.
  static const int32_t s_SystemByteOrder;

  IztStream* m_stream;
  int32_t m_majorVersion, m_minorVersion, m_sequenceNumber;
  int32_t m_byteOrder;
};

// Writes values little-endian, without tags or padding, one Write a value. Every
// member and constructor throws as ztWriteStreamBytes.
class CztOutStream : public CztStreamBase {
 public:
  // Each constructor writes a header at the stream's cursor, with the module's version or the given
  // one. Copying does too: it is how a record inside a record gets a version of its own.
  explicit CztOutStream(IztStream* stream);
  CztOutStream(IztStream* stream, int major, int minor, int sequence);
  CztOutStream(const CztOutStream& outer);
  CztOutStream(const CztOutStream& outer, int major, int minor, int sequence);

  // Length in 4 bytes, then the bytes as they are.
  CztOutStream& operator<<(const zt::fnd::AnsiString& text);
  // Field by field: Data1 in 4 bytes, Data2 and Data3 in 2, the bytes of Data4.
  CztOutStream& operator<<(const GUID& guid);
  CztOutStream& operator<<(int32_t value) { return write(value); }
  CztOutStream& operator<<(uint32_t value) { return write(value); }
  CztOutStream& operator<<(int16_t value) { return write(value); }
  CztOutStream& operator<<(uint16_t value) { return write(value); }
  CztOutStream& operator<<(unsigned char value) { return write(value); }
  CztOutStream& operator<<(int64_t value) { return write(value); }
  CztOutStream& operator<<(uint64_t value) { return write(value); }

  // New or present sub-stream with a reference; null if the byte stream has none to give.
  IztStream* CreateSubStream(const zt::fnd::String& name);

 private:
  void writeHeader();
  template <class T>
  CztOutStream& write(T value) {
    value = zt::fnd::little_endian::ToLittleEndian(value);
    ztWriteStreamBytes(m_stream, &value, sizeof value);
    return *this;
  }
};

template <class T>
void ztWriteStreamValue(CztOutStream& out, const T& value) {
  out << value;
}

// Reads values in the byte order that the header states. Every member and constructor throws as
// ztReadStreamBytes; the target of a value that fails is unchanged.
class CztInStream : public CztStreamBase {
 public:
  // Each reads a header at the stream's cursor: version and byte order are then the writer's.
  explicit CztInStream(IztStream* stream);
  CztInStream(CztInStream& outer);

  // Text after a length of long width: 8 bytes on 64-bit builds, although writers give 4. This is
  // settled; only 32-bit builds read back what was written. Throws CztStreamException for a length
  // beyond 32 bits; takes no more memory than the stream has bytes.
  CztInStream& operator>>(zt::fnd::AnsiString& text);
  // Data1 in long width, likewise.
  CztInStream& operator>>(GUID& guid);
  CztInStream& operator>>(int32_t& value) { return read(value); }
  CztInStream& operator>>(uint32_t& value) { return read(value); }
  CztInStream& operator>>(int16_t& value) { return read(value); }
  CztInStream& operator>>(uint16_t& value) { return read(value); }
  CztInStream& operator>>(unsigned char& value) { return read(value); }
  CztInStream& operator>>(int64_t& value) { return read(value); }
  CztInStream& operator>>(uint64_t& value) { return read(value); }

  // A number in the width of long: 4 or 8 bytes by word size.
  uint64_t ReadLong();

  // The sub-stream with a reference; null if there is none.
  IztStream* OpenSubStream(const zt::fnd::String& name);

 private:
  void readHeader();
  void readNumber(void* number, unsigned int sizeBytes);
  template <class T>
  CztInStream& read(T& value) {
    T number = 0;
    readNumber(&number, sizeof number);
    value = number;
    return *this;
  }
};

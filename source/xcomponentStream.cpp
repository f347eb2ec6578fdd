// Both directions go through the record field by field in one order, which is the format. A number
// that the stream does not take or give ends the record with an exception; for the bytes of texts
// and of opaqueQuad the stream's result is not read, and what does not come counts as zeros.
#include "source/xcomponentStream.h"

#include <string.h>

#include <algorithm>
#include <new>
#include <string>

#include "source/vlrHelpers.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"

namespace {

constexpr int32_t kTypesWithVariant = 8;

void WriteText(CztOutStream& out, const wchar_t* text) {
  zt::fnd::AnsiString narrow(text);
  out << narrow.length();
  // Past the typed stream, which would throw: the result of these bytes is not part of the format's
  // contract.
  if (!narrow.empty()) out.GetStream()->Write(narrow.c_str(), narrow.length(), nullptr);
}

void WriteDictionary(CztOutStream& out, const vltDictVariant& dictionary) {
  out << dictionary.schemaVersion;
  WriteText(out, dictionary.auxString1);
  WriteText(out, dictionary.prefix);
  out << dictionary.fragmentRegistered;
  WriteText(out, dictionary.auxString2);
  out << dictionary.lastInstalledSchemaVersion;
}

void WriteVariant(CztOutStream& out, const _vltComponent2& record) {
  switch (record.type) {
    case vltComponentDataDictionary:
      WriteDictionary(out, record.dictionary);
      break;
    case vltComponentObjectExpert:
    case vltComponentUIProvider:
    case vltComponentType7:
      out << record.expert.expertWord0 << record.expert.expertWord1;
      break;
    case vltComponentResourceExpert:
      WriteText(out, record.resource.pnp);
      break;
    default:
      break;
  }
}

// The text's bytes up to the first zero; bytes that do not come count as zeros. Piece by piece, so
// that a length that is not true costs no memory.
std::string ReadBytes(CztInStream& in, uint64_t length) {
  std::string text;
  bool ended = false;
  std::string piece;
  for (HRESULT result = S_OK; length > 0 && result >= 0;) {
    piece.assign(std::min(length, kStreamTextPiece), '\0');
    result = in.GetStream()->Read(piece.data(), static_cast<unsigned int>(piece.size()), nullptr);
    length -= piece.size();
    if (!ended) text.append(piece.c_str());
    // What follows a zero is read, so that the stream is at the next field, and dropped.
    ended = ended || strlen(piece.c_str()) < piece.size();
  }
  return text;
}

void ReadText(CztInStream& in, wchar_t*& text) {
  uint64_t length = in.ReadLong();
  if (length > kLongestStreamText) ZT_RAISE(zt::fnd::exception::OutOfRange());
  zt::fnd::String wide(ReadBytes(in, length).c_str());
  // What the field points to is not freed: it need not be a block of the record's own.
  if (vlrDuplicateString(wide.c_str(), &text) < 0) throw std::bad_alloc();
}

void ReadType(CztInStream& in, _vltComponent2& record) {
  int32_t type = 0;
  in >> type;
  // The old variant means something else under the new type, and a reader that stops half-way must
  // not leave its bytes to be taken for texts.
  if (type != record.type) memset(&record.dictionary, 0, sizeof record.dictionary);
  record.type = static_cast<_vltComponentType>(type);
}

void ReadDictionary(CztInStream& in, vltDictVariant& dictionary) {
  in >> dictionary.schemaVersion;
  ReadText(in, dictionary.auxString1);
  ReadText(in, dictionary.prefix);
  in >> dictionary.fragmentRegistered;
  ReadText(in, dictionary.auxString2);
  in >> dictionary.lastInstalledSchemaVersion;
}

void ReadVariant(CztInStream& in, _vltComponent2& record) {
  switch (record.type) {
    case vltComponentDataDictionary:
      ReadDictionary(in, record.dictionary);
      break;
    case vltComponentObjectExpert:
    case vltComponentUIProvider:
    case vltComponentType7:
      in >> record.expert.expertWord0 >> record.expert.expertWord1;
      break;
    case vltComponentResourceExpert:
      ReadText(in, record.resource.pnp);
      break;
    default:
      break;
  }
}

void ReadQuad(CztInStream& in, unsigned char (&quad)[8]) {
  memset(quad, 0, sizeof quad);
  in.GetStream()->Read(quad, sizeof quad, nullptr);  // Never reversed: it is no number of ours.
}

}  // namespace

CztOutStream& operator<<(CztOutStream& out, const CvltComponent& component) {
  const _vltComponent2& record = component.record();
  out << record.size << record.version << static_cast<int32_t>(record.type);
  WriteText(out, record.name);
  out << record.identifier;
  WriteText(out, record.fileName);
  out.GetStream()->Write(record.opaqueQuad, sizeof record.opaqueQuad, nullptr);
  out << record.opaqueWord;
  if (record.type < kTypesWithVariant) WriteVariant(out, record);
  return out;
}

CztInStream& operator>>(CztInStream& in, CvltComponent& component) {
  _vltComponent2& record = component.record();
  in >> record.size;
  // Before anything else: a build of the other word size has another number here.
  if (record.size != sizeof record) throw CztStreamVersionException();
  in >> record.version;
  ReadType(in, record);
  ReadText(in, record.name);
  in >> record.identifier;
  ReadText(in, record.fileName);
  ReadQuad(in, record.opaqueQuad);
  in >> record.opaqueWord;
  if (record.type < kTypesWithVariant) ReadVariant(in, record);
  return in;
}

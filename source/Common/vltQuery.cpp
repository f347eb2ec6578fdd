// A query crosses processes as a row of values in a fixed order, without marks between them, so
// that a reader that goes wrong once is wrong to the end: every step stops at the first failure.
// What comes in is another process's word. A count takes zeroed memory that costs nothing until it
// is written to, types are stored only once they were read, and texts are owned by the term from
// that moment, so that vltFreeQuery is right after a failure at any place.
#include "source/Common/vltQuery.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <cwchar>
#include <span>

#include "source/Common/vltFailure.h"
#include "source/Common/vltHookPoints.h"
#include "source/Common/vltTestHook.h"
#include "source/Common/vltcmn.h"

namespace {

constexpr int32_t kFormatVersion = 1;
// Enough for the line of a query of numbers and GUIDs; texts make it grow.
constexpr uint64_t kCharactersPerTerm = 72;
constexpr uint64_t kCharactersOfFrame = 40;

// Zeroed block in the heap and with the limit of vltTaskMemAlloc. Untouched pages of a count that
// is not true cost nothing.
void* AllocateZeroed(uint64_t sizeBytes) {
  if (sizeBytes >= 0x80000000u) return nullptr;
  return calloc(1, std::max<size_t>(static_cast<size_t>(sizeBytes), 1));
}

// A query whose array could not be allocated keeps its count.
std::span<_vltQueryTerm> TermsOf(const _vltQuery& query) {
  return {query.terms, query.terms ? query.termCount : 0};
}

// ---- To a stream

// Of a type without a value the result so far.
HRESULT WriteValue(const _vltQueryTerm& term, IvltOutputStream* stream, HRESULT result) {
  switch (term.attributeType) {
    case vltI32Type:
      return stream->WriteI32(term.value.i32);
    case vltU32Type:
      return stream->WriteU32(term.value.u32);
    case vltF64Type:
      return stream->WriteF64(term.value.f64);
    case vltStringType:
      // Its result is not read: that of the text which follows is the result of the value.
      stream->WriteI32(static_cast<int32_t>(term.tildeFlag));
      return stream->WriteString(term.value.string);
    case vltGuidType:
      return stream->WriteGuid(term.value.guid);
    default:
      return result;
  }
}

HRESULT WriteTerm(const _vltQueryTerm& term, IvltOutputStream* stream) {
  HRESULT result = stream->WriteID(term.attributeID);
  if (result >= 0) result = stream->WriteType(term.attributeType);
  return result < 0 ? result : WriteValue(term, stream, result);
}

HRESULT WriteFrame(const _vltQuery& query, IvltOutputStream* stream) {
  HRESULT result = stream->WriteI32(kFormatVersion);
  if (result >= 0) result = stream->WriteGuid(query.queryGuid);
  if (result >= 0) result = stream->WriteI32(query.tFlag);
  if (result >= 0) result = stream->WriteI32(query.orFlag);
  if (result >= 0) result = stream->WriteU32(query.termCount);
  return result;
}

// ---- From a stream

HRESULT ReadText(IvltInputStream* stream, _vltQueryTerm* term) {
  int32_t tilde = 0;
  HRESULT result = stream->ReadI32(&tilde);
  if (result < 0) return result;
  term->tildeFlag = tilde != 0;
  wchar_t* text = nullptr;
  result = stream->ReadString(&text);
  // A failed read returns nothing, whatever it wrote.
  if (result >= 0) term->value.string = text;
  return result;
}

HRESULT ReadValue(IvltInputStream* stream, _vltQueryTerm* term) {
  switch (term->attributeType) {
    case vltI32Type:
      return stream->ReadI32(&term->value.i32);
    case vltU32Type:
      return stream->ReadU32(&term->value.u32);
    case vltF64Type:
      return stream->ReadF64(&term->value.f64);
    case vltStringType:
      return ReadText(stream, term);
    case vltGuidType:
      return stream->ReadGuid(&term->value.guid);
    default:
      return S_OK;
  }
}

HRESULT ReadTerm(IvltInputStream* stream, _vltQueryTerm* term) {
  HRESULT result = stream->ReadID(&term->attributeID);
  if (result < 0) return result;
  // Not into the term at once: a read that fails may leave a type whose value is no pointer.
  _vltAttributeType type = vltUnspecifiedType;
  result = stream->ReadType(&type);
  if (result < 0) return result;
  term->attributeType = type;
  return ReadValue(stream, term);
}

HRESULT ReadFrame(IvltInputStream* stream, _vltQuery* query) {
  int32_t tFlag = 0, orFlag = 0;
  uint32_t termCount = 0;
  HRESULT result = stream->ReadGuid(&query->queryGuid);
  if (result >= 0) result = stream->ReadI32(&tFlag);
  if (result >= 0) result = stream->ReadI32(&orFlag);
  if (result >= 0) result = stream->ReadU32(&termCount);
  if (result < 0) return result;
  query->termCount = termCount;
  query->tFlag = tFlag != 0;
  query->orFlag = orFlag;
  return S_OK;
}

HRESULT MakeTerms(_vltQuery* query) {
  query->terms = nullptr;
  if (!vlt::hook::Strikes(vlt::hook::kMarshalQueryFromStream)) {
    query->terms = static_cast<_vltQueryTerm*>(
        AllocateZeroed(uint64_t{query->termCount} * sizeof(_vltQueryTerm)));
  }
  if (query->terms) return S_OK;
  return vltReportOutOfMemory("HRESULT vltMarshalQueryFromStream(IvltInputStream*, vltQuery*)");
}

// ---- To text

// Text in one block that grows. A part for which there is no memory is left out.
class Line {
 public:
  // `capacity` counts the characters without the terminator.
  explicit Line(uint64_t capacity)
      : m_text(static_cast<wchar_t*>(AllocateZeroed((capacity + 1) * sizeof(wchar_t)))),
        m_capacity(static_cast<size_t>(capacity)) {}
  ~Line() { vltTaskMemFree(m_text); }
  Line(const Line&) = delete;
  Line& operator=(const Line&) = delete;

  explicit operator bool() const { return m_text != nullptr; }

  Line& operator<<(const wchar_t* part) {
    if (!part) return *this;
    size_t length = wcslen(part);
    if (m_length + length + 1 < m_capacity) {
      // As vltAppendString2 would, without looking for the end of the text each time.
      wmemcpy(m_text + m_length, part, length + 1);
      m_length += length;
    } else {
      grow(part, length);
    }
    return *this;
  }
  Line& operator<<(TaskMem<wchar_t> part) { return *this << part.get(); }

  wchar_t* release() {
    wchar_t* text = m_text;
    m_text = nullptr;
    return text;
  }

 private:
  void grow(const wchar_t* part, size_t length) {
    // The reported capacity is raised before memory is asked for, so it counts on success only.
    size_t capacity = m_capacity;
    if (vltAppendString2(&m_text, part, &capacity) < 0) return;
    m_length += length;
    m_capacity = capacity;
    reserve(m_length + m_length / 2);
  }

  // Steps of a fixed size alone would copy a long text over and over.
  void reserve(size_t capacity) {
    if (capacity <= m_capacity || capacity >= 0x80000000u / sizeof(wchar_t)) return;
    void* block = realloc(m_text, capacity * sizeof(wchar_t));
    if (!block) return;
    m_text = static_cast<wchar_t*>(block);
    m_capacity = capacity;
  }

  wchar_t* m_text;
  size_t m_capacity;
  size_t m_length = 0;
};

using Owned = TaskMem<wchar_t>;

void AppendValue(Line& line, const _vltQueryTerm& term) {
  switch (term.attributeType) {
    case vltI32Type:
      line << Owned(vltI32ToString2(term.value.i32));
      break;
    case vltU32Type:
      line << Owned(vltU32ToString2(term.value.u32));
      break;
    case vltF64Type:
      line << Owned(vltF64ToString2(term.value.f64));
      break;
    case vltStringType:
      line << (term.tildeFlag ? L"~" : L"") << term.value.string;
      break;
    case vltGuidType:
      line << Owned(vltGuidToString2(term.value.guid));
      break;
    default:
      break;
  }
}

void AppendTerm(Line& line, const _vltQueryTerm& term) {
  line << L"," << Owned(vltI32ToString2(static_cast<int>(term.attributeID))) << L"=";
  AppendValue(line, term);
}

HRESULT ReportNoLine() {
  return vltReportOutOfMemory("HRESULT vltConvertQueryToString(const vltQuery*, wchar_t**)");
}

}  // namespace

HRESULT vltMarshalQueryToStream(const _vltQuery* query, IvltOutputStream* stream) {
  if (!query || !stream) return E_POINTER;
  HRESULT result = WriteFrame(*query, stream);
  for (const _vltQueryTerm& term : TermsOf(*query)) {
    if (result < 0) break;
    result = WriteTerm(term, stream);
  }
  return result;
}

HRESULT vltMarshalQueryFromStream(IvltInputStream* stream, _vltQuery* query) {
  if (!stream || !query) return E_POINTER;
  int32_t version = 0;
  HRESULT result = stream->ReadI32(&version);
  // Another version's fields are not known, so none is touched.
  if (result < 0 || version != kFormatVersion) return result;
  result = ReadFrame(stream, query);
  if (result < 0) return result;
  result = MakeTerms(query);
  for (_vltQueryTerm& term : TermsOf(*query)) {
    result = ReadTerm(stream, &term);
    if (result < 0) break;
  }
  // Successes of the storage's reads may be other than S_OK.
  return result < 0 ? result : S_OK;
}

HRESULT vltConvertQueryToString(const _vltQuery* query, wchar_t** text) {
  if (!query || !text) return E_POINTER;
  if (vlt::hook::Strikes(vlt::hook::kConvertQueryToString)) return ReportNoLine();
  Line line(query->termCount * kCharactersPerTerm + kCharactersOfFrame);
  if (!line) return ReportNoLine();
  line << Owned(vltGuidToString2(query->queryGuid)) << (query->tFlag ? L",t" : L",f")
       << (query->orFlag ? L",o" : L",a");
  for (const _vltQueryTerm& term : TermsOf(*query)) AppendTerm(line, term);
  *text = line.release();
  return S_OK;
}

HRESULT vltFreeQuery(_vltQuery* query) {
  if (!query) return S_OK;
  for (const _vltQueryTerm& term : TermsOf(*query)) {
    // The union has a pointer in this case only.
    if (term.attributeType == vltStringType) vltTaskMemFree(term.value.string);
  }
  vltTaskMemFree(query->terms);
  return S_OK;
}

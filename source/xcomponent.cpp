// The four generations of the record differ in a few fields. One template copies all of them, and
// asks the compiler which of those a target has, so that a field can be forgotten in no single
// conversion. Deep copies fill an uninitialised target: every text is null before it is copied, so
// that a copy that fails half-way leaves pointers that may be freed.
#include "source/xcomponent.h"

#include <string.h>
#include <wchar.h>

#include <utility>

#include "source/vlrHelpers.h"
#include "ztcom/ztcore/ztmemmgr.h"

namespace {

constexpr uint32_t kUnknownVersion = 0xFFFFFFFF;
constexpr uint32_t kWidenedVersion = 3;

// Type 7 behaves as an expert wherever a record changes hands whole, but deep copies leave its
// words.
bool HasExpertWords(_vltComponentType type) {
  return type == vltComponentObjectExpert || type == vltComponentUIProvider ||
         type == vltComponentType7;
}

// The fields that only the generations with size and version have.
template <class Target, class Source>
void CopyOpaque(Target* target, const Source* source) {
  if constexpr (requires { target->opaqueWord; }) {
    memcpy(target->opaqueQuad, source->opaqueQuad, sizeof target->opaqueQuad);
    target->opaqueWord = source->opaqueWord;
  }
}

template <class Target, class Source>
HRESULT CopyDictionary(Target* target, const Source* source) {
  target->schemaVersion = source->schemaVersion;
  target->fragmentRegistered = source->fragmentRegistered;
  // A failure leaves a null, not the garbage of an uninitialised record.
  target->auxString1 = target->prefix = target->auxString2 = nullptr;
  CvltComponent::DuplicateStringNullOK(source->auxString1, &target->auxString1);
  CvltComponent::DuplicateStringNullOK(source->prefix, &target->prefix);
  HRESULT result = CvltComponent::DuplicateStringNullOK(source->auxString2, &target->auxString2);
  if constexpr (requires { target->lastInstalledSchemaVersion; }) {
    target->lastInstalledSchemaVersion = source->lastInstalledSchemaVersion;
  }
  return result;
}

template <class Target, class Source>
HRESULT CopyVariant(Target* target, const Source* source) {
  switch (source->type) {
    case vltComponentDataDictionary:
      return CopyDictionary(&target->dictionary, &source->dictionary);
    case vltComponentObjectExpert:
    case vltComponentUIProvider:
      target->expert = source->expert;
      return S_OK;
    case vltComponentResourceExpert:
      target->resource.pnp = nullptr;
      return CvltComponent::DuplicateStringNullOK(source->resource.pnp, &target->resource.pnp);
    default:
      return S_OK;
  }
}

void FreeAndNull(wchar_t** text) {
  ZtTaskMemFree(*text);
  *text = nullptr;
}

// Takes back what a copy made whose variant failed: the caller of a failed copy frees nothing, and
// fills the record again. The text that failed is null already.
template <class Target>
void DiscardCopies(Target* target) {
  FreeAndNull(&target->name);
  FreeAndNull(&target->fileName);
  if (target->type == vltComponentDataDictionary) {
    FreeAndNull(&target->dictionary.auxString1);
    FreeAndNull(&target->dictionary.prefix);
  }
}

// All of a deep copy but the stamps.
template <class Target, class Source>
HRESULT CopyFields(Target* target, const Source* source) {
  target->name = target->fileName = nullptr;
  HRESULT result = CvltComponent::DuplicateStringNullOK(source->name, &target->name);
  if (result < 0) return result;
  result = CvltComponent::DuplicateStringNullOK(source->fileName, &target->fileName);
  if (result < 0) {
    FreeAndNull(&target->name);
    return result;
  }
  target->type = source->type;
  target->identifier = source->identifier;
  CopyOpaque(target, source);
  // After the type, by which DiscardCopies knows what there is to free.
  HRESULT variantResult = CopyVariant(target, source);
  if (variantResult >= 0) return result;
  DiscardCopies(target);
  return variantResult;
}

template <class Source>
void AttachFields(_vltComponent2* target, const Source* source) {
  target->type = source->type;
  target->name = source->name;
  target->identifier = source->identifier;
  target->fileName = source->fileName;
  CopyOpaque(target, source);
  if (source->type == vltComponentDataDictionary) {
    target->dictionary = source->dictionary;
  } else if (HasExpertWords(source->type)) {
    target->expert = source->expert;
  } else if (source->type == vltComponentResourceExpert) {
    target->resource = source->resource;
  }
}

// Zeroes the whole variant; the dictionary's is the longest.
void ZeroVariant(_vltComponent2* record) {
  memset(&record->dictionary, 0, sizeof record->dictionary);
}

// All but the stamps and the variant; frees nothing.
void ForgetFields(_vltComponent2* record) {
  record->type = vltComponentNone;
  record->name = nullptr;
  record->identifier = GUID_NULL;
  record->fileName = nullptr;
  memset(record->opaqueQuad, 0, sizeof record->opaqueQuad);
  record->opaqueWord = 0;
}

bool HandedItsTextsOut(const wchar_t* name) {
  return name && wcsstr(name, L"Motion") && wcsstr(name, L"Expert");
}

}  // namespace

void CvltComponent::InitDataMembers() {
  ForgetFields(&m_record);
  ZeroVariant(&m_record);
}

CvltComponent::CvltComponent() {
  InitDataMembers();
  m_record.size = sizeof(_vltComponent2);
  m_record.version = kUnknownVersion;
}

CvltComponent::CvltComponent(_vltComponent* source, bool attach) : CvltComponent() {
  if (attach) {
    Attach(source);
  } else {
    Copy(&m_record, source);
  }
}

CvltComponent::CvltComponent(_vltComponent2* source, bool attach) : CvltComponent() {
  m_record.size = source->size;
  m_record.version = source->version;
  if (attach) {
    Attach2(source);
  } else {
    Copy2(&m_record, source);
  }
}

CvltComponent::~CvltComponent() { Clear(); }

void CvltComponent::Attach(_vltComponent* source) {
  m_record.size = sizeof(_vltComponent2);
  AttachFields(&m_record, source);
}

void CvltComponent::Attach2(_vltComponent2* source) {
  m_record.size = source->size;
  m_record.version = source->version;
  AttachFields(&m_record, source);
}

void CvltComponent::Swap(CvltComponent& other) {
  _vltComponent2 &a = m_record, &b = other.m_record;
  // Different variants overlay each other: their fields cannot be exchanged.
  if (a.type != b.type) return;
  std::swap(a.name, b.name);
  std::swap(a.fileName, b.fileName);
  std::swap(a.identifier, b.identifier);
  std::swap(a.opaqueQuad, b.opaqueQuad);
  std::swap(a.opaqueWord, b.opaqueWord);
  std::swap(a.version, b.version);
  std::swap(a.size, b.size);
  if (a.type == vltComponentDataDictionary) {
    std::swap(a.dictionary, b.dictionary);
  } else if (HasExpertWords(a.type)) {
    std::swap(a.expert, b.expert);
  } else if (a.type == vltComponentResourceExpert) {
    std::swap(a.resource, b.resource);
  }
}

void CvltComponent::Clear() {
  // Asked before anything is freed, the name included.
  bool exempt = HandedItsTextsOut(m_record.name);
  if (!exempt) ZtTaskMemFree(m_record.name);
  ZtTaskMemFree(m_record.fileName);
  if (m_record.type == vltComponentDataDictionary) {
    ZtTaskMemFree(m_record.dictionary.auxString1);
    ZtTaskMemFree(m_record.dictionary.prefix);
    ZtTaskMemFree(m_record.dictionary.auxString2);
  } else if (m_record.type == vltComponentResourceExpert && !exempt) {
    ZtTaskMemFree(m_record.resource.pnp);
  }
  ForgetFields(&m_record);
}

HRESULT CvltComponent::DuplicateStringNullOK(const wchar_t* source, wchar_t** target) {
  if (!source) {
    *target = nullptr;
    return S_OK;
  }
  return vlrDuplicateString(source, target);
}

HRESULT CvltComponent::Copy(_vltComponent2* target, const _vltComponent* source) {
  target->size = sizeof(_vltComponent2);
  target->version = kWidenedVersion;
  return CopyFields(target, source);
}

HRESULT CvltComponent::Copy2(_vltComponent2* target, const _vltComponent2* source) {
  target->size = source->size;
  target->version = source->version;
  return CopyFields(target, source);
}

HRESULT CvltComponent::Copy2(_vltComponent2point1* target, const _vltComponent2* source) {
  return CopyFields(target, source);
}

HRESULT CvltComponent::Copy2(_vltComponent2point2* target, const _vltComponent2* source) {
  return CopyFields(target, source);
}

// The map of components, and nothing that reads a file. Every operation that answers from it calls
// Scan() first, where a derived class may bring it up to date; only then is the map's lock taken,
// for the look-up and the copying of one record. A component is owned by the map; a pointer to one
// is good only as long as no other thread removes it, so that clients get copies.
//
// The enumerator holds identifiers, not pointers: what was removed since its snapshot is passed
// over, and a walk never holds the lock between two steps.
#include "source/vltRegistrar.h"

#include <wchar.h>

#include <new>
#include <utility>

#include "ztcom/ztcore/ztcom.h"

using zt::fnd::Vector;

HRESULT CvltRegistrar::QueryInterface(const GUID& iid, void** out) {
  if (!out) return E_POINTER;
  *out = nullptr;
  if (!(iid == IID_IUnknown) && !(iid == IID_IvltRegistrar2) && !(iid == IID_IvltRegistrar)) {
    return E_NOINTERFACE;
  }
  AddRef();
  *out = static_cast<IvltRegistrar2*>(this);
  return S_OK;
}

uint32_t CvltRegistrar::AddRef() { return static_cast<uint32_t>(m_refCount.increment()); }

uint32_t CvltRegistrar::Release() {
  int left = m_refCount.decrement();
  if (left == 0) delete this;
  return static_cast<uint32_t>(left);
}

CvltRegistrar::~CvltRegistrar() { DeleteComponents(); }

HRESULT CvltRegistrar::RegisterComponent(_vltComponent2* component) {
  if (!component || !component->name || !component->fileName) return E_POINTER;
  if (component->identifier == GUID_NULL) return E_POINTER;
  HRESULT result = Scan();
  if (result < 0) return result;
  return AddComponent(new CvltComponent(component, false));
}

HRESULT CvltRegistrar::UnregisterComponent(GUID identifier) {
  HRESULT result = Scan();
  if (result < 0) return result;
  ComponentMap::Hold map(m_components);
  // Nothing there is no failure: the result is the scan's.
  return removeEntry(*map, identifier) == S_OK ? S_OK : result;
}

HRESULT CvltRegistrar::GetComponent(GUID identifier, _vltComponent2* component) {
  if (!component) return E_POINTER;
  HRESULT result = Scan();
  if (result < 0) return result;
  return CopyComponent(identifier, std::nullopt, component);
}

HRESULT CvltRegistrar::EnumComponents(_vltComponentType type, IvltEnumComponent** enumerator) {
  if (!enumerator) return E_POINTER;
  *enumerator = nullptr;
  HRESULT result = Scan();
  if (result < 0) return result;
  return CreateEnumerator(type, enumerator);
}

Vector<GUID> CvltRegistrar::SnapshotIdentifiers() {
  Vector<GUID> identifiers;
  ComponentMap::Hold map(m_components);
  // Of all types: a component may be replaced by one of another type before the walk comes to it.
  for (const auto& [identifier, component] : *map) identifiers.push_back(identifier);
  return identifiers;
}

HRESULT CvltRegistrar::CreateEnumerator(_vltComponentType type, IvltEnumComponent** enumerator) {
  auto* created = new (std::nothrow) CvltEnumComponentRegistrar(*this, type, SnapshotIdentifiers());
  if (!created) return E_OUTOFMEMORY;
  return created->QueryInterface(IID_IvltEnumComponent, reinterpret_cast<void**>(enumerator));
}

HRESULT CvltRegistrar::InternalGetComponent(GUID identifier, CvltComponent*& component) {
  HRESULT result = Scan();
  if (result < 0) return result;
  return InternalGetComponentNoScan(identifier, component);
}

HRESULT CvltRegistrar::InternalGetComponentNoScan(GUID identifier, CvltComponent*& component) {
  ComponentMap::Hold map(m_components);
  auto found = map->find(identifier);
  if (found == map->end()) return E_INVALIDARG;
  component = found->second.get();
  return S_OK;
}

template <class Record>
HRESULT CvltRegistrar::CopyComponent(GUID identifier, std::optional<_vltComponentType> type,
                                     Record* record) {
  ComponentMap::Hold map(m_components);
  auto found = map->find(identifier);
  if (found == map->end()) return E_INVALIDARG;
  if (type && found->second->record().type != *type) return E_FAIL;
  return found->second->CopyTo(record);
}

HRESULT CvltRegistrar::AddComponent(CvltComponent* component) {
  // From the first line: whatever throws below, the component goes.
  std::unique_ptr<CvltComponent> owned(component);
  ComponentMap::Hold map(m_components);
  auto& entry = (*map)[owned->record().identifier];
  entry = std::move(owned);
  return S_OK;
}

HRESULT CvltRegistrar::RemoveComponent(CvltComponent* component) {
  ComponentMap::Hold map(m_components);
  return removeEntry(*map, component->record().identifier);
}

HRESULT CvltRegistrar::removeEntry(ComponentMap::Map& map, GUID identifier) {
  auto found = map.find(identifier);
  if (found == map.end()) return S_FALSE;
  map.erase(found);
  return S_OK;
}

HRESULT CvltRegistrar::DeleteComponents() {
  ComponentMap::Hold map(m_components);
  map->clear();
  return S_OK;
}

_vltComponentType CvltRegistrar::MapStringToType(const wchar_t* text) {
  const std::pair<const wchar_t*, _vltComponentType> keys[] = {
      {DataDictionariesKey, vltComponentDataDictionary},
      {ObjectExpertsKey, vltComponentObjectExpert},
      {ResourceExpertsKey, vltComponentResourceExpert},
      {ProvidersKey, vltComponentUIProvider}};
  for (const auto& [key, type] : keys) {
    if (text && wcscmp(text, key) == 0) return type;
  }
  return vltComponentNone;
}

CvltEnumComponentRegistrar::CvltEnumComponentRegistrar(CvltRegistrar& registrar,
                                                       _vltComponentType type,
                                                       const Vector<GUID>& identifiers)
    : m_registrar(&registrar), m_type(type), m_identifiers(identifiers) {
  m_registrar->AddRef();
}

CvltEnumComponentRegistrar::~CvltEnumComponentRegistrar() { m_registrar->Release(); }

HRESULT CvltEnumComponentRegistrar::QueryInterface(const GUID& iid, void** out) {
  if (!out) return E_POINTER;
  *out = nullptr;
  if (!(iid == IID_IUnknown) && !(iid == IID_IvltEnumComponent)) return E_NOINTERFACE;
  AddRef();
  *out = static_cast<IvltEnumComponent*>(this);
  return S_OK;
}

uint32_t CvltEnumComponentRegistrar::AddRef() { return ++m_refCount; }

uint32_t CvltEnumComponentRegistrar::Release() {
  uint32_t left = --m_refCount;
  if (left == 0) delete this;
  return left;
}

HRESULT CvltEnumComponentRegistrar::Next(unsigned int count, _vltComponent2* records,
                                         unsigned int* fetched) {
  if (!fetched || !records) return E_POINTER;
  if (count == 0) return E_INVALIDARG;
  HRESULT result = S_OK;
  for (unsigned i = 0; i < count; ++i) {
    result = Next(&records[i]);
    if (result == S_FALSE) break;
    ++*fetched;  // Not reset: the caller starts it at 0.
  }
  return result;
}

HRESULT CvltEnumComponentRegistrar::Reset() {
  m_cursor = 0;
  return S_OK;
}

template <class Record>
HRESULT CvltEnumComponentRegistrar::step(Record* record) {
  while (m_cursor < m_identifiers.size()) {
    GUID identifier = m_identifiers[m_cursor++];
    // Neither a failed scan nor a component that has gone since, or cannot be copied, ends the
    // walk.
    if (m_registrar->Scan() < 0) continue;
    if (m_registrar->CopyComponent(identifier, m_type, record) >= 0) return S_OK;
  }
  return S_FALSE;
}

HRESULT CvltEnumComponentRegistrar::Next(_vltComponent2* record) { return step(record); }
HRESULT CvltEnumComponentRegistrar::Next(_vltComponent2point2* record) { return step(record); }

template HRESULT CvltRegistrar::CopyComponent(GUID, std::optional<_vltComponentType>,
                                              _vltComponent2*);
template HRESULT CvltRegistrar::CopyComponent(GUID, std::optional<_vltComponentType>,
                                              _vltComponent2point2*);

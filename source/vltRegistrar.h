#pragma once

// The registrar's base: the component map in memory, and the enumerator over it.

#include <map>
#include <memory>
#include <optional>

#include "source/Common/vltInterfaces.h"
#include "source/GuidMap.h"
#include "source/vlrHelpers.h"
#include "source/xcomponent.h"
#include "zt/fnd/Guid.h"
#include "zt/fnd/Vector.h"
#include "zt/fnd/osdep/AtomicInt.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/ThreadAnnotations.h"

// An ordered map with the lock that guards it, also in a child that is forked during a change. The
// map can be reached through a hold only:
//
//   CvlrProtectedMap<GUID, int>::Hold map(protectedMap);
//   map->erase(key);
template <class Key, class Value, class Ordered = std::map<Key, Value>>
class CvlrProtectedMap {
 public:
  using Map = Ordered;

  // Recursive: the holder of one may make another.
  class SCOPED_CAPABILITY Hold {
   public:
    explicit Hold(CvlrProtectedMap& map) ACQUIRE(map.m_lock)
        : m_map(map.m_map), m_lock(map.m_lock) {
      m_lock.lock();
    }
    ~Hold() RELEASE() { m_lock.unlock(); }
    Hold(const Hold&) = delete;
    Hold& operator=(const Hold&) = delete;

    Map& operator*() { return m_map; }
    Map* operator->() { return &m_map; }

   private:
    Map& m_map;
    zt::fnd::osdep::ForkSafeMutex& m_lock;
  };

 private:
  Map m_map GUARDED_BY(m_lock);
  zt::fnd::osdep::ForkSafeMutex m_lock{zt::fnd::osdep::AtFork::Wait, 50};
};

// Answers from a map of components in memory. Never created by itself: what Scan does, and all that
// needs a database, comes with the derived classes.
//
// Threads: any. The map's lock is held for look-ups, changes and the copying of a record, never for
// anything that reads a file or waits.
class CvltRegistrar : public IvltRegistrar2 {
 public:
  static constexpr const wchar_t* DataDictionariesKey = L"Data Dictionaries";
  static constexpr const wchar_t* ObjectExpertsKey = L"Object Experts";
  static constexpr const wchar_t* ResourceExpertsKey = L"Resource Experts";
  static constexpr const wchar_t* ProvidersKey = L"UI Providers";

  CvltRegistrar() : m_refCount(0) {}
  CvltRegistrar(const CvltRegistrar&) = delete;
  CvltRegistrar& operator=(const CvltRegistrar&) = delete;

  // IUnknown, IvltRegistrar and IvltRegistrar2 are one object, and one pointer.
  HRESULT QueryInterface(const GUID& iid, void** out) override;
  uint32_t AddRef() override;
  uint32_t Release() override;

  // What needs a database is the derived classes': E_NOTIMPL, with the arguments not touched.
  HRESULT GetConfigurationPath(wchar_t**) override { return E_NOTIMPL; }
  HRESULT SetConfigurationPath(const wchar_t*) override { return E_NOTIMPL; }
  HRESULT GetSDKPath(wchar_t**) override { return E_NOTIMPL; }
  HRESULT SetSDKPath(const wchar_t*) override { return E_NOTIMPL; }
  HRESULT GetSchemaVersion(unsigned int*) override { return E_NOTIMPL; }
  HRESULT SetSchemaVersion(unsigned int) override { return E_NOTIMPL; }
  HRESULT RegisterComponent(_vltComponent2* component) override;
  HRESULT UnregisterComponent(GUID identifier) override;
  HRESULT GetComponent(GUID identifier, _vltComponent2* component) override;
  HRESULT EnumComponents(_vltComponentType type, IvltEnumComponent** enumerator) override;
  HRESULT GetStorageServerCacheSize(unsigned int*) override { return E_NOTIMPL; }
  HRESULT SetStorageServerCacheSize(unsigned int) override { return E_NOTIMPL; }
  HRESULT GetStorageClientCacheSize(unsigned int*) override { return E_NOTIMPL; }
  HRESULT SetStorageClientCacheSize(unsigned int) override { return E_NOTIMPL; }

  // ---- After the interface, in the order of the dispatch table.
  virtual ~CvltRegistrar();
  // Brings the map up to date; its negative result is that of the operation that asked.
  virtual HRESULT Scan() = 0;

  // The component, or E_INVALIDARG and `component` untouched. The pointer is valid until the
  // component is removed.
  HRESULT InternalGetComponent(GUID identifier, CvltComponent*& component);
  HRESULT InternalGetComponentNoScan(GUID identifier, CvltComponent*& component);

  // Copies the record out under the map's lock, if the component is there and of the type, where
  // one is given. E_INVALIDARG if it is not there, E_FAIL for another type.
  template <class Record>
  HRESULT CopyComponent(GUID identifier, std::optional<_vltComponentType> type, Record* record);

  // Takes ownership; an earlier component of the same identifier is destroyed. S_OK.
  HRESULT AddComponent(CvltComponent* component);
  // Destroys the stored component with the identifier of this one: 0, or 1 if there is none.
  HRESULT RemoveComponent(CvltComponent* component);
  HRESULT DeleteComponents();

  // Type of one of the keys above, which are exact; 0 for other texts.
  static _vltComponentType MapStringToType(const wchar_t* text);

 protected:
  using OwnedComponent = std::unique_ptr<CvltComponent>;
  using ComponentMap = CvlrProtectedMap<GUID, OwnedComponent, GuidMap<OwnedComponent>>;

  // All identifiers in map order.
  zt::fnd::Vector<GUID> SnapshotIdentifiers();
  // New enumerator over a snapshot, with one reference. E_OUTOFMEMORY leaves *enumerator alone.
  HRESULT CreateEnumerator(_vltComponentType type, IvltEnumComponent** enumerator);
  ComponentMap& components() { return m_components; }

 private:
  static HRESULT removeEntry(ComponentMap::Map& map, GUID identifier);

  // 0 at first: the creator's QueryInterface takes the first reference.
  zt::fnd::osdep::AtomicInt m_refCount;
  // Owns the components; the key is the record's identifier.
  ComponentMap m_components;
};

// Walks a snapshot of identifiers and returns the components of one type that are still there.
// Keeps the registrar alive. Threads: one; the count is not atomic.
class CvltEnumComponentRegistrar : public IvltEnumComponent {
 public:
  CvltEnumComponentRegistrar(CvltRegistrar& registrar, _vltComponentType type,
                             const zt::fnd::Vector<GUID>& identifiers);
  CvltEnumComponentRegistrar(const CvltEnumComponentRegistrar&) = delete;
  CvltEnumComponentRegistrar& operator=(const CvltEnumComponentRegistrar&) = delete;

  HRESULT QueryInterface(const GUID& iid, void** out) override;
  uint32_t AddRef() override;
  uint32_t Release() override;
  HRESULT Next(unsigned int count, _vltComponent2* records, unsigned int* fetched) override;
  HRESULT Skip(unsigned int) override { return E_NOTIMPL; }
  HRESULT Reset() override;
  HRESULT Clone(IvltEnumComponent**) override { return E_NOTIMPL; }
  virtual ~CvltEnumComponentRegistrar();

  // One step: S_OK with a copy that belongs to the caller, or S_FALSE at the end.
  HRESULT Next(_vltComponent2* record);
  HRESULT Next(_vltComponent2point2* record);

 private:
  template <class Record>
  HRESULT step(Record* record);

  // Starts at 0: the creator's QueryInterface takes the first reference.
  uint32_t m_refCount = 0;
  CvltRegistrar* m_registrar;
  _vltComponentType m_type;
  zt::fnd::Vector<GUID> m_identifiers;
  // The next identifier to be tried; the size of the snapshot at its end.
  unsigned m_cursor = 0;
};

#pragma once

#include <fcntl.h>
#include <unistd.h>

#include "tests/oom/Registrar.h"

// The registrar: how it is reached, the component check, and every operation of its interfaces and
// enumerators.
namespace vlt::test::oom {

inline HRESULT GotRegistrar(HRESULT result, IvltRegistrar* registrar) {
  if (result >= 0 && registrar) registrar->Release();
  return result;
}

inline HRESULT Check(GUID id) {
  IEnumString* list = nullptr;
  HRESULT result = vltCheckComponent(id, &list);
  if (!list) return result < 0 ? result : E_UNEXPECTED;
  wchar_t* text = nullptr;
  unsigned fetched;
  while (list->Next(1, &text, &fetched) == S_OK) vltFree(text);
  list->Release();
  return S_OK;  // that components are not sound is no failure here
}

inline std::vector<Call> EntryCalls() {
  return {
      {"vltGetRegistrar",
       [] {
         IvltRegistrar* r = nullptr;
         HRESULT result = vltGetRegistrar(&r);
         return GotRegistrar(result, r);
       }},
      {"vltGetRegistrar2",
       [] {
         IvltRegistrar* r = nullptr;
         HRESULT result = vltGetRegistrar2(L"/x/vlt.vlr", L"/x", &r);
         return GotRegistrar(result, r);
       }},
      {"vltGetNamedRegistrar",
       [] {
         IvltRegistrar* r = nullptr;
         HRESULT result = vltGetNamedRegistrar(L"/a/config3.vlt", &r);
         return GotRegistrar(result, r);
       }},
      {"vltGetNamedRegistrar2",
       [] {
         IvltRegistrar* r = nullptr;
         HRESULT result = vltGetNamedRegistrar2(nullptr, &r);
         return GotRegistrar(result, r);
       }},
      {"vltGetOldRegistrar",
       [] {
         void* out = nullptr;
         return ByDesign(vltGetOldRegistrar(&out), E_NOTIMPL);
       }},
      {"vltLoadDataDictionaries", [] { return vltLoadDataDictionaries(); }},
      {"vltLoadDataDictionaries2", [] { return vltLoadDataDictionaries2(g_registrar); }},
      {"vltCheckComponent of all", [] { return Check(GUID_NULL); }},
      {"vltCheckComponent of one", [] { return Check(kExpert); }},
  };
}

// The list of the component check, made once with all allocations.
inline std::vector<Call> CheckListCalls() {
  auto list = [] {
    static IEnumString* made = [] {
      IEnumString* out = nullptr;
      vltCheckComponent(GUID_NULL, &out);
      return out;
    }();
    made->Reset();
    return made;
  };
  return {
      {"IEnumString::QueryInterface",
       [list] {
         void* out = nullptr;
         HRESULT result = list()->QueryInterface(IID_IEnumString, &out);
         list()->Release();
         return result;
       }},
      {"IEnumString::AddRef and Release",
       [list] {
         list()->AddRef();
         return Done(list()->Release());
       }},
      {"IEnumString::Next",
       [list] {
         wchar_t* texts[3] = {};
         unsigned fetched = 0;
         HRESULT result = list()->Next(3, texts, &fetched);
         for (unsigned i = 0; i < fetched; ++i) vltFree(texts[i]);
         return result == S_OK ? S_OK : E_OUTOFMEMORY;
       }},
      {"IEnumString::RemoteNext",
       [list] { return ByDesign(list()->RemoteNext(1, nullptr, nullptr), E_NOTIMPL); }},
      {"IEnumString::Skip", [list] { return list()->Skip(1); }},
      {"IEnumString::Reset", [list] { return list()->Reset(); }},
      {"IEnumString::Clone", [list] { return list()->Clone(nullptr); }},
  };
}

inline HRESULT Enumerate(unsigned atATime, _vltComponentType type = vltComponentObjectExpert) {
  IvltEnumComponent* e = nullptr;
  HRESULT result = g_registrar->EnumComponents(type, &e);
  if (result < 0) return result;
  Record records[2];
  for (unsigned fetched = 0; (result = e->Next(atATime, records, &fetched)) == S_OK; fetched = 0) {
    for (Record& record : records) record.next();
  }
  e->Release();
  return result;
}

inline std::vector<Call> EnumeratorCalls() {
  auto enumerator = [] {
    static IvltEnumComponent* made = [] {
      IvltEnumComponent* out = nullptr;
      g_registrar->EnumComponents(vltComponentObjectExpert, &out);
      return out;
    }();
    made->Reset();
    return made;
  };
  return {
      {"IvltEnumComponent::QueryInterface",
       [enumerator] {
         void* out = nullptr;
         HRESULT result = enumerator()->QueryInterface(IID_IvltEnumComponent, &out);
         enumerator()->Release();
         return result;
       }},
      {"IvltEnumComponent::AddRef and Release",
       [enumerator] {
         enumerator()->AddRef();
         return Done(enumerator()->Release());
       }},
      {"IvltEnumComponent::Next, one at a time", [] { return Enumerate(1); }},
      {"IvltEnumComponent::Next, two at a time", [] { return Enumerate(2); }},
      {"IvltEnumComponent::Next over resource experts",
       [] { return Enumerate(1, vltComponentResourceExpert); }},
      {"IvltEnumComponent::Next over dictionaries",
       [] { return Enumerate(1, vltComponentDataDictionary); }},
      {"IvltEnumComponent::Skip",
       [enumerator] { return ByDesign(enumerator()->Skip(1), E_NOTIMPL); }},
      {"IvltEnumComponent::Reset", [enumerator] { return enumerator()->Reset(); }},
      {"IvltEnumComponent::Clone",
       [enumerator] {
         IvltEnumComponent* clone = nullptr;
         return ByDesign(enumerator()->Clone(&clone), E_NOTIMPL);
       }},
  };
}

// A setter of a number: after a reported success the new one is found, and after a reported failure the new
// one or the old one.
template <class Get, class Set>
Call NumberCall(const std::string& name, Get get, Set set) {
  static unsigned s_old, s_new = 1000;
  return {name,
          [set] {
            s_old = s_new++;
            return set(s_new);
          },
          [get](bool succeeded) {
            unsigned now = get();
            return now == s_new || (!succeeded && now == s_old);
          }};
}

inline unsigned SchemaVersion() {
  unsigned version = 0;
  g_registrar->GetSchemaVersion(&version);
  return version;
}

inline unsigned ServerCacheSize() {
  unsigned size = 0;
  As<IvltRegistrar2>(IID_IvltRegistrar2)->GetStorageServerCacheSize(&size);
  return size;
}

inline HRESULT Register(_vltComponentType type, const wchar_t* name, GUID id) {
  std::wstring nameText = name, file = L"/x/registered", extra = L"ex";
  _vltComponent2 record;
  memset(&record, 0, sizeof record);
  record.size = sizeof record;
  record.version = 3;
  record.type = type;
  record.name = nameText.data();
  record.identifier = id;
  record.fileName = file.data();
  if (type == vltComponentDataDictionary) {
    record.dictionary.prefix = extra.data();
    record.dictionary.fragmentRegistered = 1;
  }
  if (type == vltComponentResourceExpert) record.resource.pnp = extra.data();
  return g_registrar->RegisterComponent(&record);
}

inline std::vector<Call> RegistrarCalls() {
  return {
      {"IvltRegistrar::QueryInterface",
       [] {
         As<IvltRegistrar> registrar(IID_IvltRegistrar);
         return S_OK;
       }},
      {"IvltRegistrar::AddRef and Release",
       [] {
         g_registrar->AddRef();
         return Done(g_registrar->Release());
       }},
      {"IvltRegistrar::GetConfigurationPath",
       [] {
         Text path;
         return path.with(g_registrar->GetConfigurationPath(path.out()));
       }},
      {"IvltRegistrar::SetConfigurationPath",
       [] {
         static bool odd = false;
         odd = !odd;
         return g_registrar->SetConfigurationPath(odd ? L"/a/odd.vlt" : L"/a/even.vlt");
       }},
      {"IvltRegistrar::SetConfigurationPath of the bare name",
       [] {
         HRESULT result = g_registrar->SetConfigurationPath(L"/a/b.vlt");
         return result < 0 ? result : g_registrar->SetConfigurationPath(L"config3.vlt");
       }},
      {"IvltRegistrar::GetSDKPath",
       [] {
         Text path;
         return ByDesign(g_registrar->GetSDKPath(path.out()), E_FAIL);
       }},
      {"IvltRegistrar::SetSDKPath",
       [] { return ByDesign(g_registrar->SetSDKPath(L"/x"), E_FAIL); }},
      {"IvltRegistrar::GetSchemaVersion", [] { return Done(SchemaVersion()); }},
      NumberCall("IvltRegistrar::SetSchemaVersion", SchemaVersion,
                 [](unsigned v) { return g_registrar->SetSchemaVersion(v); }),
      {"IvltRegistrar::RegisterComponent of a dictionary",
       [] { return Register(vltComponentDataDictionary, L"D", kDictionary); }},
      {"IvltRegistrar::RegisterComponent of an object expert",
       [] {
         return Register(vltComponentObjectExpert, L"New", GUID{7, 0, 0, {}});
       }},
      {"IvltRegistrar::RegisterComponent of a resource expert",
       [] {
         return Register(vltComponentResourceExpert, L"Newer", GUID{8, 0, 0, {}});
       }},
      {"IvltRegistrar::UnregisterComponent",
       [] { return ByDesign(g_registrar->UnregisterComponent(kExpert), E_FAIL); }},
      {"IvltRegistrar::GetComponent",
       [] {
         Record record;
         return g_registrar->GetComponent(kExpert, &record);
       }},
      {"IvltRegistrar::GetComponent of a dictionary",
       [] {
         Record record;
         return g_registrar->GetComponent(kDictionary, &record);
       }},
      {"IvltRegistrar::GetComponent of a resource expert",
       [] {
         Record record;
         return g_registrar->GetComponent(kResourceExpert, &record);
       }},
  };
}

// A dictionary of an earlier release, by system calls alone.
inline void MakePrevious() {
  static const std::string folder = g_root + "/Data Dictionaries/Last/";
  static const std::string files[] = {folder + "Old.framework", folder + "vlt.vlr"};
  for (const std::string& file : files) {
    close(open(file.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0666));
  }
}

inline std::vector<Call> OtherInterfaceCalls() {
  return {
      {"IvltRegistrar2::GetStorageServerCacheSize", [] { return Done(ServerCacheSize()); }},
      NumberCall("IvltRegistrar2::SetStorageServerCacheSize", ServerCacheSize,
                 [](unsigned v) {
                   As<IvltRegistrar2> r(IID_IvltRegistrar2);
                   return r->SetStorageServerCacheSize(v);
                 }),
      {"IvltRegistrar2::GetStorageClientCacheSize",
       [] {
         unsigned size;
         As<IvltRegistrar2> r(IID_IvltRegistrar2);
         return ByDesign(r->GetStorageClientCacheSize(&size), E_FAIL);
       }},
      {"IvltRegistrar2::SetStorageClientCacheSize",
       [] {
         As<IvltRegistrar2> r(IID_IvltRegistrar2);
         return ByDesign(r->SetStorageClientCacheSize(1), E_FAIL);
       }},
      {"IvltRegistrar2::GetSnapshotPath",
       [] {
         Text path;
         As<IvltRegistrar2> r(IID_IvltRegistrar2);
         return ByDesign(r->GetSnapshotPath(path.out()), E_FAIL);
       }},
      {"IvltRegistrar2::SetSnapshotPath",
       [] {
         As<IvltRegistrar2> r(IID_IvltRegistrar2);
         return ByDesign(r->SetSnapshotPath(L"/x"), E_FAIL);
       }},
      {"IvltPharlapRegistrarEx::ResetDDUpdatedFlags",
       [] {
         // With the flag set there is something to reset.
         HRESULT result = Register(vltComponentDataDictionary, L"D", kDictionary);
         if (result < 0) return result;
         As<IvltPharlapRegistrarEx> r(IID_IvltPharlapRegistrarEx);
         return r->ResetDDUpdatedFlags();
       }},
      {"IvltDynamicRegistrar::GetComponentsForBindingClass",
       [] {
         As<IvltDynamicRegistrar> r(IID_IvltDynamicRegistrar);
         unsigned count = 0;
         struct Array {
           GUID* value = nullptr;
           ~Array() { vltFree(value); }
         } found;
         return r->GetComponentsForBindingClass(vltComponentObjectExpert, kBindingClass, &count,
                                                &found.value);
       }},
      {"IvltDowngradeRegistrar::GetPreviousDictionaries",
       [] {
         MakePrevious();
         As<IvltDowngradeRegistrar> r(IID_IvltDowngradeRegistrar);
         unsigned count = 0;
         wchar_t** paths = nullptr;
         HRESULT result = r->GetPreviousDictionaries(nullptr, &count, &paths);
         for (unsigned i = 0; result >= 0 && paths && i < count; ++i) vltFree(paths[i]);
         vltFree(paths);
         return result;
       }},
      {"IvltDowngradeRegistrar::RemovePreviousDictionaries",
       [] {
         MakePrevious();
         As<IvltDowngradeRegistrar> r(IID_IvltDowngradeRegistrar);
         return r->RemovePreviousDictionaries(nullptr);
       }},
  };
}

}  // namespace vlt::test::oom

// Single components: how a record reaches the database, how a section becomes a component, and how
// a client gets a record out.
//
// Registering writes the section first and the list of components with it, saves, and then brings
// the copy in memory up to date, if there is one: whatever the result of the save, since the open
// document has the change already. Reading goes the other way, from a section to a record whose
// type is decided by the items that it has: a schema version makes a dictionary, "PnP" a resource
// expert, and anything else is an object expert.
#include <string.h>

#include <memory>
#include <optional>

#include "source/Common/vltcmn.h"
#include "source/Database/recordText.h"
#include "source/Pharlap/registrarText.h"
#include "source/Pharlap/vltPharlapRegistrar.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/osdep/LocaleText.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::osdep::path;
using namespace registrar;
using zt::fnd::String;

namespace {

// Widened straight into its block; null as CopyOf gives it.
wchar_t* CopyOfNarrow(const std::optional<std::string>& text) {
  if (!text) return nullptr;
  const char* begin = text->c_str();
  const char* end = begin + strlen(begin);
  const size_t most = zt::fnd::osdep::GetAnsiToWideRequiredBufferLength(begin, end, "");
  TaskMem<wchar_t> copy(static_cast<wchar_t*>(ZtTaskMemAlloc((most + 1) * sizeof(wchar_t))));
  if (!copy) return nullptr;
  wchar_t* stop = copy.get() + most;
  zt::fnd::osdep::AnsiToWideNoAlloc(begin, end, "", copy.get(), stop);
  *stop = L'\0';
  return copy.release();
}

}  // namespace

HRESULT CvltPharlapRegistrar::RegisterComponent(_vltComponent2* record) {
  switch (record->type) {
    case vltComponentObjectExpert:
      return RegisterObjectExpert(record);
    case vltComponentResourceExpert:
      return RegisterResourceExpert(record);
    case vltComponentDataDictionary:
      return RegisterDataDictionary(record);
    default:
      return E_FAIL;
  }
}

HRESULT CvltPharlapRegistrar::GetComponent(GUID identifier, _vltComponent2* record) {
  if (!record) return E_POINTER;
  ComponentMap::Hold map(components());
  auto found = map->find(identifier);
  return found == map->end() ? E_INVALIDARG : Duplicate(record, &found->second->record());
}

HRESULT CvltPharlapRegistrar::EnumComponents(_vltComponentType type,
                                             IvltEnumComponent** enumerator) {
  return enumerator ? CreateEnumerator(type, enumerator) : E_POINTER;
}

HRESULT CvltPharlapRegistrar::Duplicate(_vltComponent2* target, const _vltComponent2* source) {
  // The fields without texts, and the size stamp of the registrar's object with them.
  memcpy(target, source, sizeof *target);
  // Each text starts from null, so that a failed copy never returns the registrar's own.
  target->name = CopyOf(source->name);
  target->fileName = CopyOf(source->fileName);
  if (source->type == vltComponentDataDictionary) {
    target->dictionary.auxString1 = CopyOf(source->dictionary.auxString1);
    target->dictionary.prefix = CopyOf(source->dictionary.prefix);
    target->dictionary.auxString2 = CopyOf(source->dictionary.auxString2);
  } else if (source->type == vltComponentResourceExpert) {
    target->resource.pnp = CopyOf(source->resource.pnp);
  }
  return S_OK;
}

// ---- Registration

HRESULT CvltPharlapRegistrar::WriteExpert(const _vltComponent2* record, GuidText guidText,
                                          std::string* name) {
  std::string section = Narrow(record->name);
  *name = section;
  if (IsReserved(section)) return E_FAIL;
  std::string identifier = Narrow(vlrGuidToString(record->identifier));
  if (guidText == GuidText::WithoutBraces) identifier = WithoutBraces(identifier);
  // The directory is dropped: the next start puts the expert where experts are.
  String file(record->fileName ? record->fileName : L"");
  HRESULT result = m_registrationIni->SetItem(kComponents, section.c_str(), section.c_str(), true);
  auto set = [&](const char* item, const std::string& value) {
    if (result >= 0)
      result = m_registrationIni->SetItem(section.c_str(), item, value.c_str(), true);
  };
  set(kIdentifier, identifier);
  set(kFileName, Narrow(path::BaseName(file)));
  if (record->type == vltComponentResourceExpert) set(kPnp, Narrow(record->resource.pnp));
  return result;
}

HRESULT CvltPharlapRegistrar::SaveExpert(const _vltComponent2* record) {
  HRESULT result = SaveChanges();
  ComponentMap::Hold map(components());
  CvltComponent* component = nullptr;
  if (InternalGetComponentNoScan(record->identifier, component) < 0) return result;
  _vltComponent2& known = component->record();
  ReplaceText(&known.name, record->name);
  String file(record->fileName ? record->fileName : L"");
  ReplaceText(&known.fileName, path::BaseName(file).c_str());
  if (record->type == vltComponentResourceExpert && known.type == vltComponentResourceExpert) {
    ReplaceText(&known.resource.pnp, record->resource.pnp);
  }
  return result;
}

HRESULT CvltPharlapRegistrar::RegisterObjectExpert(_vltComponent2* record) {
  DatabaseHold hold(*this);
  if (BeginChange() < 0) return E_FAIL;
  std::string section;
  HRESULT result = WriteExpert(record, GuidText::WithoutBraces, &section);
  return result < 0 ? result : SaveExpert(record);
}

HRESULT CvltPharlapRegistrar::RegisterResourceExpert(_vltComponent2* record) {
  return RegisterObjectExpert(record);  // The type in the record makes the difference.
}

// ---- Reading

// True if the database was changed and has to be saved.
bool CvltPharlapRegistrar::completeFileName(const std::string& section, RecordText* text) {
  if (!LacksDirectory(*text)) return false;
  String experts;
  vlrMakeRootDirectory(vlt::layout::kExperts, &experts);
  text->file = Narrow(experts) + *text->file;
  m_registrationIni->SetItem(section.c_str(), kFileName, text->file->c_str(), true);
  return true;
}

HRESULT CvltPharlapRegistrar::ReadComponent(const wchar_t* section) {
  return ReadSection(section, EmptyFileName::Counts);
}

HRESULT CvltPharlapRegistrar::ReadSection(const wchar_t* wideSection, EmptyFileName emptyFileName) {
  std::string section = Narrow(wideSection);
  RecordText text = ReadRecord(*m_registrationIni, section, emptyFileName);
  bool changed = completeFileName(section, &text);
  auto component = std::make_unique<CvltComponent>();
  _vltComponent2& record = component->record();
  // The stamp is that of the object: clients see by it that the record came from here.
  record.size = sizeof(CvltComponent);
  record.version = text.version;
  record.type = text.type;
  record.name = CopyOf(wideSection);
  record.identifier = text.identifier;
  record.fileName = CopyOfNarrow(text.file);
  if (text.type == vltComponentDataDictionary) {
    record.dictionary.prefix = CopyOfNarrow(text.prefix);
    record.dictionary.schemaVersion = text.schemaVersion;
    record.dictionary.fragmentRegistered = text.fragmentRegistered;
    record.dictionary.lastInstalledSchemaVersion = text.lastInstalledSchemaVersion;
    return AddComponent(component.release());
  }
  if (text.type == vltComponentResourceExpert) record.resource.pnp = CopyOfNarrow(text.pnp);
  HRESULT result = PopulateBindingClasses(&record);
  if (result < 0) result = S_OK;  // An expert without binding classes is an expert.
  AddComponent(component.release());
  if (!changed) return result;
  // After the component is in the map: a database that cannot be written does not hide a component
  // that can be used.
  HRESULT saved = SaveChanges();
  return saved < 0 ? saved : result;
}

// ---- Binding classes

void CvltPharlapRegistrar::AddBindingClasses(const _vltComponent2* record,
                                             const CvltBindingClasses& classes) {
  if (record->type == vltComponentResourceExpert) {
    vltAddBindingClasses(record, classes, &m_resourceExpertBindings);
  } else if (record->type == vltComponentObjectExpert) {
    vltAddBindingClasses(record, classes, &m_objectExpertBindings);
  }
}

HRESULT CvltPharlapRegistrar::GetComponentsForBindingClass(_vltComponentType type,
                                                           GUID bindingClass, unsigned int* count,
                                                           GUID** components) {
  if (!components || !count) return E_POINTER;
  *count = 0;
  *components = nullptr;
  BindingClassesMap* map = nullptr;
  if (type == vltComponentResourceExpert) map = &m_resourceExpertBindings;
  if (type == vltComponentObjectExpert) map = &m_objectExpertBindings;
  if (!map) return VLT_E_NO_BINDING_CLASSES;
  return vltGetComponentsForBindingClass(bindingClass, count, map, components);
}

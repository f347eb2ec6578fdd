#include "source/Snapshot/Rehearsal.h"

#include <algorithm>
#include <new>
#include <unordered_map>

#include "source/Common/vltBindingClasses.h"
#include "source/Database/contentsWalk.h"
#include "source/Database/databaseText.h"
#include "source/Snapshot/DatabaseFile.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/Guid.h"

using registrar::Narrow;
using registrar::RecordText;
using registrar::ResourceTexts;
using registrar::Widen;
using zt::fnd::String;

namespace vlt::snapshot {
namespace {

constexpr unsigned kLongestClassesText = 1024;

Type TypeOf(const RecordText& record) {
  switch (record.type) {
    case vltComponentDataDictionary:
      return Type::Dictionary;
    case vltComponentResourceExpert:
      return Type::ResourceExpert;
    default:
      return Type::ObjectExpert;
  }
}

std::optional<std::string> Utf8IfAny(const std::optional<std::string>& text) {
  return text ? std::optional<std::string>(Utf8(*text)) : std::nullopt;
}

// A component that was replaced by one of its GUID leaves its bindings.
void AddClasses(const std::vector<Binding>& bindings, std::vector<Component>* components) {
  std::unordered_map<std::string, std::vector<const Binding*>> byComponent;
  for (const Binding& binding : bindings) byComponent[binding.component].push_back(&binding);
  if (byComponent.empty()) return;
  for (Component& component : *components) {
    std::vector<std::string>& classes = component.classes;
    for (const Binding* binding : byComponent[component.guid]) {
      if (component.type != binding->type) continue;
      bool isKnown =
          std::find(classes.begin(), classes.end(), binding->bindingClass) != classes.end();
      if (!isKnown) classes.push_back(binding->bindingClass);
    }
  }
}

// As the registrar keeps its texts: through the wide form.
std::string AsKept(const std::string& text) { return Narrow(Widen(text)); }

}  // namespace

std::string Utf8(const std::string& text) {
  zt::fnd::Utf8String utf8(Widen(text));
  return std::string(reinterpret_cast<const char*>(utf8.c_str()), utf8.length());
}

std::string GuidText(const GUID& guid) {
  String text;
  zt::fnd::Guid(guid).toString(text);
  return Narrow(text);
}

Component Describe(const IniDocument& document, const Place& place, const std::string& section,
                   const RecordText& record) {
  Component component;
  component.type = TypeOf(record);
  component.name = Utf8(section);
  component.guid = GuidText(record.identifier);
  component.file = Utf8IfAny(record.file);
  component.recordVersion = record.version;
  component.schemaVersion = record.schemaVersion;
  component.fragmentRegistered = record.fragmentRegistered;
  component.lastInstalledSchemaVersion = record.lastInstalledSchemaVersion;
  component.prefix = Utf8IfAny(record.prefix);
  component.pnp = Utf8IfAny(record.pnp);
  std::string from;
  if (document.GetItem(registrar::kContents, section.c_str(), &from) >= 0) {
    component.registrationFile = Utf8(place.toHere(from));
  }
  return component;
}

std::string Place::exchange(const std::string& path, const std::string& from,
                            const std::string& to) {
  return path.compare(0, from.size(), from) == 0 ? to + path.substr(from.size()) : path;
}

bool PlacedScan::isThere(const std::string& file) const {
  return registrar::FileIsThere(m_place.toHere(file));
}

Rehearsal::Rehearsal(const std::string& bytes, const Place& place)
    : m_place(place),
      m_document(true),
      m_isParsable(m_document.Parse(bytes) == 0),
      m_scan(m_document, m_place),
      m_onDisk(m_isParsable ? bytes : "") {}

Rehearsal::~Rehearsal() = default;

FileState Rehearsal::stateOf(const std::string& file, const zt::fnd::AbsTime& time) {
  if (m_scan.isUpToDate(file, time)) return FileState::Unchanged;
  bool known = m_document.ItemExists(registrar::kRegistrations, file.c_str()) >= 0;
  return known ? FileState::Changed : FileState::New;
}

void Rehearsal::set(const char* key, const std::string& value, bool quote) {
  if (m_document.SetItem(registrar::kGlobalSection, key, value.c_str(), quote) < 0) {
    throw std::bad_alloc();
  }
  save();
}

void Rehearsal::beginStart() {
  using namespace registrar;
  String root = Widen(m_place.recorded);
  String configuration = layout::DirectoryIn(root, layout::kData) + layout::kConfiguration;
  std::string stored;
  m_document.GetItem(kGlobalSection, kConfigFile, &stored);
  if (stored.empty() || Widen(stored) != configuration) {
    set(kConfigFile, Narrow(configuration), true);
  }
  stored.clear();
  m_document.GetItem(kGlobalSection, kSchemaVersion, &stored);
  if (stored.empty() || Number(stored) != 0) set(kSchemaVersion, Decimal(0), false);
  RecordText builtIn = BuiltInDictionary(Narrow(layout::DirectoryIn(root, layout::kDictionaries)));
  if (WriteDictionary(m_document, kBuiltInDictionary, builtIn) < 0) throw std::bad_alloc();
  save();
}

void Rehearsal::save() {
  if (m_document.Render(&m_onDisk) != 0 || m_document.Parse(m_onDisk) != 0) throw std::bad_alloc();
  m_texts.clear();
  ++m_saves;
}

Rehearsal::Merge Rehearsal::merge(const std::string& file, const zt::fnd::AbsTime& time) {
  std::string bytes;
  if (DatabaseAccess().read(m_place.toHere(file), &bytes) != 0) return Merge::Skipped;
  IniDocument fragment(true);
  m_scan.beginFile();
  bool isParsable = fragment.Parse(bytes) == 0;
  m_scan.eraseComponentsOf(file);
  int sections = isParsable ? fragment.GetNumberOfSections() : 0;
  for (int n = 1; n <= sections; ++n) {
    std::string section;
    if (fragment.GetNthSectionName(n, &section) < 0) continue;
    if (!registrar::Scan::isMerged(fragment, section)) continue;
    // A dictionary that is merged counts as changed; it is asked for by its name as it is kept.
    bool changed = fragment.ItemExists(AsKept(section).c_str(), registrar::kSchemaVersion) >= 0;
    m_scan.mergeSection(fragment, Widen(m_place.recorded), file, section, changed);
  }
  m_scan.setStamp(file, time);
  save();
  return isParsable ? Merge::Merged : Merge::SetAside;
}

void Rehearsal::removeVanished(std::vector<std::string>* vanished) {
  std::vector<std::string> eraseList;
  // A file has many components, and is looked up once.
  std::unordered_map<std::string, bool> present;
  for (const ContentsItem& item : ReadContents(m_document)) {
    auto [file, isNew] = present.try_emplace(item.file);
    if (isNew) {
      file->second = m_scan.isPresent(item.file);
      if (!file->second) vanished->push_back(item.file);
    }
    if (file->second) continue;
    m_scan.erase(item.component, item.file);
    for (int number = item.first; number <= item.last; ++number) {
      std::string name;
      if (m_document.GetNthItemName(registrar::kContents, number + 1, &name) >= 0) {
        eraseList.push_back(AsKept(name));
      }
    }
  }
  for (const std::string& name : eraseList) {
    m_document.EraseItem(registrar::kContents, name.c_str());
  }
  if (m_scan.droppedPlanted()) save();
}

void Rehearsal::readComponents(std::vector<Component>* components, std::vector<Binding>* bindings) {
  std::map<GUID, Component> byGuid;  // of two with one GUID the later counts
  int count = m_document.GetNumberOfItems(registrar::kComponents);
  for (int n = 1; n <= count; ++n) {
    std::string name;
    if (m_document.GetNthItemName(registrar::kComponents, n, &name) < 0 || name.empty()) continue;
    std::string section = AsKept(name);
    RecordText record =
        registrar::ReadRecord(m_document, section, registrar::EmptyFileName::IsNone);
    bool completed = completeFileName(section, &record);
    Component component = Describe(m_document, m_place, section, record);
    if (component.type != Type::Dictionary) {
      bind(record.identifier, component.type, AsKept(record.file.value_or("")), bindings);
    }
    byGuid.insert_or_assign(record.identifier, std::move(component));
    if (completed) save();
  }
  for (auto& [guid, component] : byGuid) components->push_back(std::move(component));
  AddClasses(*bindings, components);
}

bool Rehearsal::completeFileName(const std::string& section, RecordText* record) {
  if (!registrar::LacksDirectory(*record)) return false;
  String directory = layout::DirectoryIn(Widen(m_place.recorded), layout::kExperts);
  record->file = Narrow(directory) + *record->file;
  m_document.SetItem(section.c_str(), registrar::kFileName, record->file->c_str(), true);
  return true;
}

// ---- Binding classes

void Rehearsal::bind(const GUID& component, Type type, const std::string& file,
                     std::vector<Binding>* bindings) {
  auto& classes = m_classesByFile[file];
  if (!classes) {
    std::string text = textOfClasses(file);
    if (text.empty()) return;  // The next component of the file asks again.
    classes = std::make_unique<CvltBindingClasses>(Widen(text));
  }
  for (const GUID& entry : classes->GetComponentVector()) {
    if (!(entry == component)) continue;
    zt::fnd::Vector<GUID> bound;
    classes->GetBindingClassesForComponent(component, bound);
    for (const GUID& bindingClass : bound) {
      bindings->push_back({type, GuidText(bindingClass), GuidText(component)});
    }
  }
}

std::string Rehearsal::textOfClasses(const std::string& file) {
  ResourceTexts::Query query{":", ResourceTexts::TargetOf(file), registrar::kBindingClasses,
                             kLongestClassesText, ""};
  textsBeside(file).answer(query);
  return query.joined.substr(0, kLongestClassesText - 1);
}

ResourceTexts& Rehearsal::textsBeside(const std::string& file) {
  std::string directory;
  if (file.find("/Last/") != std::string::npos) directory = file.substr(0, file.rfind('/'));
  auto& texts = m_texts[directory];
  if (!texts) {
    IniStructForwardReferenceTag* document = ResourceTexts::NewDocument();
    if (!document) throw std::bad_alloc();
    texts = std::make_unique<ResourceTexts>(document, nullptr);
    if (directory.empty()) {
      IniReadBytes(document, m_onDisk.data(), m_onDisk.size());
    } else {
      IniReadFromFile(document, (m_place.toHere(directory) + "/vlt.vlr").c_str());
    }
  }
  return *texts;
}

}  // namespace vlt::snapshot

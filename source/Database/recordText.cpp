// How a component is written in the database, in one place for all who read or change it. The type
// is decided by the items that a section has: a schema version makes a dictionary, "PnP" a resource
// expert, and anything else is an object expert.
#include "source/Database/recordText.h"

#include "source/Common/vltcmn.h"
#include "source/Database/databaseText.h"
#include "source/IniDocument.h"
#include "zt/fnd/Guid.h"

using zt::fnd::String;

namespace registrar {
namespace {

class Section {
 public:
  Section(const IniDocument& database, const std::string& name)
      : m_database(database), m_name(name) {}

  bool has(const char* item) const { return m_database.ItemExists(m_name.c_str(), item) >= 0; }
  std::optional<std::string> text(const char* item) const {
    std::string value;
    if (m_database.GetItem(m_name.c_str(), item, &value) < 0) return std::nullopt;
    return value;
  }
  uint32_t number(const char* item, uint32_t fallback) const {
    std::string value = text(item).value_or("");
    return value.empty() ? fallback : Number(value);
  }

 private:
  const IniDocument& m_database;
  const std::string& m_name;
};

void ReadDictionary(const Section& section, RecordText* record) {
  record->type = vltComponentDataDictionary;
  record->version = kDictionaryVersion;
  record->prefix = section.text(kPrefix);
  record->schemaVersion = section.number(kSchemaVersion, 0);
  record->fragmentRegistered = section.number(kFragmentRegistered, 0);
  record->lastInstalledSchemaVersion = section.number(kLastInstalledSchemaVersion, kNeverInstalled);
}

}  // namespace

RecordText ReadRecord(const IniDocument& database, const std::string& name,
                      EmptyFileName emptyFileName) {
  Section section(database, name);
  RecordText record;
  std::string identifier = section.text(kIdentifier).value_or("");
  if (!identifier.empty()) record.identifier = vltGuidFromString2(Widen(identifier).c_str());
  record.file = section.text(kFileName);
  if (section.has(kSchemaVersion)) {
    ReadDictionary(section, &record);
    return record;
  }
  record.version = kExpertVersion;
  record.type = vltComponentObjectExpert;
  if (!section.has(kPnp)) return record;
  record.type = vltComponentResourceExpert;
  record.pnp = section.text(kPnp);
  if (emptyFileName == EmptyFileName::IsNone && record.file && record.file->empty()) {
    record.file.reset();
  }
  return record;
}

HRESULT WriteDictionary(IniDocument& database, const std::string& section,
                        const RecordText& record) {
  String identifier;
  zt::fnd::Guid(record.identifier).toString(identifier);
  // The list has the section's name as item and as value.
  HRESULT result = database.SetItem(kComponents, section.c_str(), section.c_str(), true);
  // After the first failure nothing more is set, and its result is that of the call.
  auto set = [&](const char* item, const std::string& value, bool quote) {
    if (result >= 0) result = database.SetItem(section.c_str(), item, value.c_str(), quote);
  };
  set(kIdentifier, WithoutBraces(Narrow(identifier)), true);
  set(kFileName, record.file.value_or(""), true);
  set(kSchemaVersion, Decimal(record.schemaVersion), false);
  set(kFragmentRegistered, Decimal(record.fragmentRegistered), false);
  set(kLastInstalledSchemaVersion, Decimal(record.lastInstalledSchemaVersion), false);
  set(kPrefix, record.prefix.value_or(""), true);
  return result;
}

RecordText BuiltInDictionary(const std::string& directory) {
  RecordText record;
  record.type = vltComponentDataDictionary;
  record.version = kDictionaryVersion;
  record.identifier = {
      0x790F6A90, 0xE0D8, 0x11D3, {0xAA, 0x15, 0x00, 0x50, 0x04, 0xD1, 0x31, 0xEE}};
  record.file = directory + kBuiltInDictionary + ".framework";
  record.lastInstalledSchemaVersion = 0;
  record.prefix = "vl";
  return record;
}

bool LacksDirectory(const RecordText& record) {
  return record.type != vltComponentDataDictionary && record.file &&
         record.file->find_first_of("\\/") == std::string::npos;
}

}  // namespace registrar

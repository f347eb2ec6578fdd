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

std::optional<std::string> Text(const IniDocument::Section& section, const char* item) {
  const char* value = section.value(item);
  return value ? std::optional<std::string>(value) : std::nullopt;
}

uint32_t NumberOr(uint32_t fallback, const IniDocument::Section& section, const char* item) {
  const char* value = section.value(item);
  return value && *value ? Number(value) : fallback;
}

void ReadDictionary(const IniDocument::Section& section, RecordText* record) {
  record->type = vltComponentDataDictionary;
  record->version = kDictionaryVersion;
  record->prefix = Text(section, kPrefix);
  record->schemaVersion = NumberOr(0, section, kSchemaVersion);
  record->fragmentRegistered = NumberOr(0, section, kFragmentRegistered);
  record->lastInstalledSchemaVersion =
      NumberOr(kNeverInstalled, section, kLastInstalledSchemaVersion);
}

}  // namespace

RecordText ReadRecord(const IniDocument& database, const std::string& name,
                      EmptyFileName emptyFileName) {
  const IniDocument::Section section(database, name.c_str());
  RecordText record;
  const char* identifier = section.value(kIdentifier);
  if (identifier && *identifier) record.identifier = GuidOf(identifier);
  record.file = Text(section, kFileName);
  if (section.has(kSchemaVersion)) {
    ReadDictionary(section, &record);
    return record;
  }
  record.version = kExpertVersion;
  record.type = vltComponentObjectExpert;
  if (!section.has(kPnp)) return record;
  record.type = vltComponentResourceExpert;
  record.pnp = Text(section, kPnp);
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

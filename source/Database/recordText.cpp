#include "source/Database/recordText.h"

#include "source/Common/vltcmn.h"
#include "source/Database/databaseText.h"
#include "source/IniDocument.h"

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
  record->lastInstalledSchemaVersion =
      section.number(kLastInstalledSchemaVersion, kNeverInstalled);
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

bool LacksDirectory(const RecordText& record) {
  return record.type != vltComponentDataDictionary && record.file &&
         record.file->find_first_of("\\/") == std::string::npos;
}

}  // namespace registrar

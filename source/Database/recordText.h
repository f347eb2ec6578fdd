#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "source/Common/vltTypes.h"

class IniDocument;

namespace registrar {

inline constexpr uint32_t kNeverInstalled = 0xFFFFFFFF;

// What a component's section says, as the registrar reads it. Texts are as they are in the
// database; one that is not there is none.
struct RecordText {
  _vltComponentType type = vltComponentNone;
  uint32_t version = 0;
  GUID identifier = GUID_NULL;  // null for a missing or bad text, too
  std::optional<std::string> file;
  // Dictionaries.
  uint32_t schemaVersion = 0, fragmentRegistered = 0, lastInstalledSchemaVersion = kNeverInstalled;
  std::optional<std::string> prefix;
  // Resource experts.
  std::optional<std::string> pnp;
};

// Whether an item that is there, but empty, counts as the file name of a resource expert.
enum class EmptyFileName { Counts, IsNone };

// Reads a section, which need not exist: that is an object expert without anything.
RecordText ReadRecord(const IniDocument& database, const std::string& section,
                      EmptyFileName emptyFileName);

// Lists a dictionary and sets the items of its section. The first negative result ends it: a name
// that is empty, or out of memory.
HRESULT WriteDictionary(IniDocument& database, const std::string& section,
                        const RecordText& record);

// The dictionary that every start registers, in the directory of dictionaries, which ends in a
// slash.
inline constexpr const char* kBuiltInDictionary = "vltdd";
RecordText BuiltInDictionary(const std::string& directory);

// Whether the file of an expert is to be put into the directory of experts.
bool LacksDirectory(const RecordText& record);

}  // namespace registrar

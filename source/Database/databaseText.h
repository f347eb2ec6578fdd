#pragma once

// Names of the registration database and small text helpers, shared by all that read it.

#include <stdlib.h>
#include <string.h>

#include <string>

#include "source/Common/vltTypes.h"
#include "zt/fnd/String.h"
#include "ztini/StringTools.h"

namespace registrar {

inline constexpr const char* kGlobalSection = "KOR";
inline constexpr const char* kComponents = "KORComponents";
inline constexpr const char* kRegistrations = "Registration";
inline constexpr const char* kContents = "VLRContentsSection";

inline constexpr const char* kConfigFile = "ConfigFile";
inline constexpr const char* kSchemaVersion = "SchemaVersion";
inline constexpr const char* kCacheSize = "CacheSize";
inline constexpr const char* kIdentifier = "Identifier";
inline constexpr const char* kFileName = "FileName";
inline constexpr const char* kFragmentRegistered = "FragmentRegistered";
inline constexpr const char* kLastInstalledSchemaVersion = "LastInstalledSchemaVersion";
inline constexpr const char* kPrefix = "Prefix";
inline constexpr const char* kPnp = "PnP";
inline constexpr const char* kBindingClasses = "BINDING_CLASSES";

// Whether a section of this name belongs to the database itself. A component of such a name would
// erase or overlay what all others need.
inline bool IsReserved(const std::string& section) {
  for (const char* own : {kGlobalSection, kComponents, kRegistrations, kContents}) {
    if (ztini_StrICmpWithoutSurrWhiteSpace(section.c_str(), own) == 0) return true;
  }
  return false;
}

// Record versions.
inline constexpr uint32_t kDictionaryVersion = 2;
inline constexpr uint32_t kExpertVersion = 3;

// In the process's locale; null counts as empty.
std::string Narrow(const wchar_t* text);
inline std::string Narrow(const zt::fnd::String& text) { return Narrow(text.c_str()); }
inline zt::fnd::String Widen(const std::string& text) { return zt::fnd::String(text.c_str()); }

// Cuts the braces of a 38-character GUID text: S_OK; S_FALSE for another length, E_FAIL for 38
// characters without both braces, the text then untouched.
template <class Char>
HRESULT StripBraces(Char* text, size_t length) {
  constexpr size_t kBracedLength = 38;
  if (length != kBracedLength) return S_FALSE;
  if (text[0] != '{' || text[kBracedLength - 1] != '}') return E_FAIL;
  memmove(text, text + 1, (kBracedLength - 2) * sizeof(Char));
  text[kBracedLength - 2] = 0;
  return S_OK;
}

// The text without its braces, or as it is.
inline std::string WithoutBraces(std::string text) {
  if (StripBraces(text.data(), text.size()) == S_OK) text.resize(text.size() - 2);
  return text;
}

inline std::string Decimal(uint32_t value) { return std::to_string(value); }
inline uint32_t Number(const char* text) {
  return static_cast<uint32_t>(strtoul(text, nullptr, 10));
}
inline uint32_t Number(const std::string& text) { return Number(text.c_str()); }
// With or without braces; the null GUID for anything else.
GUID GuidOf(const char* text);

}  // namespace registrar

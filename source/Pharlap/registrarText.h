#pragma once

// Names of the registration database and small text helpers, shared by the sources of the
// registrar.

#include <stdlib.h>
#include <string.h>

#include <string>

#include "source/vlrHelpers.h"
#include "zt/fnd/String.h"
#include "ztcom/ztcore/ztmemmgr.h"
#include "ztcom/ztcore/ztunknown.h"
#include "ztini/StringTools.h"

namespace registrar {

// Sections of the database itself: settings; the list of components, item and value a section each;
// the time stamp of each registration file; the file that each component came from.
inline constexpr const char* kGlobalSection = "KOR";
inline constexpr const char* kComponents = "KORComponents";
inline constexpr const char* kRegistrations = "Registration";
inline constexpr const char* kContents = "VLRContentsSection";

// Items of the settings, and of a component's section.
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
inline std::string Narrow(const wchar_t* text) {
  return text ? std::string(zt::fnd::AnsiString(text).c_str()) : std::string();
}
inline std::string Narrow(const zt::fnd::String& text) { return Narrow(text.c_str()); }
inline zt::fnd::String Widen(const std::string& text) { return zt::fnd::String(text.c_str()); }

// A record's text that is a copy; null for null, and where memory is out.
inline wchar_t* CopyOf(const wchar_t* text) {
  wchar_t* copy = nullptr;
  if (text) vlrDuplicateString(text, &copy);
  return copy;
}

// Frees the record's text and puts a copy in its place.
inline void ReplaceText(wchar_t** text, const wchar_t* by) {
  wchar_t* copy = CopyOf(by);
  ZtTaskMemFree(*text);
  *text = copy;
}

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

// Numbers as the database keeps them: decimal digits; what is no number reads as 0.
inline std::string Decimal(uint32_t value) { return std::to_string(value); }
inline uint32_t Number(const std::string& text) {
  return static_cast<uint32_t>(strtoul(text.c_str(), nullptr, 10));
}

}  // namespace registrar

// Root of the installation, ending in a slash; empty if there is none.

// The directory `name` below the root, ending in a slash, made if it was missing. Its code is that
// of the mode change, or E_FAIL where the rights to make it are missing. Without a root the text is
// empty, and the code E_FAIL.
HRESULT vlrMakeRootDirectory(const wchar_t* name, zt::fnd::String* directory);

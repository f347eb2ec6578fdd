#include "zt/fnd/osdep/SharedObjectName.h"

#include <algorithm>
#include <cstdint>
#include <memory>

#include "zt/fnd/String.h"
#include "zt/fnd/osdep/LocaleText.h"
#include "zt/fnd/osdep/SharedUnixObject.h"

namespace zt::fnd::osdep {
namespace {

bool IsAscii(wchar_t c) { return static_cast<uint32_t>(c) < 0x80; }

// By hand, and for ASCII only: toupper depends on the locale, which the host may change while the
// name is a key in a map.
wchar_t Folded(wchar_t c) { return c >= L'a' && c <= L'z' ? static_cast<wchar_t>(c - 32) : c; }

}  // namespace

AnsiString SharedObjectFileName(const String& name) {
  char* text;
  char* end;
  WideToAnsi(name.begin(), name.end(), "UTF-8", text, end);
  const std::unique_ptr<char[]> owner(text);
  return AnsiString(static_cast<const char*>(text), static_cast<AnsiString::size_type>(end - text));
}

// What path::Join would make of the two, but for the bytes of the name.
AnsiString SharedObjectPath(const String& dirName, const String& name) {
  // The narrow form of ASCII is the same in every locale of a host, so that the common name takes
  // the common way.
  if (std::all_of(name.begin(), name.end(), IsAscii)) return BuildSharedUnixFilePath(dirName, name);
  const AnsiString directory = BuildSharedUnixFilePath(dirName, String());
  const AnsiString fileName = SharedObjectFileName(name);
  // An absolute name is its own path, as in path::Join. An empty one cannot come here: all of its
  // characters are ASCII.
  return fileName[0] == '/' ? fileName : directory + fileName;
}

bool SharedObjectNameLess::operator()(const String& a, const String& b) const noexcept {
  const wchar_t* left = a.c_str();
  const wchar_t* right = b.c_str();
  while (*left != L'\0' && Folded(*left) == Folded(*right)) {
    ++left;
    ++right;
  }
  return Folded(*left) < Folded(*right);
}

}  // namespace zt::fnd::osdep

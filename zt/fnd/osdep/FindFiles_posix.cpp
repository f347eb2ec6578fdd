// One pass over the directory, each entry judged by the cheapest test first: its first character,
// the mask, the type that the listing gives for nothing, and only then calls of stat.
#include <dirent.h>
#include <wchar.h>

#include <cerrno>
#include <memory>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/FindFiles.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/StringCompare.h"
#include "zt/fnd/osdep/path.h"

namespace zt::fnd::osdep {
namespace {

using Flags = FindFiles::FindFlags;
using ScopedDir = std::unique_ptr<DIR, int (*)(DIR*)>;

enum class Errors { Quiet, Thrown };

bool Has(Flags flags, Flags flag) {
  return (static_cast<uint32_t>(flags) & static_cast<uint32_t>(flag)) != 0;
}

// Equal to no other character, in whatever locale.
bool HasNoCase(wchar_t c) {
  return c < 0x80 && !(c >= L'a' && c <= L'z') && !(c >= L'A' && c <= L'Z');
}

// Of a pattern's character that is no "*".
bool FitsCharacter(wchar_t wanted, wchar_t c) {
  if (wanted == c || wanted == L'?') return true;
  return !HasNoCase(wanted) && !HasNoCase(c) &&
         StringCaseCompare(&wanted, &wanted + 1, &c, &c + 1) == 0;
}

// A pattern without "*" that takes the last characters of the name.
bool FitsEnd(const wchar_t* pattern, const wchar_t* name) {
  size_t wanted = wcslen(pattern), length = wcslen(name);
  if (length < wanted) return false;
  for (name += length - wanted; *pattern != L'\0'; ++pattern, ++name) {
    if (!FitsCharacter(*pattern, *name)) return false;
  }
  return true;
}

struct Mask {
  String directory, pattern;
  String prefix;  // of full names: the directory and a slash

  explicit Mask(const String& mask) {
    String::size_type slash = mask.find_last_of(String(L"/\\"));
    if (slash == String::npos) {
      directory = L".";
      pattern = mask;
    } else {
      directory = mask.substr(0, slash);
      pattern = mask.substr(slash + 1);
    }
    prefix = directory + L"/";
  }
};

ScopedDir OpenDirectory(const String& directory) {
  AnsiString narrow(directory);
  DIR* dir;
  // Not RetryEintr, which knows calls that report by -1.
  do {
    dir = ::opendir(narrow.c_str());
  } while (!dir && errno == EINTR);
  return ScopedDir(dir, ::closedir);
}

// The next entry; null at the end, or with errno set.
const dirent* NextEntry(DIR* dir) {
  // readdir gives null for the end and for a failure; only errno distinguishes them.
  errno = 0;
  return ::readdir(dir);
}

bool IsDotOrDotDot(const char* name) {
  return name[0] == '.' && (name[1] == '\0' || (name[1] == '.' && name[2] == '\0'));
}

// The listing's type settles these without a call of stat.
bool SurelyNoDirectory(const dirent* entry) {
  return entry->d_type != DT_DIR && entry->d_type != DT_LNK && entry->d_type != DT_UNKNOWN;
}

// `full` begins with the prefix, and is the same text for all entries.
void AddEntry(const Mask& mask, Flags flags, const dirent* entry, String& full,
              Vector<String>& found) {
  // Whatever the pattern: a walk that descends into what it finds would never end.
  if (IsDotOrDotDot(entry->d_name)) return;
  if (entry->d_name[0] == '.' && !Has(flags, Flags::Hidden)) return;
  full.erase(mask.prefix.length(), String::npos, BufferStrategy::Keep);
  full.append(entry->d_name);
  if (!WildcardFit(mask.pattern.c_str(), full.c_str() + mask.prefix.length())) return;
  if (!Has(flags, Flags::Directories | Flags::FollowLinks)) {
    found.push_back(full);
    return;
  }
  String listed(full);
  if (Has(flags, Flags::Directories)) {
    if (SurelyNoDirectory(entry) || !path::IsDirectory(listed.c_str())) return;
    path::MakePathEndInSlash(listed);
  }
  if (Has(flags, Flags::FollowLinks) && path::IsSymLink(listed.c_str())) {
    listed = path::ResolveSymLink(listed);
  }
  found.push_back(listed);
}

Vector<String> List(const String& text, Flags flags, Errors errors) {
  Vector<String> found;
  Mask mask(text);
  // A mask that ends in a separator names nothing; an empty one fits no name either.
  if (mask.pattern.empty() && !text.empty()) return found;
  ScopedDir dir = OpenDirectory(mask.directory);
  if (!dir) {
    if (errors == Errors::Thrown) ZT_RAISE(PosixError());
    return found;
  }
  String full(mask.prefix);
  while (const dirent* entry = NextEntry(dir.get())) AddEntry(mask, flags, entry, full, found);
  // Without flags a listing that breaks off returns what it has, as it returns nothing for a
  // directory that cannot be opened.
  if (errno != 0 && errors == Errors::Thrown) ZT_RAISE(PosixError());
  if (Has(flags, Flags::DotEntries)) {
    found.push_back(mask.directory + L"/.");
    found.push_back(mask.directory + L"/..");
  }
  return found;
}

}  // namespace

bool WildcardFit(const wchar_t* pattern, const wchar_t* name) {
  // After the last "*", and where in the name the run that it matches ends. Only the last one
  // ever has to take more: what an earlier "*" took already led here.
  const wchar_t* star = nullptr;
  const wchar_t* resume = nullptr;
  while (*name != L'\0') {
    if (*pattern == L'*') {
      star = ++pattern;
      resume = name;
      // What follows the last one of all is the end of the name.
      if (!wcschr(star, L'*')) return FitsEnd(star, name);
    } else if (*pattern != L'\0' && FitsCharacter(*pattern, *name)) {
      ++pattern;
      ++name;
    } else if (star) {
      pattern = star;
      name = ++resume;
    } else {
      return false;
    }
  }
  while (*pattern == L'*') ++pattern;
  return *pattern == L'\0';
}

Vector<String> FindFiles::getFilenames(const String& mask) {
  return List(mask, Flags::None, Errors::Quiet);
}

Vector<String> FindFiles::getFilenames(const String& mask, FindFlags flags) {
  return List(mask, flags, Errors::Thrown);
}

}  // namespace zt::fnd::osdep

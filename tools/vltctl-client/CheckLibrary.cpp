#include "tools/vltctl-client/CheckLibrary.h"

#include <dlfcn.h>
#include <elf.h>
#include <errno.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <set>

#include "tools/vltctl-client/Candidates.h"
#include "tools/vltctl-client/DropRights.h"
#include "tools/vltctl-client/LibraryTrust.h"

namespace vltctl {
namespace {

struct Entry {
  const char *type, *name;
};
// A dictionary is loaded, and nothing is asked of it by name.
constexpr Entry kEntries[] = {{"object expert", "vltCreateObjectExpert"},
                              {"resource expert", "vltCreateResourceExpert"},
                              {"UI provider", "vlGetProvider"}};

constexpr const char* kBuiltInDictionary = "{790F6A90-E0D8-11D3-AA15-005004D131EE}";

const char* EntryPointOf(const Component& component) {
  for (const Entry& row : kEntries) {
    if (component.type == row.type) return row.name;
  }
  return nullptr;
}

bool HasIdentifier(const Component& component) { return component.guid != GuidText(GUID_NULL); }

// A library for the other word size is a likely mistake, and the loader's words for it are dark.
std::string WrongWordSize(const std::string& file) {
  std::ifstream in(file, std::ios::binary);
  char ident[EI_NIDENT] = {};
  in.read(ident, sizeof ident);
  if (!in || memcmp(ident, ELFMAG, SELFMAG) != 0) return "";
  int bits = ident[EI_CLASS] == ELFCLASS64 ? 64 : 32;
  int own = sizeof(void*) * 8;
  if (bits == own) return "";
  return file + " is built for " + std::to_string(bits) + " bits, this program for " +
         std::to_string(own);
}

std::string After(const std::string& text, const std::string& mark) {
  size_t at = text.find(mark);
  return at == std::string::npos ? "" : text.substr(at + mark.size());
}

// The root of a failed load, from the loader's words for it.
void Explain(const std::string& file, const std::string& words, Verdict* out) {
  constexpr const char* kNotFoundMark = ": cannot open shared object file";
  out->library = file;
  out->notes.push_back(words);
  std::string needed = words.substr(0, std::min(words.find(kNotFoundMark), words.size()));
  std::string symbol = After(words, "undefined symbol: "), bits = WrongWordSize(file);
  if (!bits.empty()) {
    out->code = "wrong-class";
    out->messages.push_back(bits);
  } else if (words.find("Permission denied") != std::string::npos) {
    out->code = "unreadable";
    out->messages.push_back(needed + " cannot be read: Permission denied");
  } else if (!symbol.empty()) {
    out->code = "undefined-symbol";
    out->messages.push_back(file + " uses \"" + symbol + "\", which no library that it needs has");
  } else if (needed != words && needed != file) {
    out->code = "missing-dependency";
    out->messages.push_back(file + " needs " + needed + ", which is not found");
  } else if (words.find("invalid ELF header") != std::string::npos ||
             words.find("file too short") != std::string::npos) {
    out->code = "not-a-library";
    out->messages.push_back(file + " is no library");
  } else {
    out->code = "not-loadable";
    out->messages.push_back(file + " does not load");
  }
}

std::string BaseName(const std::string& path) { return path.substr(path.rfind('/') + 1); }

// Names no extension, so that the loader tries others beside it.
bool IsUndecorated(const std::string& file) {
  return BaseName(file).find('.') == std::string::npos;
}

// Why nothing can be loaded from the path; a sound verdict if something may.
Verdict CheckPath(const std::string& file) {
  struct stat info;
  if (file.empty()) return Bad("no-file", "its registration names no file");
  if (!file.starts_with('/')) return Bad("relative-path", file + " is no absolute path");
  if (IsUndecorated(file)) return {};
  if (stat(file.c_str(), &info) == 0) {
    if (S_ISREG(info.st_mode) || S_ISDIR(info.st_mode)) return {};
    return Bad("not-a-library", file + " is neither a file nor a directory");
  }
  int error = errno;
  if (error == ENOENT || error == ENOTDIR) return Bad("missing", file + " does not exist");
  return Bad("unreachable", file + " cannot be reached: " + strerror(error));
}

void* Load(const std::vector<std::string>& candidates, Verdict* out) {
  for (const std::string& candidate : candidates) {
    struct stat info;
    if (stat(candidate.c_str(), &info) != 0 || !S_ISREG(info.st_mode)) continue;
    // Local, unlike the library's: another component's names must not make up for missing ones here.
    if (void* handle = dlopen(candidate.c_str(), RTLD_NOW | RTLD_LOCAL)) {
      *out = Verdict();
      out->library = candidate;
      return handle;
    }
    const char* words = dlerror();
    if (out->code.empty()) Explain(candidate, words ? words : "", out);
  }
  return nullptr;
}

// What is missing, where there is nothing to load at all.
Verdict WithoutLibrary(const std::string& file, std::vector<std::string> candidates) {
  bool isBundle = !IsUndecorated(file);
  if (isBundle) candidates.pop_back();  // the directory itself
  std::string names;
  for (size_t i = 0; i < candidates.size(); ++i) {
    if (i > 0) names += i + 1 == candidates.size() ? " and " : ", ";
    names += isBundle ? BaseName(candidates[i]) : candidates[i];
  }
  return Bad("no-library",
             (isBundle ? file + " has" : std::string("there is")) + " none of " + names);
}

}  // namespace

bool HasLibrary(const Component& component) { return component.guid != kBuiltInDictionary; }

Verdict CheckLibrary(const Component& component) {
  if (!HasLibrary(component)) return {};
  if (!HasIdentifier(component)) {
    return Bad("no-identifier", "it has no identifier of its own, so no program can ask for it");
  }
  Verdict out = CheckPath(component.file);
  if (!out.code.empty()) return out;
  std::vector<std::string> candidates = LibraryCandidates(component.file);
  void* handle = Load(candidates, &out);
  if (!handle) {
    return out.code.empty() ? WithoutLibrary(component.file, candidates) : out;
  }
  const char* entry = EntryPointOf(component);
  if (entry && !dlsym(handle, entry)) {
    out.code = "no-entry-point";
    out.messages.push_back(out.library + " does not export \"" + entry + "\"");
  }
  dlclose(handle);
  return out;
}

// ---- The library's own check

namespace {

void AddMessages(IEnumString* list, Verdict* verdict) {
  wchar_t* text = nullptr;
  unsigned fetched = 0;
  while (list->Next(1, &text, &fetched) == S_OK) {
    verdict->notes.push_back("vltCheckComponent: " + NarrowText(text));
    vltFree(text);
  }
}

}  // namespace

void AddLibrarysWords(const Component& component, Verdict* verdict) {
  if (!HasIdentifier(component))
    return;  // To the library the null identifier means all components.
  IEnumString* list = nullptr;
  try {
    vltCheckComponent(ParseGuid(component.guid), &list);
  } catch (const std::exception& error) {
    // Its messages are lost with it.
    verdict->notes.push_back(std::string("vltCheckComponent did not end: ") + error.what());
  }
  if (!list) return;
  AddMessages(list, verdict);
  list->Release();
}

// ---- Rights

namespace {

std::string Join(const std::set<uid_t>& users) {
  std::string out;
  for (uid_t user : users) out += (out.empty() ? "" : ", ") + std::to_string(user);
  return out;
}

// What root must not load, with the reason; or nothing.
std::string Refusal(const Controllers& controllers) {
  std::string why;
  if (!controllers.shared.empty()) {
    why = "\"" + controllers.shared + "\": " + controllers.reason;
  } else if (controllers.users.size() > 1) {
    why = "users " + Join(controllers.users) + " can each change it or a directory on its path";
  }
  if (why.empty()) return "";
  return "not loaded, as root would run the code of other users: " + why +
         "; check it as an ordinary user, or leave only its owner the right to change the path";
}

// The library's own conversion of the name may lead elsewhere.
constexpr const char* kInexact =
    "not loaded, as its path has characters that the locale lacks, and so root cannot see whose it "
    "is; check it in a UTF-8 locale";

// Why the process could not become the user, or nothing.
std::string Become(uid_t user, int* fd) {
  const char* failed = DetachFromParent(fd);
  if (!failed) failed = DropRights(user);
  if (!failed) return "";
  return "not loaded, as root cannot become user " + std::to_string(user) +
         ", who can change it: " + failed + "; check it as that user";
}

bool IsLoadedByRoot(const Component& component) {
  return geteuid() == 0 && HasLibrary(component) && component.file.starts_with('/');
}

}  // namespace

bool NeedsOtherUser(const Component& component) {
  if (!IsLoadedByRoot(component)) return false;
  Controllers controllers = ControllersOfLibrary(component.file);
  return component.fileIsExact && Refusal(controllers).empty() && !controllers.users.empty();
}

std::string PrepareToLoad(const Component& component, int* fd) {
  if (!IsLoadedByRoot(component)) return "";
  Controllers controllers = ControllersOfLibrary(component.file);
  std::string refusal = component.fileIsExact ? Refusal(controllers) : kInexact;
  if (!refusal.empty() || controllers.users.empty()) return refusal;
  return Become(*controllers.users.begin(), fd);
}

}  // namespace vltctl

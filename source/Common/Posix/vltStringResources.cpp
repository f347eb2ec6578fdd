// A question names a file and a key, and is answered from the components of the database whose own
// file has the same base name. Three things keep many questions cheap: the database is read once
// and kept, an index from file to sections grows with the walk through the list of components, and
// each answer is kept under all of the question. The index is built no further than needed: a
// question without a separator ends at its first match.
//
// The early-trace warnings are a part of the behaviour: with them switched on every question walks
// the list from its start again, so that each repeats the warnings that it would give alone.
#include <cstring>

#include <algorithm>
#include <tuple>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/vltcmn.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/osdep/StringCompare.h"
#include "ztini/ztini.h"

namespace {

// The early-trace lines of this file. Source and numbers are frozen; they do not follow the code.
constexpr const char* kEarlyTraceSource = "./source/Utilities/../Common/Posix/vltlinuxos";
enum EarlyTraceLine : long {
  kNoInstallDirectory = 57,
  kNoText = 120,
  kNoFileName = 134,
  kNoSection = 143,
  kNoComponents = 152,
};

constexpr const char* kComponents = "KORComponents";
// Bytes with the terminator; a longer value is cut, and then names another file or none.
constexpr size_t kFileNameSize = 260;

bool Warns() { return (vltGetTraceFlagsImpl() & kEarlyTraceMask) >= kEarlyTraceWarnings; }

// What follows the last slash; the whole text without one.
std::string BaseName(const std::string& file) { return file.substr(file.rfind('/') + 1); }

struct NameLess {
  bool operator()(const std::string& a, const std::string& b) const {
    return zt::fnd::osdep::StringCaseCompare(a.c_str(), b.c_str()) < 0;
  }
};

struct ResourceQuery {
  const char* separator;
  std::string target;  // base name of the component's file
  std::string key;
  unsigned maxLength;
  std::string joined;
  HRESULT result = E_FAIL;
  bool outOfMemory = false;  // the result says nothing of the next time
};

}  // namespace

struct vltStringResources::Database {
  explicit Database(const std::string& file) : document(IniNew(0)) {
    if (!document) return;
    IniSetDuplicateChecking(document, 1);
    IniReadFromFile(document, file.c_str());  // A missing file is an empty one.
  }
  ~Database() { IniDispose(document); }
  Database(const Database&) = delete;
  Database& operator=(const Database&) = delete;

  void answer(ResourceQuery& q);
  bool fileNameOf(const char* section, std::string* base);
  bool appendFrom(ResourceQuery& q, const char* section);
  void search(ResourceQuery& q);
  const char* indexNext(std::string* base);

  IniStructForwardReferenceTag* document;
  int32_t indexed = 0;  // items of the list that are in sectionsOf
  // Base name of a component's file to the sections that have it, in the order of the list.
  std::map<std::string, std::vector<std::string>, NameLess> sectionsOf;

  // Answers given, by all of a question but the file: the components of one file all ask the same,
  // and each answer needs all of them.
  struct Answer {
    HRESULT result;
    std::string text;
  };
  using Kind = std::tuple<bool, std::string, std::string, unsigned>;
  std::map<Kind, std::map<std::string, Answer, NameLess>> answers;
};

// False, with a warning where that is due, for a section that names no file.
bool vltStringResources::Database::fileNameOf(const char* section, std::string* base) {
  if (!IniSectionExists(document, section)) {
    if (Warns()) {
      vltEarlyTrace(kEarlyTraceSource, kNoSection,
                    "Warning: %s section has component %s but no section for this component in "
                    "vlt.vlr file",
                    kComponents, section);
    }
    return false;
  }
  if (IniItemExists(document, section, "FileName") != 1) return false;
  char file[kFileNameSize];
  int32_t status = IniGetStringIntoBuffer(document, section, "FileName", file, sizeof file);
  if (status < 1) {
    if (Warns()) {
      vltEarlyTrace(kEarlyTraceSource, kNoFileName,
                    "Warning: Could not read file name from section %s, result = %d", section,
                    static_cast<int>(status));
    }
    return false;
  }
  *base = BaseName(file);
  return true;
}

// Adds the text of one component. True if the search is over.
bool vltStringResources::Database::appendFrom(ResourceQuery& q, const char* section) {
  if (IniItemExists(document, section, q.key.c_str()) == 1) {
    TaskMem<char> text(static_cast<char*>(q.maxLength ? vltTaskMemAlloc(q.maxLength) : nullptr));
    if (!text && q.maxLength) q.outOfMemory = true;
    int32_t status = 0;
    if (text) {
      status = IniGetStringIntoBuffer(document, section, q.key.c_str(), text.get(), q.maxLength);
    }
    if (status != 0 && text) {
      if (!q.joined.empty()) q.joined += q.separator ? q.separator : "";
      q.joined += text.get();
      q.result = S_OK;
    } else if (Warns()) {
      vltEarlyTrace(kEarlyTraceSource, kNoText,
                    "Warning: Could not get string resource %s from section %s, result = %d",
                    q.key.c_str(), section, static_cast<int>(status));
    }
  }
  return !q.separator;
}

// Puts the next component of the list into the index. Returns its section and the base name of its
// file, which is empty if it has none; null at the end of the list.
const char* vltStringResources::Database::indexNext(std::string* base) {
  base->clear();
  const char* section = nullptr;
  if (IniNthItemName(document, kComponents, indexed + 1, &section) != 1) return nullptr;
  // An empty name matches nothing.
  if (fileNameOf(section, base) && !base->empty()) sectionsOf[*base].push_back(section);
  ++indexed;  // Last: out of memory leaves the component to the next question.
  return section;
}

void vltStringResources::Database::answer(ResourceQuery& q) {
  if (!document) return;
  if (IniSectionExists(document, kComponents) != 1) {
    if (Warns()) {
      vltEarlyTrace(kEarlyTraceSource, kNoComponents, "Warning: There should always be %s",
                    kComponents);
    }
    return;
  }
  if (Warns()) {
    // Each question repeats its warnings, up to where it ends.
    indexed = 0;
    sectionsOf.clear();
    answers.clear();
  }
  Kind kind(q.separator != nullptr, q.separator ? q.separator : "", q.key, q.maxLength);
  auto& known = answers[kind];
  if (auto found = known.find(q.target); found != known.end()) {
    q.result = found->second.result;
    q.joined = found->second.text;
    return;
  }
  search(q);
  // The joined text may be longer than any one; what does not fit is never returned, and need not
  // be kept.
  q.joined.resize(std::min<size_t>(q.joined.size(), q.maxLength));
  if (!q.outOfMemory) known.emplace(q.target, Answer{q.result, q.joined});
}

// The index first, and then what follows it in the list.
void vltStringResources::Database::search(ResourceQuery& q) {
  if (auto found = sectionsOf.find(q.target); found != sectionsOf.end()) {
    for (const std::string& section : found->second) {
      if (appendFrom(q, section.c_str())) return;
    }
  }
  std::string base;
  while (const char* section = indexNext(&base)) {
    bool matches =
        !base.empty() && zt::fnd::osdep::StringCaseCompare(base.c_str(), q.target.c_str()) == 0;
    if (matches && appendFrom(q, section)) return;
  }
}

vltStringResources::vltStringResources() = default;
vltStringResources::~vltStringResources() = default;

void vltStringResources::forget() {
  m_databases.clear();
  m_lookedUp = false;
}

vltStringResources::Database* vltStringResources::databaseFor(const std::string& file) {
  std::string directory;
  // A dictionary of the previous version brings its database along, in its own directory.
  if (file.find("/Last/") != std::string::npos) {
    directory = file.substr(0, file.rfind('/'));
  } else {
    if (!m_lookedUp) {
      m_installDirectory = vlLookUpInstallDirectory();
      m_lookedUp = true;
    }
    directory = m_installDirectory;
  }
  if (directory.empty()) {
    // An installation without a place; the file must not be looked for at the top of the system.
    if (vltGetTraceFlagsImpl() & kEarlyTraceMask) {
      vltEarlyTrace(kEarlyTraceSource, kNoInstallDirectory,
                    "Could not get path to KOR Data in getstringresourceimpl\n");
    }
    return nullptr;
  }
  auto& database = m_databases[directory];
  if (!database) database = std::make_unique<Database>(directory + "/vlt.vlr");
  return database.get();
}

HRESULT vltStringResources::get(const char* separator, const wchar_t* file, const wchar_t* key,
                                char** out, unsigned maxLength) {
  if (!out) return E_POINTER;
  std::string narrowFile = zt::fnd::AnsiString(file ? file : L"").c_str();
  ResourceQuery q{separator, "", zt::fnd::AnsiString(key ? key : L"").c_str(),
                  maxLength, "", E_FAIL};
  // Without a slash there is no base name to look for.
  if (narrowFile.find('/') != std::string::npos) q.target = BaseName(narrowFile);
  Database* database = databaseFor(narrowFile);
  if (!database) return E_FAIL;
  database->answer(q);
  if (q.joined.empty()) return q.result;
  auto* text = static_cast<char*>(vltTaskMemAlloc(maxLength));
  if (!text) return E_FAIL;
  strncpy(text, q.joined.c_str(), maxLength);
  text[maxLength - 1] = '\0';
  *out = text;
  return q.result;
}

HRESULT vltGetStringResourceImpl(const char* separator, const wchar_t* file, const wchar_t* key,
                                 char** out, unsigned maxLength) {
  return vltStringResources().get(separator, file, key, out, maxLength);
}

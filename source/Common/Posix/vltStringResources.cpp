// Most installations have no text of a key that is optional, and a start asks for one for each
// component. Whether the key is anywhere in the database's bytes is found in a fifth of the time that
// parsing takes, so that the database is parsed only for a key that is there. A key that is not is
// remembered as it was asked for.
#include <ctype.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>
#include <wchar.h>

#include <algorithm>
#include <array>
#include <optional>
#include <string_view>
#include <vector>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/vltcmn.h"
#include "source/Database/databaseText.h"
#include "source/Database/resourceTexts.h"
#include "vlloader/source/vlloader.h"
#include "zt/posix/Files.h"
#include "zt/posix/Transfer.h"
#include "ztini/OpenFile.h"
#include "ztini/ztini.h"

using registrar::ResourceTexts;

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

class Warnings final : public registrar::ResourceObserver {
 public:
  bool wantsAll() const override {
    return (vltGetTraceFlagsImpl() & kEarlyTraceMask) >= kEarlyTraceWarnings;
  }
  void noList() override {
    vltEarlyTrace(kEarlyTraceSource, kNoComponents, "Warning: There should always be %s",
                  kComponents);
  }
  void noSection(const char* section) override {
    vltEarlyTrace(kEarlyTraceSource, kNoSection,
                  "Warning: %s section has component %s but no section for this component in "
                  "vlt.vlr file",
                  kComponents, section);
  }
  void noFileName(const char* section, int status) override {
    vltEarlyTrace(kEarlyTraceSource, kNoFileName,
                  "Warning: Could not read file name from section %s, result = %d", section,
                  status);
  }
  void noText(const char* key, const char* section, int status) override {
    vltEarlyTrace(kEarlyTraceSource, kNoText,
                  "Warning: Could not get string resource %s from section %s, result = %d", key,
                  section, status);
  }

 private:
  static constexpr const char* kComponents = "KORComponents";
};

Warnings s_warnings;

// Finds a name in a text that comes in blocks, in the case rules of names. Looks for one of its
// characters, and compares the whole where that is.
class NameSearch {
 public:
  explicit NameSearch(const std::string& name) {
    auto isSpace = [](char c) { return isspace(static_cast<unsigned char>(c)) != 0; };
    auto first = std::find_if_not(name.begin(), name.end(), isSpace);
    m_wanted.assign(first,
                    std::find_if_not(name.rbegin(), std::reverse_iterator(first), isSpace).base());
    for (size_t c = 0; c < m_folded.size(); ++c)
      m_folded[c] = static_cast<unsigned char>(toupper(static_cast<int>(c)));
    // Letters are in every word; others are rare.
    auto isLetter = [](char c) { return isalpha(static_cast<unsigned char>(c)) != 0; };
    auto rare = std::find_if_not(m_wanted.begin(), m_wanted.end(), isLetter);
    if (rare != m_wanted.end()) m_anchor = static_cast<size_t>(rare - m_wanted.begin());
    for (size_t c = 0; !m_wanted.empty() && c < m_folded.size(); ++c) {
      if (m_folded[c] == fold(m_wanted[m_anchor])) m_forms += static_cast<char>(c);
    }
  }

  size_t size() const { return m_wanted.size(); }
  bool isIn(std::string_view text) const {
    if (m_wanted.empty()) return true;
    return std::any_of(m_forms.begin(), m_forms.end(), [&](char c) { return isIn(text, c); });
  }

 private:
  unsigned char fold(char c) const { return m_folded[static_cast<unsigned char>(c)]; }

  // With this form of the character.
  bool isIn(std::string_view text, char form) const {
    auto same = [this](char a, char b) { return fold(a) == fold(b); };
    for (size_t at = text.find(form, m_anchor); at != text.npos; at = text.find(form, at + 1)) {
      const std::string_view rest = text.substr(at - m_anchor);
      if (rest.size() < size()) return false;
      if (std::equal(m_wanted.begin(), m_wanted.end(), rest.begin(), same)) return true;
    }
    return false;
  }

  std::string m_wanted;  // without white space around it
  size_t m_anchor = 0;   // the character that is looked for
  std::string m_forms;   // all characters that fold as that one does
  std::array<unsigned char, 256> m_folded;
};

// False where the parser may join what stands apart in the bytes: see ztini/TextLines.h.
bool HasPlainLines(std::string_view block, bool isFirst) {
  constexpr size_t kNeverLong = 255;
  return (!isFirst || block.find('\n') < kNeverLong) && block.find('\r') == std::string::npos &&
         block.find('\0') == std::string::npos;
}

// False only if a parser finds no such name in the file. Reads it in blocks: a start has the text of
// the database in memory already, and should not have it twice.
bool MayHold(const std::string& file, const std::string& name) {
  zt::posix::ScopedFd fd = zt::posix::OpenExisting(file.c_str(), O_RDONLY);
  struct stat info;
  if (!fd || fstat(fd.get(), &info) != 0 || info.st_size > ztini::kLargestFileBytes) return true;
  const NameSearch search(name);
  const size_t blockBytes = 65536 + search.size();
  std::vector<char> buffer(blockBytes + search.size());
  size_t kept = 0;  // the end of the block before, in which the name may begin
  for (bool isFirst = true;; isFirst = false) {
    size_t got = zt::posix::MoveAll(blockBytes, [&](size_t done, size_t rest) {
      return read(fd.get(), buffer.data() + kept + done, rest);
    });
    if (got < blockBytes && errno != 0) return true;
    std::string_view text(buffer.data(), kept + got);
    if (!HasPlainLines(text.substr(kept), isFirst) || search.isIn(text)) return true;
    if (got < blockBytes) return false;
    kept = search.size() - 1;
    std::copy(text.end() - static_cast<ptrdiff_t>(kept), text.end(), buffer.begin());
  }
}

}  // namespace

class vltStringResources::Database {
 public:
  explicit Database(std::string file) : m_file(std::move(file)) {}
  // False only if no component has a text of the key.
  bool mayHave(const std::string& key) {
    // One who wants reports gets those of the whole walk.
    if (m_texts || s_warnings.wantsAll()) return true;
    auto known = m_keys.find(key);
    if (known == m_keys.end()) known = m_keys.emplace(key, MayHold(m_file, key)).first;
    return known->second;
  }
  void answer(ResourceTexts::Query& query) {
    if (!m_texts) m_texts.emplace(read(), &s_warnings);
    m_texts->answer(query);
  }

 private:
  IniStructForwardReferenceTag* read() const {
    IniStructForwardReferenceTag* document = ResourceTexts::NewDocument();
    if (document) IniReadFromFile(document, m_file.c_str());  // A missing file is an empty one.
    return document;
  }

  std::string m_file;
  std::map<std::string, bool> m_keys;  // whether the file may hold it
  std::optional<ResourceTexts> m_texts;
};

vltStringResources::vltStringResources() = default;
vltStringResources::~vltStringResources() = default;

void vltStringResources::forget() {
  m_databases.clear();
  m_installed = nullptr;
  m_missing.clear();
  m_lookedUp = false;
}

vltStringResources::Database* vltStringResources::databaseFor(const std::string& file) {
  std::string directory;
  // A dictionary of the previous version brings its database along, in its own directory.
  const bool isPrevious = file.find("/Last/") != std::string::npos;
  if (isPrevious) {
    directory = file.substr(0, file.rfind('/'));
  } else {
    if (m_installed) return m_installed;
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
  if (!isPrevious) m_installed = database.get();
  return database.get();
}

namespace {

// As wcsstr finds it, which goes character by character.
bool IsOfPreviousVersion(const wchar_t* file) {
  for (const wchar_t* l = wcschr(file, L'L'); l; l = wcschr(l + 1, L'L')) {
    if (l != file && l[-1] == L'/' && wcsncmp(l, L"Last/", 5) == 0) return true;
  }
  return false;
}

}  // namespace

// The answer to most questions, without a conversion of their texts.
bool vltStringResources::isKnownMissing(const wchar_t* file, const wchar_t* key) const {
  return file && key && !m_missing.empty() && m_missing == key && !IsOfPreviousVersion(file) &&
         !s_warnings.wantsAll();
}

HRESULT vltStringResources::get(const char* separator, const wchar_t* file, const wchar_t* key,
                                char** out, unsigned maxLength) {
  if (!out) return E_POINTER;
  if (isKnownMissing(file, key)) return E_FAIL;
  std::string narrowFile = registrar::Narrow(file), narrowKey = registrar::Narrow(key);
  Database* database = databaseFor(narrowFile);
  if (!database) return E_FAIL;
  if (!database->mayHave(narrowKey)) {
    if (key && database == m_installed) m_missing = key;
    return E_FAIL;
  }
  ResourceTexts::Query q{separator, ResourceTexts::TargetOf(narrowFile), std::move(narrowKey),
                         maxLength, ""};
  database->answer(q);
  HRESULT result = q.found ? S_OK : E_FAIL;
  if (q.joined.empty()) return result;
  auto* text = static_cast<char*>(vltTaskMemAlloc(maxLength));
  if (!text) return E_FAIL;
  strncpy(text, q.joined.c_str(), maxLength);
  text[maxLength - 1] = '\0';
  *out = text;
  return result;
}

HRESULT vltGetStringResourceImpl(const char* separator, const wchar_t* file, const wchar_t* key,
                                 char** out, unsigned maxLength) {
  return vltStringResources().get(separator, file, key, out, maxLength);
}

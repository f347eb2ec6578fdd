// Most installations have no text of a key that is optional, and a start asks for one for each
// component. Whether the key is anywhere in the database's bytes is found in a fifth of the time that
// parsing takes, so that the database is parsed only for a key that is there.
#include <ctype.h>
#include <fcntl.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <optional>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/vltcmn.h"
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

// Nothing where the bytes cannot be had whole just now.
std::optional<std::string> BytesOf(const std::string& file) {
  zt::posix::ScopedFd fd = zt::posix::OpenExisting(file.c_str(), O_RDONLY);
  struct stat info;
  if (!fd || fstat(fd.get(), &info) != 0 || info.st_size > ztini::kLargestFileBytes) {
    return std::nullopt;
  }
  std::string bytes(static_cast<size_t>(info.st_size), '\0');
  size_t got = zt::posix::MoveAll(bytes.size(), [&](size_t done, size_t rest) {
    return read(fd.get(), bytes.data() + done, rest);
  });
  return got == bytes.size() ? std::optional(std::move(bytes)) : std::nullopt;
}

// False where the parser may join what stands apart in the bytes: see ztini/TextLines.h.
bool HasPlainLines(const std::string& bytes) {
  constexpr size_t kNeverLong = 255;
  return bytes.find('\n') < kNeverLong && bytes.find('\r') == std::string::npos &&
         bytes.find('\0') == std::string::npos;
}

// Whether the bytes hold the name, in the case rules of names. Horspool's search, which steps over
// what cannot be the end of the name.
bool Holds(const std::string& bytes, const std::string& name) {
  auto isSpace = [](char c) { return isspace(static_cast<unsigned char>(c)) != 0; };
  auto first = std::find_if_not(name.begin(), name.end(), isSpace);
  std::string wanted(first,
                     std::find_if_not(name.rbegin(), std::reverse_iterator(first), isSpace).base());
  std::array<unsigned char, 256> folded;
  for (int c = 0; c < 256; ++c)
    folded[static_cast<size_t>(c)] = static_cast<unsigned char>(toupper(c));
  auto fold = [&](char c) { return folded[static_cast<unsigned char>(c)]; };
  const size_t size = wanted.size();
  if (size == 0) return true;
  std::array<size_t, 256> step;
  step.fill(size);
  for (size_t i = 0; i + 1 < size; ++i) step[fold(wanted[i])] = size - 1 - i;
  auto same = [&](char a, char b) { return fold(a) == fold(b); };
  for (size_t at = size - 1; at < bytes.size(); at += step[fold(bytes[at])]) {
    if (std::equal(wanted.rbegin(), wanted.rend(), bytes.rend() - static_cast<ptrdiff_t>(at) - 1,
                   same)) {
      return true;
    }
  }
  return false;
}

}  // namespace

class vltStringResources::Database {
 public:
  explicit Database(std::string file) : m_file(std::move(file)), m_bytes(BytesOf(m_file)) {
    if (m_bytes && !HasPlainLines(*m_bytes)) m_bytes.reset();
  }
  void answer(ResourceTexts::Query& query) {
    if (!m_texts) {
      // One who wants reports gets those of the whole walk.
      if (m_bytes && !s_warnings.wantsAll() && !mayHave(query.key)) return;
      m_texts.emplace(read(), &s_warnings);
      m_bytes.reset();
    }
    m_texts->answer(query);
  }

 private:
  bool mayHave(const std::string& key) {
    auto known = m_keys.find(key);
    if (known == m_keys.end()) known = m_keys.emplace(key, Holds(*m_bytes, key)).first;
    return known->second;
  }
  IniStructForwardReferenceTag* read() const {
    IniStructForwardReferenceTag* document = ResourceTexts::NewDocument();
    if (!document) return nullptr;
    if (m_bytes) {
      IniReadBytes(document, m_bytes->data(), m_bytes->size());
    } else {
      IniReadFromFile(document, m_file.c_str());  // A missing file is an empty one.
    }
    return document;
  }

  std::string m_file;
  std::optional<std::string> m_bytes;  // until it is parsed; none: the parser reads the file itself
  std::map<std::string, bool> m_keys;  // whether the bytes hold it
  std::optional<ResourceTexts> m_texts;
};

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
  ResourceTexts::Query q{separator, ResourceTexts::TargetOf(narrowFile),
                         zt::fnd::AnsiString(key ? key : L"").c_str(), maxLength, ""};
  Database* database = databaseFor(narrowFile);
  if (!database) return E_FAIL;
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

#include <string.h>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/vltcmn.h"
#include "source/Database/resourceTexts.h"
#include "vlloader/source/vlloader.h"
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

}  // namespace

struct vltStringResources::Database : ResourceTexts {
  explicit Database(const std::string& file) : ResourceTexts(Read(file), &s_warnings) {}

  static IniStructForwardReferenceTag* Read(const std::string& file) {
    IniStructForwardReferenceTag* document = NewDocument();
    if (document) IniReadFromFile(document, file.c_str());  // A missing file is an empty one.
    return document;
  }
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

// A question names a file and a key, and is answered from the components of the database whose own
// file has the same base name. Two things keep many questions cheap: an index from file to sections
// grows with the walk through the list of components, and each answer is kept under all of the
// question. The index is built no further than needed: a question without a separator ends at its
// first match.
#include "source/Database/resourceTexts.h"

#include <algorithm>
#include <cctype>
#include <utility>

#include "source/Common/vltcmn.h"
#include "source/Database/databaseText.h"
#include "ztini/ztini.h"

namespace registrar {
namespace {

// Bytes with the terminator; a longer value is cut, and then names another file or none.
constexpr size_t kFileNameSize = 260;

// What follows the last slash; the whole text without one.
std::string BaseName(const std::string& file) { return file.substr(file.rfind('/') + 1); }

// Equal for names that differ in case only, by the locale's table of single bytes. Folding each name
// once makes a look-up one hash in place of a dozen comparisons.
std::string Folded(std::string name) {
  for (char& c : name) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return name;
}

}  // namespace

ResourceTexts::ResourceTexts(IniStructForwardReferenceTag* document, ResourceObserver* observer)
    : m_document(document), m_observer(observer) {}

ResourceTexts::~ResourceTexts() { IniDispose(m_document); }

IniStructForwardReferenceTag* ResourceTexts::NewDocument() {
  IniStructForwardReferenceTag* document = IniNew(0);
  if (document) IniSetDuplicateChecking(document, 1);
  return document;
}

std::string ResourceTexts::TargetOf(const std::string& file) {
  return file.find('/') == std::string::npos ? "" : BaseName(file);
}

// False for a section that names no file.
bool ResourceTexts::fileNameOf(const char* section, std::string* base) {
  IniSection* found = IniFindSection(m_document, section);
  if (!found) {
    if (reports()) m_observer->noSection(section);
    return false;
  }
  if (!IniFindEntry(found, 0, kFileName)) return false;
  char file[kFileNameSize];
  int32_t status = IniGetStringIntoBuffer(m_document, section, kFileName, file, sizeof file);
  if (status < 1) {
    if (reports()) m_observer->noFileName(section, static_cast<int>(status));
    return false;
  }
  *base = BaseName(file);
  return true;
}

// Adds the text of one component. True if the search is over.
bool ResourceTexts::appendFrom(Query& q, const char* section) {
  if (IniItemExists(m_document, section, q.key.c_str()) == 1) {
    TaskMem<char> text(static_cast<char*>(q.maxLength ? vltTaskMemAlloc(q.maxLength) : nullptr));
    if (!text && q.maxLength) q.outOfMemory = true;
    int32_t status = 0;
    if (text) {
      status = IniGetStringIntoBuffer(m_document, section, q.key.c_str(), text.get(), q.maxLength);
    }
    if (status != 0 && text) {
      if (!q.joined.empty()) q.joined += q.separator ? q.separator : "";
      q.joined += text.get();
      q.found = true;
    } else if (reports()) {
      m_observer->noText(q.key.c_str(), section, static_cast<int>(status));
    }
  }
  return !q.separator;
}

// Puts the next component of the list into the index. Returns its section and the folded base name of
// its file, which is empty if it has none; null at the end of the list.
const char* ResourceTexts::indexNext(std::string* folded) {
  folded->clear();
  std::string base;
  const char* section = nullptr;
  if (IniNthItemName(m_document, kComponents, m_indexed + 1, &section) != 1) return nullptr;
  // An empty name matches nothing.
  if (fileNameOf(section, &base) && !base.empty()) {
    *folded = Folded(std::move(base));
    m_sectionsOf[*folded].push_back(section);
  }
  ++m_indexed;  // Last: out of memory leaves the component to the next question.
  return section;
}

void ResourceTexts::answer(Query& q) {
  if (!m_document) return;
  if (IniSectionExists(m_document, kComponents) != 1) {
    if (reports()) m_observer->noList();
    return;
  }
  if (reports()) {
    // An observer gets the reports of each question as if it were the only one: the walk begins
    // again.
    m_indexed = 0;
    m_sectionsOf.clear();
    m_answers.clear();
  }
  Kind kind(q.separator != nullptr, q.separator ? q.separator : "", q.key, q.maxLength);
  auto& known = m_answers[kind];
  const std::string folded = Folded(q.target);
  if (auto found = known.find(folded); found != known.end()) {
    q.found = found->second.found;
    q.joined = found->second.text;
    return;
  }
  search(q, folded);
  // The joined text may be longer than any one; what does not fit is never returned, and need not
  // be kept.
  q.joined.resize(std::min<size_t>(q.joined.size(), q.maxLength));
  if (!q.outOfMemory) known.emplace(folded, Answer{q.found, q.joined});
}

// The index first, and then what follows it in the list.
void ResourceTexts::search(Query& q, const std::string& folded) {
  if (auto found = m_sectionsOf.find(folded); found != m_sectionsOf.end()) {
    for (const std::string& section : found->second) {
      if (appendFrom(q, section.c_str())) return;
    }
  }
  std::string next;
  while (const char* section = indexNext(&next)) {
    if (!next.empty() && next == folded && appendFrom(q, section)) return;
  }
}

}  // namespace registrar

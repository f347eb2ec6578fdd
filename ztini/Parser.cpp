#include <cstring>

#include "ztini/Document.h"
#include "ztini/Join.h"
#include "ztini/LineBuffer.h"
#include "ztini/NameCompare.h"
#include "ztini/StringTools.h"

namespace {

using ztini::LocaleFold;

// Where a line stands in the document while it is built. A line's text is cut in place.
class DocumentBuilder {
 public:
  explicit DocumentBuilder(IniStructForwardReferenceTag* doc) : m_doc(doc) {}

  // 0, also for a bad line, or kIniOutOfMemory.
  int32_t takeLine(char* text, int32_t line);

 private:
  int32_t takeHeader(char* afterBracket, int32_t line);
  int32_t takeItem(char* text, int32_t line);
  int32_t store(const char* name, const char* value, int32_t line);
  int32_t replace(IniEntry* entry, const char* value, int32_t line);
  int32_t appendEntry(const char* name, const char* value, int32_t line);
  int32_t openSection(const char* name, int32_t line);
  int32_t badLine(int32_t line);
  bool has(IniReadOption option) const { return (m_doc->readOptions & option) != 0; }

  IniStructForwardReferenceTag* m_doc;
  IniSection* m_section = nullptr;
};

char* SkipWhite(char* text) {
  while (LocaleFold::isSpace(*text)) ++text;
  return text;
}

// Ends the text [begin, end) before its trailing white space; false if nothing is left.
bool CutTrailingWhite(char* begin, char* end) {
  while (end > begin && LocaleFold::isSpace(end[-1])) --end;
  *end = 0;
  return end > begin;
}

int32_t DocumentBuilder::takeLine(char* text, int32_t line) {
  text = SkipWhite(text);
  if (*text == ';') return 0;
  return *text == '[' ? takeHeader(text + 1, line) : takeItem(text, line);
}

int32_t DocumentBuilder::badLine(int32_t line) {
  if (m_doc->firstBadLine == -1) m_doc->firstBadLine = line;
  return 0;
}

int32_t DocumentBuilder::takeHeader(char* afterBracket, int32_t line) {
  char* name = SkipWhite(afterBracket);
  char* end = strchr(name, ']');
  if (!end || !CutTrailingWhite(name, end)) return badLine(line);
  IniSection* known = nullptr;
  if (m_doc->duplicateChecking && IniSeekSection(m_doc, name, &known) < 0) return kIniOutOfMemory;
  if (!known) return openSection(name, line);
  known->line = line;
  m_section = known;
  return 0;
}

int32_t DocumentBuilder::openSection(const char* name, int32_t line) {
  IniSection* section = IniReadSection(m_doc, name);
  if (!section) return kIniOutOfMemory;
  section->line = line;
  if (!IniAppendSection(m_doc, section)) return kIniOutOfMemory;
  m_section = section;
  return 0;
}

int32_t DocumentBuilder::takeItem(char* text, int32_t line) {
  char* separator = text + strcspn(text, has(kIniReadColons) ? ":=" : "=");
  if (!*separator || separator == text) return badLine(line);
  char* value = separator + 1;
  if (*separator == ':' && *value == '=') ++value;
  CutTrailingWhite(text, separator);
  value = SkipWhite(value);
  if (!CutTrailingWhite(value, value + strlen(value)) && !has(kIniReadKeepEmpty)) {
    return badLine(line);
  }
  return store(text, value, line);
}

int32_t DocumentBuilder::store(const char* name, const char* value, int32_t line) {
  if (!m_section) {
    if (!has(kIniReadColons)) return 0;
    const int32_t status = openSection(kIniNullSectionName, -1);
    if (status < 0) return status;
  }
  IniEntry* known = nullptr;
  if (m_doc->duplicateChecking && IniSeekEntry(m_doc, m_section, name, &known) < 0) {
    return kIniOutOfMemory;
  }
  return known ? replace(known, value, line) : appendEntry(name, value, line);
}

int32_t DocumentBuilder::replace(IniEntry* entry, const char* value, int32_t line) {
  char* copy = ztini_StrDupWithoutSurrWhiteSpace(value);
  if (!copy) return kIniOutOfMemory;
  IniReplaceValue(entry, copy);
  IniNewEntryHandleQuotes(entry, m_doc->readOptions);
  entry->line = line;
  return 0;
}

int32_t DocumentBuilder::appendEntry(const char* name, const char* value, int32_t line) {
  IniEntry* entry = IniReadEntry(m_doc, name, value);
  if (!entry) return kIniOutOfMemory;
  entry->line = line;
  return IniAppendEntry(m_section, entry) ? 0 : kIniOutOfMemory;
}

}  // namespace

int32_t IniRead(IniStructForwardReferenceTag* doc, IniLineInputFunction input, void* context) {
  if (!doc) return 0;
  IniEmptyDocument(doc);
  doc->firstBadLine = -1;
  if (!input) return 0;
  ztini::LineBuffer line;
  if (!line.open()) return kIniOutOfMemory;
  DocumentBuilder builder(doc);
  do {
    int32_t status = line.next(input, context);
    if (status >= 0 && line.complete()) status = builder.takeLine(line.text(), line.lineNumber());
    if (status < 0) return status;
  } while (!line.atEnd());
  return IniJoinPieces(doc);
}

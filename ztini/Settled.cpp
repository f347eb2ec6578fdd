#include "ztini/Settled.h"

#include <cstring>

#include "ztini/Join.h"
#include "ztini/NameCompare.h"
#include "ztini/StringTools.h"

// A document that was read is settled as it is: its names and values were cut out of lines like
// those that it is written to. What breaks this is known by its looks, and unsettles the document
// for good: pieces, which may be joined with what comes to be beside them, and the section without
// a header. What is put has to pass the tests here.

namespace {

struct Text {
  explicit Text(const char* text) : begin(ztini_SkipWhiteSpace(text)), end(begin + strlen(begin)) {
    while (end > begin && ztini::LocaleFold::isSpace(end[-1])) --end;
  }
  bool has(char c) const { return memchr(begin, c, static_cast<size_t>(end - begin)); }
  bool breaksLine() const { return has('\n') || has('\r'); }
  bool isEmpty() const { return begin == end; }
  bool isEnclosedIn(char quote) const {
    return end - begin >= 2 && *begin == quote && end[-1] == quote;
  }

  const char* begin;
  const char* end;
};

bool SectionSurvives(Text name) {
  const size_t length = strlen(kIniNullSectionName);
  const bool isNull = static_cast<size_t>(name.end - name.begin) == length &&
                      memcmp(name.begin, kIniNullSectionName, length) == 0;
  return !isNull && !name.breaksLine() && !name.has(']');
}

bool ItemSurvives(Text name) {
  return !name.breaksLine() && !name.has('=') && *name.begin != '[' && *name.begin != ';' &&
         !IniMayBePiece(name.begin, name.end);
}

bool ValueSurvives(Text value, int32_t quote) {
  if (value.breaksLine()) return false;
  if (quote) return quote == '"' || quote == '\'';
  // Without quotes of its own: an empty value makes a bad line, and enclosing quotes would be taken
  // for the file's.
  return !value.isEmpty() && !value.isEnclosedIn('"') && !value.isEnclosedIn('\'');
}

}  // namespace

bool ztini::IniSurvivesFile(const char* section, const char* item, const char* value,
                            int32_t quote) {
  return SectionSurvives(Text(section)) && ItemSurvives(Text(item)) &&
         ValueSurvives(Text(value), quote);
}

int32_t IniIsSettled(IniStructForwardReferenceTag* doc) {
  if (!doc || !doc->settled) return 0;
  // A line limit splits values, which the reader joins to what may be another item.
  if (doc->maxLineLength != -1 || (doc->writeOptions & kIniWriteMark)) return 0;
  const int32_t quotes = kIniReadDoubleQuotes | kIniReadSingleQuotes;
  if ((doc->readOptions & quotes) != quotes) return 0;
  // Under another locale other characters are white space, and other names are equal.
  doc->fold.refresh();
  return doc->fold.generation() == doc->settledFold ? 1 : 0;
}

void IniTakeAsRead(IniStructForwardReferenceTag* doc) {
  const bool tight = (doc->writeOptions & kIniWriteTight) != 0;
  bool afterRead = false;
  int32_t line = 0;
  doc->firstBadLine = -1;
  // An empty line is a bad one.
  auto skipLine = [&] {
    ++line;
    if (doc->firstBadLine == -1) doc->firstBadLine = line;
  };
  for (int32_t n = 1; n <= doc->sections.count(); ++n) {
    IniSection* section = doc->section(n);
    const bool wasRead = IniSectionWasReadFromFile(section) != 0;
    if (tight && !wasRead && afterRead) skipLine();
    // The count follows the writer's rule for empty lines, section by section.
    section->line = ++line;
    ztini::NameNode** items = section->items.nodes();
    for (int32_t i = 0; i < section->items.count(); ++i) {
      static_cast<IniEntry*>(items[i])->line = ++line;
    }
    if (!tight || !wasRead) skipLine();
    afterRead = wasRead;
  }
  doc->currentSection = nullptr;
  doc->lastItemLine = -1;
}

// Every look-up by a section's name goes through IniFindSection, which remembers the section that
// it found: callers ask for item after item of one section, and the second question costs one
// comparison. The memory has a meaning, too. Of several sections of one name, the one that was
// enumerated last is found, until another name is asked for.
//
// No look-up fails for lack of memory. The index of a long list is built by the first look-up;
// without memory for it the list is scanned, with the same answer. IniSeek... is for reading and
// putting, which must not scan once for each line of a file, and reports instead.
#include "ztini/Document.h"
#include "ztini/NameCompare.h"
#include "ztini/StringTools.h"

#include <cstring>

namespace {

using Doc = IniStructForwardReferenceTag;

// A name that is looked for. Most names of a section differ in their lengths or last characters,
// which are compared before the whole.
class WantedName {
 public:
  WantedName(const ztini::NameFold& fold, const char* name)
      : m_fold(fold), m_name(name), m_begin(ztini::SkipSpace(fold, name)) {
    m_length = strlen(m_begin);
    while (m_length > 0 && fold.isSpace(m_begin[m_length - 1])) --m_length;
  }

  bool is(const IniEntry* entry) const {
    if (differsAtAGlance(entry)) return false;
    if (m_length != 0 && entry->knownNameLength == m_length &&
        memcmp(entry->name, m_begin, m_length) == 0)
      return true;
    return ztini::CompareNames(m_fold, entry->name, m_name) == 0;
  }

 private:
  // Of a name with white space at its ends, which another locale may have seen as letters, nothing
  // is said.
  bool differsAtAGlance(const IniEntry* entry) const {
    const size_t length = entry->knownNameLength;
    if (length == 0 || m_length == 0) return false;
    const char last = entry->name[length - 1];
    if (m_fold.isSpace(*entry->name) || m_fold.isSpace(last)) return false;
    return length != m_length || m_fold.upper(last) != m_fold.upper(m_begin[m_length - 1]);
  }

  const ztini::NameFold& m_fold;
  const char* m_name;
  const char* m_begin;  // without the white space around it
  size_t m_length;
};

// The fold is fresh.
IniEntry* FindInSection(Doc* doc, IniSection* section, const char* item) {
  if (!item || doc->caseSensitive || !section->items.isScanned()) {
    return static_cast<IniEntry*>(section->items.find(item, doc->match(), ztini::FoldState::Fresh));
  }
  const WantedName wanted(doc->fold, item);
  ztini::NameNode** node = section->items.nodes();
  for (ztini::NameNode** end = node + section->items.count(); node < end; ++node) {
    auto* entry = static_cast<IniEntry*>(*node);
    if (wanted.is(entry)) return entry;
  }
  return nullptr;
}

IniEntry* FindItem(Doc* doc, const char* section, const char* item) {
  IniSection* found = IniFindSection(doc, section);
  return found ? FindInSection(doc, found, item) : nullptr;
}

IniEntry* NthItem(Doc* doc, const char* section, int32_t n) {
  IniSection* found = IniFindSection(doc, section);
  return found ? found->item(n) : nullptr;
}

// True only for names that are different. Names with white space around them are left to the whole
// comparison.
bool DifferAtTheirEnds(const ztini::NameFold& fold, const char* a, const char* b) {
  const size_t aLength = strlen(a), bLength = strlen(b);
  if (!aLength || !bLength) return false;
  const char aLast = a[aLength - 1], bLast = b[bLength - 1];
  for (char end : {*a, aLast, *b, bLast}) {
    if (fold.isSpace(end)) return false;
  }
  return aLength != bLength || fold.upper(aLast) != fold.upper(bLast);
}

// The fold is fresh.
bool IsCurrent(Doc* doc, const char* name) {
  if (!doc->currentSection) return false;
  // Byte by byte, white space included, as names are stored without any.
  if (strcmp(doc->currentSection->name, name) == 0) return true;
  return !doc->caseSensitive && !DifferAtTheirEnds(doc->fold, doc->currentSection->name, name) &&
         ztini::CompareNames(doc->fold, doc->currentSection->name, name) == 0;
}

int32_t Give(const char* text, const char** out) {
  if (out) *out = text;
  return text ? 1 : 0;
}

}  // namespace

IniSection* IniFindSection(Doc* doc, const char* section) {
  if (!doc || !section) return nullptr;
  doc->fold.refresh();
  if (IsCurrent(doc, section)) return doc->currentSection;
  ztini::NameNode* found = doc->sections.find(section, doc->match(), ztini::FoldState::Fresh);
  // A section that is not there changes nothing: the next question is likely to be about the same
  // one as before.
  if (found) doc->currentSection = static_cast<IniSection*>(found);
  return static_cast<IniSection*>(found);
}

int32_t IniSeekSection(Doc* doc, const char* name, IniSection** found, ztini::FoldState fold,
                       ztini::NameHash* hash) {
  *found = nullptr;
  if (fold == ztini::FoldState::Unknown) doc->fold.refresh();
  ztini::NameNode* node = nullptr;
  if (IsCurrent(doc, name)) {
    node = doc->currentSection;
  } else if (!doc->sections.seek(name, doc->match(), &node, ztini::FoldState::Fresh, hash)) {
    return kIniOutOfMemory;
  }
  if (node) doc->currentSection = *found = static_cast<IniSection*>(node);
  return 0;
}

int32_t IniSeekEntry(Doc* doc, IniSection* section, const char* name, IniEntry** found,
                     ztini::FoldState fold) {
  ztini::NameNode* node = nullptr;
  const bool good = section->items.seek(name, doc->match(), &node, fold);
  *found = static_cast<IniEntry*>(node);
  return good ? 0 : kIniOutOfMemory;
}

int32_t IniFindSectionIndex(Doc* doc, const char* section) {
  IniSection* found = IniFindSection(doc, section);
  return found ? doc->sections.positionOf(found) : 0;
}

IniEntry* IniFindEntry(IniSection* section, int32_t caseSensitive, const char* item) {
  if (!section) return nullptr;
  const auto match = caseSensitive ? ztini::NameMatch::Exact : ztini::NameMatch::IgnoreCase;
  return static_cast<IniEntry*>(section->items.find(item, match));
}

int32_t IniFindEntryIndex(IniSection* section, int32_t caseSensitive, const char* item) {
  IniEntry* found = IniFindEntry(section, caseSensitive, item);
  return found ? section->items.positionOf(found) : 0;
}

int32_t IniSectionExists(Doc* doc, const char* section) {
  return IniFindSection(doc, section) ? 1 : 0;
}

int32_t IniItemExists(Doc* doc, const char* section, const char* item) {
  return FindItem(doc, section, item) ? 1 : 0;
}

int32_t IniLineOfSection(Doc* doc, const char* section) {
  IniSection* found = IniFindSection(doc, section);
  return found ? found->line : -1;
}

const char* IniSectionName(const IniSection* section) { return section ? section->name : nullptr; }

const char* IniEntryName(const IniEntry* entry) { return entry ? entry->name : nullptr; }

int32_t IniSectionWasReadFromFile(const IniSection* section) {
  return section && section->line >= 0 ? 1 : 0;
}

int32_t IniSectionIsNull(const IniSection* section) {
  return section && strcmp(section->name, kIniNullSectionName) == 0 ? 1 : 0;
}

int32_t IniNumberOfSections(Doc* doc) { return doc ? doc->sections.count() : 0; }

int32_t IniNumberOfItems(Doc* doc, const char* section) {
  IniSection* found = IniFindSection(doc, section);
  return found ? found->items.count() : 0;
}

int32_t IniNthSectionName(Doc* doc, int32_t n, const char** name) {
  IniSection* found = doc ? doc->section(n) : nullptr;
  // So that the caller's next look-up by this name finds this section, and not an earlier one of
  // the same name.
  if (found) doc->currentSection = found;
  return Give(IniSectionName(found), name);
}

int32_t IniNthItemName(Doc* doc, const char* section, int32_t n, const char** name) {
  return Give(IniEntryName(NthItem(doc, section, n)), name);
}

int32_t IniNthItemPointerToString(Doc* doc, const char* section, int32_t n, const char** value) {
  const IniEntry* found = NthItem(doc, section, n);
  return Give(found ? found->value : nullptr, value);
}

int32_t IniGet(Doc* doc, const char* section, const char* item, const char** value) {
  const IniEntry* found = FindItem(doc, section, item);
  // Also of an item that was put, whose line is -1.
  if (found) doc->lastItemLine = found->line;
  return Give(found ? found->value : nullptr, value);
}

int32_t IniRenameSection(Doc* doc, const char* section, const char* name) {
  IniSection* found = IniFindSection(doc, section);
  if (!found || !name) return 0;
  // Before the document counts as changed: a failed rename leaves it settled.
  char* copy = ztini_StrDupWithoutSurrWhiteSpace(name);
  if (!copy) return kIniOutOfMemory;
  doc->settled = false;
  doc->sections.rename(found, copy);
  found->markChanged();
  return 1;
}

int32_t IniRemoveSection(Doc* doc, const char* section) {
  IniSection* found = IniFindSection(doc, section);
  if (!found) return 0;
  doc->sections.remove(found);
  // Before the record is freed.
  if (doc->currentSection == found) doc->currentSection = nullptr;
  IniDisposeSection(found);
  return 1;
}

int32_t IniRemoveItem(Doc* doc, const char* section, const char* item) {
  IniSection* parent = IniFindSection(doc, section);
  IniEntry* found = parent ? IniFindEntry(parent, doc->caseSensitive, item) : nullptr;
  if (!found) return 0;
  parent->items.remove(found);
  parent->markChanged();
  IniDisposeEntry(found);
  return 1;
}

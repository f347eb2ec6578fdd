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
  // The fold is fresh.
  WantedName(const ztini::NameFold& fold, const char* name)
      : m_fold(fold), m_name(name), m_trimmed(ztini::Trimmed(fold, name)) {
    if (m_trimmed.length) m_last = fold.upper(m_trimmed.begin[m_trimmed.length - 1]);
  }

  ztini::NameHash hash() const { return {m_fold, m_trimmed}; }

  // Whether it is this name, of this length; 0 where that is unknown.
  bool is(const char* name, size_t length) const {
    if (length && length == m_trimmed.length) {
      if (m_fold.upper(name[length - 1]) != m_last) return false;
      if (memcmp(name, m_trimmed.begin, length) == 0) return true;
    } else if (length && m_trimmed.length && !m_fold.isSpace(*name) &&
               !m_fold.isSpace(name[length - 1])) {
      // Stored names have no white space around them, but for what another locale has seen as
      // letters.
      return false;
    }
    return ztini::CompareNames(m_fold, name, m_name) == 0;
  }

 private:
  const ztini::NameFold& m_fold;
  const char* m_name;
  ztini::TrimmedName m_trimmed;
  unsigned char m_last = 0;
};

IniEntry* FindItem(Doc* doc, const char* section, const char* item) {
  IniSection* found = IniFindSection(doc, section);
  return found ? IniFindFresh(doc, found, item) : nullptr;
}

IniEntry* NthItem(Doc* doc, const char* section, int32_t n) {
  IniSection* found = IniFindSection(doc, section);
  return found ? found->item(n) : nullptr;
}

// Byte by byte, white space included, as names are stored without any.
bool IsCurrentExactly(const Doc* doc, const char* name) {
  return doc->currentSection && strcmp(doc->currentSection->name, name) == 0;
}

// By the engine's rule, and ahead of others of the same name: where there is none, the index finds
// it as well.
bool IsCurrent(const Doc* doc, const WantedName& wanted) {
  const IniSection* current = doc->currentSection;
  return current && !doc->caseSensitive && !doc->sections.isKnownAsOnlyOne(current) &&
         wanted.is(current->name, strlen(current->name));
}

int32_t Give(const char* text, const char** out) {
  if (out) *out = text;
  return text ? 1 : 0;
}

}  // namespace

IniSection* IniFindSection(Doc* doc, const char* section) {
  if (!doc || !section) return nullptr;
  doc->fold.refresh();
  if (IsCurrentExactly(doc, section)) return doc->currentSection;
  const WantedName wanted(doc->fold, section);
  if (IsCurrent(doc, wanted)) return doc->currentSection;
  const auto hash = doc->sections.isScanned() ? ztini::NameHash() : wanted.hash();
  ztini::NameNode* found = doc->sections.find(section, doc->match(), ztini::FoldState::Fresh, hash);
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
  if (IsCurrentExactly(doc, name) || IsCurrent(doc, WantedName(doc->fold, name))) {
    node = doc->currentSection;
  } else if (!doc->sections.seek(name, doc->match(), &node, ztini::FoldState::Fresh, hash)) {
    return kIniOutOfMemory;
  }
  if (node) doc->currentSection = *found = static_cast<IniSection*>(node);
  return 0;
}

IniEntry* IniFindFresh(Doc* doc, IniSection* section, const char* item) {
  if (!item || doc->caseSensitive || !section->items.isScanned()) {
    return static_cast<IniEntry*>(section->items.find(item, doc->match(), ztini::FoldState::Fresh));
  }
  const WantedName wanted(doc->fold, item);
  ztini::NameNode** node = section->items.nodes();
  for (ztini::NameNode** end = node + section->items.count(); node < end; ++node) {
    auto* entry = static_cast<IniEntry*>(*node);
    if (wanted.is(entry->name, entry->knownNameLength)) return entry;
  }
  return nullptr;
}

int32_t IniSeekEntry(Doc* doc, IniSection* section, const char* name, IniEntry** found,
                     ztini::FoldState fold, ztini::NameHash* hash) {
  ztini::NameNode* node = nullptr;
  const bool good = section->items.seek(name, doc->match(), &node, fold, hash);
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

// Records come in two kinds, by who owns their memory. Those that were read lie in the arena, over
// the text of the file, and are given back with the document; those that were put have blocks of
// their own. Each record says of its name, its value and itself where it lies, so that one function
// disposes of both.
#include "ztini/Document.h"

#include <cstring>

#include "ztini/StringTools.h"

namespace {

constexpr size_t kScratchSize = 256;

}  // namespace

IniStructForwardReferenceTag* IniNew(int reserved) {
  if (reserved != 0) return nullptr;
  auto* doc = ztini::New<IniStructForwardReferenceTag>();
  if (!doc) return nullptr;
  doc->scratch = ztini_PI_NewHandle(kScratchSize);
  if (!doc->scratch) {
    ztini::Delete(doc);
    return nullptr;
  }
  return doc;
}

void IniDispose(IniStructForwardReferenceTag* doc) {
  if (!doc) return;
  IniEmptyDocument(doc);
  ztini_PI_DisposeHandle(doc->scratch);
  ztini::Delete(doc);
}

int32_t IniSetDuplicateChecking(IniStructForwardReferenceTag* doc, int32_t value) {
  if (!doc) return 0;
  // Reading the document back under another rule may give another one.
  doc->settled = false;
  return std::exchange(doc->duplicateChecking, value);
}

int32_t IniSetReadOptions(IniStructForwardReferenceTag* doc, int32_t bits) {
  if (!doc) return 0;
  doc->readOptions = bits;
  doc->settled = false;
  return 1;
}

int32_t IniSetWriteOptions(IniStructForwardReferenceTag* doc, int32_t maxLineLength,
                           int32_t breakCharacter, int32_t bits) {
  if (!doc) return 0;
  doc->maxLineLength = maxLineLength;
  doc->breakCharacter = breakCharacter;
  doc->writeOptions = bits;
  doc->rendering.reset();
  return 1;
}

IniDurability IniSetDurability(IniStructForwardReferenceTag* doc, IniDurability durability) {
  return doc ? std::exchange(doc->durability, durability) : IniDurability::None;
}

IniSection* IniNewSection(IniStructForwardReferenceTag* doc, const char* name) {
  IniSection* section = ztini::New<IniSection>(&doc->fold);
  if (!section) return nullptr;
  section->flags = doc->sectionFlags;
  section->name = ztini_StrDupWithoutSurrWhiteSpace(name);
  if (!section->name) {
    IniDisposeSection(section);
    return nullptr;
  }
  return section;
}

IniEntry* IniNewEntry(const char* name, const char* value, int32_t readOptions) {
  IniEntry* entry = ztini::New<IniEntry>();
  if (!entry) return nullptr;
  entry->name = ztini_StrDupWithoutSurrWhiteSpace(name);
  entry->value = ztini_StrDupWithoutSurrWhiteSpace(value);
  if (!entry->name || !entry->value) {
    IniDisposeEntry(entry);
    return nullptr;
  }
  // After the copy, which has cut the white space.
  entry->knownNameLength = IniKnownNameLength(strlen(entry->name));
  IniNewEntryHandleQuotes(entry, readOptions);
  return entry;
}

IniSection* IniReadSection(IniStructForwardReferenceTag* doc, char* name) {
  void* place = doc->arena.record(sizeof(IniSection));
  if (!place) return nullptr;
  auto* section = new (place) IniSection(&doc->fold);
  section->flags = doc->sectionFlags;
  section->name = name;
  section->nameInArena = section->recordInArena = 1;
  return section;
}

void IniDisposeSection(IniSection* section) {
  if (!section) return;
  ztini::NameNode** items = section->items.nodes();
  for (int32_t n = section->items.count(); n >= 1; --n) {
    IniDisposeEntry(static_cast<IniEntry*>(items[n - 1]));
  }
  if (!section->nameInArena) std::free(section->name);
  if (section->recordInArena) {
    // The record lies in the arena, but its list of items has a block of its own.
    section->~IniSection();
  } else {
    ztini::Delete(section);
  }
}

void IniDisposeEntry(IniEntry* entry) {
  if (!entry) return;
  if (!entry->nameInArena) free(entry->name);
  if (!entry->valueInArena) free(entry->value);
  if (!entry->recordInArena) ztini::Delete(entry);
}

void IniNewEntryHandleQuotes(IniEntry* entry, int32_t readOptions) {
  const size_t length = strlen(entry->value);
  entry->quote = IniEnclosingQuote(entry->value, length, readOptions);
  entry->knownValueLength = IniKnownValueLength(length);
  if (!entry->quote) return;
  entry->knownValueLength = IniKnownValueLength(length - 2);
  memmove(entry->value, entry->value + 1, length - 2);
  entry->value[length - 2] = 0;
}

void IniReplaceValue(IniEntry* entry, char* value) {
  if (!entry->valueInArena) free(entry->value);
  entry->value = value;
  entry->knownValueLength = IniKnownValueLength(strlen(value));
  entry->valueInArena = 0;
}

bool IniAppendSection(IniStructForwardReferenceTag* doc, IniSection* section,
                      ztini::NameHash hash) {
  // Before the append, which cannot report.
  if (!doc->sections.reserve(1)) {
    IniDisposeSection(section);
    return false;
  }
  doc->sections.append(section, hash);
  return true;
}

void IniEmptyDocument(IniStructForwardReferenceTag* doc) {
  doc->currentSection = nullptr;
  ztini::NameNode** sections = doc->sections.nodes();
  // Without removing each from the list: nothing looks names up any more, and the index goes as a
  // whole.
  for (int32_t n = doc->sections.count(); n >= 1; --n) {
    auto* section = static_cast<IniSection*>(sections[n - 1]);
    // Most sections of a file are never changed, and their items are not touched for the last time.
    if (!section->isAllInArena()) IniDisposeSection(section);
  }
  doc->sections.keepFirst(0);
  // Last: the records that lie there were disposed of above.
  doc->arena.clear();
  doc->text.reset();
  doc->rendering.reset();
  doc->wasSaved = false;
  doc->settled = false;
}

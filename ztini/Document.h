#pragma once

#include <cstdint>
#include <cstring>
#include <string_view>

#include "ztini/Alloc.h"
#include "ztini/Arena.h"
#include "ztini/Handle.h"
#include "ztini/NameFold.h"
#include "ztini/NameList.h"
#include "ztini/TextBuffer.h"
#include "ztini/ztini.h"

// The records that the engine's handles refer to. Callers outside see the functions of ztini.h
// only.
//
// What is read lies in the document's arena and in the text of its file: records, names and values
// take no malloc block each, and go when the document is emptied. What is put, and a name or value
// that is changed, has a block of its own, so that a document that is edited for months does not
// grow.

inline constexpr char kIniNullSectionName[] = "(null)";

struct IniEntry : ztini::NameNode {
  char* value = nullptr;  // without surrounding white space and enclosing quotes
  int32_t line = -1;      // -1: not from a file
  // Lengths of both texts, so that a save does not count them; 0 where that is unknown. No field
  // lies in two halves of a word: the parser would wait for each half that it has just written.
  uint16_t knownNameLength : 7 = 0;
  // What encloses the value in the file: 0, 34, 39, or as put. More than a character, because a put
  // of 256 is not one of 0: it writes the character 0.
  uint16_t quote : 9 = 0;
  uint16_t knownValueLength = 0;

  std::string_view nameText() const {
    return {name, knownNameLength ? knownNameLength : strlen(name)};
  }
  std::string_view valueText() const {
    return {value, knownValueLength ? knownValueLength : strlen(value)};
  }
};

// The field for a quote as put.
inline uint16_t IniQuoteField(int32_t quote) {
  const auto character = static_cast<unsigned char>(quote);
  return character == 0 && quote != 0 ? 256 : character;
}

// For the fields above: 0 for what they cannot hold.
inline uint16_t IniKnownNameLength(size_t length) {
  return length < 1u << 7 ? static_cast<uint16_t>(length) : 0;
}
inline uint16_t IniKnownValueLength(size_t length) {
  return length <= UINT16_MAX ? static_cast<uint16_t>(length) : 0;
}

struct IniSection : ztini::NameNode {
  explicit IniSection(ztini::NameFold* fold) : items(fold) {}

  IniEntry* item(int32_t position) const { return static_cast<IniEntry*>(items.at(position)); }

  // Items in file order; the list owns none of them, the section does.
  ztini::NameList items;  // of IniEntry
  int32_t flags = 0;
  int32_t line = -1;  // of the header; -1: not from a file

  // Where the header and the first so many items are in the document's last rendering; size 0 where
  // they have changed since, or were in none.
  uint32_t renderedAt = 0;
  uint32_t renderedSize = 0;
  int32_t renderedItems = 0;

  // For each change of a name, an item or a value.
  void markChanged() {
    renderedSize = 0;
    valueInArena = 0;
  }
  // For an item that comes last.
  void markAppended() { valueInArena = 0; }

  // Whether it may go without being disposed of: all that it has lies in the arena.
  bool isAllInArena() const {
    return nameInArena && valueInArena && recordInArena && items.ownsNoBlock();
  }
};

struct IniStructForwardReferenceTag {
  ztini::Arena arena;     // of what was read
  ztini::OwnedText text;  // of the file, cut into names and values; null: they are in the arena
  size_t textSize = 0;    // bytes of the file that was read last; 0 where it was read by lines
  ztini::NameFold fold;
  ztini::NameList sections{&fold};       // of IniSection
  IniSection* currentSection = nullptr;  // the section last found, asked first
  int32_t sectionFlags = 0;              // copied into new sections, never read
  int32_t duplicateChecking = 1;
  // Nonzero: look-ups compare names byte by byte.
  int32_t caseSensitive = 0;
  int32_t lastItemLine = -1;       // of the item last fetched by IniGet
  ztini_Handle scratch = nullptr;  // the value last decoded
  int32_t maxLineLength = 80;
  int32_t breakCharacter = 0;
  int32_t writeOptions = 14;
  int32_t readOptions = 2;
  int32_t firstBadLine = -1;  // of the last read; -1: none
  IniDurability durability = IniDurability::None;
  ztini::OwnedText fileName;  // last read or written successfully; null: none
  // Seconds of the Unix epoch; 0 where the file could not be asked.
  int64_t fileTimestamp = 0;
  // Reading the file that the document would be written to gives this document; as long as the fold
  // has this generation.
  bool settled = false;
  uint32_t settledFold = 0;
  // What the next save is made from. Before the first one, the bytes that the document was read
  // from, where the reader has left them (IniKeepSource): most are written again as they are. Later
  // the text of the last save, from which the sections that have not changed are copied. Empty
  // where there was none under these write options, and after the first save: most documents are
  // saved once, if at all, and would hold a second copy of their text for nothing.
  ztini::TextBuffer rendering;
  bool wasSaved = false;  // since it was read

  ztini::NameMatch match() const {
    return caseSensitive ? ztini::NameMatch::Exact : ztini::NameMatch::IgnoreCase;
  }
  IniSection* section(int32_t position) const {
    return static_cast<IniSection*>(sections.at(position));
  }
};

// Records that belong to no list yet, in malloc blocks; null without memory.
IniSection* IniNewSection(IniStructForwardReferenceTag* doc, const char* name);
IniEntry* IniNewEntry(const char* name, const char* value, int32_t readOptions);

// The same in the document's arena, over texts that live as long and have no surrounding white
// space. The quotes that enclose the value are cut off in place, where the options ask for it.
IniSection* IniReadSection(IniStructForwardReferenceTag* doc, char* name);
IniEntry* IniReadEntry(IniStructForwardReferenceTag* doc, char* name, size_t nameLength,
                       char* value, size_t valueLength);

// The quote that the options have removed from the value; 0 for none.
inline int32_t IniEnclosingQuote(const char* value, size_t length, int32_t readOptions) {
  if (length < 2 || value[0] != value[length - 1]) return 0;
  if (value[0] == '"') return readOptions & kIniReadDoubleQuotes ? '"' : 0;
  return value[0] == '\'' && readOptions & kIniReadSingleQuotes ? '\'' : 0;
}

// Frees the record and what it holds, but for what lies in the arena; it must be in no list. Null
// is allowed.
void IniDisposeSection(IniSection* section);
void IniDisposeEntry(IniEntry* entry);

// Removes the quotes that enclose the value, where the options ask for it, and sets `quote`.
void IniNewEntryHandleQuotes(IniEntry* entry, int32_t readOptions);

// Takes over a malloc block as the value and frees the old one if it is one, too.
void IniReplaceValue(IniEntry* entry, char* value);

// Appends the record, or disposes it. False without memory.
bool IniAppendSection(IniStructForwardReferenceTag* doc, IniSection* section,
                      ztini::NameHash hash = {});
bool IniAppendEntry(IniSection* section, IniEntry* entry, ztini::NameHash hash = {});

// IniFindSection and IniFindEntry for those who ask again and again: 0 with the record or null, or
// kIniOutOfMemory with null where only a scan of many names could find it.
int32_t IniSeekSection(IniStructForwardReferenceTag* doc, const char* name, IniSection** found,
                       ztini::FoldState fold = ztini::FoldState::Unknown,
                       ztini::NameHash* hash = nullptr);
int32_t IniSeekEntry(IniStructForwardReferenceTag* doc, IniSection* section, const char* name,
                     IniEntry** found, ztini::FoldState fold = ztini::FoldState::Unknown,
                     ztini::NameHash* hash = nullptr);

// The item of a section that has just been looked up: the fold is fresh. Null if it is not there.
IniEntry* IniFindFresh(IniStructForwardReferenceTag* doc, IniSection* section, const char* item);

// Removes all sections, the last one first.
void IniEmptyDocument(IniStructForwardReferenceTag* doc);

// ---- Once a line of a file: in the header for the parser's sake.

inline IniEntry* IniReadEntry(IniStructForwardReferenceTag* doc, char* name, size_t nameLength,
                              char* value, size_t valueLength) {
  void* place = doc->arena.record(sizeof(IniEntry));
  if (!place) return nullptr;
  const int32_t quote = IniEnclosingQuote(value, valueLength, doc->readOptions);
  if (quote) {
    // In place, by moving both ends inward: the text belongs to the document.
    value[valueLength - 1] = 0;
    ++value;
    valueLength -= 2;
  }
  auto* entry = new (place) IniEntry;
  entry->name = name;
  entry->value = value;
  entry->nameInArena = entry->valueInArena = entry->recordInArena = 1;
  entry->quote = static_cast<uint16_t>(quote);
  entry->knownNameLength = IniKnownNameLength(nameLength);
  entry->knownValueLength = IniKnownValueLength(valueLength);
  return entry;
}

inline bool IniAppendEntry(IniSection* section, IniEntry* entry, ztini::NameHash hash) {
  if (!section->items.reserve(1)) {
    IniDisposeEntry(entry);
    return false;
  }
  section->items.append(entry, hash);
  section->markAppended();
  return true;
}

// Lines come in from either of two sources and are cut in place: a header opens or finds a section,
// an item is stored in the present one, anything else is a bad line, of which the first is
// remembered and none is an error. What is cut out stays where it is when the document owns the
// text, and is copied into the arena when the line is gone with the next one.
//
// A repeated name updates the first one, so that every item asks whether its section has one of its
// name. Most do not, and ItemKeys answers most of these questions from a word made of the name's
// ends.
//
// Where the document owns the text, one block takes all records, its size guessed from the first
// lines. The C library keeps such a block, or as much, for the next document; many blocks in a row
// it gave back to the system, which has to clear each page again. The list of a section's items is
// made in that block as well, when the section ends.
#include "ztini/Parser.h"

#include <algorithm>
#include <cstring>

#include "ztini/Document.h"
#include "ztini/Join.h"
#include "ztini/LineBuffer.h"
#include "ztini/StringTools.h"
#include "ztini/TextLines.h"

namespace {

using ztini::FoldState;
using ztini::NameFold;

// Whether the text of a line stays where it is for the document's life, or only until the next
// line.
enum class TextLife { Document, Line };

// Sections of one file resemble each other, but a small one after a large one must not take its
// memory.
constexpr int32_t kMostExpected = 16;

// The names of a section's items, as far as a glance at their ends tells them apart. Most sections
// have too few items for an index, and most names of a section differ in their last characters.
class ItemKeys {
 public:
  using Key = uint64_t;
  static constexpr int kMost = 16;

  // Equal for names that are equal; of a trimmed name that is not empty.
  static Key Of(const NameFold& fold, const char* begin, const char* end) {
    const size_t length = static_cast<size_t>(end - begin);
    if (length >= sizeof(Key) && fold.foldsAsciiOnly()) {
      // The last eight characters at once, without the bit of each that case changes.
      Key key;
      memcpy(&key, end - sizeof key, sizeof key);
      return (key & kWithoutCase) ^ (length * kOddFactor);
    }
    Key key = length;
    for (size_t i = 1; i <= 4 && i <= length; ++i) key = key << 8 | fold.upper(end[-int(i)]);
    for (size_t i = 0; i < 3 && i < length; ++i) key = key << 8 | fold.upper(begin[i]);
    return key;
  }

  // Forgets all; the section that follows has so many items, of which nothing is known.
  void start(int32_t items) {
    m_count = 0;
    m_seen = 0;
    m_good = items == 0;
  }
  void add(Key key) {
    m_good = m_good && m_count < kMost;
    if (!m_good) return;
    m_keys[m_count++] = key;
    m_seen |= bitOf(key);
  }
  // False only if no item has a name of this key.
  bool mayHave(Key key) const {
    if (!m_good) return true;
    if (!(m_seen & bitOf(key))) return false;
    return std::find(m_keys, m_keys + m_count, key) != m_keys + m_count;
  }

 private:
  static constexpr Key kWithoutCase = 0xdfdfdfdfdfdfdfdfu;
  static constexpr Key kOddFactor = 0x9e3779b97f4a7c15u;

  // One of 64, by the key: most keys that are not there are found missing by it.
  static uint64_t bitOf(Key key) { return uint64_t(1) << (key * kOddFactor >> 58); }

  Key m_keys[kMost];
  uint64_t m_seen = 0;
  int m_count = 0;
  bool m_good = false;
};

// A line's place in the document while it is built. A line's text is cut in place.
class DocumentBuilder {
 public:
  DocumentBuilder(IniStructForwardReferenceTag* doc, TextLife life) : m_doc(doc), m_life(life) {}

  // Takes the text [begin, end), of which *end may be written. 0, also for a bad line, or
  // kIniOutOfMemory.
  int32_t takeLine(char* begin, char* end, int32_t line);

  // After the last line, or the first status that is not 0.
  int32_t finish(int32_t status);

 private:
  int32_t takeHeader(char* begin, char* end, int32_t line);
  int32_t takeItem(char* begin, char* end, int32_t line);
  int32_t store(char* name, char* nameEnd, char* value, char* valueEnd, int32_t line);
  int32_t replace(IniEntry* entry, const char* value, int32_t line);
  int32_t appendEntry(char* name, char* nameEnd, char* value, char* valueEnd, int32_t line,
                      ztini::NameHash hash);
  int32_t openSection(char* name, char* nameEnd, int32_t line, ztini::NameHash hash = {});
  int32_t openNullSection();
  int32_t gather(IniEntry* entry);
  void endGathering();
  int32_t badLine(int32_t line);
  char* keep(char* begin, char* end);
  bool has(IniReadOption option) const { return (m_doc->readOptions & option) != 0; }
  bool isSpace(char c) const { return m_doc->fold.isSpace(c); }
  char* skipWhite(char* begin, const char* end) const;
  char* cutTrailingWhite(char* begin, char* end) const;

  IniStructForwardReferenceTag* m_doc;
  TextLife m_life;
  IniSection* m_section = nullptr;
  int32_t m_itemsExpected = 1;  // besides the first
  ItemKeys m_keys;              // of m_section
  // Items of m_section that are not in its list yet, which is empty then. The arena has space
  // for the list.
  ztini::NameNode* m_gathered[ItemKeys::kMost];
  uint32_t m_gatheredCount = 0;
  bool m_gathers = false;
  bool m_hasPieces = false;
  bool m_hasNullSection = false;
};

char* DocumentBuilder::skipWhite(char* begin, const char* end) const {
  while (begin < end && isSpace(*begin)) ++begin;
  return begin;
}

// Ends the text before its trailing white space; its end, which is `begin` if nothing is left.
char* DocumentBuilder::cutTrailingWhite(char* begin, char* end) const {
  while (end > begin && isSpace(end[-1])) --end;
  *end = 0;
  return end;
}

int32_t DocumentBuilder::takeLine(char* begin, char* end, int32_t line) {
  begin = skipWhite(begin, end);
  if (begin == end) return badLine(line);
  // A comment is no bad line. It is not kept: a save writes sections and items only.
  if (*begin == ';') return 0;
  return *begin == '[' ? takeHeader(begin + 1, end, line) : takeItem(begin, end, line);
}

int32_t DocumentBuilder::badLine(int32_t line) {
  if (m_doc->firstBadLine == -1) m_doc->firstBadLine = line;
  return 0;
}

int32_t DocumentBuilder::takeHeader(char* begin, char* end, int32_t line) {
  char* name = skipWhite(begin, end);
  // The first one: what follows it on the line is ignored.
  auto* bracket = static_cast<char*>(memchr(name, ']', static_cast<size_t>(end - name)));
  if (!bracket) return badLine(line);
  char* nameEnd = cutTrailingWhite(name, bracket);
  if (nameEnd == name) return badLine(line);
  endGathering();
  IniSection* known = nullptr;
  ztini::NameHash hash;
  if (m_doc->duplicateChecking && IniSeekSection(m_doc, name, &known, FoldState::Fresh, &hash) < 0)
    return kIniOutOfMemory;
  if (!known) return openSection(name, nameEnd, line, hash);
  known->line = line;
  m_section = known;
  m_keys.start(known->items.count());
  return 0;
}

int32_t DocumentBuilder::openSection(char* name, char* nameEnd, int32_t line,
                                     ztini::NameHash hash) {
  char* kept = keep(name, nameEnd);
  IniSection* section = kept ? IniReadSection(m_doc, kept) : nullptr;
  if (!section) return kIniOutOfMemory;
  section->line = line;
  if (!IniAppendSection(m_doc, section, hash)) return kIniOutOfMemory;
  m_hasNullSection = m_hasNullSection || IniSectionIsNull(section);
  if (m_section) m_itemsExpected = std::clamp(m_section->items.count() - 1, 1, kMostExpected);
  m_section = section;
  m_keys.start(0);
  m_gathers = m_life == TextLife::Document;
  return 0;
}

int32_t DocumentBuilder::openNullSection() {
  char* name = m_doc->arena.text(kIniNullSectionName, strlen(kIniNullSectionName));
  return name ? openSection(name, name + strlen(name), -1) : kIniOutOfMemory;
}

int32_t DocumentBuilder::takeItem(char* begin, char* end, int32_t line) {
  // The first one: a value may hold more.
  auto* separator = static_cast<char*>(memchr(begin, '=', static_cast<size_t>(end - begin)));
  if (has(kIniReadColons)) {
    char* before = separator ? separator : end;
    auto* colon = static_cast<char*>(memchr(begin, ':', static_cast<size_t>(before - begin)));
    if (colon) separator = colon;
  }
  if (!separator || separator == begin) return badLine(line);
  char* value = separator + 1;
  if (*separator == ':' && value < end && *value == '=') ++value;
  char* nameEnd = cutTrailingWhite(begin, separator);
  value = skipWhite(value, end);
  char* valueEnd = cutTrailingWhite(value, end);
  if (value == valueEnd && !has(kIniReadKeepEmpty)) return badLine(line);
  return store(begin, nameEnd, value, valueEnd, line);
}

int32_t DocumentBuilder::store(char* name, char* nameEnd, char* value, char* valueEnd,
                               int32_t line) {
  if (!m_section) {
    // Items before the first header are dropped, without counting as bad lines.
    if (!has(kIniReadColons)) return 0;
    const int32_t status = openNullSection();
    if (status < 0) return status;
  }
  const ItemKeys::Key key = ItemKeys::Of(m_doc->fold, name, nameEnd);
  IniEntry* known = nullptr;
  ztini::NameHash hash;
  if (m_doc->duplicateChecking && m_keys.mayHave(key)) {
    endGathering();
    const int32_t status = IniSeekEntry(m_doc, m_section, name, &known, FoldState::Fresh, &hash);
    if (status < 0) return status;
  }
  if (known) return replace(known, value, line);
  m_keys.add(key);
  m_hasPieces = m_hasPieces || IniMayBePiece(name, nameEnd);
  return appendEntry(name, nameEnd, value, valueEnd, line, hash);
}

int32_t DocumentBuilder::replace(IniEntry* entry, const char* value, int32_t line) {
  char* copy = ztini_StrDup(value);
  if (!copy) return kIniOutOfMemory;
  IniReplaceValue(entry, copy);
  IniNewEntryHandleQuotes(entry, m_doc->readOptions);
  entry->line = line;
  m_section->markChanged();
  return 0;
}

int32_t DocumentBuilder::appendEntry(char* name, char* nameEnd, char* value, char* valueEnd,
                                     int32_t line, ztini::NameHash hash) {
  char* keptName = keep(name, nameEnd);
  char* keptValue = keptName ? keep(value, valueEnd) : nullptr;
  if (!keptValue) return kIniOutOfMemory;
  const size_t listBytes = m_gathers ? (m_gatheredCount + 1) * sizeof *m_gathered : 0;
  if (!m_doc->arena.reserve(sizeof(IniEntry) + listBytes)) return kIniOutOfMemory;
  IniEntry* entry = IniReadEntry(m_doc, keptName, static_cast<size_t>(nameEnd - name), keptValue,
                                 static_cast<size_t>(valueEnd - value));
  if (!entry) return kIniOutOfMemory;
  entry->line = line;
  if (m_gathers) return gather(entry);
  // As many as the section before has; without memory the append tries again.
  if (m_section->items.count() == 1) m_section->items.reserve(m_itemsExpected);
  return IniAppendEntry(m_section, entry, hash) ? 0 : kIniOutOfMemory;
}

int32_t DocumentBuilder::gather(IniEntry* entry) {
  m_gathered[m_gatheredCount++] = entry;
  if (m_gatheredCount == ItemKeys::kMost) endGathering();
  return 0;
}

// Makes the list of the section's items. Later ones are added to it one by one.
void DocumentBuilder::endGathering() {
  if (!m_gathers) return;
  m_gathers = false;
  ztini::NameList& items = m_section->items;
  if (m_gatheredCount == 1) {
    items.append(m_gathered[0]);
  } else if (m_gatheredCount > 1) {
    const size_t bytes = m_gatheredCount * sizeof *m_gathered;
    void* list = m_doc->arena.record(bytes);
    memcpy(list, m_gathered, bytes);
    items.lend(static_cast<ztini::NameNode**>(list), m_gatheredCount);
  }
  m_section->valueInArena = 1;
  m_gatheredCount = 0;
}

char* DocumentBuilder::keep(char* begin, char* end) {
  return m_life == TextLife::Document ? begin
                                      : m_doc->arena.text(begin, static_cast<size_t>(end - begin));
}

int32_t DocumentBuilder::finish(int32_t status) {
  endGathering();
  if (status < 0) return status;
  if (m_hasPieces) status = IniJoinPieces(m_doc);
  m_doc->settled = status == 0 && !m_hasPieces && !m_hasNullSection && m_doc->duplicateChecking &&
                   !has(kIniReadColons);
  // Names that were cut under one locale may be equal, or have white space, under another.
  m_doc->settledFold = m_doc->fold.generation();
  return status;
}

void StartRead(IniStructForwardReferenceTag* doc) {
  IniEmptyDocument(doc);
  doc->textSize = 0;
  doc->firstBadLine = -1;
  // Once for the whole text: the locale in force at the beginning decides for every line.
  doc->fold.refresh();
}

// Lines of a text, and how many bytes they take.
struct Sample {
  size_t headers = 0, items = 0;
  ptrdiff_t sizeBytes = 0;
  bool isPart = false;

  // The lines that begin and end in [begin, end), the first one at `begin`.
  void take(const char* begin, const char* end) {
    for (const char* at = begin; at < end;) {
      const void* lineEnd = memchr(at, '\n', static_cast<size_t>(end - at));
      if (!lineEnd) return;
      ++(*at == '[' ? headers : items);
      const char* next = static_cast<const char*>(lineEnd) + 1;
      sizeBytes += next - at;
      at = next;
    }
  }
};

// From places all over the text: a file may begin with a long list, and go on with small sections.
Sample SampleOf(const char* begin, const char* end) {
  constexpr ptrdiff_t kPlaces = 8, kPlaceBytes = 512;
  Sample sample;
  const auto size = end - begin;
  if (size <= kPlaces * kPlaceBytes) {
    sample.take(begin, end);
    return sample;
  }
  sample.isPart = true;
  sample.take(begin, begin + kPlaceBytes);
  for (ptrdiff_t n = 1; n < kPlaces; ++n) {
    const char* place = begin + size / kPlaces * n;
    const void* lineEnd = memchr(place, '\n', kPlaceBytes);
    if (lineEnd) sample.take(static_cast<const char*>(lineEnd) + 1, place + kPlaceBytes);
  }
  return sample;
}

// Asks for the memory of the document's records at once, guessed from some of the text's lines.
// Without memory for it, and for what was not guessed, reading asks piece by piece.
void ExpectRecords(IniStructForwardReferenceTag* doc, const char* begin, const char* end) {
  constexpr double kMostBytes = 2;  // for one of the text: a file of empty lines needs nothing
  const Sample sample = SampleOf(begin, end);
  const size_t bytes =
      sample.headers * sizeof(IniSection) + sample.items * (sizeof(IniEntry) + sizeof(IniEntry*));
  if (!bytes) return;
  const auto size = double(end - begin);
  double times = size / double(sample.sizeBytes);
  if (sample.isPart) times = std::min(times, kMostBytes * size / double(bytes));
  doc->arena.expect(static_cast<size_t>(times * double(bytes)) & ~(alignof(IniSection) - 1));
  doc->sections.reserve(static_cast<uint32_t>(times * double(sample.headers)));
}

}  // namespace

int32_t ztini::IniReadText(IniStructForwardReferenceTag* doc, OwnedText text, size_t begin,
                           size_t end) {
  StartRead(doc);
  doc->text = std::move(text);
  doc->textSize = end;
  char* bytes = doc->text.get();
  ExpectRecords(doc, bytes + begin, bytes + end);
  TextLines lines(bytes + begin, bytes + end);
  DocumentBuilder builder(doc, TextLife::Document);
  while (lines.next()) {
    const int32_t status = builder.takeLine(lines.begin(), lines.end(), lines.lineNumber());
    if (status < 0) return builder.finish(status);
  }
  return builder.finish(0);
}

int32_t IniRead(IniStructForwardReferenceTag* doc, IniLineInputFunction input, void* context) {
  if (!doc) return 0;
  StartRead(doc);
  if (!input) return 0;
  ztini::LineBuffer line;
  if (!line.open()) return kIniOutOfMemory;
  DocumentBuilder builder(doc, TextLife::Line);
  do {
    int32_t status = line.next(input, context);
    if (status >= 0 && line.complete()) {
      status = builder.takeLine(line.text(), line.text() + strlen(line.text()), line.lineNumber());
    }
    if (status < 0) return builder.finish(status);
  } while (!line.atEnd());
  return builder.finish(0);
}

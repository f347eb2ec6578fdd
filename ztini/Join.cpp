// One walk a section, from the first item to the last. A piece numbered 1 begins a run, and every
// piece with another number after it belongs to that run; items that are no pieces end it. The list
// is compacted while it is walked, since removing each piece by itself would move the rest of the
// list every time. Without memory the walk goes on without merging, so that the list is whole in
// either case.
#include "ztini/Join.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>

#include "ztini/Document.h"
#include "ztini/StringTools.h"

namespace {

constexpr char kPieceMark[] = " Line";

bool AllDigits(const char* text) { return *text && text[strspn(text, "0123456789")] == 0; }

bool IsPiece(const IniEntry* entry, bool* isFirst) {
  size_t baseLength;
  long number;
  if (!AnalyzeItemName(entry->name, &baseLength, &number)) return false;
  *isFirst = number == 1;
  return true;
}

// One walk over a section's items; those that stay move up in place.
class SectionJoin {
 public:
  explicit SectionJoin(IniSection* section)
      : m_section(section), m_items(section->items.nodes()), m_count(section->items.count()) {}

  // False without memory; the section is whole either way.
  bool run();

 private:
  IniEntry* item(int32_t index) const { return static_cast<IniEntry*>(m_items[index]); }
  int32_t runEnd(int32_t begin) const;
  bool merge(int32_t begin, int32_t end);

  IniSection* m_section;
  ztini::NameNode** m_items;
  int32_t m_count;
};

bool SectionJoin::run() {
  int32_t kept = 0;
  bool changed = false, good = true;
  for (int32_t next = 0; next < m_count;) {
    bool isFirst = false;
    int32_t end = next + 1;
    // A run without its first piece stays as it is: nothing says what came before it.
    if (good && IsPiece(item(next), &isFirst) && isFirst) {
      const int32_t pieces = runEnd(next);
      good = merge(next, pieces);
      if (good) end = pieces;
      changed = true;
    }
    m_items[kept++] = m_items[next];
    next = end;
  }
  if (changed) {
    m_section->items.keepFirst(kept);
    m_section->markChanged();
  }
  return good;
}

int32_t SectionJoin::runEnd(int32_t begin) const {
  int32_t end = begin + 1;
  bool isFirst = false;
  while (end < m_count && IsPiece(item(end), &isFirst) && !isFirst) ++end;
  return end;
}

char* JoinedValue(ztini::NameNode** begin, ztini::NameNode** end) {
  // Two walks, to count and to copy: a long value comes in thousands of pieces.
  size_t length = 0;
  for (auto** at = begin; at < end; ++at) length += strlen(static_cast<IniEntry*>(*at)->value);
  char* joined = static_cast<char*>(ztini::Allocate(length + 1));
  if (!joined) return nullptr;
  char* out = joined;
  for (auto** at = begin; at < end; ++at) out = stpcpy(out, static_cast<IniEntry*>(*at)->value);
  *out = 0;
  return joined;
}

bool SectionJoin::merge(int32_t begin, int32_t end) {
  IniEntry* first = item(begin);
  size_t baseLength = 0;
  long number;
  AnalyzeItemName(first->name, &baseLength, &number);
  char base[kIniLongestBaseName + 1];
  ztini_StringCopyMax(base, first->name, baseLength + 1);
  // Both texts before anything changes.
  ztini::OwnedText name(ztini_StrDupWithoutSurrWhiteSpace(base));
  ztini::OwnedText value(JoinedValue(m_items + begin, m_items + end));
  if (!name || !value) return false;
  IniReplaceValue(first, value.release());
  ztini::ReplaceName(first, name.release());
  first->knownNameLength = 0;
  for (int32_t piece = begin + 1; piece < end; ++piece) IniDisposeEntry(item(piece));
  return true;
}

}  // namespace

int32_t AnalyzeItemName(const char* name, size_t* baseLength, long* number) {
  const char* mark = name ? strstr(name, kPieceMark) : nullptr;
  if (!mark) return 0;
  const size_t length = static_cast<size_t>(mark - name);
  const char* digits = mark + strlen(kPieceMark);
  // strtol alone would take a sign and white space.
  if (length > kIniLongestBaseName || !AllDigits(digits)) return 0;
  // The engine reports by its results, and leaves the host's errno alone.
  const int before = errno;
  errno = 0;
  const long value = strtol(digits, nullptr, 10);
  const bool fits = errno == 0;
  errno = before;
  if (!fits) return 0;
  *baseLength = length;
  *number = value;
  return 1;
}

bool IniEndsAsPiece(const char* name, const char* end) {
  const char* digits = end;
  while (digits > name && digits[-1] >= '0' && digits[-1] <= '9') --digits;
  const ptrdiff_t markLength = sizeof kPieceMark - 1;
  return digits < end && digits - name >= markLength &&
         memcmp(digits - markLength, kPieceMark, markLength) == 0;
}

int32_t IniJoinPieces(IniStructForwardReferenceTag* doc) {
  for (int32_t n = 1; n <= doc->sections.count(); ++n) {
    if (!SectionJoin(doc->section(n)).run()) return kIniOutOfMemory;
  }
  return 0;
}

// One walk over the document serves two ends: a caller's function that takes lines, and a text in
// memory for a file. The walk is a template over the two, so that both write the same. Values that
// would make a line too long are split into pieces, which the reader joins (Join.h).
#include <bit>
#include <cstring>
#include <string_view>

#include "ztini/ByteOrderMark.h"
#include "ztini/Document.h"
#include "ztini/Render.h"
#include "ztini/TextBuffer.h"

namespace {

// " Line", four digits and a separator of three, whether or not it is that wide.
constexpr int64_t kPieceOverhead = 12;

// Takes lines one by one and passes each on.
class FunctionLines {
 public:
  FunctionLines(IniLineOutputFunction output, void* stream) : m_output(output), m_stream(stream) {}

  ztini::TextBuffer& begin() {
    m_line.clear();
    return m_line;
  }
  int32_t end() { return m_line.ok() ? m_output(m_stream, m_line.text()) : kIniOutOfMemory; }

  // Each section is made of its items.
  bool reuse(IniSection*) { return false; }
  void note(IniSection*) {}

 private:
  IniLineOutputFunction m_output;
  void* m_stream;
  ztini::TextBuffer m_line;
};

// Size of the block for a rendering after one of `sizeBytes`: a little more, and the same for many
// renderings of which each is a little longer. An allocator gives a block of a size that was just
// freed from what it has; a new size of its own comes from the system, page by page.
size_t BlockFor(size_t sizeBytes) {
  const size_t least = sizeBytes + sizeBytes / 64;
  const size_t step = std::bit_floor(least) / 8 + 1;
  return (least / step + 1) * step;
}

// Bytes that both texts begin with, in whole blocks.
size_t SharedStart(std::string_view a, std::string_view b) {
  constexpr size_t kBlock = 256;
  const size_t end = std::min(a.size(), b.size());
  size_t at = 0;
  while (at + kBlock <= end && memcmp(a.data() + at, b.data() + at, kBlock) == 0) at += kBlock;
  return at;
}

// Puts lines together in one text, as they are in a file. Sections that have not changed since the
// rendering before, but for items added at their end, are copied from there, neighbours at once: a
// save of a long document that differs in few places costs little more than its bytes.
//
// Of a document that was not saved yet, a few lines at a time are compared with the source that it
// was read from. As long as they are the same they are not kept, and from the first difference on the
// text goes on in the source's own block: most starts save what they have read, and need no second
// block for it.
class TextInMemory {
 public:
  // `wasSaved`: `before` is the text of the last save, otherwise the source, or empty.
  TextInMemory(ztini::TextBuffer* text, ztini::TextBuffer before, bool wasSaved, size_t sizeHint,
               bool marked)
      : m_text(text),
        m_before(std::move(before)),
        m_reuses(wasSaved && m_before.size()),
        m_follows(!wasSaved && m_before.size()),
        m_isFirst(!marked) {
    const size_t whole = BlockFor(m_before.size() ? m_before.size() : sizeHint);
    m_text->reserve(m_follows ? std::min(whole, kStepBytes + kStepBytes / 4) : whole);
    if (marked) m_text->append(ztini::kUtf8Mark);
  }

  ztini::TextBuffer& begin() {
    copyReused();
    return m_isFirst ? m_first : *m_text;
  }
  int32_t end() {
    if (m_isFirst) endFirst();
    m_text->append('\n');
    if (!m_text->ok() || !m_first.ok()) return kIniOutOfMemory;
    if (m_follows && m_text->size() >= kStepBytes) follow();
    return m_text->ok() ? 0 : kIniOutOfMemory;
  }

  // Takes what was rendered of the section from the rendering before, if it is there.
  bool reuse(IniSection* section) {
    m_sectionAt = size();
    m_sectionIsFirst = m_isFirst;
    if (m_isFirst || !m_reuses || !section->renderedSize) return false;
    const size_t at = section->renderedAt;
    if (at != m_reusedEnd) {
      copyReused();
      m_reusedBegin = m_reusedEnd = at;
    }
    m_reusedEnd += section->renderedSize;
    section->renderedAt = static_cast<uint32_t>(m_sectionAt);
    return true;
  }

  // For the next rendering: the section ends here. The file's first line is made with what is
  // before it.
  void note(IniSection* section) {
    const bool fits = size() <= UINT32_MAX && !m_sectionIsFirst;
    section->renderedAt = fits ? static_cast<uint32_t>(m_sectionAt) : 0;
    section->renderedSize = fits ? static_cast<uint32_t>(size() - m_sectionAt) : 0;
    section->renderedItems = section->items.count();
  }

  // *unchangedBytes: as IniRender's.
  int32_t finish(size_t* unchangedBytes) {
    copyReused();
    if (!m_text->ok()) return kIniOutOfMemory;
    if (m_follows) follow();
    if (m_follows) takeOverSource();
    if (!m_text->ok()) return kIniOutOfMemory;
    if (unchangedBytes)
      *unchangedBytes = m_reuses ? SharedStart(m_before.view(), m_text->view()) : m_unchanged;
    return 0;
  }

 private:
  // Of text that is compared at once: it stays in the processor's first cache.
  static constexpr size_t kStepBytes = 8192;

  size_t size() const { return m_same + m_text->size() + (m_reusedEnd - m_reusedBegin); }

  void copyReused() {
    if (m_reusedEnd == m_reusedBegin) return;
    m_text->append(m_before.view().substr(m_reusedBegin, m_reusedEnd - m_reusedBegin));
    m_reusedBegin = m_reusedEnd;
  }

  void follow() {
    if (m_before.view().substr(m_same).starts_with(m_text->view())) {
      m_same += m_text->size();
      m_text->clear();
      return;
    }
    const size_t whole = BlockFor(m_before.size());
    if (m_same == 0) {
      m_follows = false;
      m_before.reset();
      m_text->reserve(whole);
    } else {
      m_before.reserve(whole);
      takeOverSource();
    }
  }

  // The text is what is the same in the source, and what was made since.
  void takeOverSource() {
    m_follows = false;
    m_before.cut(m_same);
    m_unchanged = std::exchange(m_same, 0);
    m_before.append(m_text->view());
    *m_text = std::move(m_before);
  }

  // A name may begin with the bytes of a byte order mark. As the first bytes of the file they would
  // be lost or get the whole file refused, so an empty line goes before them.
  void endFirst() {
    m_isFirst = false;
    const char* line = m_first.text();
    if (ztini::MarkIn(line, strnlen(line, 4)) != ztini::ByteOrderMark::None) m_text->append('\n');
    m_text->append(m_first.view());
  }

  ztini::TextBuffer* m_text;
  ztini::TextBuffer m_before;
  bool m_reuses;   // from the text of the last save
  bool m_follows;  // the source, whose first m_same bytes the text has, too
  size_t m_same = 0;
  size_t m_unchanged = 0;                     // m_same at the end of that
  size_t m_reusedBegin = 0, m_reusedEnd = 0;  // of m_before, not yet copied
  size_t m_sectionAt = 0;
  bool m_sectionIsFirst = false;
  ztini::TextBuffer m_first;
  bool m_isFirst;
};

// Emits a document line by line. Every operation gives 0 or a negative status.
template <class Lines>
class DocumentWriter {
 public:
  DocumentWriter(const IniStructForwardReferenceTag* doc, Lines* lines)
      : m_doc(doc),
        m_lines(*lines),
        m_separator(doc->writeOptions & kIniWriteSpaces ? " = " : "=") {}

  int32_t write();

 private:
  int32_t writeSection(IniSection* section, const IniSection* previous);
  int32_t writeHeaderAndItems(IniSection* section);
  int32_t writeItems(IniSection* section, int32_t first);
  int32_t writeHeader(const IniSection* section);
  int32_t writeEmptyLine();
  int32_t writeItem(const IniEntry* entry);
  int32_t writePieces(const IniEntry* entry, int64_t room);
  int32_t endWithValue(ztini::TextBuffer& line, std::string_view value, uint32_t quote);
  size_t pieceLength(std::string_view rest, size_t room) const;
  bool tight() const { return (m_doc->writeOptions & kIniWriteTight) != 0; }

  const IniStructForwardReferenceTag* m_doc;
  Lines& m_lines;
  std::string_view m_separator;
};

template <class Lines>
int32_t DocumentWriter<Lines>::write() {
  const IniSection* previous = nullptr;
  ztini::NameNode** sections = m_doc->sections.nodes();
  for (int32_t n = 0; n < m_doc->sections.count(); ++n) {
    auto* section = static_cast<IniSection*>(sections[n]);
    const int32_t status = writeSection(section, previous);
    if (status < 0) return status;
    previous = section;
  }
  return 0;
}

template <class Lines>
int32_t DocumentWriter<Lines>::writeSection(IniSection* section, const IniSection* previous) {
  const bool fromFile = IniSectionWasReadFromFile(section);
  int32_t status = 0;
  // A section that was added gets an empty line before it, so that it does not run into the file's
  // own ones.
  if (tight() && !fromFile && IniSectionWasReadFromFile(previous)) status = writeEmptyLine();
  if (status >= 0) status = writeHeaderAndItems(section);
  if (status < 0) return status;
  return tight() && (fromFile || IniSectionIsNull(section)) ? 0 : writeEmptyLine();
}

template <class Lines>
int32_t DocumentWriter<Lines>::writeHeaderAndItems(IniSection* section) {
  if (m_lines.reuse(section)) {
    const int32_t done = section->renderedItems;
    return done == section->items.count() ? 0 : writeItems(section, done);
  }
  const int32_t status = IniSectionIsNull(section) ? 0 : writeHeader(section);
  return status < 0 ? status : writeItems(section, 0);
}

template <class Lines>
int32_t DocumentWriter<Lines>::writeItems(IniSection* section, int32_t first) {
  ztini::NameNode** items = section->items.nodes();
  for (int32_t n = first; n < section->items.count(); ++n) {
    const int32_t status = writeItem(static_cast<const IniEntry*>(items[n]));
    if (status < 0) return status;
  }
  m_lines.note(section);
  return 0;
}

template <class Lines>
int32_t DocumentWriter<Lines>::writeEmptyLine() {
  m_lines.begin();
  return m_lines.end();
}

template <class Lines>
int32_t DocumentWriter<Lines>::writeHeader(const IniSection* section) {
  m_lines.begin().append('[').append(section->name).append(']');
  return m_lines.end();
}

template <class Lines>
int32_t DocumentWriter<Lines>::writeItem(const IniEntry* entry) {
  const std::string_view name = entry->nameText(), value = entry->valueText();
  const int64_t quotes = entry->quote ? 2 : 0;
  const int64_t nameLength = static_cast<int64_t>(name.size());
  const int64_t total =
      static_cast<int64_t>(value.size() + m_separator.size()) + nameLength + quotes;
  if (m_doc->maxLineLength != -1 && total > m_doc->maxLineLength) {
    return writePieces(entry, m_doc->maxLineLength - nameLength - kPieceOverhead - quotes);
  }
  return endWithValue(m_lines.begin().append(name), value, entry->quote);
}

template <class Lines>
int32_t DocumentWriter<Lines>::writePieces(const IniEntry* entry, int64_t room) {
  // A name that leaves no space would be split into pieces without end.
  if (room < 1) return kIniNoRoom;
  std::string_view rest = entry->valueText();
  for (unsigned number = 1; !rest.empty(); ++number) {
    const size_t length = pieceLength(rest, static_cast<size_t>(room));
    ztini::TextBuffer& line = m_lines.begin();
    line.append(entry->nameText()).append(" Line").appendNumber(number);
    const int32_t status = endWithValue(line, rest.substr(0, length), entry->quote);
    if (status < 0) return status;
    rest.remove_prefix(length);
  }
  return 0;
}

// A last break character among the first `room` bytes ends the piece, even where exactly `room`
// bytes are left.
template <class Lines>
size_t DocumentWriter<Lines>::pieceLength(std::string_view rest, size_t room) const {
  if (rest.size() < room) return rest.size();
  if (!m_doc->breakCharacter) return room;
  const size_t at = rest.substr(0, room).rfind(static_cast<char>(m_doc->breakCharacter));
  return at == std::string_view::npos ? room : at + 1;
}

template <class Lines>
int32_t DocumentWriter<Lines>::endWithValue(ztini::TextBuffer& line, std::string_view value,
                                            uint32_t quote) {
  line.append(m_separator);
  if (quote) line.append(static_cast<char>(quote));
  line.append(value);
  if (quote) line.append(static_cast<char>(quote));
  return m_lines.end();
}

}  // namespace

int32_t IniWrite(IniStructForwardReferenceTag* doc, IniLineOutputFunction output, void* stream) {
  if (!doc || !output) return 0;
  FunctionLines lines(output, stream);
  return DocumentWriter(doc, &lines).write();
}

int32_t ztini_WriteStringToFile(FILE* file, const char* text) {
  const size_t length = strlen(text);
  return fwrite(text, 1, length, file) == length ? 0 : kIniWriteFailed;
}

int32_t IniFileOutputFunc(void* file, const char* line) {
  FILE* stream = static_cast<FILE*>(file);
  const int32_t status = ztini_WriteStringToFile(stream, line);
  return status < 0 ? status : ztini_WriteStringToFile(stream, "\n");
}

int32_t ztini::IniRender(IniStructForwardReferenceTag* doc, TextBuffer* text,
                         size_t* unchangedBytes) {
  const bool marked = (doc->writeOptions & kIniWriteMark) != 0;
  // The sections' places in it are overwritten one by one, so it serves once only.
  TextInMemory lines(text, std::move(doc->rendering), doc->wasSaved, doc->textSize, marked);
  const int32_t status = DocumentWriter(doc, &lines).write();
  return status < 0 ? status : lines.finish(unchangedBytes);
}

void ztini::IniKeepSource(IniStructForwardReferenceTag* doc, TextBuffer bytes) {
  // The text of a save has the sections' places.
  if (!doc->wasSaved) doc->rendering = std::move(bytes);
}

int32_t ztini_IniWriteToFileHelper(IniStructForwardReferenceTag* doc, FILE* file) {
  if (!doc || !file) return 0;
  ztini::TextBuffer text;
  const int32_t status = ztini::IniRender(doc, &text);
  if (status < 0) return status;
  const size_t written = fwrite(text.text(), 1, text.size(), file);
  // Flushed here, where a full disk is still a result: the stream's close comes later and is the
  // caller's.
  return written == text.size() && fflush(file) == 0 ? 0 : kIniWriteFailed;
}

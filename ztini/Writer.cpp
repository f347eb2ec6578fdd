#include <cstring>
#include <string_view>

#include "ztini/ByteOrderMark.h"
#include "ztini/Document.h"
#include "ztini/Render.h"
#include "ztini/TextBuffer.h"

namespace {

// " Line", four digits and a separator of three, whether or not it is that wide.
constexpr int64_t kPieceOverhead = 12;

// Emits a document line by line. Every operation gives 0 or a negative status.
class DocumentWriter {
 public:
  DocumentWriter(const IniStructForwardReferenceTag* doc, IniLineOutputFunction output,
                 void* stream)
      : m_doc(doc),
        m_output(output),
        m_stream(stream),
        m_separator(doc->writeOptions & kIniWriteSpaces ? " = " : "=") {}

  int32_t write();

 private:
  int32_t writeSection(const IniSection* section, const IniSection* previous);
  int32_t writeHeader(const IniSection* section);
  int32_t writeItem(const IniEntry* entry);
  int32_t writePieces(const IniEntry* entry, int64_t room);
  int32_t emitValue(std::string_view value, int32_t quote);
  int32_t emitLine();
  size_t pieceLength(std::string_view rest, size_t room) const;
  bool tight() const { return (m_doc->writeOptions & kIniWriteTight) != 0; }

  const IniStructForwardReferenceTag* m_doc;
  IniLineOutputFunction m_output;
  void* m_stream;
  std::string_view m_separator;
  ztini::TextBuffer m_line;
};

int32_t DocumentWriter::write() {
  const IniSection* previous = nullptr;
  for (int32_t n = 1; n <= m_doc->sections.count(); ++n) {
    const IniSection* section = m_doc->section(n);
    const int32_t status = writeSection(section, previous);
    if (status < 0) return status;
    previous = section;
  }
  return 0;
}

int32_t DocumentWriter::writeSection(const IniSection* section, const IniSection* previous) {
  const bool fromFile = IniSectionWasReadFromFile(section);
  const bool isNull = IniSectionIsNull(section);
  int32_t status = 0;
  if (tight() && !fromFile && IniSectionWasReadFromFile(previous)) status = m_output(m_stream, "");
  if (status >= 0 && !isNull) status = writeHeader(section);
  for (int32_t n = 1; status >= 0 && n <= section->items.count(); ++n) {
    status = writeItem(section->item(n));
  }
  if (status < 0) return status;
  if (tight() && (fromFile || isNull)) return 0;
  return m_output(m_stream, "");
}

int32_t DocumentWriter::writeHeader(const IniSection* section) {
  m_line.clear();
  m_line.append('[').append(section->name).append(']');
  return emitLine();
}

int32_t DocumentWriter::writeItem(const IniEntry* entry) {
  const std::string_view name = entry->name, value = entry->value;
  const int64_t quotes = entry->quote ? 2 : 0;
  const int64_t nameLength = static_cast<int64_t>(name.size());
  const int64_t total =
      static_cast<int64_t>(value.size() + m_separator.size()) + nameLength + quotes;
  if (m_doc->maxLineLength != -1 && total > m_doc->maxLineLength) {
    return writePieces(entry, m_doc->maxLineLength - nameLength - kPieceOverhead - quotes);
  }
  m_line.clear();
  m_line.append(name);
  return emitValue(value, entry->quote);
}

int32_t DocumentWriter::writePieces(const IniEntry* entry, int64_t room) {
  if (room < 1) return kIniNoRoom;
  std::string_view rest = entry->value;
  for (unsigned number = 1; !rest.empty(); ++number) {
    const size_t length = pieceLength(rest, static_cast<size_t>(room));
    m_line.clear();
    m_line.append(entry->name).append(" Line").appendNumber(number);
    const int32_t status = emitValue(rest.substr(0, length), entry->quote);
    if (status < 0) return status;
    rest.remove_prefix(length);
  }
  return 0;
}

// A last break character among the first `room` bytes ends the piece, even where exactly `room`
// bytes are left.
size_t DocumentWriter::pieceLength(std::string_view rest, size_t room) const {
  if (rest.size() < room) return rest.size();
  if (!m_doc->breakCharacter) return room;
  const size_t at = rest.substr(0, room).rfind(static_cast<char>(m_doc->breakCharacter));
  return at == std::string_view::npos ? room : at + 1;
}

int32_t DocumentWriter::emitValue(std::string_view value, int32_t quote) {
  m_line.append(m_separator);
  if (quote) m_line.append(static_cast<char>(quote));
  m_line.append(value);
  if (quote) m_line.append(static_cast<char>(quote));
  return emitLine();
}

int32_t DocumentWriter::emitLine() {
  return m_line.ok() ? m_output(m_stream, m_line.text()) : kIniOutOfMemory;
}

}  // namespace

int32_t IniWrite(IniStructForwardReferenceTag* doc, IniLineOutputFunction output, void* stream) {
  if (!doc || !output) return 0;
  return DocumentWriter(doc, output, stream).write();
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

namespace {

struct FirstLine {
  ztini::TextBuffer* text;
  bool comes;
};

// A name may begin with the bytes of a byte order mark. As the first bytes of the file they would be
// lost or get the whole file refused, so an empty line goes before them.
int32_t AppendLine(void* state, const char* line) {
  auto* first = static_cast<FirstLine*>(state);
  if (first->comes && ztini::MarkIn(line, strnlen(line, 4)) != ztini::ByteOrderMark::kNone) {
    first->text->append('\n');
  }
  first->comes = false;
  first->text->append(line).append('\n');
  return first->text->ok() ? 0 : kIniOutOfMemory;
}

}  // namespace

int32_t ztini::IniRender(IniStructForwardReferenceTag* doc, TextBuffer* text) {
  const bool marked = (doc->writeOptions & kIniWriteMark) != 0;
  FirstLine first = {text, !marked};
  if (marked) text->append(kUtf8Mark);
  const int32_t status = IniWrite(doc, AppendLine, &first);
  if (status < 0) return status;
  return text->ok() ? 0 : kIniOutOfMemory;
}

int32_t ztini_IniWriteToFileHelper(IniStructForwardReferenceTag* doc, FILE* file) {
  if (!doc || !file) return 0;
  ztini::TextBuffer text;
  const int32_t status = ztini::IniRender(doc, &text);
  if (status < 0) return status;
  const size_t written = fwrite(text.text(), 1, text.size(), file);
  return written == text.size() && fflush(file) == 0 ? 0 : kIniWriteFailed;
}

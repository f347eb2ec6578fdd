#pragma once

#include <algorithm>
#include <cstring>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "ztini/Document.h"
#include "ztini/LineReader.h"

// Documents in tests: made from text, and shown as text.

namespace ztini::test {

struct DisposeDocument {
  void operator()(IniStructForwardReferenceTag* doc) const { IniDispose(doc); }
};
using Document = std::unique_ptr<IniStructForwardReferenceTag, DisposeDocument>;

inline Document NewDocument() { return Document(IniNew(0)); }

// Bytes in memory as what a LineFile reads; `chunk` bytes at a time.
class MemoryLines {
 public:
  explicit MemoryLines(std::string_view bytes, size_t chunk = kLineFileBufferSize)
      : m_state(LineFileNew(nullptr)), m_rest(bytes), m_chunk(chunk) {
    m_state->fill = fill;
    s_active = this;
  }
  ~MemoryLines() { LineFileDispose(m_state); }
  MemoryLines(const MemoryLines&) = delete;
  MemoryLines& operator=(const MemoryLines&) = delete;

  LineFile* state() const { return m_state; }

 private:
  static int32_t fill(LineFile* state) {
    MemoryLines& self = *s_active;
    const size_t bytes = std::min(self.m_chunk, self.m_rest.size());
    memcpy(state->buffer, self.m_rest.data(), bytes);
    self.m_rest.remove_prefix(bytes);
    state->cursor = state->buffer;
    state->bytesLeft = static_cast<int32_t>(bytes);
    state->totalBytes += state->bytesLeft;
    return 0;
  }

  inline static MemoryLines* s_active = nullptr;
  LineFile* m_state;
  std::string_view m_rest;
  size_t m_chunk;
};

inline int32_t Read(const Document& doc, std::string_view bytes) {
  MemoryLines lines(bytes);
  return IniRead(doc.get(), IniLineFileInputFunction, lines.state());
}

// A document read from these bytes; read options as in IniSetReadOptions.
inline Document Parse(std::string_view bytes, int32_t options = 2, int32_t duplicateChecking = 1) {
  Document doc = NewDocument();
  IniSetReadOptions(doc.get(), options);
  IniSetDuplicateChecking(doc.get(), duplicateChecking);
  if (Read(doc, bytes) != 0) return nullptr;
  return doc;
}

// Every section, item, line and quote: "[a@1] x=1@2 y='b'@3 [b@4]"; the value is enclosed in its
// quote character.
inline std::string Show(const Document& doc) {
  std::string shown;
  for (int32_t s = 1; s <= doc->sections.count(); ++s) {
    const IniSection* section = doc->section(s);
    if (s > 1) shown += ' ';
    shown += std::string("[") + section->name + "@" + std::to_string(section->line) + "]";
    for (int32_t i = 1; i <= section->items.count(); ++i) {
      const IniEntry* item = section->item(i);
      const std::string quote(item->quote ? 1u : 0u, static_cast<char>(item->quote));
      shown += std::string(" ") + item->name + "=" + quote + item->value + quote + "@" +
               std::to_string(item->line);
    }
  }
  return shown;
}

// What IniWrite gives to its output function.
inline std::vector<std::string> WrittenLines(const Document& doc, int32_t* status = nullptr) {
  std::vector<std::string> lines;
  const auto output = [](void* stream, const char* line) -> int32_t {
    static_cast<std::vector<std::string>*>(stream)->push_back(line);
    return 0;
  };
  const int32_t result = IniWrite(doc.get(), output, &lines);
  if (status) *status = result;
  return lines;
}

inline std::string WrittenText(const Document& doc) {
  std::string text;
  for (const std::string& line : WrittenLines(doc)) text += line + "\n";
  return text;
}

inline std::string RawValue(const Document& doc, const char* section, const char* item) {
  const char* value = nullptr;
  return IniGetPointerToRawString(doc.get(), section, item, &value) == 1 ? value : "<absent>";
}

}  // namespace ztini::test

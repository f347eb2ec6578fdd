#include "source/IniDocument.h"

#include <string.h>

#include "ztini/Document.h"
#include "ztini/Render.h"

namespace {

constexpr int32_t kReadOptions =
    kIniReadDoubleQuotes | kIniReadSingleQuotes | 16;  // 16 is idle here
constexpr int32_t kWriteOptions = kIniWriteSafely | kIniWriteSpaces | kIniWriteTight;
constexpr int32_t kNoLineLimit = -1;
constexpr int32_t kQuotesOn = 1;

HRESULT CopyOut(const char* value, char** out) {
  // The caller has sized the buffer, by contract.
  strcpy(*out, value);
  return S_OK;
}

HRESULT CopyOut(const char* value, std::string* out) {
  *out = value;
  return S_OK;
}

bool IsNull(char** out) { return !out || !*out; }
bool IsNull(const std::string* out) { return !out; }

}  // namespace

IniStructForwardReferenceTag* IniDocument::NewDocument() {
  IniStructForwardReferenceTag* fresh = IniNew(0);
  if (!fresh) return nullptr;
  IniSetReadOptions(fresh, kReadOptions);
  IniSetWriteOptions(fresh, kNoLineLimit, ' ', kWriteOptions);
  return fresh;
}

int32_t IniDocument::Parse(std::string_view bytes) {
  Dispose();
  m_ini = NewDocument();
  return m_ini ? IniReadBytes(m_ini, bytes.data(), bytes.size()) : kIniOutOfMemory;
}

int32_t IniDocument::Render(std::string* bytes) const {
  ztini::TextBuffer text;
  int32_t status = ztini::IniRender(m_ini, &text);
  // Only a whole text: a rendering that ran out of memory leaves the caller's.
  if (status == 0) bytes->assign(text.text(), text.size());
  return status;
}

void IniDocument::Dispose() {
  IniDispose(m_ini);
  m_ini = nullptr;
}

namespace {

template <class Out>
HRESULT GetValue(const IniDocument& document, const char* section, const char* item, Out* out) {
  if (!section || !item || IsNull(out)) return E_POINTER;
  const char* value = IniDocument::Section(document, section).value(item);
  // Sections and items that are missing are not distinguished: callers ask for the value.
  return value ? CopyOut(value, out) : E_FAIL;
}

template <class Out>
HRESULT GetSectionName(IniStructForwardReferenceTag* document, int n, Out* out) {
  if (IsNull(out)) return E_POINTER;
  const char* name = nullptr;
  return IniNthSectionName(document, n, &name) == 1 ? CopyOut(name, out) : E_FAIL;
}

template <class Out>
HRESULT GetItemName(IniStructForwardReferenceTag* document, const char* section, int n, Out* out) {
  if (!section || IsNull(out)) return E_POINTER;
  const char* name = nullptr;
  return IniNthItemName(document, section, n, &name) == 1 ? CopyOut(name, out) : E_FAIL;
}

}  // namespace

HRESULT IniDocument::GetItem(char const* section, char const* item, char** out) const {
  return GetValue(*this, section, item, out);
}

HRESULT IniDocument::GetItem(char const* section, char const* item, std::string* out) const {
  return GetValue(*this, section, item, out);
}

HRESULT IniDocument::SetItem(char const* section, char const* item, char const* value, bool quote) {
  if (!section || !item || !value) return E_POINTER;
  if (IniPutStringWithOptions(m_ini, section, item, value, quote ? kQuotesOn : 0,
                              m_useEscapes ? 1 : 0) != 1) {
    return E_FAIL;
  }
  m_dirty = true;
  return S_OK;
}

HRESULT IniDocument::ItemExists(char const* section, char const* item) const {
  return IniItemExists(m_ini, section, item) == 1 ? S_OK : E_FAIL;
}

HRESULT IniDocument::SectionExists(char const* section) const {
  if (!section) return E_POINTER;
  return IniSectionExists(m_ini, section) == 1 ? S_OK : E_FAIL;
}

HRESULT IniDocument::EraseItem(char const* section, char const* item) {
  if (!section || !item) return E_POINTER;
  if (IniRemoveItem(m_ini, section, item) != 1) return E_FAIL;
  m_dirty = true;
  return S_OK;
}

HRESULT IniDocument::EraseSection(char const* section) {
  if (!section) return E_POINTER;
  if (IniRemoveSection(m_ini, section) != 1) return E_FAIL;
  m_dirty = true;
  return S_OK;
}

int IniDocument::GetNumberOfSections() const { return IniNumberOfSections(m_ini); }

int IniDocument::GetNumberOfItems(char const* section) const {
  return IniNumberOfItems(m_ini, section);
}

HRESULT IniDocument::GetNthSectionName(int n, char** out) const {
  return GetSectionName(m_ini, n, out);
}
HRESULT IniDocument::GetNthSectionName(int n, std::string* out) const {
  return GetSectionName(m_ini, n, out);
}
HRESULT IniDocument::GetNthItemName(char const* section, int n, char** out) const {
  return GetItemName(m_ini, section, n, out);
}
HRESULT IniDocument::GetNthItemName(char const* section, int n, std::string* out) const {
  return GetItemName(m_ini, section, n, out);
}

IniDocument::Section::Section(const IniDocument& document, const char* name)
    : m_document(document), m_name(name), m_section(IniFindSection(document.m_ini, name)) {}

bool IniDocument::Section::has(const char* item) const {
  return m_section && IniFindFresh(m_document.m_ini, m_section, item);
}

const char* IniDocument::Section::value(const char* item) const {
  return m_section ? decoded(IniFindFresh(m_document.m_ini, m_section, item)) : nullptr;
}

const char* IniDocument::Section::decoded(const IniEntry* entry) const {
  if (!entry || !entry->value) return nullptr;
  // Most values have no escapes: what is stored is the value.
  if (!m_document.m_useEscapes || !strchr(entry->value, '\\')) return entry->value;
  const char* text = nullptr;
  return IniGetPointerToString(m_document.m_ini, m_name, entry->name, &text) == 1 ? text : nullptr;
}

int IniDocument::Section::count() const { return m_section ? m_section->items.count() : 0; }

const char* IniDocument::Section::itemName(int n) const {
  return IniEntryName(m_section ? m_section->item(n) : nullptr);
}

const char* IniDocument::Section::itemValue(int n) const {
  const IniEntry* entry = m_section ? m_section->item(n) : nullptr;
  if (!entry) return nullptr;
  return m_section->items.isKnownAsOnlyOne(entry) ? decoded(entry) : value(entry->name);
}

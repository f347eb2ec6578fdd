#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "source/Common/vltTypes.h"
#include "ztini/ztini.h"

// The sections and items of an INI file in memory, read and written as all guarded files are.
//
// Reads and writes no file; CvlIniMgr is a document with its file and the file's lock. Results are
// S_OK, E_FAIL, E_POINTER for a null argument. Names and values are taken as they are: a line feed
// in a name or, without escapes, in a value breaks the file's lines. Threads: one at a time.
class IniDocument {
 public:
  // Nothing before Parse. `useEscapes`: values are encoded when set and decoded when read.
  explicit IniDocument(bool useEscapes) : m_useEscapes(useEscapes) {}
  virtual ~IniDocument() { Dispose(); }
  IniDocument(const IniDocument&) = delete;
  IniDocument& operator=(const IniDocument&) = delete;

  // Replaces all by what a file of these bytes holds. 0, kIniUnsupportedEncoding with an empty
  // document, or kIniOutOfMemory.
  int32_t Parse(std::string_view bytes);
  // The bytes that a file of the document would have. 0, or an IniStatus and *bytes untouched.
  int32_t Render(std::string* bytes) const;

  // Copies the value to *out, which the caller provides and sizes.
  HRESULT GetItem(char const* section, char const* item, char** out) const;
  HRESULT GetItem(char const* section, char const* item, std::string* out) const;
  HRESULT SetItem(char const* section, char const* item, char const* value, bool quote);
  // S_OK when it is there, E_FAIL when not.
  HRESULT ItemExists(char const* section, char const* item) const;
  HRESULT SectionExists(char const* section) const;
  HRESULT EraseItem(char const* section, char const* item);
  HRESULT EraseSection(char const* section);
  int GetNumberOfSections() const;
  int GetNumberOfItems(char const* section) const;  // 0 for an unknown section
  // One section for many questions; nothing, if it is not there.
  class Section;

  // n from 1; 0 is the last and -1 the first.
  HRESULT GetNthSectionName(int n, char** out) const;
  HRESULT GetNthSectionName(int n, std::string* out) const;
  HRESULT GetNthItemName(char const* section, int n, char** out) const;
  HRESULT GetNthItemName(char const* section, int n, std::string* out) const;

 protected:
  // An empty one with the options of guarded files; null when out of memory.
  static IniStructForwardReferenceTag* NewDocument();
  void Dispose();

  IniStructForwardReferenceTag* m_ini = nullptr;
  bool m_dirty = false;  // changed since it was made
  bool m_useEscapes;
};

// Answers as the document does, and looks the section up once. Good until the document changes or
// another section of it is asked for.
class IniDocument::Section {
 public:
  Section(const IniDocument& document, const char* name);

  // Null for an item that is not there. Decoded where the document's values are; valid until the
  // next question.
  const char* value(const char* item) const;
  bool has(const char* item) const;
  int count() const;
  const char* itemName(int n) const;  // n as above
  // What value() gives for that name: of several items of one name, that of the first.
  const char* itemValue(int n) const;

 private:
  const char* decoded(const IniEntry* entry) const;

  const IniDocument& m_document;
  const char* m_name;
  IniSection* m_section;
};

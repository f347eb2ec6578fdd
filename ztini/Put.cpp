#include <cstdio>

#include "ztini/Document.h"
#include "ztini/EscapeCodec.h"
#include "ztini/Settled.h"
#include "ztini/StringTools.h"

// Storing values: everything new is complete before it is appended, so that a call that runs out of
// memory leaves the document as it was.
namespace {

using Doc = IniStructForwardReferenceTag;

// Puts the item into a section that may not be in the document yet.
bool PutIntoSection(Doc* doc, IniSection* section, const char* item, const char* value,
                    int32_t quote) {
  IniEntry* known = nullptr;
  if (doc->duplicateChecking && IniSeekEntry(doc, section, item, &known) < 0) return false;
  if (known) {
    // The old value goes last: the new one may be a part of it.
    char* copy = ztini_StrDupWithoutSurrWhiteSpace(value);
    if (!copy) return false;
    IniReplaceValue(known, copy);
    known->quote = IniQuoteField(quote);
    section->markChanged();
    return true;
  }
  IniEntry* entry = IniNewEntry(item, value, 0);
  if (!entry) return false;
  entry->quote = IniQuoteField(quote);
  return IniAppendEntry(section, entry);
}

int32_t OutOfMemory(Doc* doc) {
  // So that the next look-up does not rely on what a failed call has left there.
  doc->currentSection = nullptr;
  return kIniOutOfMemory;
}

}  // namespace

int32_t IniPut(Doc* doc, const char* section, const char* item, const char* value,
               int32_t quoteCharacter) {
  if (!doc) return 0;
  if (!ztini_HasNonWhiteSpace(section) || !ztini_HasNonWhiteSpace(item)) return kIniEmptyName;
  if (!value) value = "";
  if (doc->settled) {
    // Before the put is known to succeed: a document that counts as not settled is only read back
    // once too often.
    doc->settled = ztini::IniSurvivesFile(section, item, value, quoteCharacter);
  }
  IniSection* known = nullptr;
  if (IniSeekSection(doc, section, &known) < 0) return OutOfMemory(doc);
  if (known) {
    return PutIntoSection(doc, known, item, value, quoteCharacter) ? 1 : OutOfMemory(doc);
  }
  // Into the document only with its item: a section without items would be written to the file.
  IniSection* fresh = IniNewSection(doc, section);
  if (!fresh) return OutOfMemory(doc);
  if (!PutIntoSection(doc, fresh, item, value, quoteCharacter)) {
    IniDisposeSection(fresh);
    return OutOfMemory(doc);
  }
  if (!IniAppendSection(doc, fresh)) return OutOfMemory(doc);
  doc->currentSection = fresh;
  return 1;
}

int32_t IniPutStringWithOptions(Doc* doc, const char* section, const char* item, const char* value,
                                int32_t quote, int32_t escape) {
  const int32_t quoteCharacter = quote ? '"' : 0;
  if (!doc || !escape || !value) return IniPut(doc, section, item, value, quoteCharacter);
  // A copy, which also allows a value that lies in the document itself.
  ztini::OwnedText encoded(ztini::EncodeEscapes(value));
  if (!encoded) return OutOfMemory(doc);
  return IniPut(doc, section, item, encoded.get(), quoteCharacter);
}

int32_t IniPutRawString(Doc* doc, const char* section, const char* item, const char* value) {
  return IniPutStringWithOptions(doc, section, item, value, 1, 0);
}

int32_t IniPutDouble(Doc* doc, const char* section, const char* item, double value) {
  char text[64];
  snprintf(text, sizeof text, "%.14e", value);
  return IniPut(doc, section, item, text, 0);
}

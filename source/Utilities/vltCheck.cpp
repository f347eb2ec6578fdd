// The check goes on after a failure: its result is the list of messages, and the status only says
// whether the list is worth reading. What the system refuses is therefore turned into a message
// where it happens, and no refusal of a single file ends the whole. No lock is held while a library
// is loaded: its initialisers may call this library, and ask for the registrar.
#include "source/Utilities/vltCheck.h"

#include <errno.h>
#include <stdlib.h>
#include <string.h>

#include <new>
#include <string>

#include "source/Common/vltFailure.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltAllocationPoints.h"
#include "source/Utilities/vltutils.h"
#include "zt/fnd/Guid.h"
#include "zt/fnd/osdep/BinaryFile.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/SharedLibrary.h"
#include "zt/fnd/osdep/path.h"
#include "ztcom/ztcore/ztcom.h"

using zt::fnd::AnsiString;
using zt::fnd::String;
using zt::fnd::osdep::BinaryFile;
using zt::fnd::osdep::path;

namespace {

struct Kind {
  _vltComponentType type;
  const wchar_t* word;
  const wchar_t* entryPoint;
};
// In the order in which all components are checked.
constexpr Kind kKinds[] = {
    {vltComponentDataDictionary, L"dictionary", nullptr},
    {vltComponentObjectExpert, L"object expert", L"vltCreateObjectExpert"},
    {vltComponentResourceExpert, L"resource expert", L"vltCreateResourceExpert"},
    {vltComponentUIProvider, L"UI provider", L"vlGetProvider"}};

std::string Narrow(const wchar_t* text) { return AnsiString(text).c_str(); }

HRESULT Tell(vltErrors& errors, const std::string& message) {
  errors.push_back(String(message.c_str()));
  return E_FAIL;
}

HRESULT ReportFile(vltErrors& errors, const wchar_t* word, const wchar_t* file, const char* what) {
  return Tell(errors,
              "the " + Narrow(word) + " \"" + Narrow(file) + "\" is registered but " + what);
}

constexpr const char* kMissing = "does not exist";
constexpr const char* kUnreadable = "is not readable";

// A relative path is nowhere: dictionaries keep their prefix in a field that is checked as a file.
// Throws what keeps the system from answering.
bool IsThere(const wchar_t* file) {
  if (!path::IsPathAbsolute(file)) return false;
  try {
    return path::DoesFileExist(String(file));
  } catch (const zt::fnd::osdep::PosixError& error) {
    if (error.whatcode() != ENOTDIR) throw;
    return false;  // Nothing can be below what is no directory.
  }
}

}  // namespace

HRESULT CheckFileExistence(const wchar_t* file, const wchar_t* word, vltErrors& errors) {
  try {
    if (!IsThere(file)) return ReportFile(errors, word, file, kMissing);
    BinaryFile(String(file), BinaryFile::Mode::Read, false).close();
    return S_OK;
  } catch (const zt::fnd::osdep::OSException&) {
    // What the check is there to find. Raised, it would cost the caller all other messages.
    return ReportFile(errors, word, file, kUnreadable);
  }
}

HRESULT CheckEntryPoint(const wchar_t* file, const wchar_t* entryPoint, vltErrors& errors) {
  // Unloaded at the end of the scope, whatever was found.
  zt::fnd::osdep::SharedLibrary library(String(file), true, true);
  if (!library.isLoaded()) {
    return Tell(errors, "failed to load library \"" + Narrow(file) +
                            "\" while checking for entry point \"" + Narrow(entryPoint) + "\"");
  }
  if (!library.getFunctionPointer(String(entryPoint), true)) {
    return Tell(errors, "failed to find entry point \"" + Narrow(entryPoint) + "\" in library \"" +
                            Narrow(file) + "\"");
  }
  return S_OK;
}

HRESULT CheckComponent(const _vltComponent2& component, vltErrors& errors) {
  const Kind* kind = nullptr;
  for (const Kind& row : kKinds) {
    if (row.type == component.type) kind = &row;
  }
  // A type without files, or one that a later build knows: nothing to check.
  if (!kind) return S_OK;
  if (kind->entryPoint) {
    if (!component.fileName) return ReportFile(errors, kind->word, L"", kMissing);
    HRESULT result = CheckFileExistence(component.fileName, kind->word, errors);
    return result < 0 ? result : CheckEntryPoint(component.fileName, kind->entryPoint, errors);
  }
  HRESULT result = S_OK;
  for (const wchar_t* file : {static_cast<const wchar_t*>(component.fileName),
                              static_cast<const wchar_t*>(component.dictionary.prefix),
                              static_cast<const wchar_t*>(component.dictionary.auxString1)}) {
    if (file) result = CheckFileExistence(file, kind->word, errors);
  }
  return result;
}

void FreeComponent(_vltComponent2& record) {
  vltTaskMemFree(record.dictionary.auxString1);
  vltTaskMemFree(record.dictionary.prefix);
  vltTaskMemFree(record.dictionary.auxString2);
  vltTaskMemFree(record.name);
  vltTaskMemFree(record.fileName);
  if (record.type == vltComponentResourceExpert) vltTaskMemFree(record.resource.pnp);
}

// Every byte: the longest variant is not the one that is initialised by itself.
OwnedRecord::OwnedRecord() { memset(static_cast<_vltComponent2*>(this), 0, sizeof *this); }

namespace {

HRESULT CheckAll(IvltRegistrar* registrar, vltErrors& errors) {
  HRESULT status = S_OK;
  for (const Kind& kind : kKinds) {
    // Every type is checked, also after a failure: the list is to be complete.
    HRESULT result = CheckComponents(registrar, kind.type, errors);
    if (status >= 0) status = result;
  }
  return status;
}

HRESULT CheckOne(IvltRegistrar* registrar, GUID id, vltErrors& errors) {
  OwnedRecord record;
  HRESULT result = registrar->GetComponent(id, &record);
  return result < 0 ? result : CheckComponent(record, errors);
}

}  // namespace

HRESULT CheckComponents(IvltRegistrar* registrar, _vltComponentType type, vltErrors& errors) {
  CztComPtr<IvltEnumComponent> enumerator;
  HRESULT status = registrar->EnumComponents(type, enumerator.out());
  if (status < 0) return status;
  if (!enumerator) abort();  // A registrar that reports success and returns nothing.
  for (;;) {
    OwnedRecord record;
    unsigned int fetched = 0;
    if (enumerator->Next(1, &record, &fetched) != S_OK) return status;
    HRESULT result = CheckComponent(record, errors);
    if (status >= 0) status = result;
  }
}

HRESULT vltCheckComponent(vltID id, IEnumString** errors) {
  if (!errors) return E_POINTER;
  CztComPtr<IvltRegistrar> registrar;
  HRESULT status = vltGetRegistrar(registrar.out());
  if (status < 0) return status;
  vltErrors found;
  status =
      id == GUID_NULL ? CheckAll(registrar.get(), found) : CheckOne(registrar.get(), id, found);
  CEnumErrorString* list = vlt::Allocate(
      vlt::kErrorListPoint, [&] { return new (std::nothrow) CEnumErrorString(found); });
  if (!list) return vltReportOutOfMemory(vlt::kErrorListPoint.signature);
  // The list is the result; the status is only its summary.
  list->QueryInterface(IID_IEnumString, reinterpret_cast<void**>(errors));
  return status;
}

HRESULT CEnumErrorString::QueryInterface(const GUID& iid, void** out) {
  if (!out) return E_POINTER;
  *out = nullptr;
  if (!(iid == IID_IUnknown) && !(iid == IID_IEnumString)) return E_NOINTERFACE;
  AddRef();
  *out = static_cast<IEnumString*>(this);
  return S_OK;
}

uint32_t CEnumErrorString::AddRef() { return ++m_refCount; }

uint32_t CEnumErrorString::Release() {
  uint32_t left = --m_refCount;
  if (left == 0) delete this;
  return left;
}

HRESULT CEnumErrorString::Next(unsigned int count, wchar_t** strings, unsigned int* fetched) {
  unsigned int done = 0;
  while (done < count && m_cursor < m_errors.size()) {
    // So that a copy that fails leaves no pointer of the caller's to be freed.
    strings[done] = nullptr;
    // Without memory the text is met again by the next call.
    if (vltDuplicateString(m_errors[static_cast<unsigned>(m_cursor)].c_str(), &strings[done]) < 0) {
      break;
    }
    ++m_cursor;
    ++done;
  }
  if (fetched) *fetched = done;
  return done == count ? S_OK : S_FALSE;
}

HRESULT CEnumErrorString::Skip(unsigned int count) {
  // May pass the end; Next() compares before it reads.
  m_cursor += count;
  return S_OK;
}

HRESULT CEnumErrorString::Reset() {
  m_cursor = 0;
  return S_OK;
}

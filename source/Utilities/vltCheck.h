#pragma once

// The component check: are the registered files there, can they be read, and do they offer the
// entry point that the system will look for?
//
//   type             files                          entry point
//   dictionary       fileName, prefix, auxString1   none
//   object expert    fileName                       vltCreateObjectExpert
//   resource expert  fileName                       vltCreateResourceExpert
//   UI provider      fileName                       vlGetProvider
//
// Libraries are loaded for the check and unloaded again, in this process: their initialisers run.
// No lock is held meanwhile, so they may call this library.

#include "source/Common/vltInterfaces.h"
#include "zt/fnd/String.h"
#include "zt/fnd/Vector.h"

using vltErrors = zt::fnd::Vector<zt::fnd::String>;

// Walks the messages. Belongs to one thread. Every text is a vltAlloc copy.
class CEnumErrorString : public IEnumString {
 public:
  explicit CEnumErrorString(const vltErrors& errors) : m_errors(errors) {}
  CEnumErrorString(const CEnumErrorString&) = delete;
  CEnumErrorString& operator=(const CEnumErrorString&) = delete;

  HRESULT QueryInterface(const GUID& iid, void** out) override;
  uint32_t AddRef() override;
  uint32_t Release() override;
  // S_OK if all `count` were returned, else S_FALSE; *fetched, unless null, gets the number.
  HRESULT Next(unsigned int count, wchar_t** strings, unsigned int* fetched) override;
  HRESULT RemoteNext(unsigned int, wchar_t**, unsigned int*) override { return E_NOTIMPL; }
  HRESULT Skip(unsigned int count) override;  // past the end there is simply nothing left
  HRESULT Reset() override;
  HRESULT Clone(IEnumString**) override { return S_OK; }  // without output
  virtual ~CEnumErrorString() = default;

 private:
  uint32_t m_refCount = 0;
  vltErrors m_errors;
  uint64_t m_cursor = 0;  // wider than any Skip can make it
};

// S_OK, or E_FAIL and one message more. A relative path, and one below what is no directory, do not
// exist. Where anything else keeps the system from answering - a directory that may not be entered,
// a name too long, links in a circle - the file is not readable.
HRESULT CheckFileExistence(const wchar_t* path, const wchar_t* word, vltErrors& errors);
HRESULT CheckEntryPoint(const wchar_t* path, const wchar_t* entryPoint, vltErrors& errors);
// Of a dictionary's files the last one decides the result; all are checked.
HRESULT CheckComponent(const _vltComponent2& component, vltErrors& errors);
// All components of the type; the first failure is the result.
HRESULT CheckComponents(IvltRegistrar* registrar, _vltComponentType type, vltErrors& errors);
// Frees every text of a record of this library, whatever its type: those that a type has not are
// null.
void FreeComponent(_vltComponent2& record);

// A record that a call fills, with the texts that it then has.
struct OwnedRecord : _vltComponent2 {
  OwnedRecord();  // zeroed
  ~OwnedRecord() { FreeComponent(*this); }
  OwnedRecord(const OwnedRecord&) = delete;
  OwnedRecord& operator=(const OwnedRecord&) = delete;
};

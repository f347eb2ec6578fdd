#pragma once

// Result codes and the root of all interfaces.

#include <cstdint>

#include "zt/fnd/GuidType.h"

// Result of an exported function or interface operation. Negative is failure: test the sign, for 1
// (S_FALSE) is a success. Always 32 bits wide, so that 0x80004005 is negative on every word size.
using HRESULT = int32_t;

#ifndef S_OK
#define S_OK (static_cast<HRESULT>(0))
#define S_FALSE (static_cast<HRESULT>(1))
#define E_NOTIMPL (static_cast<HRESULT>(0x80004001))
#define E_NOINTERFACE (static_cast<HRESULT>(0x80004002))
#define E_POINTER (static_cast<HRESULT>(0x80004003))
#define E_FAIL (static_cast<HRESULT>(0x80004005))
#define E_UNEXPECTED (static_cast<HRESULT>(0x8000FFFF))
#define E_OUTOFMEMORY (static_cast<HRESULT>(0x8007000E))
#define E_INVALIDARG (static_cast<HRESULT>(0x80070057))
#endif

// Reference-counted object: slot 0 QueryInterface, 1 AddRef, 2 Release. A pointer that a call hands
// out carries a reference for the caller. The protected destructor forbids delete.
struct IUnknown {
  // Returns the interface `iid` with a reference; otherwise nulls *out and gives E_NOINTERFACE.
  virtual HRESULT QueryInterface(const GUID& iid, void** out) = 0;
  virtual uint32_t AddRef() = 0;   // the new count
  virtual uint32_t Release() = 0;  // the new count; 0 means gone

 protected:
  ~IUnknown() = default;
};

inline constexpr GUID GUID_NULL = {0, 0, 0, {0, 0, 0, 0, 0, 0, 0, 0}};
inline constexpr GUID IID_IUnknown = {0, 0, 0, {0xC0, 0, 0, 0, 0, 0, 0, 0x46}};

#pragma once

// Result codes and the root of all interfaces.

#include <cstdint>

#include "zt/fnd/GuidType.h"

// Result of an exported function or interface operation. Negative is failure: test the sign, for 1
// (S_FALSE) is a success. Always 32 bits wide, so that 0x80004005 is negative on every word size.
using HRESULT = int32_t;

//   S_OK            done
//   S_FALSE         done, with less than was asked for: the end of a walk, nothing there
//   E_NOTIMPL       an operation that is kept for its slot only
//   E_NOINTERFACE   the object has no such interface
//   E_POINTER       a required pointer is null
//   E_FAIL          any other failure: the system refuses, the file is damaged, the lock is lost
//   E_UNEXPECTED    a failure that the operation did not foresee
//   E_OUTOFMEMORY   out of memory; nothing was changed, unless documented otherwise
//   E_INVALIDARG    an argument that is out of range, or names nothing
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

// Reference-counted object: slot 0 QueryInterface, 1 AddRef, 2 Release. A pointer that a call
// returns carries a reference for the caller. The protected destructor forbids delete: an object
// ends with its last reference. Threads: as the object's class documents; a count that threads
// share is atomic.
struct IUnknown {
  // S_OK and the interface `iid` with a reference; otherwise nulls *out and gives E_NOINTERFACE.
  // All interfaces of one object answer IID_IUnknown with the same pointer, which is its identity.
  virtual HRESULT QueryInterface(const GUID& iid, void** out) = 0;
  // Both return the new count, which is for debugging: another thread may have changed it since.
  virtual uint32_t AddRef() = 0;
  virtual uint32_t Release() = 0;  // 0: the object is gone

 protected:
  ~IUnknown() = default;
};

// The nil UUID of RFC 4122, section 4.1.7; it names nothing.
inline constexpr GUID GUID_NULL = {0, 0, 0, {0, 0, 0, 0, 0, 0, 0, 0}};
// Identifiers of this first family, IID_IEnumString too, end in the same eight bytes.
inline constexpr GUID IID_IUnknown = {0, 0, 0, {0xC0, 0, 0, 0, 0, 0, 0, 0x46}};

#pragma once

// Interfaces in the manner of COM: slot 0 QueryInterface, 1 AddRef, 2 Release, then the operations
// in the order below. No interface has a virtual destructor; the protected one forbids delete.

#include "source/Common/vltTypes.h"

// Walks the components of one type, from a snapshot of the identifiers. Belongs to one thread.
struct IvltEnumComponent : IUnknown {
  // Fills up to `count` records and adds their number to *fetched, which the caller starts at 0.
  // 0 when all were filled, 1 when the walk ended first; E_INVALIDARG for a count of 0.
  // Each record filled belongs to the caller: vltutilsFreeComponent2.
  virtual HRESULT Next(unsigned int count, _vltComponent2* records, unsigned int* fetched) = 0;
  virtual HRESULT Skip(unsigned int count) = 0;          // E_NOTIMPL
  virtual HRESULT Reset() = 0;                           // back to the first
  virtual HRESULT Clone(IvltEnumComponent** clone) = 0;  // E_NOTIMPL

 protected:
  ~IvltEnumComponent() = default;
};

// Walks texts; each returned text is freed with vltFree. RemoteNext is slot 4.
struct IEnumString : IUnknown {
  virtual HRESULT Next(unsigned int count, wchar_t** strings, unsigned int* fetched) = 0;
  virtual HRESULT RemoteNext(unsigned int count, wchar_t** strings, unsigned int* fetched) = 0;
  virtual HRESULT Skip(unsigned int count) = 0;
  virtual HRESULT Reset() = 0;
  virtual HRESULT Clone(IEnumString** clone) = 0;

 protected:
  ~IEnumString() = default;
};

// The registrar. Returned texts are freed with vltFree.
struct IvltRegistrar : IUnknown {
  virtual HRESULT GetConfigurationPath(wchar_t** path) = 0;
  virtual HRESULT SetConfigurationPath(const wchar_t* path) = 0;
  virtual HRESULT GetSDKPath(wchar_t** path) = 0;
  virtual HRESULT SetSDKPath(const wchar_t* path) = 0;
  virtual HRESULT GetSchemaVersion(unsigned int* version) = 0;
  virtual HRESULT SetSchemaVersion(unsigned int version) = 0;
  // Stores a dictionary or an expert in the database; the component is answered from the next start
  // on.
  virtual HRESULT RegisterComponent(_vltComponent2* component) = 0;
  virtual HRESULT UnregisterComponent(GUID identifier) = 0;
  // Fills *component with a copy that belongs to the caller; E_INVALIDARG for an unknown
  // identifier.
  virtual HRESULT GetComponent(GUID identifier, _vltComponent2* component) = 0;
  virtual HRESULT EnumComponents(_vltComponentType type, IvltEnumComponent** enumerator) = 0;

 protected:
  ~IvltRegistrar() = default;
};

struct IvltRegistrar2 : IvltRegistrar {
  virtual HRESULT GetStorageServerCacheSize(unsigned int* sizeBytes) = 0;
  virtual HRESULT SetStorageServerCacheSize(unsigned int sizeBytes) = 0;
  virtual HRESULT GetStorageClientCacheSize(unsigned int* sizeBytes) = 0;
  virtual HRESULT SetStorageClientCacheSize(unsigned int sizeBytes) = 0;
  virtual HRESULT GetSnapshotPath(wchar_t** path) = 0;
  virtual HRESULT SetSnapshotPath(const wchar_t* path) = 0;

 protected:
  ~IvltRegistrar2() = default;
};

struct IvltPharlapRegistrarEx : IUnknown {
  // Clears fragmentRegistered of every dictionary, on disk and in memory.
  virtual HRESULT ResetDDUpdatedFlags() = 0;

 protected:
  ~IvltPharlapRegistrarEx() = default;
};

struct IvltDynamicRegistrar : IUnknown {
  // Experts of the type that bind to the class; the array is freed with vltFree.
  // VLT_E_NO_COMPONENT if there is none, VLT_E_NO_BINDING_CLASSES for other types than experts.
  virtual HRESULT GetComponentsForBindingClass(_vltComponentType type, GUID bindingClass,
                                               unsigned int* count, GUID** components) = 0;

 protected:
  ~IvltDynamicRegistrar() = default;
};

struct IvltDowngradeRegistrar : IUnknown {
  // Paths of the dictionaries kept in "Data Dictionaries/Last"; array and texts are freed with
  // vltFree. 1 with *count 0 if there are none.
  virtual HRESULT GetPreviousDictionaries(const _vltStartupOptions* options, unsigned int* count,
                                          wchar_t*** paths) = 0;
  virtual HRESULT RemovePreviousDictionaries(const _vltStartupOptions* options) = 0;

 protected:
  ~IvltDowngradeRegistrar() = default;
};

// ---- Interfaces that the storage implements. Its own have further slots in between: these are
// source-compatible only.
struct IvltMetaAttribute : IUnknown {
  virtual HRESULT GetAttributeType(_vltAttributeType* type) = 0;

 protected:
  ~IvltMetaAttribute() = default;
};

struct IvltClass : IUnknown {
  virtual HRESULT GetMetaAttribute(vltAttributeID id, IvltMetaAttribute** out) = 0;

 protected:
  ~IvltClass() = default;
};

struct IvltObject : IUnknown {
  virtual HRESULT GetObjectID(GUID* id) = 0;
  virtual HRESULT GetClass(IvltClass** out) = 0;
  virtual HRESULT SetI32Attribute(vltAttributeID, int32_t) = 0;
  virtual HRESULT SetU32Attribute(vltAttributeID, uint32_t) = 0;
  virtual HRESULT SetF64Attribute(vltAttributeID, double) = 0;
  virtual HRESULT SetGuidAttribute(vltAttributeID, GUID) = 0;
  virtual HRESULT SetStringAttribute(vltAttributeID, const wchar_t*) = 0;
  virtual HRESULT GetI32Attribute(vltAttributeID, int32_t*) = 0;
  virtual HRESULT GetU32Attribute(vltAttributeID, uint32_t*) = 0;
  virtual HRESULT GetF64Attribute(vltAttributeID, double*) = 0;
  virtual HRESULT GetGuidAttribute(vltAttributeID, GUID*) = 0;
  virtual HRESULT GetStringAttribute(vltAttributeID, wchar_t**) = 0;
  virtual HRESULT GetReferenceAttribute(vltAttributeID, IvltObject**) = 0;
  virtual HRESULT GetI32ArrayAttribute(vltAttributeID, uint32_t capacity, int32_t* buffer,
                                       uint32_t* count) = 0;
  virtual HRESULT GetU32ArrayAttribute(vltAttributeID, uint32_t capacity, uint32_t* buffer,
                                       uint32_t* count) = 0;
  virtual HRESULT GetF64ArrayAttribute(vltAttributeID, uint32_t capacity, double* buffer,
                                       uint32_t* count) = 0;
  virtual HRESULT GetGuidArrayAttribute(vltAttributeID, uint32_t capacity, GUID* buffer,
                                        uint32_t* count) = 0;
  virtual HRESULT GetStringArrayAttribute(vltAttributeID, uint32_t capacity, wchar_t** buffer,
                                          uint32_t* count) = 0;
  virtual HRESULT GetReferenceArrayAttribute(vltAttributeID, uint32_t capacity, IvltObject** buffer,
                                             uint32_t* count) = 0;

 protected:
  ~IvltObject() = default;
};

struct IvltOutputStream : IUnknown {
  virtual HRESULT WriteType(_vltAttributeType) = 0;
  virtual HRESULT WriteID(vltAttributeID) = 0;
  virtual HRESULT WriteI32(int32_t) = 0;
  virtual HRESULT WriteU32(uint32_t) = 0;
  virtual HRESULT WriteF64(double) = 0;
  virtual HRESULT WriteGuid(GUID) = 0;
  virtual HRESULT WriteString(const wchar_t*) = 0;

 protected:
  ~IvltOutputStream() = default;
};

struct IvltInputStream : IUnknown {
  virtual HRESULT ReadType(_vltAttributeType*) = 0;
  virtual HRESULT ReadID(vltAttributeID*) = 0;
  virtual HRESULT ReadI32(int32_t*) = 0;
  virtual HRESULT ReadU32(uint32_t*) = 0;
  virtual HRESULT ReadF64(double*) = 0;
  virtual HRESULT ReadGuid(GUID*) = 0;
  virtual HRESULT ReadString(wchar_t**) = 0;

 protected:
  ~IvltInputStream() = default;
};

// ---- Identifiers, as QueryInterface takes them.
inline constexpr GUID IID_IEnumString = {0x101, 0, 0, {0xC0, 0, 0, 0, 0, 0, 0, 0x46}};
inline constexpr GUID IID_IvltRegistrar = {
    0xFCDFD763, 0x1181, 0x11D4, {0xAA, 0x1E, 0x00, 0x50, 0x04, 0xD1, 0x31, 0xEE}};
inline constexpr GUID IID_IvltRegistrar2 = {
    0xCDB47B31, 0xECB3, 0x11D4, {0xAA, 0x6C, 0x00, 0x50, 0x04, 0xD1, 0x31, 0xEE}};
inline constexpr GUID IID_IvltEnumComponent = {
    0xFCDFD764, 0x1181, 0x11D4, {0xAA, 0x1E, 0x00, 0x50, 0x04, 0xD1, 0x31, 0xEE}};
inline constexpr GUID IID_IvltPharlapRegistrarEx = {
    0xC4CF07F4, 0xCB55, 0x434D, {0x89, 0x8C, 0x77, 0xE8, 0x55, 0x21, 0x03, 0x05}};
inline constexpr GUID IID_IvltDynamicRegistrar = {
    0x9F110591, 0x8ECC, 0x499C, {0x84, 0x8C, 0x7F, 0x0D, 0x88, 0x86, 0xA9, 0x4C}};
inline constexpr GUID IID_IvltDowngradeRegistrar = {
    0x906812E8, 0x732C, 0x4273, {0x85, 0xBE, 0x6B, 0xC0, 0xD6, 0xCB, 0x19, 0x5C}};

#pragma once

// Interfaces in the manner of COM: slot 0 QueryInterface, 1 AddRef, 2 Release, then the operations
// in the order below. No interface has a virtual destructor; the protected one forbids delete.
//
// Rules for every operation of this library's objects:
// 1. Results are HRESULTs; the sign says whether it failed (ztcom/ztcore/ztunknown.h).
// 2. A null out-pointer gives E_POINTER, unless documented otherwise. Inputs are checked where that
//    is documented only.
// 3. Text is terminated UTF-32. The caller frees every returned text or array with vltFree and
//    releases every returned interface.
// 4. The registrar may be called from any thread. An enumerator belongs to the thread that has it.

#include "source/Common/vltTypes.h"

// Walks the components of one type, from a snapshot of the identifiers. Belongs to one thread.
// Keeps the registrar alive. A component that was removed since the snapshot is skipped, and so is
// one that memory does not suffice to copy; one that was added is not seen.
struct IvltEnumComponent : IUnknown {
  // Fills up to `count` records side by side, and adds their number to *fetched, which the caller
  // starts at 0. S_OK when all were filled, S_FALSE when the walk ended first; E_INVALIDARG for a
  // count of 0; E_POINTER. Each record filled belongs to the caller: vltutilsFreeComponent2.
  // Records past *fetched own nothing.
  virtual HRESULT Next(unsigned int count, _vltComponent2* records, unsigned int* fetched) = 0;
  virtual HRESULT Skip(unsigned int count) = 0;  // E_NOTIMPL
  // The snapshot stays as it was taken: a reset walk meets the same identifiers. S_OK.
  virtual HRESULT Reset() = 0;                           // back to the first
  virtual HRESULT Clone(IvltEnumComponent** clone) = 0;  // E_NOTIMPL

 protected:
  ~IvltEnumComponent() = default;
};

// Walks the messages of vltCheckComponent; each returned text is freed with vltFree. Belongs to one
// thread, and holds a copy of the messages: no registrar is needed any more.
struct IEnumString : IUnknown {
  // Returns up to `count` texts in `strings`, which is not checked for null. S_OK for all of them,
  // else S_FALSE; *fetched, unless null, is set to the number, unlike that of IvltEnumComponent.
  // Without memory the text is returned by the next call.
  virtual HRESULT Next(unsigned int count, wchar_t** strings, unsigned int* fetched) = 0;
  // Slot 4, kept for the layout: E_NOTIMPL, and the arguments are not used.
  virtual HRESULT RemoteNext(unsigned int count, wchar_t** strings, unsigned int* fetched) = 0;
  // S_OK, also when the skip goes past the last text; the next call then returns none.
  virtual HRESULT Skip(unsigned int count) = 0;
  // Back to the first text. S_OK.
  virtual HRESULT Reset() = 0;
  // S_OK, and *clone is left as it is: there is no copy.
  virtual HRESULT Clone(IEnumString** clone) = 0;

 protected:
  ~IEnumString() = default;
};

// The registrar. Every setting and component that it stores is in one file, the registration
// database (docs/registration-database.md), and on disk when the call returns S_OK.
//
// Changes give E_FAIL, with nothing written, where the database could not be opened or another
// process has its lock now. Questions are answered from memory.
struct IvltRegistrar : IUnknown {
  // Path of the storage's configuration, which the start of a registrar sets to "config3.vlt" in
  // the data directory. Without a setting it is that of the default installation; a setting that is
  // the bare name "config3.vlt" is completed by the data directory. S_OK; E_FAIL, with the text all
  // the same, where there is no data directory; E_OUTOFMEMORY and null.
  virtual HRESULT GetConfigurationPath(wchar_t** path) = 0;
  // Keeps the path; a bare "config3.vlt" is completed first. S_OK without a write where the setting
  // is the same but for case. E_OUTOFMEMORY; E_POINTER for null.
  virtual HRESULT SetConfigurationPath(const wchar_t* path) = 0;
  // Both always give E_FAIL, whatever the argument.
  virtual HRESULT GetSDKPath(wchar_t** path) = 0;
  virtual HRESULT SetSDKPath(const wchar_t* path) = 0;
  // A number for clients to agree on, which the start of a registrar sets to 0; 0 where there is
  // none. S_OK.
  virtual HRESULT GetSchemaVersion(unsigned int* version) = 0;
  // S_OK without a write where the number is the same. E_OUTOFMEMORY.
  virtual HRESULT SetSchemaVersion(unsigned int version) = 0;
  // Stores a dictionary or an expert in the database, in the section of its name, whose other items
  // stay. A component that the registrar knows by its identifier changes at once, another one is
  // answered from the next start on. Of an expert's fileName the directory is dropped: experts have
  // one of their own. `component` is not checked for null.
  //
  // E_FAIL for other types, and for the names of the database's own sections, in any case: "KOR",
  // "KORComponents", "Registration", "VLRContentsSection". A negative result for an empty or null
  // name. Where an expert's binding classes are stored with it the call may throw
  // zt::fnd::exception::OutOfRange: its position among the components of its file has no
  // counterpart among its classes.
  virtual HRESULT RegisterComponent(_vltComponent2* component) = 0;
  // Always E_FAIL: a component goes when its registration file does, at the next start.
  virtual HRESULT UnregisterComponent(GUID identifier) = 0;
  // Fills *component with a copy that belongs to the caller: vltutilsFreeComponent2. A text that
  // memory is out for is null. E_INVALIDARG for an unknown identifier, *component then untouched.
  virtual HRESULT GetComponent(GUID identifier, _vltComponent2* component) = 0;
  // Walks the components of one type, in the order of their identifiers: Data1, Data2, Data3,
  // bytes. A type without components, and a number that is none, give an empty walk. S_OK;
  // E_OUTOFMEMORY.
  virtual HRESULT EnumComponents(_vltComponentType type, IvltEnumComponent** enumerator) = 0;

 protected:
  ~IvltRegistrar() = default;
};

// Settings of the storage besides those of IvltRegistrar. Only the size of the server's cache is
// kept.
struct IvltRegistrar2 : IvltRegistrar {
  // 33554432 where there is no setting, or none that can be read. S_OK.
  virtual HRESULT GetStorageServerCacheSize(unsigned int* sizeBytes) = 0;
  // Any number is kept as it is. S_OK, E_FAIL or E_OUTOFMEMORY.
  virtual HRESULT SetStorageServerCacheSize(unsigned int sizeBytes) = 0;
  // These four always give E_FAIL, whatever the argument.
  virtual HRESULT GetStorageClientCacheSize(unsigned int* sizeBytes) = 0;
  virtual HRESULT SetStorageClientCacheSize(unsigned int sizeBytes) = 0;
  virtual HRESULT GetSnapshotPath(wchar_t** path) = 0;
  virtual HRESULT SetSnapshotPath(const wchar_t* path) = 0;

 protected:
  ~IvltRegistrar2() = default;
};

// QueryInterface of the registrar gives this interface and the next two.
struct IvltPharlapRegistrarEx : IUnknown {
  // Clears fragmentRegistered of every dictionary, on disk and in memory. S_OK, also without a
  // database; E_FAIL; the failure of the save, while the flags in memory are cleared. Where no flag
  // is set nothing is written, and the result is that of the last one read: negative for a
  // dictionary that has none.
  virtual HRESULT ResetDDUpdatedFlags() = 0;

 protected:
  ~IvltPharlapRegistrarEx() = default;
};

struct IvltDynamicRegistrar : IUnknown {
  // Identifiers of the experts of the type that bind to the class, in the order of their entry.
  // *count is their number; the array is freed with vltFree. VLT_E_NO_COMPONENT if there is none,
  // VLT_E_NO_BINDING_CLASSES for other types than experts, E_OUTOFMEMORY after a report to the log:
  // the array is null and *count 0.
  virtual HRESULT GetComponentsForBindingClass(_vltComponentType type, GUID bindingClass,
                                               unsigned int* count, GUID** components) = 0;

 protected:
  ~IvltDynamicRegistrar() = default;
};

// The dictionaries that an installation has kept from the version before it. Both calls make the
// directory where it is missing; E_FAIL where the rights to do so are missing.
struct IvltDowngradeRegistrar : IUnknown {
  // Paths of the bundles ("*.framework") in "Data Dictionaries/Last"; array and texts are freed
  // with vltFree, one by one. `options` is not used. S_OK; S_FALSE with *count 0 and *paths
  // untouched if there are none; E_OUTOFMEMORY, *paths untouched. A null count or paths makes it a
  // call without effect, which is S_OK.
  virtual HRESULT GetPreviousDictionaries(const _vltStartupOptions* options, unsigned int* count,
                                          wchar_t*** paths) = 0;
  // Removes them, and then the database beside them. S_OK; S_FALSE if there are none; E_FAIL where
  // one of the files cannot be removed: the other dictionaries are gone, and the database stays.
  // E_FAIL for options with port configuration, and nothing is removed. Null options are none.
  virtual HRESULT RemovePreviousDictionaries(const _vltStartupOptions* options) = 0;

 protected:
  ~IvltDowngradeRegistrar() = default;
};

// ---- Interfaces that the storage implements. Its own have further slots in between: these are
// source-compatible only.
//
// The library calls them with valid arguments, from the thread of its caller, and without a lock of
// its own. A result passes on to that caller. A success that comes with a null class or meta
// attribute is a broken contract and aborts the process.
//
// The type of an attribute.
struct IvltMetaAttribute : IUnknown {
  virtual HRESULT GetAttributeType(_vltAttributeType* type) = 0;

 protected:
  ~IvltMetaAttribute() = default;
};

// The class of an object: which attributes it has. *out carries a reference for the caller.
struct IvltClass : IUnknown {
  virtual HRESULT GetMetaAttribute(vltAttributeID id, IvltMetaAttribute** out) = 0;

 protected:
  ~IvltClass() = default;
};

// An object of the storage. What it returns belongs to the caller: texts go back with vltFree,
// objects with Release. Of a failed getter of one value nothing is taken, whatever it has written.
struct IvltObject : IUnknown {
  // The result is not read: an object that has no id leaves the null one.
  virtual HRESULT GetObjectID(GUID* id) = 0;
  virtual HRESULT GetClass(IvltClass** out) = 0;
  // The setters copy what they are given. A text may be null.
  virtual HRESULT SetI32Attribute(vltAttributeID, int32_t) = 0;
  virtual HRESULT SetU32Attribute(vltAttributeID, uint32_t) = 0;
  virtual HRESULT SetF64Attribute(vltAttributeID, double) = 0;
  virtual HRESULT SetGuidAttribute(vltAttributeID, GUID) = 0;
  virtual HRESULT SetStringAttribute(vltAttributeID, const wchar_t*) = 0;
  // A text or a reference may come as null with a success.
  virtual HRESULT GetI32Attribute(vltAttributeID, int32_t*) = 0;
  virtual HRESULT GetU32Attribute(vltAttributeID, uint32_t*) = 0;
  virtual HRESULT GetF64Attribute(vltAttributeID, double*) = 0;
  virtual HRESULT GetGuidAttribute(vltAttributeID, GUID*) = 0;
  virtual HRESULT GetStringAttribute(vltAttributeID, wchar_t**) = 0;
  virtual HRESULT GetReferenceAttribute(vltAttributeID, IvltObject**) = 0;
  // The array getters set *count to the number of elements. A capacity of 0 with a null buffer asks
  // for the number only; the library then calls again with a zeroed buffer for that many, and
  // *count may have become smaller. Of the buffer the first *count elements are taken, `capacity`
  // at most, also with a failure. Texts and references among them may be null.
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

// Typed streams, by which queries travel. A value is read back by the operation of the same type;
// the format below is the storage's. WriteString takes null.
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

// A text that is read belongs to the caller: vltFree. It may be null. A failed read returns no
// text.
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

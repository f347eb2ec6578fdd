#pragma once

// The exported surface of libvltutils.
//
// Rules for every function here:
// 1. Results. HRESULTs are negative on failure; test the sign. Functions that return a value have no
//    failure of their own: bad text reads as 0 or as the null GUID.
// 2. Ownership. A text or array that a call hands out comes from vltAlloc and is ended with vltFree.
//    A record's texts are ended with vltutilsFreeComponent2, an interface with Release.
//    `const wchar_t*` results are static and never freed.
// 3. Null. A required null pointer gives E_POINTER and changes nothing, unless told otherwise.
// 4. Text. Wide text is UTF-32 in the host's byte order, narrow text is in the encoding of the
//    process's locale (setlocale); what that encoding lacks becomes "?".
// 5. Exceptions. Nothing is caught at the surface: failures below it that have no result code of
//    their own pass out as zt::fnd::exception::Exception (zt/fnd/Exception.h), as std::bad_alloc or,
//    where a shared file cannot be opened, as the int 1. A call that ends so has released its locks.
// 6. Threads. Every function may be called from every thread, unless told otherwise.
// 7. Waiting. Calls that open a shared file wait, without limit, for other processes that have it.
// 8. Saving. What a call has saved when it returns S_OK survives a kill and a power cut. A call that
//    changes the registration database makes sure that the process still has the database's lock, which
//    a fork, a host that closes all descriptors or a removed lock file takes from it. A lost lock is
//    taken again without waiting; where another process has it the call is E_FAIL and writes nothing.
//    Questions are answered from memory all the same.
// 9. Forks. A forked child may call every function, also one of a process with many threads. It has the
//    parent's registrar, and its lock from the first change on that no other process has it.

#include "source/Common/ZtUtils/General/vlt_vlTracer.h"
#include "source/Common/vltInterfaces.h"
#include "source/Common/vltTypes.h"
#include "zt/fnd/StringFwd.h"

// ---- Memory.

// Block of `size` bytes; null when there is none, or for 0x80000000 bytes and more.
VLT_EXPORT void* vltAlloc(size_t size);
VLT_EXPORT void vltFree(void* p);  // null is ignored
// Frees the texts of a record, not the record; does not null them. Returns 0.
VLT_EXPORT int vltutilsFreeComponent2(_vltComponent2& c);

// ---- Registrar.

// The one registrar of the process, made at the first call: that one scans the installation under
// the "Dir" preference and brings the database "vlt.vlr" up to date, and waits while another
// process has its registrar. Later calls answer at once.
VLT_EXPORT HRESULT vltGetRegistrar(IvltRegistrar** out);
// The same with the database and the install directory named; both are ignored once the registrar
// exists. A null registrationFile makes it vltGetRegistrar.
VLT_EXPORT HRESULT vltGetRegistrar2(const wchar_t* registrationFile, const wchar_t* installDir,
                                    IvltRegistrar** out);
VLT_EXPORT HRESULT vltGetOldRegistrar(void** out);  // nulls *out; E_NOTIMPL
// Tries to load the library of every registered dictionary and traces what does not load, which is
// no failure of the call.
VLT_EXPORT HRESULT vltLoadDataDictionaries();
VLT_EXPORT HRESULT vltLoadDataDictionaries2(IvltRegistrar* registrar);

// Checks the files and entry points of one component, or of all for the null GUID. *errors walks the
// messages and is returned also when the result is a failure, but for E_POINTER, E_OUTOFMEMORY and a
// registrar that cannot be made. Loads the libraries of experts into this process, and unloads them. A
// path that the system does not let it look at is reported as not readable.
VLT_EXPORT HRESULT vltCheckComponent(vltID id, IEnumString** errors);
// vltGetRegistrar for a null storage or the default one; E_FAIL for others. The same function twice.
VLT_EXPORT HRESULT vltGetNamedRegistrar(const wchar_t* storage, IvltRegistrar** out);
VLT_EXPORT HRESULT vltGetNamedRegistrar2(const wchar_t* storage, IvltRegistrar** out);

// ---- Settings and rendezvous. Files below <install>/Data (docs/settings.md, docs/jar.md).

// Each output is optional: a null one is not read. Texts are freed with vltFree. Index 3 has defaults
// for every value; at others a missing one gives E_FAIL, and the rest is still read. A result of an
// unusable sidecar is negative although the values, then defaults, are set.
VLT_EXPORT HRESULT vltGetClientSettings(unsigned index, unsigned remote, unsigned offline,
                                        const wchar_t* name, wchar_t** bootstrapEndpoint,
                                        wchar_t** protocol, wchar_t** endpoint, wchar_t** eventPort,
                                        wchar_t** eventNameAppend);
VLT_EXPORT HRESULT vltGetClientCacheSettings(
    unsigned* objectCacheLimit, unsigned* objectCacheFlushPercentage, unsigned* bufferCacheLimit,
    unsigned* bufferCacheMinimumLimit, unsigned* bufferCacheFlushPercentage,
    unsigned* garbageCollectorInterval, unsigned useName, const wchar_t* name);
VLT_EXPORT HRESULT vltGetServerSettings(
    unsigned index, unsigned* remoteEnabled, wchar_t** bootstrapEndpoint, wchar_t** remoteProtocol,
    wchar_t** remoteEndpoint, wchar_t** remoteEventPort, wchar_t** localProtocol,
    wchar_t** localEndpoint, int* lastServerCookie, wchar_t** eventNameAppend,
    long* maxBackupFrequency, unsigned useName, const wchar_t* name, unsigned* journalingOptions,
    unsigned* validateDBStructure, long* numCheckpoints, unsigned* createCheckpoints);
// Identity of this machine's server, made at the first call with vltCreateGuid; E_FAIL where that fails.
VLT_EXPORT HRESULT vltGetServerIdentity(GUID* out);
VLT_EXPORT HRESULT vltSetServerCookie(int cookie);  // E_FAIL without a data directory
VLT_EXPORT HRESULT vltAddSvrProcessIDToJar(const wchar_t* section, long processID);
// "127.0.0.1:port" of the local server, as it was at the first call; null gives E_FAIL.
VLT_EXPORT HRESULT vltGetLocalConfigurationURL(wchar_t** url);
VLT_EXPORT int vltIsDefaultStorage(const wchar_t* path);  // 1 also for null
// *storage, if wanted: the name of the offline storage that the address tells.
VLT_EXPORT HRESULT vltIsOfflineStorage(const wchar_t* url, unsigned* isOffline, wchar_t** storage);

// ---- Resources and files.

// Text under `key` of the components in the database whose file has the base name of `file`. With a
// separator the texts of all of them, joined; without, the first one's. At most maxLength bytes
// with the terminator. E_FAIL, and *out untouched, when there is none.
VLT_EXPORT HRESULT vltGetStringResource(const char* separator, const wchar_t* file,
                                        const wchar_t* key, char** out, unsigned maxLength);
VLT_EXPORT int vltGetBinaryResource();  // 0
// chmod, to the mode bits given, that does not follow a symbolic link; with `recursive` also of
// what a directory holds, up to the first failure. S_OK or E_FAIL.
VLT_EXPORT HRESULT vltSetFileSecurity(const zt::fnd::String& path, int mode, bool recursive);
// Flags of "vlttrace.txt" in the install directory, read once: (second number << 4) | first.
VLT_EXPORT unsigned vltGetTraceFlags();

// ---- Diagnostics. Beside these the three members of vlt_vlTracer, with mangled names.

// Nonzero if a fault is armed at the point of this name (docs/hook-file.md); the fault may also act on
// the spot: wait, end the process, throw std::bad_alloc, take all memory.
VLT_EXPORT unsigned vltTestHook(const char* name);
// Reads "VLTHooks.ini" of the install directory and arms what it asks for. Never fails.
VLT_EXPORT void vltRefreshHook();

// ---- Text case. In place; 0, or 1 for null or empty. Characters above 255 stay.
VLT_EXPORT int vltStrupr(char* s);
VLT_EXPORT int vltWcsupr(wchar_t* s);

// ---- Scalars and GUIDs as text.
VLT_EXPORT wchar_t* vltU32ToString(unsigned v);
VLT_EXPORT unsigned vltU32FromString(const wchar_t* s);
// Prints a negative number as such in the 32-bit library only; the 64-bit one prints it plus 2^32.
VLT_EXPORT wchar_t* vltI32ToString(int v);
VLT_EXPORT int vltI32FromString(const wchar_t* s);
VLT_EXPORT wchar_t* vltF64ToString(double v);  // 15 significant digits
VLT_EXPORT double vltF64FromString(const wchar_t* s);
VLT_EXPORT const wchar_t* vltBoolToString(int v);    // "True" or "False"
VLT_EXPORT int vltBoolFromString(const wchar_t* s);  // 1 for true, t, yes, y in any case
VLT_EXPORT HRESULT vltCreateGuid(GUID* out);
// Field by field, as unsigned numbers: -1, 0 or 1.
VLT_EXPORT int vltDceGuidCompare(const GUID& a, const GUID& b);
VLT_EXPORT GUID vltGuidFromString(const wchar_t* s);  // with or without braces
VLT_EXPORT wchar_t* vltGuidToString(GUID g);          // {38 characters}; no memory: null or empty
VLT_EXPORT wchar_t* vltGuidToStructString(GUID g);    // a C initialiser

// ---- Type vocabulary.
VLT_EXPORT _vltAttributeStorage vltAttributeStorageFromString(const wchar_t* s);
VLT_EXPORT const wchar_t* vltAttributeStorageToString(_vltAttributeStorage s);
VLT_EXPORT _vltAttributeType vltAttributeTypeFromString(const wchar_t* s);
VLT_EXPORT const wchar_t* vltAttributeTypeToString(_vltAttributeType t);   // "i32_array"
VLT_EXPORT const wchar_t* vltAttributeTypeToString2(_vltAttributeType t);  // "vltI32ArrayType"
VLT_EXPORT _vltClient vltClientFromString(const wchar_t* s);
VLT_EXPORT const wchar_t* vltClientToString(_vltClient c);
VLT_EXPORT const wchar_t* vltAttributeTypeToVltTypeString(_vltAttributeType t);
VLT_EXPORT const wchar_t* vltAttributeTypeToLumTypeString(_vltAttributeType t);
VLT_EXPORT const wchar_t* vltAttributeTypeToLumTypeName(_vltAttributeType t);
VLT_EXPORT const wchar_t* vltAttributeTypeToLumDataTypeString(_vltAttributeType t);
VLT_EXPORT unsigned short vltAttributeTypeToExternalLumDataType(_vltAttributeType t);
VLT_EXPORT unsigned short vltAttributeTypeToInternalLumDataType(_vltAttributeType t);
VLT_EXPORT unsigned vltAttributeIDExternalToInternal(unsigned id);
VLT_EXPORT unsigned vltAttributeIDInternalToExternal(unsigned id);
VLT_EXPORT unsigned vltMakeExternalAttributeID(unsigned id, _vltAttributeType t);
VLT_EXPORT unsigned vltMakeInternalAttributeID(unsigned id, _vltAttributeType t);
VLT_EXPORT int vltIsLumBlob(unsigned tag);                           // 1 for the two blob tags
VLT_EXPORT unsigned vltLumMakeTypedTag(unsigned type, unsigned id);  // low halves, type on top

// ---- Attribute values. The object is the storage's; the attribute's type is asked of its class.

// Text of any attribute: numbers, GUIDs and texts as they are, a reference as the GUID of its object
// (all zeros for none), an array as "{a,b}" without quotes. E_FAIL for blobs and fast references;
// *text is untouched on failure, and may be null on success where memory is out.
VLT_EXPORT HRESULT vltGetAttributeValueAsString(IvltObject* object, unsigned id, wchar_t** text);
// Sets a number, a GUID or a text; E_FAIL for other types.
VLT_EXPORT HRESULT vltSetAttributeValueFromString(IvltObject* object, unsigned id,
                                                  const wchar_t* text);

// ---- Fixed answers.
VLT_EXPORT int vltUseZTRPC();    // 1
VLT_EXPORT int vltStandAlone();  // 1

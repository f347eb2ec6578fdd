#pragma once

// The exported surface of libvltutils.
//
// Rules for every function here:
// 1. Results. HRESULTs are negative on failure; test the sign. Functions that return a value have
//    no failure of their own: bad text reads as 0 or as the null GUID.
// 2. Ownership. A text or array that a call returns comes from vltAlloc; free it with vltFree. Free
//    a record's texts with vltutilsFreeComponent2, an interface with Release. `const wchar_t*`
//    results are static and never freed.
// 3. Null. A required null pointer gives E_POINTER and changes nothing, unless documented
//    otherwise.
// 4. Text. Wide text is UTF-32 in the host's byte order, narrow text is in the encoding of the
//    process's locale (setlocale); what that encoding lacks becomes "?".
// 5. Exceptions. Nothing is caught at the surface: failures below it that have no result code of
//    their own pass out as zt::fnd::exception::Exception (zt/fnd/Exception.h), as std::bad_alloc
//    or, where a shared file cannot be opened, as the int 1. A call that ends so has released its
//    locks.
// 6. Threads. Every function may be called from every thread, unless documented otherwise.
// 7. Waiting. Calls that open a shared file wait, without limit, for other processes that have it.
// 8. Saving. What a call has saved when it returns S_OK survives a kill and a power cut. A call
//    that changes the registration database makes sure that the process still has the database's
//    lock, which a fork, a host that closes all descriptors or a removed lock file takes from it. A
//    lost lock is taken again without waiting; where another process has it the call is E_FAIL and
//    writes nothing. Questions are answered from memory all the same.
// 9. Forks. A forked child may call every function, also one of a process with many threads. It has
//    the parent's registrar, and its lock from the first change on that no other process has it.

#include "source/Common/ZtUtils/General/vlt_vlTracer.h"
#include "source/Common/vltInterfaces.h"
#include "source/Common/vltTypes.h"
#include "zt/fnd/StringFwd.h"

// ---- Memory.

// Block of `size` bytes; null when there is none, or for 0x80000000 bytes and more.
VLT_EXPORT void* vltAlloc(size_t size);
VLT_EXPORT void vltFree(void* p);  // null is ignored
// Frees the texts that a record of its type has, not the record; does not null them. Returns 0.
VLT_EXPORT int vltutilsFreeComponent2(_vltComponent2& c);

// ---- Registrar.

// The one registrar of the process, made at the first call: that one scans the installation under
// the "Dir" preference and brings the database "vlt.vlr" up to date, and waits while another
// process has its registrar. Later calls answer at once.
//
// S_OK and a reference in *out. E_FAIL, *out untouched, where the preference cannot be read.
// E_FAIL, *out null, for a call from inside the creation. E_OUTOFMEMORY, *out null, after a report
// to the log. Throws zt::fnd::exception::InvalidArgument for an empty install directory. What the
// creation throws leaves no registrar, and the next call tries again.
VLT_EXPORT HRESULT vltGetRegistrar(IvltRegistrar** out);
// The same with the database and the install directory named; both are ignored once the registrar
// exists. A null registrationFile makes it vltGetRegistrar. A null installDir is an empty one.
VLT_EXPORT HRESULT vltGetRegistrar2(const wchar_t* registrationFile, const wchar_t* installDir,
                                    IvltRegistrar** out);
VLT_EXPORT HRESULT vltGetOldRegistrar(void** out);  // nulls *out; E_NOTIMPL
// Tries to load the library of every registered dictionary and unloads it again. What does not load
// is traced, and is no failure of the call. S_OK, or the failure of vltGetRegistrar.
VLT_EXPORT HRESULT vltLoadDataDictionaries();
// The same for a registrar of the caller, which stays the caller's. S_OK, E_POINTER, or the failure
// of its EnumComponents.
VLT_EXPORT HRESULT vltLoadDataDictionaries2(IvltRegistrar* registrar);

// Checks the files and entry points of one component, or of all for the null GUID. S_OK where all
// is as it should be; E_FAIL, or the registrar's failure, where anything is not. *errors walks the
// messages and is returned also when the result is a failure, but for E_POINTER, E_OUTOFMEMORY and
// a registrar that cannot be made. Loads the libraries of experts into this process, and unloads
// them. A path that the system does not allow to be examined is reported as not readable.
VLT_EXPORT HRESULT vltCheckComponent(vltID id, IEnumString** errors);
// vltGetRegistrar for a null storage or the default one (vltIsDefaultStorage); for others E_FAIL,
// and *out is untouched. The same function twice.
VLT_EXPORT HRESULT vltGetNamedRegistrar(const wchar_t* storage, IvltRegistrar** out);
VLT_EXPORT HRESULT vltGetNamedRegistrar2(const wchar_t* storage, IvltRegistrar** out);

// ---- Settings and rendezvous. Files below <install>/Data (docs/settings.md, docs/jar.md).

// Rules of the three settings calls. Each output is optional: a null one is not read. Index 3 has
// defaults for every value; at others a missing text gives E_FAIL, its output is untouched, and the
// rest is still read; a missing *eventNameAppend is empty. Without the directory all values are
// missing. An output that memory is out for is untouched, without a failure. A result of an
// unusable sidecar is negative although the values, then defaults, are set. Where the file cannot
// be read at the moment the result is E_FAIL or E_OUTOFMEMORY, and every output is untouched. The
// file is made, empty, where it is missing.

// Where a client reaches a server: one of this machine, or a remote one. With `offline` the file is
// <name>.ini and, unless `remote`, *endpoint is that of the offline storage `name` from the jar:
// then the result is the jar's. Without `remote` *eventPort is untouched.
VLT_EXPORT HRESULT vltGetClientSettings(unsigned index, unsigned remote, unsigned offline,
                                        const wchar_t* name, wchar_t** bootstrapEndpoint,
                                        wchar_t** protocol, wchar_t** endpoint, wchar_t** eventPort,
                                        wchar_t** eventNameAppend);
// Sizes of a client's caches, all with defaults: the result is that of opening the file, which is
// <name>.ini with `useName` and a name.
VLT_EXPORT HRESULT vltGetClientCacheSettings(
    unsigned* objectCacheLimit, unsigned* objectCacheFlushPercentage, unsigned* bufferCacheLimit,
    unsigned* bufferCacheMinimumLimit, unsigned* bufferCacheFlushPercentage,
    unsigned* garbageCollectorInterval, unsigned useName, const wchar_t* name);
// Where and how a server listens, saves and checks. `useName` and `name` as above. Truth values are
// 0 or 1, *numCheckpoints is never negative. *lastServerCookie comes from the jar, where a missing
// one is written as 0; where that fails it is 0 or untouched, and the rest still counts.
VLT_EXPORT HRESULT vltGetServerSettings(
    unsigned index, unsigned* remoteEnabled, wchar_t** bootstrapEndpoint, wchar_t** remoteProtocol,
    wchar_t** remoteEndpoint, wchar_t** remoteEventPort, wchar_t** localProtocol,
    wchar_t** localEndpoint, int* lastServerCookie, wchar_t** eventNameAppend,
    long* maxBackupFrequency, unsigned useName, const wchar_t* name, unsigned* journalingOptions,
    unsigned* validateDBStructure, long* numCheckpoints, unsigned* createCheckpoints);

// Rules of the three jar calls. S_OK: saved, or read. E_FAIL: no install directory, no right to
// make its data directory, or a file that cannot be read at the moment or written. E_OUTOFMEMORY:
// nothing is saved.

// Identity of this machine's server, made at the first call with vltCreateGuid; E_FAIL where that
// fails, and nothing is kept.
VLT_EXPORT HRESULT vltGetServerIdentity(GUID* out);
// Keeps the cookie of the server's last start. E_FAIL without a data directory, which is not made.
VLT_EXPORT HRESULT vltSetServerCookie(int cookie);
// Keeps the id of the server's process in a section of the caller's choice; makes the data
// directory. E_FAIL for a name that no section can have, an empty one for example.
VLT_EXPORT HRESULT vltAddSvrProcessIDToJar(const wchar_t* section, long processID);

// "127.0.0.1:port" of the local server, as it was at the first call, from "kor.ini" of the working
// directory. A null `url` gives E_FAIL. Where the file cannot be used the text has no port: the
// first call fails with it, and later ones are S_OK with the same text. *url is untouched where
// memory is out.
VLT_EXPORT HRESULT vltGetLocalConfigurationURL(wchar_t** url);
// 1 for null, and for a path that ends in "config.vlt" or "config3.vlt" in any case; else 0.
VLT_EXPORT int vltIsDefaultStorage(const wchar_t* path);
// Whether the address is that of an offline storage: *isOffline is 1 or 0, and *storage the
// storage's name, untouched for 0, null where memory is out. Both are optional. Always S_OK.
VLT_EXPORT HRESULT vltIsOfflineStorage(const wchar_t* url, unsigned* isOffline, wchar_t** storage);

// ---- Resources and files.

// Text under `key` of the components in the database whose file has the base name of `file`. With a
// separator the texts of all of them, joined; without, the first one's. At most maxLength bytes
// with the terminator. S_OK; *out is untouched where all texts found are empty. E_FAIL, and *out
// untouched, when there is none, or where memory is out.
VLT_EXPORT HRESULT vltGetStringResource(const char* separator, const wchar_t* file,
                                        const wchar_t* key, char** out, unsigned maxLength);
VLT_EXPORT int vltGetBinaryResource();  // 0: there are none
// Sets the mode bits; with `recursive` also of what a directory holds, up to the first failure. A
// symbolic link is left alone, which is S_OK. E_FAIL where the path names nothing or the system
// refuses.
VLT_EXPORT HRESULT vltSetFileSecurity(const zt::fnd::String& path, int mode, bool recursive);
// Flags of "vlttrace.txt" in the install directory, read once: (second number << 4) | first.
VLT_EXPORT unsigned vltGetTraceFlags();

// ---- Diagnostics. Beside these the three members of vlt_vlTracer, with mangled names.

// Nonzero if a fault is armed at the point of this name (docs/hook-file.md); the fault may also act
// on the spot: wait, end the process, throw std::bad_alloc, take all memory.
VLT_EXPORT unsigned vltTestHook(const char* name);
// Reads "VLTHooks.ini" of the install directory and arms what it asks for. Never fails.
VLT_EXPORT void vltRefreshHook();

// ---- Text case.

// To upper case, in place, by the process's locale. 0, or 1 for null or empty. Characters above 255
// stay.
VLT_EXPORT int vltStrupr(char* s);
VLT_EXPORT int vltWcsupr(wchar_t* s);

// ---- Scalars and GUIDs as text.
//
// ...ToString returns a new text, null where memory is out. ...FromString reads what the text
// begins with, after white space, and ignores the rest; null, or no number, reads as 0.

VLT_EXPORT wchar_t* vltU32ToString(unsigned v);  // decimal
// As wcstoul reads it, cut to 32 bits: "-1" is 4294967295.
VLT_EXPORT unsigned vltU32FromString(const wchar_t* s);
// Prints a negative number as such in the 32-bit library only; the 64-bit one prints it plus 2^32.
VLT_EXPORT wchar_t* vltI32ToString(int v);
// As wcstol reads it, cut to 32 bits: it takes both forms of a negative number on 64 bits.
VLT_EXPORT int vltI32FromString(const wchar_t* s);
VLT_EXPORT wchar_t* vltF64ToString(double v);  // 15 significant digits
// As wcstod reads it, in the process's locale.
VLT_EXPORT double vltF64FromString(const wchar_t* s);
VLT_EXPORT const wchar_t* vltBoolToString(int v);    // "True" for all but 0, else "False"
VLT_EXPORT int vltBoolFromString(const wchar_t* s);  // 1 for true, t, yes, y in any case, else 0

// New GUID from the entry UuidCreate of the library "ZT-RPC", which is loaded at the first call and
// stays. S_OK; E_FAIL where the entry refuses; VLT_E_UUID_LIBRARY and VLT_E_UUID_ENTRY where there
// is no library or no entry, *out then untouched. `out` goes to the entry as it is.
VLT_EXPORT HRESULT vltCreateGuid(GUID* out);
// Field by field, as unsigned numbers: -1, 0 or 1. The order differs from that of the bytes.
VLT_EXPORT int vltDceGuidCompare(const GUID& a, const GUID& b);
// The 38 characters with braces, or the same without; any other text, and null, is the null GUID.
VLT_EXPORT GUID vltGuidFromString(const wchar_t* s);
// {38 characters}, upper case. Null or empty where memory is out.
VLT_EXPORT wchar_t* vltGuidToString(GUID g);
// A C initialiser: {0x1,0x2,0x3,{0x4,...}}. Null where memory is out.
VLT_EXPORT wchar_t* vltGuidToStructString(GUID g);

// ---- Type vocabulary.
//
// Pure functions of their arguments. Names are static texts, never null; a value that is no type,
// storage or client has a name, too. Words are read in any case; null or an unknown word is value
// 0.

VLT_EXPORT _vltAttributeStorage vltAttributeStorageFromString(const wchar_t* s);  // 0 is "dynamic"
// "static" for 1, else "dynamic".
VLT_EXPORT const wchar_t* vltAttributeStorageToString(_vltAttributeStorage s);
// The user's words, with "_" or a blank in "i32_array", "ref" for "reference". No word is read as
// an array of fast references: "fast_reference_array" is vltReferenceArrayType.
VLT_EXPORT _vltAttributeType vltAttributeTypeFromString(const wchar_t* s);
// The user's word, "i32_array", and the enumerator, "vltI32ArrayType"; "unspecified" and
// "vltUnspecifiedType" for no type.
VLT_EXPORT const wchar_t* vltAttributeTypeToString(_vltAttributeType t);
VLT_EXPORT const wchar_t* vltAttributeTypeToString2(_vltAttributeType t);
// The client that a word names, 1 or 2; 0 for any other word (the words: vltVocabulary.cpp).
VLT_EXPORT _vltClient vltClientFromString(const wchar_t* s);
// The name of a client, which vltClientFromString takes back; "Unknown" for other numbers.
VLT_EXPORT const wchar_t* vltClientToString(_vltClient c);
// The type in source code, "i32[]"; "!!! BAD TYPE" for no type.
VLT_EXPORT const wchar_t* vltAttributeTypeToVltTypeString(_vltAttributeType t);
// The type in the database's source code, the name of its tag, and the name of its data type:
// "long", "kLumLongType", "kLumLongDataType". Those of a blob for no type.
VLT_EXPORT const wchar_t* vltAttributeTypeToLumTypeString(_vltAttributeType t);
VLT_EXPORT const wchar_t* vltAttributeTypeToLumTypeName(_vltAttributeType t);
VLT_EXPORT const wchar_t* vltAttributeTypeToLumDataTypeString(_vltAttributeType t);
// The tag of the type in the database, that of a blob (0xE2C0) for no type. The two differ for an
// array of references only, which is 0xEEC0 outside.
VLT_EXPORT unsigned short vltAttributeTypeToExternalLumDataType(_vltAttributeType t);
VLT_EXPORT unsigned short vltAttributeTypeToInternalLumDataType(_vltAttributeType t);
// The id with the tag and array bits of the other side. Only ids of reference arrays differ; every
// other one comes back as it is.
VLT_EXPORT unsigned vltAttributeIDExternalToInternal(unsigned id);
VLT_EXPORT unsigned vltAttributeIDInternalToExternal(unsigned id);
// The id with the array bits of the type in bits 13 to 15; bits that are set there stay set.
VLT_EXPORT unsigned vltMakeExternalAttributeID(unsigned id, _vltAttributeType t);
VLT_EXPORT unsigned vltMakeInternalAttributeID(unsigned id, _vltAttributeType t);
// 1 where the low half is a tag of blobs or text, else 0.
VLT_EXPORT int vltIsLumBlob(unsigned tag);
VLT_EXPORT unsigned vltLumMakeTypedTag(unsigned type, unsigned id);  // low halves, type on top

// ---- Attribute values.
//
// The object is the storage's and stays the caller's; the attribute's type is asked of its class.
// Results are the storage's beside those below. Threads: as the storage allows.

// Text of any attribute: numbers, GUIDs and texts as they are, a reference as the GUID of its
// object (all zeros for none), an array as "{a,b}" without quotes. E_POINTER; E_FAIL for blobs and
// fast references; E_OUTOFMEMORY for the elements of an array. *text is untouched on failure.
VLT_EXPORT HRESULT vltGetAttributeValueAsString(IvltObject* object, unsigned id, wchar_t** text);
// Sets a number, a GUID or a text; what is no number reads as 0, what is no GUID as the null one.
// E_POINTER for a null object; E_FAIL for other types, and nothing is set.
VLT_EXPORT HRESULT vltSetAttributeValueFromString(IvltObject* object, unsigned id,
                                                  const wchar_t* text);

// ---- Fixed answers.
VLT_EXPORT int vltUseZTRPC();    // 1
VLT_EXPORT int vltStandAlone();  // 1

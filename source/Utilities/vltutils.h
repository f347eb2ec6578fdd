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

// Block of `size` bytes, not initialised, aligned as malloc aligns; null when there is none, or for
// 0x80000000 bytes and more on every word size. Never throws.
VLT_EXPORT void* vltAlloc(size_t size);
// Gives back a block of vltAlloc, or one that a call here returned. A block of the host's own
// allocator is not one of these, and the reverse holds too.
VLT_EXPORT void vltFree(void* p);  // null is ignored
// Frees the texts that a record of its type has, not the record, and does not null them: name and
// fileName; of a dictionary prefix, auxString1 and auxString2; of a resource expert pnp. The type
// has to be the one that the call filled in. Returns 0.
VLT_EXPORT int vltutilsFreeComponent2(_vltComponent2& c);

// ---- Registrar.

// The one registrar of the process, made at the first call: that one scans the installation under
// the "Dir" preference and brings the database "vlt.vlr" up to date, and waits while another
// process has its registrar. Later calls answer at once.
//
// S_OK and a reference in *out; Release it. The object lives as long as the process all the same,
// so that its database stays locked. E_FAIL, *out untouched, where the preference cannot be read.
// E_FAIL, *out null, for a call from inside the creation. E_OUTOFMEMORY, *out null, after a report
// to the log. Throws zt::fnd::exception::InvalidArgument for an empty install directory. What the
// creation throws leaves no registrar, and the next call tries again.
VLT_EXPORT HRESULT vltGetRegistrar(IvltRegistrar** out);
// The same with the database and the install directory named; both are ignored once the registrar
// exists. A null registrationFile makes it vltGetRegistrar. A null installDir is an empty one. The
// database's sidecar lies beside it under the extension ".vl5" (docs/sidecar.md).
VLT_EXPORT HRESULT vltGetRegistrar2(const wchar_t* registrationFile, const wchar_t* installDir,
                                    IvltRegistrar** out);
VLT_EXPORT HRESULT vltGetOldRegistrar(void** out);  // nulls *out; E_NOTIMPL
// Tries to load the library of every registered dictionary and unloads it again; their initialisers
// run in this process. What does not load is traced, and is no failure of the call. S_OK, or the
// failure of vltGetRegistrar.
VLT_EXPORT HRESULT vltLoadDataDictionaries();
// The same for a registrar of the caller, which stays the caller's. S_OK, E_POINTER, or the failure
// of its EnumComponents.
VLT_EXPORT HRESULT vltLoadDataDictionaries2(IvltRegistrar* registrar);

// Checks the files and entry points of one component, or of all for the null GUID. S_OK where all
// is as it should be; E_FAIL, or the registrar's failure, where anything is not. *errors walks the
// messages and is returned also when the result is a failure, but for E_POINTER, E_OUTOFMEMORY and
// a registrar that cannot be made. An unknown id is E_INVALIDARG with no message. Release *errors;
// it does not need the registrar.
//
// A message names the kind of component and the path:
//
//   the dictionary "PATH" is registered but does not exist
//   the object expert "PATH" is registered but is not readable
//   failed to load library "PATH" while checking for entry point "NAME"
//   failed to find entry point "NAME" in library "PATH"
//
// Loads the libraries of experts into this process, and unloads them. A path that the system does
// not allow to be examined is reported as not readable.
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
// The defaults at index 3: bootstrap 62602; remote ncacn_ip_tcp, 51700, event port 57616; local
// ncalrpc, 61900.
VLT_EXPORT HRESULT vltGetClientSettings(unsigned index, unsigned remote, unsigned offline,
                                        const wchar_t* name, wchar_t** bootstrapEndpoint,
                                        wchar_t** protocol, wchar_t** endpoint, wchar_t** eventPort,
                                        wchar_t** eventNameAppend);
// Sizes of a client's caches: the result is that of opening the file, which is <name>.ini with
// `useName` and a name. Values are not checked; text that starts with no digit is 0.
//
//   output                       unit      default
//   objectCacheLimit             count     150000
//   objectCacheFlushPercentage   percent   20
//   bufferCacheLimit             bytes     33554432
//   bufferCacheMinimumLimit      bytes     2097152
//   bufferCacheFlushPercentage   percent   20
//   garbageCollectorInterval     ms        20000
VLT_EXPORT HRESULT vltGetClientCacheSettings(
    unsigned* objectCacheLimit, unsigned* objectCacheFlushPercentage, unsigned* bufferCacheLimit,
    unsigned* bufferCacheMinimumLimit, unsigned* bufferCacheFlushPercentage,
    unsigned* garbageCollectorInterval, unsigned useName, const wchar_t* name);
// Where and how a server listens, saves and checks. `useName` and `name` as above; the endpoints
// and protocols are those of vltGetClientSettings, at the same index. *lastServerCookie comes from
// the jar, where a missing one is written as 0; where that fails it is 0 or untouched, and the rest
// still counts.
//
//   output                shape                  default
//   remoteEnabled         0 or 1                 0, at every index
//   maxBackupFrequency    seconds                86400
//   journalingOptions     0 or 1                 1
//   validateDBStructure   0 or 1                 1
//   numCheckpoints        count, never negative  100
//   createCheckpoints     0 or 1                 1
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
// fails, and nothing is kept. E_POINTER for null. Every later call on the machine answers the same,
// by whichever process.
VLT_EXPORT HRESULT vltGetServerIdentity(GUID* out);
// Keeps the cookie of the server's last start, in place of the one before, for vltGetServerSettings
// to return. Any number will do. E_FAIL without a data directory, which is not made.
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

// Text under `key` of the components in the database whose file has the base name of `file`, in any
// case. With a separator the texts of all of them, joined in the order of the database; without,
// the first one's. At most maxLength bytes with the terminator; for 0 there is no text. A null
// `file` or `key` counts as empty; a `file` without a slash matches nothing. The database is that
// of the installation, or of the file's own directory below "/Last/".
//
// S_OK; *out is untouched where all texts found are empty. E_FAIL, and *out untouched, when there
// is none, or where memory is out. E_POINTER for a null `out`.
VLT_EXPORT HRESULT vltGetStringResource(const char* separator, const wchar_t* file,
                                        const wchar_t* key, char** out, unsigned maxLength);
VLT_EXPORT int vltGetBinaryResource();  // 0: there are none
// Sets the mode bits, as chmod(2) takes them; with `recursive` also of what a directory holds, but
// for entries whose name begins with a dot, up to the first failure. A symbolic link is left alone,
// which is S_OK. E_FAIL where the path names nothing or the system refuses. For the library's own
// programs: the text class is not installed, and other programs use chmod(2).
VLT_EXPORT HRESULT vltSetFileSecurity(const zt::fnd::String& path, int mode, bool recursive);
// Flags of "vlttrace.txt" in the install directory, read once: (second number << 4) | first. 0
// without the file. The low two bits of the first number ask for early trace lines on standard
// output: 1 for errors, 2 and 3 for warnings too. Throws std::bad_alloc where the file cannot be
// read at the moment; the next call reads it again.
VLT_EXPORT unsigned vltGetTraceFlags();

// ---- Diagnostics. Beside these the three members of vlt_vlTracer, with mangled names.

// Nonzero if a fault is armed at the point of this name (docs/hook-file.md), which has to match
// exactly; 0 for null. The fault may also act on the spot: wait, end the process, throw
// std::bad_alloc, take all memory.
VLT_EXPORT unsigned vltTestHook(const char* name);
// Reads "VLTHooks.ini" of the install directory and arms what it asks for, in place of the name
// armed before; a fault that was asked for once stays set. Never fails: what cannot be read arms
// nothing.
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
// As wcstoul reads it, cut to 32 bits: "-1" is 4294967295. Too large a number is 4294967295 in the
// 32-bit library and is cut, 4294967296 to 0, in the 64-bit one.
VLT_EXPORT unsigned vltU32FromString(const wchar_t* s);
// Prints a negative number as such in the 32-bit library only; the 64-bit one prints it plus 2^32.
VLT_EXPORT wchar_t* vltI32ToString(int v);
// As wcstol reads it, cut to 32 bits: it takes both forms of a negative number on 64 bits.
VLT_EXPORT int vltI32FromString(const wchar_t* s);
// 15 significant digits with the decimal point of the process's locale, as printf's "%.15g": not
// every value reads back to the bit.
VLT_EXPORT wchar_t* vltF64ToString(double v);
// As wcstod reads it, in the process's locale.
VLT_EXPORT double vltF64FromString(const wchar_t* s);
VLT_EXPORT const wchar_t* vltBoolToString(int v);    // "True" for all but 0, else "False"
VLT_EXPORT int vltBoolFromString(const wchar_t* s);  // 1 for true, t, yes, y in any case, else 0

// New GUID from the entry UuidCreate of the library "ZT-RPC", which is loaded at the first call and
// stays. S_OK; E_FAIL where the entry refuses; VLT_E_UUID_LIBRARY and VLT_E_UUID_ENTRY where there
// is no library or no entry, *out then untouched, and the next call looks again. `out` goes to the
// entry as it is: null is not checked.
VLT_EXPORT HRESULT vltCreateGuid(GUID* out);
// Field by field, as unsigned numbers: -1, 0 or 1. Data1, Data2 and Data3 decide before the bytes
// of Data4. On little-endian hosts that differs from comparing the 16 bytes.
VLT_EXPORT int vltDceGuidCompare(const GUID& a, const GUID& b);
// The 38 characters with braces, or the same without, in either case (RFC 4122, section 3); any
// other text, and null, is the null GUID, which is no error.
VLT_EXPORT GUID vltGuidFromString(const wchar_t* s);
// {38 characters}, upper case. Null or empty where memory is out.
VLT_EXPORT wchar_t* vltGuidToString(GUID g);
// A C initialiser: {0x1,0x2,0x3,{0x4,...}}. A field of zero is "0", without the "0x". Null where
// memory is out.
VLT_EXPORT wchar_t* vltGuidToStructString(GUID g);

// ---- Type vocabulary.
//
// Pure functions of their arguments. Names are static texts, never null; a value that is no type,
// storage or client has a name, too. Words are read in any case; null or an unknown word is value
// 0.

VLT_EXPORT _vltAttributeStorage vltAttributeStorageFromString(const wchar_t* s);  // 0 is "dynamic"
// "static" for 1, else "dynamic".
VLT_EXPORT const wchar_t* vltAttributeStorageToString(_vltAttributeStorage s);
// The user's words:
//
//   i32  u32  f64  guid  blob  string  ref  reference  fast_reference
//   i32_array  u32_array  f64_array  guid_array  string_array  ref_array  reference_array
//
// In an array's word a blank may replace the "_" before "array". No word is read as an array of
// fast references: "fast_reference_array" is vltReferenceArrayType.
VLT_EXPORT _vltAttributeType vltAttributeTypeFromString(const wchar_t* s);
// The user's word, "i32_array", and the enumerator, "vltI32ArrayType"; "unspecified" and
// "vltUnspecifiedType" for no type. vltAttributeTypeFromString takes the former back.
VLT_EXPORT const wchar_t* vltAttributeTypeToString(_vltAttributeType t);
VLT_EXPORT const wchar_t* vltAttributeTypeToString2(_vltAttributeType t);
// The client that a word names, in its short or its long form; 0 for any other word.
VLT_EXPORT _vltClient vltClientFromString(const wchar_t* s);
// The long form for 1 and 2, which vltClientFromString takes back; "Unknown" for other numbers.
VLT_EXPORT const wchar_t* vltClientToString(_vltClient c);
// The type in source code, "i32[]"; "!!! BAD TYPE" for no type.
VLT_EXPORT const wchar_t* vltAttributeTypeToVltTypeString(_vltAttributeType t);
// The type in the database's source code, the name of its tag, and the name of its data type:
// "long", "kLumLongType", "kLumLongDataType". Those of a blob for no type.
VLT_EXPORT const wchar_t* vltAttributeTypeToLumTypeString(_vltAttributeType t);
VLT_EXPORT const wchar_t* vltAttributeTypeToLumTypeName(_vltAttributeType t);
VLT_EXPORT const wchar_t* vltAttributeTypeToLumDataTypeString(_vltAttributeType t);
// The tag of the type in the database. The two differ for an array of references only, which is
// 0xEEC0 outside.
//
//   0x5AC0  i32, fast reference      0x20C0  reference
//   0x58C0  u32                      0xE0C1  GUID
//   0x68C0  f64                      0xE2C0  blob, every array, and no type
//   0xB8C0  string
VLT_EXPORT unsigned short vltAttributeTypeToExternalLumDataType(_vltAttributeType t);
VLT_EXPORT unsigned short vltAttributeTypeToInternalLumDataType(_vltAttributeType t);
// An id has its number in bits 0 to 12, array bits in 13 to 15 and, as a typed tag, a tag in 16 to
// 31.
//
// These two give the id with the tag and array bits of the other side. Only ids of reference arrays
// differ, and they come back as they were after both: 0xEEC00005 is 0xE2C0C005 inside. Every other
// id is returned unchanged.
VLT_EXPORT unsigned vltAttributeIDExternalToInternal(unsigned id);
VLT_EXPORT unsigned vltAttributeIDInternalToExternal(unsigned id);
// The id with the array bits of the type in bits 13 to 15; bits that are set there stay set. In the
// order 1 to 6: arrays of i32, u32, f64, string, GUID and, inside only, references. 0 for other
// types.
VLT_EXPORT unsigned vltMakeExternalAttributeID(unsigned id, _vltAttributeType t);
VLT_EXPORT unsigned vltMakeInternalAttributeID(unsigned id, _vltAttributeType t);
// 1 where the low half is a tag of blobs or text, 0xE2C0 or 0xB8C0, else 0.
VLT_EXPORT int vltIsLumBlob(unsigned tag);
VLT_EXPORT unsigned vltLumMakeTypedTag(unsigned type, unsigned id);  // low halves, type on top

// ---- Attribute values.
//
// The object is the storage's and stays the caller's; the attribute's type is asked of its class.
// Results are the storage's beside those below. Threads: as the storage allows.

// Text of any attribute: numbers and GUIDs by the conversions above, texts as they are, a reference
// as the GUID of its object (all zeros for none), an array as "{a,b}" without quotes, a null
// reference in it as "NULL". E_POINTER for a null object or `text`; E_FAIL for blobs and fast
// references; E_OUTOFMEMORY for the elements of an array. *text is untouched on failure. It may be
// null with a success: the value is a null text, or memory is out.
VLT_EXPORT HRESULT vltGetAttributeValueAsString(IvltObject* object, unsigned id, wchar_t** text);
// Sets a number, a GUID or a text; what is no number reads as 0, what is no GUID as the null one. A
// null text is passed on to the storage for an attribute of texts, and reads as above for others.
// E_POINTER for a null object; E_FAIL for other types, and nothing is set.
VLT_EXPORT HRESULT vltSetAttributeValueFromString(IvltObject* object, unsigned id,
                                                  const wchar_t* text);

// ---- Fixed answers, kept for callers of earlier releases.
VLT_EXPORT int vltUseZTRPC();    // 1
VLT_EXPORT int vltStandAlone();  // 1

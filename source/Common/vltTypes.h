#pragma once

// Plain types that cross the library's surface: result codes, GUIDs, enumerations and the four
// generations of the component record. Layouts are fixed on both word sizes.

#include <cstddef>
#include <cstdint>

#include "zt/fnd/GuidType.h"
#include "ztcom/ztcore/ztunknown.h"

#define VLT_EXPORT extern "C" __attribute__((visibility("default")))

// vltCreateGuid: the library "ZT-RPC" did not load, or has no entry UuidCreate.
#define VLT_E_UUID_LIBRARY (static_cast<HRESULT>(0x80040325))
#define VLT_E_UUID_ENTRY (static_cast<HRESULT>(0x80040326))
// GetComponentsForBindingClass: no component serves the class; the component type has no binding
// classes.
#define VLT_E_NO_COMPONENT (static_cast<HRESULT>(0x80040301))
#define VLT_E_NO_BINDING_CLASSES (static_cast<HRESULT>(0x80040306))

// Attribute number in bits 0 to 12, array bits in 13 to 15 and, as a typed tag, the database's type
// tag in 16 to 31; vltMakeExternalAttributeID and its kin compose and convert it.
using vltAttributeID = uint32_t;

// Identifier of a component or of an object of the storage. The null one is none, or all, as the
// call documents.
using vltID = _GUID;

// Type of an attribute's value. The underlying types of the enumerations are fixed, so that any
// 32-bit value may be passed; one that is not listed is treated as vltUnspecifiedType.
//
//   I32, U32, F64    int32_t, uint32_t, double
//   String           terminated wide text, or null
//   Reference        an IvltObject with a reference, or null
//   Guid             GUID by value
//   Blob             bytes, which this library neither reads nor writes
//   ...Array         elements of the same shapes; there is no array of blobs
//   FastReference    a reference that the database keeps as a plain number; not read here
enum _vltAttributeType : int32_t {
  vltUnspecifiedType,
  vltI32Type,
  vltU32Type,
  vltF64Type,
  vltStringType,
  vltReferenceType,
  vltGuidType,
  vltBlobType,
  vltI32ArrayType,
  vltU32ArrayType,
  vltF64ArrayType,
  vltStringArrayType,
  vltReferenceArrayType,
  vltGuidArrayType,
  vltFastReferenceType
};
// How the storage keeps an attribute: 0 dynamic, 1 static. Any other value counts as dynamic.
enum _vltAttributeStorage : int32_t {};
// Kind of client, 0 to 2; vltClientToString has their names. Any other value counts as unknown.
enum _vltClient : int32_t {};
// Kind of a component, which selects the variant of its record. RegisterComponent stores
// dictionaries and the two experts only. UI providers and type 7 have the variant of object
// experts. 1 and 3 are not used.
enum _vltComponentType : int32_t {
  vltComponentNone = 0,
  vltComponentDataDictionary = 2,
  vltComponentObjectExpert = 4,
  vltComponentResourceExpert = 5,
  vltComponentUIProvider = 6,
  vltComponentType7 = 7
};

// Defined by the storage. This library reads one bit: the top bit of the byte after the first
// 32-bit member, set when port configuration options are given.
struct _vltStartupOptions;

// What a component record holds beyond the common fields, selected by its type.
// A data dictionary. The items in quotes are those of its section in the registration database; the
// two aux texts have none there, and are carried from record to record without a meaning to this
// library.
struct vltDictVariant {
  // "SchemaVersion", as the dictionary's registration file gives it; 0 where the database has none.
  uint32_t schemaVersion;
  wchar_t* auxString1;
  // "Prefix"; "vl" for the built-in dictionary. The component check takes it for a path.
  wchar_t* prefix;
  // Nonzero: merged from a registration file since IvltPharlapRegistrarEx::ResetDDUpdatedFlags.
  uint32_t fragmentRegistered;  // "FragmentRegistered"
  wchar_t* auxString2;
  // "LastInstalledSchemaVersion", which clients write and read; 0xFFFFFFFF: the database has no
  // value.
  uint32_t lastInstalledSchemaVersion;
};
// The same as generation 2.1 had it: without the last field.
struct vltDictVariant21 {
  uint32_t schemaVersion;
  wchar_t* auxString1;
  wchar_t* prefix;
  uint32_t fragmentRegistered;
  wchar_t* auxString2;
};
// An object expert, a UI provider or a component of type 7. Carried from record to record, without
// a meaning to this library.
struct vltExpertVariant {
  int32_t expertWord0, expertWord1;
};
// A resource expert: the item "PnP" of its section. A terminated text, or null.
struct vltResourceVariant {
  wchar_t* pnp;
};

// Component record of today. Each text is terminated, may be null, and is a block of its own; a
// record that a call fills belongs to the caller, who frees its texts with vltutilsFreeComponent2.
// A record that the caller passes in is only read.
//
//   size         sizeof(_vltComponent2); 120, or 76 on 32 bits, in records that a registrar returns
//   version      2 dictionary, 3 expert, 0xFFFFFFFF not set
//   name         section of the component in the database
//   identifier   key of the component; one record at a time has it
//   fileName     path of the component's bundle or library
//   opaque...    carried, zero in every record that this library builds
struct _vltComponent2 {
  uint32_t size, version;
  _vltComponentType type;
  wchar_t* name;
  GUID identifier;
  wchar_t* fileName;
  unsigned char opaqueQuad[8];  // bytes: as a 64-bit number it would be aligned to 8
  int32_t opaqueWord;
  union {
    vltDictVariant dictionary;
    vltExpertVariant expert;
    vltResourceVariant resource;
  };
};

// First generation: without size and version. A copy of it as a _vltComponent2 has version 3.
struct _vltComponent {
  _vltComponentType type;
  wchar_t* name;
  GUID identifier;
  wchar_t* fileName;
  unsigned char opaqueQuad[8];
  int32_t opaqueWord;
  union {
    vltDictVariant dictionary;
    vltExpertVariant expert;
    vltResourceVariant resource;
  };
};

// Generation 2.1: without the opaque fields; a dictionary ends after auxString2.
struct _vltComponent2point1 {
  _vltComponentType type;
  wchar_t* name;
  GUID identifier;
  wchar_t* fileName;
  union {
    vltDictVariant21 dictionary;
    vltExpertVariant expert;
    vltResourceVariant resource;
  };
};

// Generation 2.2: 2.1 with the whole dictionary variant.
struct _vltComponent2point2 {
  _vltComponentType type;
  wchar_t* name;
  GUID identifier;
  wchar_t* fileName;
  union {
    vltDictVariant dictionary;
    vltExpertVariant expert;
    vltResourceVariant resource;
  };
};

static_assert(sizeof(wchar_t) == 4);
// The size is part of the stream format: a reader compares the stamp with its own.
static_assert(sizeof(_vltComponent2) == (sizeof(void*) == 8 ? 112 : 72), "record size stamp");

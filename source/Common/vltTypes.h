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

// Attribute number, with array bits and a database type tag above it where documented.
using vltAttributeID = uint32_t;

using vltID = _GUID;

// The underlying types are fixed, so that any 32-bit value may be passed.
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
enum _vltAttributeStorage : int32_t {};  // 0 dynamic, 1 static
enum _vltClient : int32_t {};            // 0 to 2; vltClientToString has their texts
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
struct vltDictVariant {
  uint32_t schemaVersion;
  wchar_t* auxString1;
  wchar_t* prefix;
  uint32_t fragmentRegistered;  // nonzero: merged since the flags were last reset
  wchar_t* auxString2;
  uint32_t lastInstalledSchemaVersion;  // 0xFFFFFFFF: the database has no value
};
struct vltDictVariant21 {
  uint32_t schemaVersion;
  wchar_t* auxString1;
  wchar_t* prefix;
  uint32_t fragmentRegistered;
  wchar_t* auxString2;
};
struct vltExpertVariant {
  int32_t expertWord0, expertWord1;
};
struct vltResourceVariant {
  wchar_t* pnp;
};

// Component record of today. Each text is a block of its own; a record that a call fills belongs to
// the caller, who ends it with vltutilsFreeComponent2.
struct _vltComponent2 {
  uint32_t size, version;
  _vltComponentType type;
  wchar_t* name;
  GUID identifier;
  wchar_t* fileName;
  unsigned char opaqueQuad[8];  // bytes, so that no compiler aligns them to 8
  int32_t opaqueWord;
  union {
    vltDictVariant dictionary;
    vltExpertVariant expert;
    vltResourceVariant resource;
  };
};

// First generation: without size and version.
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
static_assert(sizeof(_vltComponent2) == (sizeof(void*) == 8 ? 112 : 72), "record size stamp");

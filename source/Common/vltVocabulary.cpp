// The names of types are data: one table has every dialect's name of a type, its tag and its bits,
// and the functions below are look-ups in it. Words that users may write are a second table, since
// several of them name one type.
#include <array>

#include "source/Common/vltcmn.h"
#include "zt/fnd/osdep/StringCompare.h"

namespace {

using zt::fnd::osdep::StringCaseCompare;

// One row a type: its names in every dialect, and the bits that mark it in an attribute id.
struct TypeRow {
  const wchar_t* userText;
  const wchar_t* enumerator;
  const wchar_t* source;
  const wchar_t* lumType;
  const wchar_t* lumTypeName;
  const wchar_t* lumDataType;
  unsigned short tag;
  unsigned char internalArrayBits, externalArrayBits;
};

constexpr unsigned short kLumLong = 0x5AC0;
constexpr unsigned short kLumULong = 0x58C0;
constexpr unsigned short kLumDouble = 0x68C0;
constexpr unsigned short kLumUnicode = 0xB8C0;
constexpr unsigned short kLumSwizzler = 0x20C0;
constexpr unsigned short kLumGuid = 0xE0C1;
constexpr unsigned short kLumBlob = 0xE2C0;
constexpr unsigned short kLumExternalReferences = 0xEEC0;

constexpr TypeRow BlobRow(const wchar_t* userText, const wchar_t* enumerator, const wchar_t* source,
                          unsigned char internalBits, unsigned char externalBits) {
  return {userText, enumerator,   source,      L"ELumBlob", L"kLumBlobType", L"kLumBlobDataType",
          kLumBlob, internalBits, externalBits};
}

// Indexed by _vltAttributeType; row 0 serves everything out of range. The array bits follow
// the order in which the database learned the types, not the order of the enumerators.
constexpr std::array<TypeRow, 15> kTypes = {{
    BlobRow(L"unspecified", L"vltUnspecifiedType", L"!!! BAD TYPE", 0, 0),
    {L"i32", L"vltI32Type", L"i32", L"long", L"kLumLongType", L"kLumLongDataType", kLumLong, 0, 0},
    {L"u32", L"vltU32Type", L"u32", L"unsigned long", L"kLumULongType", L"kLumULongDataType",
     kLumULong, 0, 0},
    {L"f64", L"vltF64Type", L"f64", L"double", L"kLumDoubleType", L"kLumDoubleDataType", kLumDouble,
     0, 0},
    {L"string", L"vltStringType", L"wstring", L"ELumUnicode", L"kLumBlobUnicodeType",
     L"kLumBlobUnicodeDataType", kLumUnicode, 0, 0},
    {L"reference", L"vltReferenceType", L"IvltObject*", L"TLumIDSwizzler<CLumPersist>",
     L"kLumIDSwizzlerType", L"kLumIDSwizzlerDataType", kLumSwizzler, 0, 0},
    {L"guid", L"vltGuidType", L"GUID", L"ELumGuid", L"kLumGuidType", L"kLumGuidDataType", kLumGuid,
     0, 0},
    BlobRow(L"blob", L"vltBlobType", L"IvltBlob*", 0, 0),
    BlobRow(L"i32_array", L"vltI32ArrayType", L"i32[]", 1, 1),
    BlobRow(L"u32_array", L"vltU32ArrayType", L"u32[]", 2, 2),
    BlobRow(L"f64_array", L"vltF64ArrayType", L"f64[]", 3, 3),
    BlobRow(L"string_array", L"vltStringArrayType", L"wstring[]", 4, 4),
    BlobRow(L"reference_array", L"vltReferenceArrayType", L"IvltObject*[]", 6, 0),
    BlobRow(L"guid_array", L"vltGuidArrayType", L"GUID[]", 5, 5),
    // A reference in the source dialect, a plain number in the database.
    {L"fast_reference", L"vltFastReferenceType", L"IvltObject*", L"long", L"kLumLongType",
     L"kLumLongDataType", kLumLong, 0, 0},
}};

const TypeRow& Row(_vltAttributeType t) {
  auto index = static_cast<uint32_t>(t);
  return kTypes[index < kTypes.size() ? index : 0];
}

// Words are compared in any case; no two of one table are equal, so that their order means nothing.
struct Word {
  const wchar_t* text;
  int32_t value;
};

constexpr Word kTypeWords[] = {
    {L"i32", vltI32Type},
    {L"u32", vltU32Type},
    {L"f64", vltF64Type},
    {L"guid", vltGuidType},
    {L"blob", vltBlobType},
    {L"string", vltStringType},
    {L"ref", vltReferenceType},
    {L"reference", vltReferenceType},
    {L"fast_reference", vltFastReferenceType},
    {L"i32_array", vltI32ArrayType},
    {L"i32 array", vltI32ArrayType},
    {L"u32_array", vltU32ArrayType},
    {L"u32 array", vltU32ArrayType},
    {L"f64_array", vltF64ArrayType},
    {L"f64 array", vltF64ArrayType},
    {L"guid_array", vltGuidArrayType},
    {L"guid array", vltGuidArrayType},
    {L"string_array", vltStringArrayType},
    {L"string array", vltStringArrayType},
    {L"ref_array", vltReferenceArrayType},
    {L"ref array", vltReferenceArrayType},
    // There is no array of fast references: both spellings read as plain ones.
    {L"fast_reference_array", vltReferenceArrayType},
    {L"fast reference array", vltReferenceArrayType},
    {L"reference_array", vltReferenceArrayType},
    {L"reference array", vltReferenceArrayType},
};
constexpr Word kStorageWords[] = {{L"dynamic", 0}, {L"static", 1}};
constexpr Word kClientWords[] = {
    {L"kor", 1}, {L"programmatic", 1}, {L"spec", 2}, {L"specification", 2}};

// Value of the first word that equals the text in any case; 0 for none.
template <size_t N>
int32_t Find(const Word (&words)[N], const wchar_t* s) {
  for (const Word& word : words) {
    // A null text compares as an empty one, which is no word.
    if (StringCaseCompare(s, word.text) == 0) return word.value;
  }
  return 0;
}

// An id: number in bits 0 to 12, array bits in 13 to 15, type tag above.
constexpr unsigned kNumberMask = 0x1FFF;
constexpr unsigned kArrayBitsMask = 0xE000;
constexpr unsigned kArrayBitsShift = 13;
constexpr unsigned kReferenceArrayBits = 6u << kArrayBitsShift;

}  // namespace

const wchar_t* vltAttributeTypeToString3(_vltAttributeType t) { return Row(t).userText; }
const wchar_t* vltAttributeTypeToString4(_vltAttributeType t) { return Row(t).enumerator; }
const wchar_t* vltAttributeTypeToVltTypeString2(_vltAttributeType t) { return Row(t).source; }
const wchar_t* vltAttributeTypeToLumTypeString2(_vltAttributeType t) { return Row(t).lumType; }
const wchar_t* vltAttributeTypeToLumTypeName2(_vltAttributeType t) { return Row(t).lumTypeName; }
const wchar_t* vltAttributeTypeToLumDataTypeString2(_vltAttributeType t) {
  return Row(t).lumDataType;
}

const wchar_t* vltAttributeStorageToString2(_vltAttributeStorage s) {
  return static_cast<int32_t>(s) == 1 ? L"static" : L"dynamic";
}

const wchar_t* vltClientToString2(_vltClient c) {
  switch (static_cast<int32_t>(c)) {
    case 1:
      return L"Programmatic";
    case 2:
      return L"Specification";
    default:
      return L"Unknown";
  }
}

_vltAttributeType vltAttributeTypeFromString2(const wchar_t* s) {
  return static_cast<_vltAttributeType>(Find(kTypeWords, s));
}

_vltAttributeStorage vltAttributeStorageFromString2(const wchar_t* s) {
  return static_cast<_vltAttributeStorage>(Find(kStorageWords, s));
}

_vltClient vltClientFromString2(const wchar_t* s) {
  return static_cast<_vltClient>(Find(kClientWords, s));
}

unsigned vltLumMakeTypedTag2(unsigned short type, unsigned short id) {
  return static_cast<unsigned>(type) << 16 | id;
}

int vltIsLumBlob2(unsigned short tag) { return tag == kLumBlob || tag == kLumUnicode ? 1 : 0; }

unsigned short vltAttributeTypeToInternalLumDataType2(_vltAttributeType t) { return Row(t).tag; }

unsigned short vltAttributeTypeToExternalLumDataType2(_vltAttributeType t) {
  // The one type that has another tag outside.
  return t == vltReferenceArrayType ? kLumExternalReferences : Row(t).tag;
}

unsigned vltInternalBlobArrayTypeToBits2(_vltAttributeType t) { return Row(t).internalArrayBits; }
unsigned vltExternalBlobArrayTypeToBits2(_vltAttributeType t) { return Row(t).externalArrayBits; }

unsigned vltMakeInternalAttributeID2(unsigned id, _vltAttributeType t) {
  // Three bits; an id that has some of them set already keeps them.
  return id | (vltInternalBlobArrayTypeToBits2(t) & 7) << kArrayBitsShift;
}

unsigned vltMakeExternalAttributeID2(unsigned id, _vltAttributeType t) {
  return id | (vltExternalBlobArrayTypeToBits2(t) & 7) << kArrayBitsShift;
}

unsigned vltAttributeIDExternalToInternal2(unsigned id) {
  // Only a typed tag of references differs between the sides; ids without a tag have 0 there.
  if (id >> 16 != kLumExternalReferences) return id;
  unsigned low = vltMakeInternalAttributeID2(id & kNumberMask, vltReferenceArrayType);
  return vltLumMakeTypedTag2(kLumBlob, static_cast<unsigned short>(low));
}

unsigned vltAttributeIDInternalToExternal2(unsigned id) {
  if (id >> 16 != kLumBlob || (id & kArrayBitsMask) != kReferenceArrayBits) return id;
  return vltLumMakeTypedTag2(kLumExternalReferences, static_cast<unsigned short>(id & kNumberMask));
}

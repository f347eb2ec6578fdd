#include <gtest/gtest.h>

#include <utility>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"

namespace {

_vltAttributeType Type(int value) { return static_cast<_vltAttributeType>(value); }

struct Names {
  int type;
  const wchar_t *user, *enumerator, *source, *lumType, *lumName, *lumData;
};

const Names kNames[] = {
    {0, L"unspecified", L"vltUnspecifiedType", L"!!! BAD TYPE", L"ELumBlob", L"kLumBlobType",
     L"kLumBlobDataType"},
    {1, L"i32", L"vltI32Type", L"i32", L"long", L"kLumLongType", L"kLumLongDataType"},
    {2, L"u32", L"vltU32Type", L"u32", L"unsigned long", L"kLumULongType", L"kLumULongDataType"},
    {3, L"f64", L"vltF64Type", L"f64", L"double", L"kLumDoubleType", L"kLumDoubleDataType"},
    {4, L"string", L"vltStringType", L"wstring", L"ELumUnicode", L"kLumBlobUnicodeType",
     L"kLumBlobUnicodeDataType"},
    {5, L"reference", L"vltReferenceType", L"IvltObject*", L"TLumIDSwizzler<CLumPersist>",
     L"kLumIDSwizzlerType", L"kLumIDSwizzlerDataType"},
    {6, L"guid", L"vltGuidType", L"GUID", L"ELumGuid", L"kLumGuidType", L"kLumGuidDataType"},
    {7, L"blob", L"vltBlobType", L"IvltBlob*", L"ELumBlob", L"kLumBlobType", L"kLumBlobDataType"},
    {8, L"i32_array", L"vltI32ArrayType", L"i32[]", L"ELumBlob", L"kLumBlobType",
     L"kLumBlobDataType"},
    {9, L"u32_array", L"vltU32ArrayType", L"u32[]", L"ELumBlob", L"kLumBlobType",
     L"kLumBlobDataType"},
    {10, L"f64_array", L"vltF64ArrayType", L"f64[]", L"ELumBlob", L"kLumBlobType",
     L"kLumBlobDataType"},
    {11, L"string_array", L"vltStringArrayType", L"wstring[]", L"ELumBlob", L"kLumBlobType",
     L"kLumBlobDataType"},
    {12, L"reference_array", L"vltReferenceArrayType", L"IvltObject*[]", L"ELumBlob",
     L"kLumBlobType", L"kLumBlobDataType"},
    {13, L"guid_array", L"vltGuidArrayType", L"GUID[]", L"ELumBlob", L"kLumBlobType",
     L"kLumBlobDataType"},
    {14, L"fast_reference", L"vltFastReferenceType", L"IvltObject*", L"long", L"kLumLongType",
     L"kLumLongDataType"},
    {15, L"unspecified", L"vltUnspecifiedType", L"!!! BAD TYPE", L"ELumBlob", L"kLumBlobType",
     L"kLumBlobDataType"},
    {99, L"unspecified", L"vltUnspecifiedType", L"!!! BAD TYPE", L"ELumBlob", L"kLumBlobType",
     L"kLumBlobDataType"},
    {-1, L"unspecified", L"vltUnspecifiedType", L"!!! BAD TYPE", L"ELumBlob", L"kLumBlobType",
     L"kLumBlobDataType"},
    {INT32_MIN, L"unspecified", L"vltUnspecifiedType", L"!!! BAD TYPE", L"ELumBlob",
     L"kLumBlobType", L"kLumBlobDataType"},
};

TEST(vltVocabulary, EveryTypeHasItsNameInEveryDialect) {
  for (const Names& row : kNames) {
    _vltAttributeType t = Type(row.type);
    EXPECT_STREQ(vltAttributeTypeToString(t), row.user) << row.type;
    EXPECT_STREQ(vltAttributeTypeToString2(t), row.enumerator) << row.type;
    EXPECT_STREQ(vltAttributeTypeToVltTypeString(t), row.source) << row.type;
    EXPECT_STREQ(vltAttributeTypeToLumTypeString(t), row.lumType) << row.type;
    EXPECT_STREQ(vltAttributeTypeToLumTypeName(t), row.lumName) << row.type;
    EXPECT_STREQ(vltAttributeTypeToLumDataTypeString(t), row.lumData) << row.type;
  }
}

TEST(vltVocabulary, TypeTextsAreReadInAnyCase) {
  const std::pair<const wchar_t*, int> rows[] = {{L"i32", 1},
                                                 {L"U32", 2},
                                                 {L"f64", 3},
                                                 {L"Guid", 6},
                                                 {L"blob", 7},
                                                 {L"STRING", 4},
                                                 {L"ref", 5},
                                                 {L"reference", 5},
                                                 {L"fast_reference", 14},
                                                 {L"i32_array", 8},
                                                 {L"i32 array", 8},
                                                 {L"u32_array", 9},
                                                 {L"u32 array", 9},
                                                 {L"f64_array", 10},
                                                 {L"f64 array", 10},
                                                 {L"guid_array", 13},
                                                 {L"guid array", 13},
                                                 {L"string_array", 11},
                                                 {L"string array", 11},
                                                 {L"ref_array", 12},
                                                 {L"ref array", 12},
                                                 {L"fast_reference_array", 12},
                                                 {L"FAST REFERENCE ARRAY", 12},
                                                 {L"reference_array", 12},
                                                 {L"reference array", 12},
                                                 {L"fast reference", 0},
                                                 {L"unspecified", 0},
                                                 {L"", 0},
                                                 {L" i32", 0},
                                                 {nullptr, 0}};
  for (const auto& [text, value] : rows) {
    EXPECT_EQ(vltAttributeTypeFromString(text), Type(value)) << (text ? text : L"null");
  }
}

TEST(vltVocabulary, EveryUserTextReadsBackAsItsTypeButUnspecified) {
  for (int type = 1; type <= 14; ++type) {
    EXPECT_EQ(vltAttributeTypeFromString(vltAttributeTypeToString(Type(type))), Type(type));
  }
}

TEST(vltVocabulary, AliasesDoNotComeBack) {
  EXPECT_STREQ(vltAttributeTypeToString(vltAttributeTypeFromString(L"ref")), L"reference");
}

TEST(vltVocabulary, StorageAndClientWords) {
  EXPECT_EQ(static_cast<int>(vltAttributeStorageFromString(L"STATIC")), 1);
  EXPECT_EQ(static_cast<int>(vltAttributeStorageFromString(L"dynamic")), 0);
  EXPECT_EQ(static_cast<int>(vltAttributeStorageFromString(L"unknown word")), 0);
  EXPECT_STREQ(vltAttributeStorageToString(static_cast<_vltAttributeStorage>(1)), L"static");
  EXPECT_STREQ(vltAttributeStorageToString(static_cast<_vltAttributeStorage>(0)), L"dynamic");
  EXPECT_STREQ(vltAttributeStorageToString(static_cast<_vltAttributeStorage>(-5)), L"dynamic");
  const std::pair<const wchar_t*, int> clients[] = {{L"KOR", 1},  {L"programmatic", 1},
                                                    {L"spec", 2}, {L"Specification", 2},
                                                    {L"kors", 0}, {nullptr, 0}};
  for (const auto& [text, value] : clients) {
    EXPECT_EQ(static_cast<int>(vltClientFromString(text)), value);
  }
  EXPECT_STREQ(vltClientToString(static_cast<_vltClient>(0)), L"Unknown");
  EXPECT_STREQ(vltClientToString(static_cast<_vltClient>(1)), L"Programmatic");
  EXPECT_STREQ(vltClientToString(static_cast<_vltClient>(2)), L"Specification");
  EXPECT_STREQ(vltClientToString(static_cast<_vltClient>(3)), L"Unknown");
}

TEST(vltVocabulary, TagsAndArrayBits) {
  struct Row {
    int type;
    unsigned internalTag, externalTag, internalBits, externalBits;
  };
  const Row rows[] = {
      {0, 0xE2C0, 0xE2C0, 0, 0},  {1, 0x5AC0, 0x5AC0, 0, 0},  {2, 0x58C0, 0x58C0, 0, 0},
      {3, 0x68C0, 0x68C0, 0, 0},  {4, 0xB8C0, 0xB8C0, 0, 0},  {5, 0x20C0, 0x20C0, 0, 0},
      {6, 0xE0C1, 0xE0C1, 0, 0},  {7, 0xE2C0, 0xE2C0, 0, 0},  {8, 0xE2C0, 0xE2C0, 1, 1},
      {9, 0xE2C0, 0xE2C0, 2, 2},  {10, 0xE2C0, 0xE2C0, 3, 3}, {11, 0xE2C0, 0xE2C0, 4, 4},
      {12, 0xE2C0, 0xEEC0, 6, 0}, {13, 0xE2C0, 0xE2C0, 5, 5}, {14, 0x5AC0, 0x5AC0, 0, 0},
      {99, 0xE2C0, 0xE2C0, 0, 0}};
  for (const Row& row : rows) {
    _vltAttributeType t = Type(row.type);
    EXPECT_EQ(vltAttributeTypeToInternalLumDataType(t), row.internalTag) << row.type;
    EXPECT_EQ(vltAttributeTypeToExternalLumDataType(t), row.externalTag) << row.type;
    EXPECT_EQ(vltInternalBlobArrayTypeToBits2(t), row.internalBits) << row.type;
    EXPECT_EQ(vltExternalBlobArrayTypeToBits2(t), row.externalBits) << row.type;
    EXPECT_EQ(vltMakeInternalAttributeID(7, t), 7 | row.internalBits << 13) << row.type;
    EXPECT_EQ(vltMakeExternalAttributeID(7, t), 7 | row.externalBits << 13) << row.type;
  }
  EXPECT_EQ(vltMakeInternalAttributeID(7, Type(12)), 0xC007u);
}

TEST(vltVocabulary, TypedTagsMaskTheirHalves) {
  EXPECT_EQ(vltLumMakeTypedTag(0x12345AC0, 0xFFFF0001), 0x5AC00001u);
  EXPECT_EQ(vltIsLumBlob(0xE2C0), 1);
  EXPECT_EQ(vltIsLumBlob(0x1234B8C0), 1);
  EXPECT_EQ(vltIsLumBlob(0xEEC0), 0);
}

TEST(vltVocabulary, OnlyReferenceArrayIdsDifferInsideAndOutside) {
  EXPECT_EQ(vltAttributeIDInternalToExternal(0xE2C0C005), 0xEEC00005u);
  EXPECT_EQ(vltAttributeIDExternalToInternal(0xEEC00005), 0xE2C0C005u);
  EXPECT_EQ(vltAttributeIDInternalToExternal(0xE2C0A005), 0xE2C0A005u);
  EXPECT_EQ(vltAttributeIDExternalToInternal(0xEEC0FFFF), 0xE2C0DFFFu);
  EXPECT_EQ(vltAttributeIDInternalToExternal(0xE2C0DFFF), 0xEEC01FFFu);
  for (unsigned id : {0u, 7u, 0x5AC00001u, 0xE2C00005u, 0xE2C0E005u, 0xFFFFFFFFu}) {
    EXPECT_EQ(vltAttributeIDInternalToExternal(id), id);
    EXPECT_EQ(vltAttributeIDExternalToInternal(id), id);
  }
}

}  // namespace

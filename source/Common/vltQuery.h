#pragma once

// Queries: a GUID, two flags and terms of an attribute id with a typed value. Sent and received
// over the storage's typed streams, printed as one line, freed.

#include "source/Common/vltInterfaces.h"

struct _vltQueryTerm {
  vltAttributeID attributeID;
  uint32_t tildeFlag;  // for texts: 0 or 1
  _vltAttributeType attributeType;
  // Selected by the type: i32 1, u32 2, f64 3, string 4, guid 6; other types have no value.
  union {
    int32_t i32;
    uint32_t u32;
    double f64;
    wchar_t* string;  // owned by the term, from vltTaskMemAlloc
    GUID guid;
  } value;
};

struct _vltQuery {
  GUID queryGuid;
  int32_t tFlag;   // truth value: t or f
  int32_t orFlag;  // truth value: o or a
  uint32_t termCount;
  _vltQueryTerm* terms;  // array from vltTaskMemAlloc
};

// Writes, in order: format version 1, GUID, tFlag, orFlag, termCount, and of each term id, type and
// value; a text is its tildeFlag, whose result is not read, and the text. Stops at the first
// failure; returns the last result.
HRESULT vltMarshalQueryToStream(const _vltQuery* query, IvltOutputStream* stream);

// Reads what vltMarshalQueryToStream writes. S_OK; a version other than 1 is the success of its
// read, with the query untouched. tFlag and tildeFlag come as 0 or 1, orFlag as it is.
// E_OUTOFMEMORY, after its report, leaves termCount set and terms null. A failure after that
// leaves the terms that were not read zeroed: vltFreeQuery may end the query.
HRESULT vltMarshalQueryFromStream(IvltInputStream* stream, _vltQuery* query);

// One line: "{GUID},t,a,5=42,9=~abc". Ids print as signed numbers do (vltI32ToString2); a value of
// a type without one is empty. *text is freed with vltFree; E_POINTER for null, E_OUTOFMEMORY after
// its report. What cannot be appended for lack of memory is left out.
HRESULT vltConvertQueryToString(const _vltQuery* query, wchar_t** text);

// Frees the texts of the terms and the array; the query keeps its fields, `terms` too. Returns 0.
HRESULT vltFreeQuery(_vltQuery* query);

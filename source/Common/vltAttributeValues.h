#pragma once

// Attributes of a storage object as text, whatever their type. The type is asked of the object's
// class; objects, classes and meta attributes are the storage's own (source/Utilities/
// vltInterfaces.h), and a success of theirs with a null class or meta attribute aborts the process.
//
// Every reference and text that the storage returns is given back, also when an exception leaves:
// std::bad_alloc or zt::fnd::exception::OutOfRange of the texts, nothing else. Returned texts are
// vltTaskMemAlloc blocks. Results beside those documented: E_POINTER for a null object or
// out-pointer, and the storage's as they come. A text that memory does not suffice for is null
// whatever the result, in a list it is empty: test it. Threads: as the storage allows.

#include "source/Common/vltInterfaces.h"
#include "zt/fnd/StringFwd.h"

HRESULT vltGetAttributeType(IvltObject* object, unsigned id, _vltAttributeType* type);

// Text of the value:
//   numbers, GUIDs   by the conversions of source/Common/vltcmn.h
//   text             a copy; null for null
//   reference        the object's GUID; that of no object is all zeros
//   array            as vltGetArrayValueAsString
// E_FAIL for blobs, fast references and types that are none. *text is untouched on failure, except
// that a reference and an array that could not be read are written all the same: the GUID of zeros,
// what there is of the list.
HRESULT vltGetAttributeValueAsString2(IvltObject* object, unsigned id, wchar_t** text);
// The same, with *text untouched on every failure.
HRESULT vltGetAttributeValueAsStringImpl(IvltObject* object, unsigned id, wchar_t** text);

// Sets a number, GUID or text; what is no number reads as 0, what is no GUID as the null one.
// E_FAIL, with nothing called, for references, blobs, arrays and types that are none.
HRESULT vltSetAttributeValueFromString2(IvltObject* object, unsigned id, const wchar_t* text);

// Replaces `text` by the elements between braces, with commas and no blanks, neither quoted nor
// escaped: "{a,b}". A null object reads "NULL". Returns the last result of the storage; a failure
// when asked for the elements does not keep those that came out of the list.
// E_FAIL and "{}" for a type that is no array. E_OUTOFMEMORY, after its report, and "{" when there
// is no space for the elements.
HRESULT vltGetArrayValueAsString(IvltObject* object, unsigned id, _vltAttributeType type,
                                 zt::fnd::String& text);

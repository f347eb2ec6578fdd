#pragma once

// Names and meanings of the numbers that the library reports: HRESULTs of calls, and codes of its
// exceptions (zt::fnd::exception::Exception::getErrorCode). Header-only, C++17, needs no library.

#include <cstdint>

namespace vlt {

struct ResultInfo {
  std::uint32_t code;
  const char* name;     // of the macro or of the exception's class
  const char* meaning;  // one clause, without a full stop
};

inline constexpr ResultInfo kResults[] = {
    {0x00000000, "S_OK", "done"},
    {0x00000001, "S_FALSE", "done, with less than was asked for: the end of a walk, nothing there"},
    {0x80004001, "E_NOTIMPL", "an operation that is kept for its slot only"},
    {0x80004002, "E_NOINTERFACE", "the object has no such interface"},
    {0x80004003, "E_POINTER", "a required pointer is null"},
    {0x80004005, "E_FAIL",
     "the system refuses, a file is damaged, or another process has the lock; the log says more"},
    {0x8000FFFF, "E_UNEXPECTED", "a failure that the operation did not foresee"},
    {0x8007000E, "E_OUTOFMEMORY", "out of memory"},
    {0x80070057, "E_INVALIDARG", "an argument is out of range, or names nothing"},
    {0x80040301, "VLT_E_NO_COMPONENT", "no component serves the class"},
    {0x80040306, "VLT_E_NO_BINDING_CLASSES", "components of this type have no binding classes"},
    {0x80040325, "VLT_E_UUID_LIBRARY", "the library \"ZT-RPC\", which makes GUIDs, did not load"},
    {0x80040326, "VLT_E_UUID_ENTRY", "the library \"ZT-RPC\" has no entry UuidCreate"},
    {0x80030012, "ZT_E_END_OF_STREAM", "the stream ended before the value did"},
    {0x80070005, "ZT_E_ACCESS_DENIED", "the stream is not open for this"},
    {0x00000007, "PosixError", "a file or directory is not there (ENOENT)"},
    {0x0000002A, "OSException", "the system refuses; whatcode() of the exception is its number"},
    {0x8ABC7007, "OutOfRange", "a number or a position is out of range"},
    {0x8ABC7007, "BoundExceeded", "a request goes beyond the bounds of the data"},
    {0x8ABC7009, "ObjectAlreadyExists", "the object exists already"},
    {0x8ABC700A, "NonexistentException", "the object does not exist"},
    {0x8ABC700E, "InvalidOperation", "the operation is not allowed in this state"},
    {0x8ABC700F, "InvalidArgument",
     "an argument is invalid: an empty install directory, for example"},
    {0x8ABC7010, "InitializationFailure", "the object could not be set up"},
    {0x8ABC7011, "FileWriteFailed", "a file could not be written"},
    {0x8ABC7012, "FileReadFailed", "a file could not be read"},
    {0x8ABC7014, "DeserializationError", "the bytes are not of the expected form"},
    {0x8ABC7017, "BufferOverflow", "the result is longer than the caller's buffer"},
    {0x8ABC7019, "AccessDenied", "the rights to a file or directory are missing"},
    {0x8ABC701B, "FileAlreadyExists", "the file exists already"},
    {0x8ABC7024, "InvalidLocale", "the system does not have the locale"},
    {0x8ABC7030, "InvalidSequence", "the text is not valid UTF-8"},
    {0x8ABC7032, "BadGuidString", "the text is not a GUID"},
    {0x8ABC7034, "UnableToConvert", "the text cannot be converted"},
    {0xFFFFFFFF, "Exception", "a failure without a code of its own"},
};

// The row of a code; null for a code that is not the library's. Of two classes with one code it is
// the first.
constexpr const ResultInfo* FindResult(std::uint32_t code) {
  for (const ResultInfo& row : kResults) {
    if (row.code == code) return &row;
  }
  return nullptr;
}

}  // namespace vlt

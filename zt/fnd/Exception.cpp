#include "zt/fnd/Exception.h"

namespace zt::fnd::exception {
namespace {

std::string WithDetail(const char* prefix, const char* detail) {
  std::string text(prefix);
  if (detail) text += detail;
  return text;
}

}  // namespace

// The destructors are defined here, and with them the one copy of each class's type information.
#define ZT_FIXED_TEXT(Name, code, text)                    \
  Name::~Name() = default;                                 \
  const char* Name::what() const noexcept { return text; } \
  uint32_t Name::getErrorCode() const noexcept { return code; }

#define ZT_DETAILED(Name, prefix)                                                \
  Name::Name(const char* detail) : m_message(WithDetail(prefix ": ", detail)) {} \
  Name::~Name() = default;                                                       \
  const char* Name::what() const noexcept { return m_message.c_str(); }

// Codes and texts are part of the surface: they stay as they are when the code changes.
ZT_FIXED_TEXT(Exception, 0xFFFFFFFFu, "unspecified exception")
ZT_FIXED_TEXT(OutOfRange, 0x8ABC7007u, "Out of range")
ZT_FIXED_TEXT(BoundExceeded, 0x8ABC7007u, "A request was made that would exceed the bounds")
ZT_FIXED_TEXT(ObjectAlreadyExists, 0x8ABC7009u, "Object already exists")
ZT_FIXED_TEXT(NonexistentException, 0x8ABC700Au, "The object does not exist")
ZT_FIXED_TEXT(InvalidOperation, 0x8ABC700Eu, "Invalid operation")
ZT_FIXED_TEXT(InvalidArgument, 0x8ABC700Fu, "Invalid argument(s)")
ZT_FIXED_TEXT(InitializationFailure, 0x8ABC7010u, "Initialization failed")
ZT_FIXED_TEXT(FileWriteFailed, 0x8ABC7011u, "Write file operation failed")
ZT_FIXED_TEXT(FileReadFailed, 0x8ABC7012u, "Read file operation failed")
ZT_FIXED_TEXT(DeserializationError, 0x8ABC7014u, "Failed to deserialize")
ZT_FIXED_TEXT(BufferOverflow, 0x8ABC7017u, "Buffer overflowed")
ZT_FIXED_TEXT(FileAlreadyExists, 0x8ABC701Bu, "File already exists")
ZT_FIXED_TEXT(InvalidLocale, 0x8ABC7024u, "Invalid locale")
ZT_FIXED_TEXT(InvalidSequence, 0x8ABC7030u, "Invalid UTF8 encoding sequence")
ZT_FIXED_TEXT(BadGuidString, 0x8ABC7032u, "Badly formatted Guid string.")
ZT_FIXED_TEXT(UnableToConvert, 0x8ABC7034u, "Unable to convert.")
ZT_FIXED_TEXT(NotImplemented, 0x80004001u, "Not implemented")

ZT_DETAILED(OutOfRange2, "Out of range")
ZT_DETAILED(BoundExceeded2, "A request was made that would exceed the bounds")
ZT_DETAILED(InvalidArgument2, "Invalid argument(s)")
ZT_DETAILED(AccessDenied, "Access denied")

uint32_t AccessDenied::getErrorCode() const noexcept { return 0x8ABC7019u; }

}  // namespace zt::fnd::exception

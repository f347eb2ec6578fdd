#pragma once

// Component records on typed streams. The bytes are documented in docs/stream-format.md.

#include "source/Common/ZtUtils/General/ztTypedStream.h"
#include "source/xcomponent.h"

// Writes the record's fields one by one, with the variant of its type. Texts go out in the locale's
// encoding. Throws CztStreamException when the stream takes a number no longer; whether a text's
// bytes and opaqueQuad were taken is not checked.
CztOutStream& operator<<(CztOutStream& out, const CvltComponent& component);

// Reads a record that a build of the same record size wrote. Texts are new blocks; the ones that
// the component held are not freed. Lengths and Data1 are read in long width, so that only 32-bit
// builds read back what was written.
//
// Throws CztStreamVersionException for another record size, with nothing read after it;
// CztEndOfStreamException and CztStreamException for numbers that do not come;
// zt::fnd::exception::OutOfRange for a text length beyond 32 bits; std::bad_alloc. What was read
// until then stays in the component, which remains safe to use and destroy. Bytes of a text or of
// opaqueQuad that do not come count as zeros.
CztInStream& operator>>(CztInStream& in, CvltComponent& component);

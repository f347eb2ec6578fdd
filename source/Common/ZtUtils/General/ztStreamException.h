#pragma once

#include "zt/fnd/String.h"

// What typed streams and the loading of sub-streams throw. A family of its own: no std::exception,
// and no foundation exception either. The messages of this library are empty.
class CztStreamException {
 public:
  explicit CztStreamException(const zt::fnd::String& message = zt::fnd::String())
      : m_message(message) {}

  // Lives as long as the object; empty for what this library throws.
  const zt::fnd::String& what() const { return m_message; }

 private:
  zt::fnd::String m_message;
};

// The stream ended before the value did.
class CztEndOfStreamException : public CztStreamException {
 public:
  using CztStreamException::CztStreamException;
};

// A record was written by a build whose record has another form. Thrown by readers of records.
class CztStreamVersionException : public CztStreamException {
 public:
  using CztStreamException::CztStreamException;
};

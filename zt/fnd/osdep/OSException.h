#pragma once

#include <cstdint>
#include <string>

#include "zt/fnd/Exception.h"

namespace zt::fnd::osdep {

// A failure that the operating system reports. getErrorCode() of this family is a small number, not
// one of the foundation's block; whatcode() is the system's own number.
class ZT_EXCEPTION_CLASS OSException : public exception::Exception {
 public:
  OSException();  // "Unknown error", 0
  OSException(const char* message, unsigned int code);
  OSException(const OSException&) = default;
  OSException& operator=(const OSException&) = default;
  ~OSException() override;

  const char* what() const noexcept override;
  uint32_t getErrorCode() const noexcept override;  // 42
  // The number that the system reported, or that the thrower gave: an errno, an OSStatus, -1 for
  // the loader.
  virtual uint32_t whatcode() const noexcept;

 protected:
  std::string message;
  uint32_t code;
};

// An errno. getErrorCode(): 0 for 0, 7 for ENOENT, 42 for any other.
class ZT_EXCEPTION_CLASS PosixError : public OSException {
 public:
  PosixError();  // the calling thread's errno, so build it right after the failed call
  explicit PosixError(int errnum);  // the system's text for it
  // A text of the thrower's, which names the path or the loader's reason; null counts as empty.
  PosixError(const char* message, int errnum);
  PosixError(const PosixError&) = default;
  PosixError& operator=(const PosixError&) = default;
  ~PosixError() override;

  uint32_t getErrorCode() const noexcept override;
};

// An OSStatus, sign-extended. getErrorCode(): 0 for 0, 7 for -43 (file not found), 42 for any
// other.
class ZT_EXCEPTION_CLASS CarbonError : public OSException {
 public:
  explicit CarbonError(short code);  // "Unknown error code"
  CarbonError(const char* message, short code);
  CarbonError(const CarbonError&) = default;
  CarbonError& operator=(const CarbonError&) = default;
  ~CarbonError() override;

  uint32_t getErrorCode() const noexcept override;
};

}  // namespace zt::fnd::osdep

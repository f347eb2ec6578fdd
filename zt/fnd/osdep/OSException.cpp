#include "zt/fnd/osdep/OSException.h"

#include <cerrno>
#include <cstring>

namespace zt::fnd::osdep {
namespace {

constexpr uint32_t kNoError = 0;
constexpr uint32_t kNotFound = 7;
// The small codes that clients know: done, not found, anything else.
constexpr uint32_t kOther = 42;
constexpr uint32_t kFileNotFoundStatus = 0xFFFFFFD5u;  // -43

// The C library has either of two strerror_r: one returns the text, one a status.
[[maybe_unused]] const char* ErrorText(const char* text, const char*) { return text; }
[[maybe_unused]] const char* ErrorText(int status, const char* buffer) {
  return status == 0 ? buffer : "Unknown error";
}

// strerror_r and not strerror, whose buffer threads share.
std::string PosixText(int errnum) {
  char buffer[256] = "";
  return ErrorText(strerror_r(errnum, buffer, sizeof buffer), buffer);
}

std::string TextOf(const char* text) { return text ? text : std::string(); }

uint32_t SmallCode(uint32_t code, uint32_t notFound) noexcept {
  if (code == 0) return kNoError;
  return code == notFound ? kNotFound : kOther;
}

}  // namespace

OSException::OSException() : message("Unknown error"), code(0) {}
OSException::OSException(const char* text, unsigned int number)
    : message(TextOf(text)), code(number) {}
OSException::~OSException() = default;
const char* OSException::what() const noexcept { return message.c_str(); }
uint32_t OSException::getErrorCode() const noexcept { return kOther; }
uint32_t OSException::whatcode() const noexcept { return code; }

// errno is read first of all: building the text may change it.
PosixError::PosixError() : PosixError(errno) {}
PosixError::PosixError(int errnum) : PosixError(PosixText(errnum).c_str(), errnum) {}
PosixError::PosixError(const char* text, int errnum)
    : OSException(text, static_cast<unsigned int>(errnum)) {}
PosixError::~PosixError() = default;
uint32_t PosixError::getErrorCode() const noexcept { return SmallCode(code, ENOENT); }

CarbonError::CarbonError(short status) : CarbonError("Unknown error code", status) {}
CarbonError::CarbonError(const char* text, short status)
    : OSException(text, static_cast<unsigned int>(static_cast<int>(status))) {}
CarbonError::~CarbonError() = default;
uint32_t CarbonError::getErrorCode() const noexcept { return SmallCode(code, kFileNotFoundStatus); }

}  // namespace zt::fnd::osdep

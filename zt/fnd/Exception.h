#pragma once

#include <cstddef>
#include <cstdint>
#include <exception>
#include <string>
#include <type_traits>

// The one exception family of the foundation and the OS layer.
//
// An exception carries a fixed text (what()), a 32-bit code for the outside (getErrorCode()), and
// the place of the throw. Handlers inside the library decide by class, never by code. Objects are
// plain values; copying copies the message. Exported, so that programs that load the library can
// catch it.
//
// ZT_RAISE(expression) stamps line and source path (relative to the root, no extension) and throws
// a copy. It is an expression of type void that never returns. The bounds checks of wire forms
// throw without it and leave the place empty.
#define ZT_EXCEPTION_CLASS __attribute__((visibility("default")))

#define ZT_FILE_STEM                                                          \
  ([]() noexcept -> const char* {                                             \
    static constexpr ::zt::fnd::exception::detail::FileStem s_stem(__FILE__); \
    return s_stem.text;                                                       \
  }())

#define ZT_RAISE(...) ::zt::fnd::exception::detail::Raise(__VA_ARGS__, __LINE__, ZT_FILE_STEM)

namespace zt::fnd::exception {

namespace detail {
struct Stamp;
}

// Root of the family: "unspecified exception", 0xFFFFFFFF.
class ZT_EXCEPTION_CLASS Exception : public std::exception {
 public:
  Exception() noexcept = default;
  Exception(const Exception&) = default;
  Exception& operator=(const Exception&) = default;
  ~Exception() override;

  // Never null; lives as long as the object.
  const char* what() const noexcept override;
  virtual uint32_t getErrorCode() const noexcept;

 protected:
  friend struct detail::Stamp;
  uint32_t line = 0;           // 0 until stamped
  const char* file = nullptr;  // static text; null until stamped
};

// A class with a text and a code of its own and no field.
#define ZT_FIXED_TEXT_EXCEPTION(Name)                \
  class ZT_EXCEPTION_CLASS Name : public Exception { \
   public:                                           \
    Name() noexcept = default;                       \
    Name(const Name&) = default;                     \
    Name& operator=(const Name&) = default;          \
    ~Name() override;                                \
    const char* what() const noexcept override;      \
    uint32_t getErrorCode() const noexcept override; \
  }

// A class whose text is that of its base, ": " and a detail; a null detail counts as empty. The
// code is that of the base. Throws std::bad_alloc.
#define ZT_DETAILED_EXCEPTION(Name, Base)       \
  class ZT_EXCEPTION_CLASS Name : public Base { \
   public:                                      \
    explicit Name(const char* detail);          \
    Name(const Name&) = default;                \
    Name& operator=(const Name&) = default;     \
    ~Name() override;                           \
    const char* what() const noexcept override; \
                                                \
   private:                                     \
    std::string m_message;                      \
  }

// Codes are 0x8ABC7000 and a small number, with two exceptions: this class and the next share one,
// and NotImplemented is E_NOTIMPL. Exception.cpp has them all with their texts.
ZT_FIXED_TEXT_EXCEPTION(OutOfRange);     // 0x8ABC7007
ZT_FIXED_TEXT_EXCEPTION(BoundExceeded);  // 0x8ABC7007 too: only the class differs
ZT_FIXED_TEXT_EXCEPTION(ObjectAlreadyExists);
ZT_FIXED_TEXT_EXCEPTION(NonexistentException);
ZT_FIXED_TEXT_EXCEPTION(InvalidOperation);
ZT_FIXED_TEXT_EXCEPTION(InvalidArgument);
ZT_FIXED_TEXT_EXCEPTION(InitializationFailure);
ZT_FIXED_TEXT_EXCEPTION(FileWriteFailed);
ZT_FIXED_TEXT_EXCEPTION(FileReadFailed);
ZT_FIXED_TEXT_EXCEPTION(DeserializationError);
ZT_FIXED_TEXT_EXCEPTION(BufferOverflow);
ZT_FIXED_TEXT_EXCEPTION(FileAlreadyExists);
ZT_FIXED_TEXT_EXCEPTION(InvalidLocale);
ZT_FIXED_TEXT_EXCEPTION(InvalidSequence);
ZT_FIXED_TEXT_EXCEPTION(BadGuidString);
ZT_FIXED_TEXT_EXCEPTION(UnableToConvert);
ZT_FIXED_TEXT_EXCEPTION(NotImplemented);

ZT_DETAILED_EXCEPTION(OutOfRange2, OutOfRange);
ZT_DETAILED_EXCEPTION(BoundExceeded2, BoundExceeded);
ZT_DETAILED_EXCEPTION(InvalidArgument2, InvalidArgument);

// "Access denied: " and the detail, mostly a path.
class ZT_EXCEPTION_CLASS AccessDenied : public Exception {
 public:
  explicit AccessDenied(const char* detail);
  AccessDenied(const AccessDenied&) = default;
  AccessDenied& operator=(const AccessDenied&) = default;
  ~AccessDenied() override;
  const char* what() const noexcept override;
  uint32_t getErrorCode() const noexcept override;

 private:
  std::string m_message;
};

#undef ZT_FIXED_TEXT_EXCEPTION
#undef ZT_DETAILED_EXCEPTION

namespace detail {

// A source path without its extension.
template <size_t N>
struct FileStem {
  char text[N];

  constexpr explicit FileStem(const char (&path)[N]) : text() {
    size_t length = N - 1;
    for (size_t i = N - 1; i > 0 && path[i] != '/'; --i) {
      if (path[i] == '.') {
        length = i;
        break;
      }
    }
    for (size_t i = 0; i < length; ++i) text[i] = path[i];
  }
};

struct Stamp {
  // The one writer of the stamp; classes of the family need not know it.
  static void set(Exception* e, uint32_t line, const char* file) noexcept {
    e->line = line;
    e->file = file;
  }
};

// Throws a copy with the stamp: the expression itself may be a constant, or an lvalue of the
// caller.
template <class E>
[[noreturn]] void Raise(E&& e, uint32_t line, const char* file) {
  std::decay_t<E> stamped(e);
  Stamp::set(&stamped, line, file);
  throw std::decay_t<E>(stamped);
}

}  // namespace detail
}  // namespace zt::fnd::exception

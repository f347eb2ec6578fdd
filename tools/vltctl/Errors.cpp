// error: names and meanings of result and exception codes.
#include <algorithm>
#include <cctype>
#include <charconv>

#include "source/Common/ZtUtils/General/ztStreamInterfaces.h"
#include "source/Common/vltTypes.h"
#include "tools/vltctl/Reading.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/OSException.h"

namespace admin {
namespace {

struct CodeRow {
  uint32_t code;
  std::string name, meaning;
};

template <class E>
CodeRow Of(const char* name, const E& exception) {
  return {exception.getErrorCode(), name, std::string("exception: ") + exception.what()};
}

#define ROW(name, meaning) \
  { static_cast<uint32_t>(name), #name, meaning }
#define EXCEPTION(Name) Of(#Name, zt::fnd::exception::Name())

std::vector<CodeRow> Rows() {
  using zt::fnd::osdep::PosixError;
  return {
      ROW(S_OK, "success"),
      ROW(S_FALSE, "success with less: an enumerator had fewer items than were asked for"),
      ROW(E_NOTIMPL, "the operation is not there, or the exception NotImplemented"),
      ROW(E_NOINTERFACE, "the object does not have the interface"),
      ROW(E_POINTER, "a pointer argument that is needed is null"),
      ROW(E_FAIL, "every failure without a code of its own; the log may say more"),
      ROW(E_UNEXPECTED, "a failure that is none of the system's: out of memory, a relative path"),
      ROW(E_OUTOFMEMORY, "out of memory; the named event \"LockdownVLTEvent\" is set"),
      ROW(E_INVALIDARG, "an argument is wrong, or no component has the identifier"),
      ROW(VLT_E_NO_COMPONENT, "no component serves the binding class"),
      ROW(VLT_E_NO_BINDING_CLASSES, "components of this type have no binding classes"),
      ROW(VLT_E_UUID_LIBRARY, "the library \"ZT-RPC\", which makes identifiers, did not load"),
      ROW(VLT_E_UUID_ENTRY, "the library \"ZT-RPC\" has no entry \"UuidCreate\""),
      ROW(ZT_E_END_OF_STREAM, "the stream ended before the value did"),
      ROW(ZT_E_ACCESS_DENIED, "the stream is not open for this"),
      EXCEPTION(OutOfRange),
      EXCEPTION(BoundExceeded),
      EXCEPTION(ObjectAlreadyExists),
      EXCEPTION(NonexistentException),
      EXCEPTION(InvalidOperation),
      EXCEPTION(InvalidArgument),
      EXCEPTION(InitializationFailure),
      EXCEPTION(FileWriteFailed),
      EXCEPTION(FileReadFailed),
      EXCEPTION(DeserializationError),
      EXCEPTION(BufferOverflow),
      Of("AccessDenied", zt::fnd::exception::AccessDenied("(path)")),
      EXCEPTION(FileAlreadyExists),
      EXCEPTION(InvalidLocale),
      EXCEPTION(InvalidSequence),
      EXCEPTION(BadGuidString),
      EXCEPTION(UnableToConvert),
      Of("PosixError", PosixError(ENOENT)),
      Of("PosixError", PosixError(EIO)),
      EXCEPTION(Exception)};
}

#undef ROW
#undef EXCEPTION

// "0x80040326", "80040326", "-2147220698", "2147746598"; nothing for other words.
std::optional<uint32_t> CodeOf(const std::string& word) {
  bool isHex = word.starts_with("0x") || word.starts_with("0X") ||
               (word.size() == 8 &&
                std::all_of(word.begin(), word.end(), [](unsigned char c) { return isxdigit(c); }));
  std::string digits = word.substr(isHex && word[1] != '0' && tolower(word[1]) == 'x' ? 2 : 0);
  long long value = 0;
  auto [end, error] =
      std::from_chars(digits.data(), digits.data() + digits.size(), value, isHex ? 16 : 10);
  bool isWhole = error == std::errc() && end == digits.data() + digits.size() && !digits.empty();
  if (!isWhole || value > 0xFFFFFFFFll || value < -0x80000000ll) return std::nullopt;
  return static_cast<uint32_t>(value);
}

std::string Lower(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(),
                 [](unsigned char c) { return tolower(c); });
  return text;
}

std::string Hex(uint32_t code) {
  char text[16];
  snprintf(text, sizeof text, "0x%08X", code);
  return text;
}

}  // namespace

int Error(const Arguments& arguments, Output& output) {
  const std::string word = arguments.text("CODE");
  std::optional<uint32_t> code = CodeOf(word);
  vltctl::Table table;
  std::vector<std::string> names;
  bool found = false;
  for (const CodeRow& row : Rows()) {
    names.push_back(row.name);
    if (!word.empty() && (code ? row.code != *code : Lower(row.name) != Lower(word))) continue;
    found = true;
    table.add({Hex(row.code), row.name, row.meaning});
    output.item({{"code", row.code}, {"name", row.name}, {"meaning", row.meaning}});
  }
  output.print(table);
  if (found) return vltctl::kGood;
  std::string guess = code ? "" : vltctl::DidYouMean(word, names);
  throw vltctl::Failure(vltctl::kNotFound,
                        {"no-such-code", "", "the library has no code or name " + word, "",
                         guess.empty() ? "\"vltctl error\" shows all" : guess});
}

}  // namespace admin

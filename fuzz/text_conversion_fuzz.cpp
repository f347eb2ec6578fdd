// UTF-8 and locale text in both directions.
#include <string.h>

#include <memory>

#include "fuzz/Input.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/Utf8ToWide.h"
#include "zt/fnd/WideToUtf8.h"

using namespace zt::fnd;

namespace {

// What decodes has as many characters as was counted, and encodes to the same or, for the forms that
// only decode, to other bytes.
void Decode(const uint8_t* data, size_t sizeBytes) {
  try {
    auto* end = data + sizeBytes;
    unsigned length = GetUtf8StringLength(data, end);
    auto wide = std::make_unique<wchar_t[]>(length + 1);
    Utf8ToWide(data, end, wide.get(), wide.get() + length);
    unsigned bytes = GetUtf8EncodingBytes(wide.get(), wide.get() + length);
    auto again = std::make_unique<unsigned char[]>(bytes + 1);
    fuzz::Demand(WideToUtf8(wide.get(), wide.get() + length, again.get(), again.get() + bytes) ==
                 bytes);
  } catch (const exception::InvalidSequence&) {
    // Bad bytes, reported as such.
  }
}

void Encode(const std::wstring& wide) {
  const wchar_t* begin = wide.data();
  const wchar_t* end = begin + wide.size();
  unsigned bytes = GetUtf8EncodingBytes(begin, end);
  auto utf8 = std::make_unique<unsigned char[]>(bytes + 1);
  fuzz::Demand(WideToUtf8(begin, end, utf8.get(), utf8.get() + bytes) == bytes);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  if (sizeBytes == 0) return 0;
  Decode(data, sizeBytes);
  std::wstring wide = fuzz::Wide(data, sizeBytes);
  Encode(wide);
  String text(wide.data(), static_cast<unsigned>(wide.size()));
  AnsiString narrow(text);
  fuzz::Demand(narrow.length() <= 4 * text.length());
  String back(narrow);
  fuzz::Demand(back.length() <= narrow.length());
  return 0;
}

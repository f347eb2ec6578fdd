// The text operations on paths, and wildcards.
#include "fuzz/Input.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/FindFiles.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::String;
using zt::fnd::osdep::path;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  std::wstring wide = fuzz::Wide(data, sizeBytes);
  String text(wide.c_str());
  String normal = path::NormalizePath(text);
  fuzz::Demand(normal.empty() || path::IsAbs(normal));
  fuzz::Demand(path::BaseName(text).find(L'/') == String::npos);
  fuzz::Demand(path::DirName(text).length() <= text.length());
  String joined = path::Join(text, text);
  fuzz::Demand(joined.length() <= 2 * text.length() + 1);
  size_t half = wide.size() / 2;
  std::wstring pattern = wide.substr(0, half), name = wide.substr(half);
  zt::fnd::osdep::WildcardFit(pattern.c_str(), name.c_str());
  fuzz::Demand(zt::fnd::osdep::WildcardFit(L"*", name.c_str()));
  return 0;
}

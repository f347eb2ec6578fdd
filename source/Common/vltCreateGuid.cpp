#include <atomic>

#include "source/Common/vltcmn.h"
#include "zt/fnd/osdep/SharedLibrary.h"

namespace {

using UuidCreate = int (*)(GUID*);

// The entry of "ZT-RPC" once it was found. Two threads that find it together store the same value.
std::atomic<UuidCreate> g_GuidCreate{nullptr};

HRESULT FindGuidCreate() {
  // Not unloaded with the object, so that the entry stays valid.
  zt::fnd::osdep::SharedLibrary library(zt::fnd::String(L"ZT-RPC"), false, true);
  if (!library.isLoaded()) return VLT_E_UUID_LIBRARY;
  void* entry = library.getFunctionPointer(zt::fnd::AnsiString("UuidCreate"), true);
  if (!entry) return VLT_E_UUID_ENTRY;
  g_GuidCreate = reinterpret_cast<UuidCreate>(entry);
  return S_OK;
}

}  // namespace

HRESULT vltCreateGuid2(GUID* out) {
  if (!g_GuidCreate) {
    HRESULT result = FindGuidCreate();
    if (result < 0) return result;
  }
  // The entry's own codes mean nothing to callers here; 0 is its success.
  return g_GuidCreate.load()(out) == 0 ? S_OK : E_FAIL;
}

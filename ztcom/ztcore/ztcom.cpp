#include "ztcom/ztcore/ztcom.h"

#include <cstring>

#include "zt/fnd/ByteOrder.h"

namespace {

bool SameId(const GUID& a, const GUID& b) { return memcmp(&a, &b, sizeof a) == 0; }

// The third 32-bit word of IUnknown's id is the constant part of the old ids. Callers on hosts of
// the other byte order wrote it as 0xC000.
bool IsUnknown(const GUID& iid) {
  const auto third = zt::fnd::little_endian::Get<uint32_t>(iid.Data4);
  const auto fourth = zt::fnd::little_endian::Get<uint32_t>(iid.Data4 + 4);
  return iid.Data1 == 0 && iid.Data2 == 0 && iid.Data3 == 0 && (third == 0xC0 || third == 0xC000) &&
         fourth == 0x46000000;
}

HRESULT HandOut(void* object, uintptr_t offset, void** out) {
  auto* found = reinterpret_cast<IUnknown*>(static_cast<char*>(object) + offset);
  found->AddRef();
  *out = found;
  return S_OK;
}

}  // namespace

HRESULT ZTComInternalQueryInterface(void* object, const _ZTCOM_INTMAP_ENTRY* entries,
                                    const GUID& iid, void** out) {
  // A broken table is a mistake of the class, which no result to a caller would mend.
  if (!object || !out || entries->function != kZtComSimpleEntry) abort();
  *out = nullptr;
  // Before the rows, and always the first one's interface: one pointer is the object's identity.
  if (IsUnknown(iid)) return HandOut(object, entries->offset, out);
  for (const _ZTCOM_INTMAP_ENTRY* row = entries; row->function != 0; ++row) {
    bool blind = !row->iid;
    if (!blind && !SameId(*row->iid, iid)) continue;
    if (row->function == kZtComSimpleEntry) {
      if (blind) abort();
      return HandOut(object, row->offset, out);
    }
    HRESULT result =
        reinterpret_cast<ZtComMapFunction>(row->function)(object, iid, out, row->offset);
    // A row for all interfaces may refuse one, which a later row then answers.
    if (result == S_OK || (result < 0 && !blind)) return result;
  }
  return E_NOINTERFACE;
}

HRESULT HResultFromZTResult(int result) {
  if (result >= 0) return S_OK;
  // Negated as unsigned: the magnitude of INT_MIN has no int.
  return static_cast<HRESULT>((0u - static_cast<unsigned>(result)) | 0x800A0000u);
}

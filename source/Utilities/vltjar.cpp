// The jar's opening and saving are those of every guarded file (source/GuardedIniFile.h); what is
// the jar's own are the results, the messages and the hook points in kJar. The settings files are
// opened through the same functions, so that they share them.
#include "source/Utilities/vltjar.h"

#include <algorithm>
#include <new>

#include "source/Common/vltResultOf.h"
#include "source/GuardedIniFile.h"
#include "source/Utilities/vltAllocationPoints.h"

using zt::fnd::AnsiString;

namespace vltjar {

std::string Narrow(const wchar_t* text) {
  return text ? std::string(AnsiString(text).c_str()) : std::string();
}

}  // namespace vltjar

using vltjar::Narrow;

namespace {

constexpr GuardedIniKind kJar = {.useEscapes = false,
                                 .otherFailure = E_UNEXPECTED,
                                 .refusedMessage = "Insufficient privilege to delete cache file",
                                 .otherFailureMessage = "Bad error trying to delete cache file",
                                 .openSignature = vlt::kJarPoint.signature,
                                 .openPoint = vlt::kJarPoint.hookPoint,
                                 .retryPoint = vlt::hook::kJarRetry,
                                 .writtenPoint = vlt::hook::kJarInvalidChecksumSet,
                                 .sealedPoint = vlt::hook::kJarValidChecksumSet};

GuardedIniFile Guarded(const wchar_t* file) { return GuardedIniFile(Narrow(file), kJar); }

}  // namespace

HRESULT VltjarOpenIniWithValidation(const wchar_t* file, CvlIniMgr** out) {
  *out = nullptr;
  std::unique_ptr<CvlIniMgr> opened;
  HRESULT result = VltjarOpen(file, &opened);
  // Also with a negative result: the caller decides what a file that was begun again is worth.
  *out = opened.release();
  return result;
}

HRESULT VltjarOpen(const wchar_t* file, std::unique_ptr<CvlIniMgr>* out) {
  return Guarded(file).open(out);
}

HRESULT VltjarSaveChanges(const wchar_t* file, CvlIniMgr* ini) { return Guarded(file).save(*ini); }

HRESULT VltjarDeleteIniFile(const wchar_t* file) {
  // Only the making of the paths can throw here; setAside has results for all else.
  return vlt::ResultOf(E_UNEXPECTED, [&] { return Guarded(file).setAside(); });
}

bool VltjarChecksumFileExists(const wchar_t* file) { return Guarded(file).hasSidecar(); }

HRESULT VltjarGetChecksumForCacheFile(const wchar_t* file, unsigned char** digest) {
  *digest = nullptr;
  // Out of memory says nothing of the sidecar: the file must not be set aside for it.
  return vlt::ResultOf(E_FAIL, [&] {
    return vlt::ResultOf<std::bad_alloc>(E_OUTOFMEMORY, [&] {
      IniSidecar::Digest found;
      IniSidecar::State state = IniSidecar::Read(Guarded(file).sidecar(), &found);
      if (state == IniSidecar::State::Missing) return S_FALSE;
      if (state != IniSidecar::State::Present) return E_FAIL;
      *digest = new unsigned char[found.size()];
      std::copy(found.begin(), found.end(), *digest);
      return S_OK;
    });
  });
}

HRESULT VltjarSetChecksumForCacheFile(const wchar_t* file, const unsigned char* digest) {
  IniSidecar::Digest copy;
  std::copy_n(digest, copy.size(), copy.begin());
  return vlt::ResultOf(E_UNEXPECTED,
                       [&] { return Guarded(file).writeSidecar(copy, IniDurability::Synced); });
}

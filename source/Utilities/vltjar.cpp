#include "source/Utilities/vltjar.h"

#include <new>

#include "source/Common/vltFailure.h"
#include "source/Common/vltFileSecurity.h"
#include "source/Common/vltHookPoints.h"
#include "source/Common/vltTestHook.h"
#include "source/IniSidecar.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::AnsiString;
using zt::fnd::String;
using zt::fnd::osdep::path;

namespace vltjar {

std::string Narrow(const wchar_t* text) {
  return text ? std::string(AnsiString(text).c_str()) : std::string();
}

}  // namespace vltjar

using vltjar::Narrow;

namespace {

std::string SidecarOf(const wchar_t* file) { return CvlIniMgr::SidecarName(Narrow(file)); }

// The object, or null without memory or where the hook says so. Throws what the constructor throws.
CvlIniMgr* Create(const char* hookPoint, const std::string& file, const unsigned char* digest) {
  if (vltTestHook(hookPoint)) return nullptr;
  return new (std::nothrow) CvlIniMgr(file.c_str(), false, digest, false, false);
}

// What the opening comes to: the object and the status of its sidecar, or the report.
HRESULT HandOver(CvlIniMgr* created, HRESULT status, CvlIniMgr** out) {
  if (!created) {
    return vltReportOutOfMemory("HRESULT VltjarOpenIniWithValidation(const wchar_t*, CvlIniMgr**)");
  }
  *out = created;
  return status;
}

}  // namespace

HRESULT VltjarOpenIniWithValidation(const wchar_t* file, CvlIniMgr** out) {
  *out = nullptr;
  std::string narrow = Narrow(file);
  // From the sidecar on: another process may be about to mend what this one would set aside.
  std::unique_ptr<IniFileLock> hold = IniFileLock::ForFile(narrow.c_str());
  IniSidecar::Digest digest;
  IniSidecar::State state = IniSidecar::Read(SidecarOf(file), &digest);
  if (state == IniSidecar::State::Unreadable) state = IniSidecar::Read(SidecarOf(file), &digest);
  // Nothing is known of the file then. It stays, and the caller may try again.
  if (state == IniSidecar::State::Unreadable) return E_FAIL;
  HRESULT status = state == IniSidecar::State::Short ? E_FAIL : S_OK;
  CvlIniMgr* created = nullptr;
  try {
    if (status < 0) VltjarDeleteIniFile(file);
    created = Create(vlt::hook::kJarOpen, narrow,
                     state == IniSidecar::State::Present ? digest.data() : nullptr);
  } catch (...) {
    // Whatever it was - a digest that differs, a file that has just been set aside, a shortage that
    // may have passed - the file is taken as it is now, and a failure of that counts.
    created = Create(vlt::hook::kJarRetry, narrow, nullptr);
  }
  return HandOver(created, status, out);
}

HRESULT VltjarOpen(const wchar_t* file, std::unique_ptr<CvlIniMgr>* out) {
  CvlIniMgr* opened = nullptr;
  HRESULT result = VltjarOpenIniWithValidation(file, &opened);
  out->reset(opened);
  return result;
}

HRESULT VltjarSaveChanges(const wchar_t* file, CvlIniMgr* ini) {
  // With the mark a crash before the digest leaves a sidecar that cannot match, never none at all.
  if (!VltjarChecksumFileExists(file)) {
    VltjarSetChecksumForCacheFile(file, IniSidecar::kInvalidMark);
  }
  unsigned char* written = nullptr;
  HRESULT result = ini->WriteAndGetChecksum(&written);
  std::unique_ptr<unsigned char[]> digest(written);
  vltTestHook(vlt::hook::kJarInvalidChecksumSet);
  if (result < 0 || !digest) return result;
  result = VltjarSetChecksumForCacheFile(file, digest.get());
  vltTestHook(vlt::hook::kJarValidChecksumSet);
  return result;
}

HRESULT VltjarDeleteIniFile(const wchar_t* file) {
  try {
    CvlIniMgr::SetAside(String(file));
    return S_OK;
  } catch (const zt::fnd::osdep::OSException&) {
    // The file stays where it is; the caller opens it as it is.
    vltTraceError("Insufficient privilege to delete cache file");
    return E_FAIL;
  } catch (...) {
    // A relative path, or no memory.
    vltTraceError("Bad error trying to delete cache file");
    return E_UNEXPECTED;
  }
}

bool VltjarChecksumFileExists(const wchar_t* file) {
  try {
    return path::DoesFileExist(String(SidecarOf(file).c_str()));
  } catch (const zt::fnd::exception::Exception&) {
    // An inaccessible sidecar counts as missing; a failed write of the mark is ignored.
    return false;
  }
}

HRESULT VltjarGetChecksumForCacheFile(const wchar_t* file, unsigned char** digest) {
  *digest = nullptr;
  try {
    return IniSidecar::Read(SidecarOf(file), digest);
  } catch (const std::bad_alloc&) {
    return E_OUTOFMEMORY;  // Says nothing of the sidecar: the file must not be set aside for it.
  } catch (...) {
    return E_FAIL;  // A sidecar that cannot be read for any reason is an unusable one.
  }
}

HRESULT VltjarSetChecksumForCacheFile(const wchar_t* file, const unsigned char* digest) {
  try {
    return IniSidecar::Write(SidecarOf(file), digest, true);
  } catch (...) {
    return E_UNEXPECTED;  // The file stands; only its digest is old, which the next opening survives.
  }
}

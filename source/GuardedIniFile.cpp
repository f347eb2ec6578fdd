// Opening tries twice. The first time with the digest of the sidecar; the second time without,
// since a file that was edited by hand is to be used all the same. A short sidecar means that the
// file beside it cannot be trusted, which is then set aside before anything is read.
//
// Saving writes the file first and its sidecar after it. In between the sidecar is that of the old
// file, which differs, and a file that differs is taken as it is: so a crash there costs nothing.
#include "source/GuardedIniFile.h"

#include <new>
#include <utility>

#include "source/Common/vltFailure.h"
#include "source/Common/vltResultOf.h"
#include "source/Common/vltTestHook.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::String;

namespace {

// Its answer does not matter: nothing is allocated here.
void Pass(const char* hookPoint) { vlt::hook::Strikes(hookPoint); }

void Trace(const char* message) {
  if (message) vltTraceError("%s", message);
}

}  // namespace

GuardedIniFile::GuardedIniFile(std::string file, const GuardedIniKind& kind)
    : m_file(std::move(file)), m_sidecar(CvlIniMgr::SidecarName(m_file)), m_kind(kind) {}

// Null where memory is out and that is to be a result.
std::unique_ptr<CvlIniMgr> GuardedIniFile::create(const char* hookPoint,
                                                  const IniSidecar::Digest* expected) const {
  const unsigned char* digest = expected ? expected->data() : nullptr;
  if (!m_kind.openSignature) {
    return std::make_unique<CvlIniMgr>(m_file.c_str(), false, digest, false, m_kind.useEscapes);
  }
  if (vlt::hook::Strikes(hookPoint)) return nullptr;
  return std::unique_ptr<CvlIniMgr>(
      new (std::nothrow) CvlIniMgr(m_file.c_str(), false, digest, false, m_kind.useEscapes));
}

HRESULT GuardedIniFile::open(std::unique_ptr<CvlIniMgr>* out) const {
  out->reset();
  // From the sidecar on: another process may be about to mend what this one would set aside.
  std::unique_ptr<IniFileLock> hold = IniFileLock::ForFile(m_file.c_str());
  IniSidecar::Digest digest;
  IniSidecar::State state = IniSidecar::Read(m_sidecar, &digest);
  // Once more: the failure of a moment may have passed, and the answer decides whether a file is
  // set aside.
  if (state == IniSidecar::State::Unreadable) state = IniSidecar::Read(m_sidecar, &digest);
  if (state == IniSidecar::State::Unreadable) return E_FAIL;
  try {
    if (state == IniSidecar::State::Short) setAside();
    *out = create(m_kind.openPoint, state == IniSidecar::State::Present ? &digest : nullptr);
  } catch (...) {
    // Whatever it was - a digest that differs, a file that has just been set aside, a failure that
    // may have passed - the file is taken as it is now, and a failure of that counts.
    *out = create(m_kind.retryPoint, nullptr);
  }
  if (!*out) return vltReportOutOfMemory(m_kind.openSignature);
  return state == IniSidecar::State::Short ? E_FAIL : S_OK;
}

HRESULT GuardedIniFile::save(CvlIniMgr& ini) const {
  // Without the mark, a crash in the first save would leave a file that looks as if it had never
  // had a sidecar, and so looks like a whole one.
  if (!hasSidecar()) writeSidecar(IniSidecar::kInvalidMark, ini.durability());
  IniSidecar::Digest digest;
  HRESULT result = ini.WriteAndGetDigest(&digest);
  Pass(m_kind.writtenPoint);
  if (result < 0) return result;
  result = writeSidecar(digest, ini.durability());
  Pass(m_kind.sealedPoint);
  return result;
}

HRESULT GuardedIniFile::setAside() const {
  try {
    CvlIniMgr::SetAside(String(m_file.c_str()));
    return S_OK;
  } catch (const zt::fnd::osdep::OSException&) {
    // The file stays where it is, and is opened as it is.
    Trace(m_kind.refusedMessage);
    return E_FAIL;
  } catch (...) {
    // The same, for a relative path or out of memory.
    Trace(m_kind.otherFailureMessage);
    return m_kind.otherFailure;
  }
}

bool GuardedIniFile::hasSidecar() const {
  // Where that cannot be said, the mark that is written does no harm, whatever is there.
  return vlt::Attempt<std::exception>(
      [&] { return zt::fnd::osdep::path::DoesFileExist(String(m_sidecar.c_str())); });
}

HRESULT GuardedIniFile::writeSidecar(const IniSidecar::Digest& digest,
                                     IniDurability durability) const {
  // A new file whose digest is old is taken as it is by the next opening.
  return vlt::ResultOf(m_kind.otherFailure, [&] {
    return IniSidecar::Write(m_sidecar, digest, durability == IniDurability::Synced);
  });
}

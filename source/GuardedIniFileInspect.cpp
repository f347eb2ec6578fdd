// The answer of open() without its effects. The same questions are asked in the same order: the
// sidecar first, then the file with the digest that it names, then the file without one, as the
// second opening takes it. Nothing is locked, so that the answer is that of the moment.
#include <errno.h>
#include <sys/stat.h>

#include "source/DurableCopy.h"
#include "source/GuardedIniFile.h"
#include "zt/posix/Files.h"

namespace {

using Kind = GuardedIniState::Kind;
using Opening = GuardedIniState::Opening;
using Found = CvlIniMgr::Found;

bool IsOfType(const std::string& path, mode_t type) {
  struct stat info;
  return zt::posix::LookUp(path.c_str(), false).examine(&info) && (info.st_mode & S_IFMT) == type;
}

// Of a file whose digest is the expected one, or of which none is expected; `taken` is its kind
// where it can be parsed.
GuardedIniState Judge(const CvlIniMgr::Finding& finding, Kind taken) {
  switch (finding.found) {
    case Found::Readable:
      return {taken, Opening::Takes};
    case Found::Missing:
      return {Kind::Missing, Opening::Begins};
    case Found::NoIniFile:
      return {Kind::Unparsable, Opening::SetsAsideAndBegins};
    default:
      return {Kind::Unreadable, Opening::Fails, finding.error};
  }
}

// The first opening has failed over the digest. The second one expects none, and where it sets
// the file aside there is no third.
GuardedIniState JudgeChanged(const CvlIniMgr::Finding& finding, bool isMark) {
  GuardedIniState state = Judge(finding, isMark ? Kind::FirstSave : Kind::DigestDiffers);
  if (state.kind != Kind::Unparsable) return state;
  return {Kind::UnparsableChanged, Opening::SetsAsideAndFails};
}

}  // namespace

GuardedIniState GuardedIniFile::inspect() const { return inspectContents(m_file); }

GuardedIniState GuardedIniFile::inspectDatabase() const {
  GuardedIniState state = inspect();
  const std::string copy = DurableCopy::NameFor(m_file);
  bool counts = state.kind != Kind::Sound && state.opening != Opening::Fails;
  if (!counts || !IsOfType(copy, S_IFREG)) return state;
  GuardedIniState taken = inspectContents(copy);
  if (taken.opening != Opening::Takes) return taken;
  return {Kind::DurableCopy, Opening::TakesCopy};
}

// `contents`: the file, or what takes its place.
GuardedIniState GuardedIniFile::inspectContents(const std::string& contents) const {
  IniSidecar::Digest digest;
  switch (IniSidecar::Read(m_sidecar, &digest)) {
    case IniSidecar::State::Unreadable:
      return {Kind::SidecarUnreadable, Opening::Fails, errno};
    case IniSidecar::State::Short:
      return {IsOfType(m_sidecar, S_IFDIR) ? Kind::SidecarDirectory : Kind::SidecarShort,
              Opening::SetsAsideAndFails};
    case IniSidecar::State::Missing:
      return Judge(CvlIniMgr::Inspect(contents, nullptr), Kind::NoSidecar);
    case IniSidecar::State::Present:
      break;
  }
  CvlIniMgr::Finding finding = CvlIniMgr::Inspect(contents, digest.data());
  if (finding.found != Found::OtherDigest) return Judge(finding, Kind::Sound);
  return JudgeChanged(CvlIniMgr::Inspect(contents, nullptr), digest == IniSidecar::kInvalidMark);
}

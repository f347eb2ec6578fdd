// How a client reaches the one registrar of the process.
//
// One registrar a process, made by whichever thread asks first and never destroyed. Two locks guard
// it: one for vltGetRegistrar, which reads the preference, and one for the creation, which both
// entries reach. Both are AtFork::Renew: the creation waits for another process's registrar without
// limit, and a fork must not wait that long. A child that is forked in the meantime finds the
// creation interrupted and begins with its own.
#include "source/Utilities/vltRegistrarEntry.h"

#include <new>
#include <string>

#include "source/Common/vltFailure.h"
#include "source/Common/vltResultOf.h"
#include "source/Posix/vltLinuxRegistrar.h"
#include "source/Utilities/vltAllocationPoints.h"
#include "source/Utilities/vltCheck.h"
#include "source/Utilities/vltutils.h"
#include "vlloader/source/InstallLayout.h"
#include "vlloader/source/vlloader.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"
#include "zt/fnd/osdep/LeakedInstance.h"
#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/SharedLibrary.h"
#include "zt/fnd/osdep/path.h"
#include "ztcom/ztcore/ztcom.h"

using zt::fnd::String;
using zt::fnd::osdep::AtFork;
using zt::fnd::osdep::ForkSafeHold;
using zt::fnd::osdep::ForkSafeMutex;
using zt::fnd::osdep::LeakedInstance;

namespace {

// Never destroyed, like the registrar itself: other libraries ask for it from their exit handlers.
// The locks here are held while the registrar waits for other processes, so that no fork may wait
// for them in turn.
struct RegistrarGuard {
  ForkSafeMutex lock{AtFork::Renew, 10};
};

// The process-wide registrar, and the lock of its creation: two first calls would otherwise make
// two, and the second would wait for the first one's database indefinitely. Recursive, so that a
// call from inside the creation can be distinguished from one of another thread.
struct Creation {
  ForkSafeMutex lock{AtFork::Renew, 20};
  bool inProgress = false;
  IvltRegistrar* s_LinuxRegistrar = nullptr;  // with one reference that is never released
  CvltLinuxRegistrar* object = nullptr;       // the same
  zt::fnd::osdep::ProcessMark process;        // the one that made it, or went on with it last
};

// Holds the creation's lock. In a child that was forked while another thread was making the
// registrar nothing has begun: what that thread has made so far is left as it is, out of sight.
class CreationHold {
 public:
  explicit CreationHold(Creation& creation) : m_hold(creation.lock) {
    if (creation.lock.takeInterrupted()) creation.inProgress = false;
  }

 private:
  ForkSafeHold m_hold;
};

class InProgress {
 public:
  explicit InProgress(Creation& creation) : m_creation(creation) { m_creation.inProgress = true; }
  ~InProgress() { m_creation.inProgress = false; }
  InProgress(const InProgress&) = delete;
  InProgress& operator=(const InProgress&) = delete;

 private:
  Creation& m_creation;
};

bool LookUp(const char* failure, std::string* directory) {
  // The caller has a result for a failure, and nothing was begun yet.
  if (vlt::Attempt<std::exception>([&] { *directory = vlLookUpInstallDirectory(); })) return true;
  vltTraceError("%s", failure);
  return false;
}

}  // namespace

void vlPrepareRegistrarEntry() {
  LeakedInstance<RegistrarGuard>();
  LeakedInstance<Creation>();
}

HRESULT vltGetRegistrar(IvltRegistrar** out) {
  ForkSafeHold hold(LeakedInstance<RegistrarGuard>().lock);
  std::string installDirectory, dataDirectory;
  if (!LookUp("Could not get the VLT install path in vltGetRegistrar", &installDirectory) ||
      !LookUp("Could not get the VLT data path in vltGetRegistrar", &dataDirectory)) {
    return E_FAIL;
  }
  String file = vlt::layout::FileIn(String(dataDirectory.c_str()), vlt::layout::kDatabase);
  return vltGetRegistrar2(file.c_str(), String(installDirectory.c_str()).c_str(), out);
}

HRESULT vltGetRegistrar2(const wchar_t* registrationFile, const wchar_t* installDir,
                         IvltRegistrar** out) {
  if (!registrationFile) return vltGetRegistrar(out);
  if (!out) return E_POINTER;
  *out = nullptr;
  Creation& creation = LeakedInstance<Creation>();
  CreationHold hold(creation);
  // The lock is recursive, so that only the creating thread itself comes here.
  if (creation.inProgress) return E_FAIL;
  if (!creation.s_LinuxRegistrar) {
    CvltLinuxRegistrar* created = vlt::Allocate(vlt::kRegistrarPoint, [&] {
      InProgress inProgress(creation);
      return new (std::nothrow)
          CvltLinuxRegistrar(String(registrationFile), String(installDir ? installDir : L""));
    });
    if (!created) return vltReportOutOfMemory(vlt::kRegistrarPoint.signature);
    creation.object = created;
    creation.process = zt::fnd::osdep::ProcessMark::Current();
    // Last: a child that another thread forks in between finds it whole or not at all.
    created->QueryInterface(IID_IvltRegistrar,
                            reinterpret_cast<void**>(&creation.s_LinuxRegistrar));
  } else if (!creation.process.isCurrent()) {
    // A forked child has the registrar, but not its lock.
    creation.object->ContinueInThisProcess();
    creation.process = zt::fnd::osdep::ProcessMark::Current();
  }
  *out = ZtAddRef(creation.s_LinuxRegistrar);
  return S_OK;
}

HRESULT vltLoadDataDictionaries() {
  CztComPtr<IvltRegistrar> registrar;
  HRESULT result = vltGetRegistrar(registrar.out());
  if (result < 0) {
    vltTraceError("failed to get registrar");
    return result;
  }
  return vltLoadDataDictionaries2(registrar.get());
}

namespace {

void TryToLoad(const wchar_t* fileName) {
  if (!fileName) {
    vltTraceError("invalid dictionary registration, missing file path");
    return;
  }
  zt::fnd::osdep::SharedLibrary library(String(fileName), true, true);
  if (!library.isLoaded()) {
    vltTraceError("failed to load dictionary \"%s\"", zt::fnd::AnsiString(fileName).c_str());
  }
}

}  // namespace

HRESULT vltLoadDataDictionaries2(IvltRegistrar* registrar) {
  if (!registrar) return E_POINTER;
  CztComPtr<IvltEnumComponent> enumerator;
  HRESULT result = registrar->EnumComponents(vltComponentDataDictionary, enumerator.out());
  if (result < 0) return result;
  for (;;) {
    OwnedRecord record;
    unsigned int fetched = 0;
    // The end of the walk, or a failure of a foreign registrar: either ends it, and is no failure
    // of the call.
    if (enumerator->Next(1, &record, &fetched) != S_OK) return result;
    TryToLoad(record.fileName);
  }
}

HRESULT vltGetRegistrarDynamically(IvltRegistrar** out) {
  zt::fnd::osdep::SharedLibrary library(String(L"vltutils"), false, true);
  if (!library.isLoaded()) return E_FAIL;
  auto entry = reinterpret_cast<HRESULT (*)(IvltRegistrar**)>(
      library.getFunctionPointer(zt::fnd::AnsiString("vltGetRegistrar"), true));
  return entry ? entry(out) : E_FAIL;
}

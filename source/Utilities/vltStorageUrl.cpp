// Where the local server listens, and which kind of storage a name or an address is.
#include <string.h>
#include <wchar.h>

#include <atomic>
#include <memory>
#include <string>

#include "source/Common/vltResultOf.h"
#include "source/Common/vltcmn.h"
#include "source/Utilities/vltSettingsKeys.h"
#include "source/Utilities/vltjar.h"
#include "source/Utilities/vltutils.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/osdep/StringCompare.h"
#include "zt/fnd/osdep/path.h"

using zt::fnd::String;
using zt::fnd::osdep::path;
using zt::fnd::osdep::StringCaseCompare;

namespace {

// A name without a directory: the settings file of this look-up lies in the working directory,
// unlike that of the settings calls.
constexpr const wchar_t* kModulePath = L"vltutils";
constexpr const wchar_t* kLocalHost = L"127.0.0.1:";
constexpr const wchar_t* kOfflineMarker = L"VLTOFFLINESTORAGE=";

// The answer of the first call, which stays whatever the file says later; never freed. Without a
// lock, which a forked child could find held: of two first calls at once each reads the file, and
// the answer of one counts.
constinit std::atomic<const std::wstring*> s_localServer{nullptr};

// The port of the settings file; empty if the file cannot be opened.
HRESULT ReadPort(std::string* port) {
  String file = path::Join(path::DirName(String(kModulePath)), String(vlt::layout::kSettings));
  std::unique_ptr<CvlIniMgr> ini;
  // A directory that cannot be written is no reason to fail the caller otherwise.
  HRESULT result = vlt::ResultOf<int>(E_FAIL, [&] { return VltjarOpen(file.c_str(), &ini); });
  const std::string key = settings::kLocalEndpoint.key + std::to_string(settings::kDefaultIndex);
  if (ini && ini->GetItem(settings::kSection, key.c_str(), port) < 0) {
    *port = zt::fnd::AnsiString(String(settings::kLocalEndpoint.atDefaultIndex)).c_str();
  }
  return result;
}

// The answer that counts, which is this one unless another thread has settled one.
const std::wstring* Settled(const std::wstring& answer) {
  auto mine = std::make_unique<const std::wstring>(answer);
  const std::wstring* settled = nullptr;
  // On failure `settled` is the other thread's answer, which both return.
  if (s_localServer.compare_exchange_strong(settled, mine.get())) settled = mine.release();
  return settled;
}

}  // namespace

HRESULT vltGetLocalConfigurationURL(wchar_t** url) {
  if (!url) return E_FAIL;  // Not E_POINTER: callers know it so.
  HRESULT result = S_OK;
  const std::wstring* endpoint = s_localServer;
  if (!endpoint) {
    std::string port;
    result = ReadPort(&port);
    endpoint = Settled(kLocalHost + std::wstring(String(port.c_str()).c_str()));
  }
  // Its result is dropped: *url is untouched where memory is out, and the result says how the file
  // was.
  vltDuplicateString2(endpoint->c_str(), url);
  return result;
}

int vltIsDefaultStorage(const wchar_t* storage) {
  if (!storage) return 1;
  String name = path::BaseName(String(storage));
  return StringCaseCompare(name.c_str(), L"config.vlt") == 0 ||
         StringCaseCompare(name.c_str(), L"config3.vlt") == 0;
}

HRESULT vltIsOfflineStorage(const wchar_t* url, unsigned* isOffline, wchar_t** storage) {
  const wchar_t* found = url ? wcsstr(url, kOfflineMarker) : nullptr;
  if (isOffline) *isOffline = found ? 1 : 0;
  if (!found || !storage) return S_OK;
  const wchar_t* name = found + wcslen(kOfflineMarker);
  // The name ends at the next field of the address, or with it.
  const wchar_t* colon = wcschr(name, L':');
  size_t length = colon ? static_cast<size_t>(colon - name) : wcslen(name);
  auto* copy = static_cast<wchar_t*>(vltTaskMemAlloc((length + 1) * sizeof(wchar_t)));
  *storage = copy;
  if (!copy) return S_OK;  // A null name is what the caller sees of it.
  wmemcpy(copy, name, length);
  copy[length] = 0;
  return S_OK;
}

HRESULT vltGetNamedRegistrar2(const wchar_t* storage, IvltRegistrar** out) {
  if (!out) return E_POINTER;
  return vltIsDefaultStorage(storage) ? vltGetRegistrar(out) : E_FAIL;
}

HRESULT vltGetNamedRegistrar(const wchar_t* storage, IvltRegistrar** out) {
  return vltGetNamedRegistrar2(storage, out);
}

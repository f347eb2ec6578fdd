#pragma once

#include <sys/stat.h>

#include "tests/oom/Registrar.h"

// Settings, the jar, resources and files.
namespace vlt::test::oom {

inline HRESULT ClientSettings() {
  Text t[5];
  return vltGetClientSettings(3, 1, 0, nullptr, t[0].out(), t[1].out(), t[2].out(), t[3].out(),
                              t[4].out());
}

// The server's cookie as the jar has it; -1 if it cannot be read.
inline int Cookie() {
  int cookie = -1;
  vltGetServerSettings(3, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, &cookie,
                       nullptr, nullptr, 0, nullptr, nullptr, nullptr, nullptr, nullptr);
  return cookie;
}

inline HRESULT ServerSettings() {
  Text t[7];
  unsigned number;
  long longNumber;
  int cookie;
  return vltGetServerSettings(3, &number, t[0].out(), t[1].out(), t[2].out(), t[3].out(),
                              t[4].out(), t[5].out(), &cookie, t[6].out(), &longNumber, 0, nullptr,
                              &number, &number, &longNumber, &number);
}

inline HRESULT CacheSettings() {
  unsigned n[6];
  return vltGetClientCacheSettings(&n[0], &n[1], &n[2], &n[3], &n[4], &n[5], 0, nullptr);
}

// The identity is made once, and stays.
inline bool HasItsIdentity() {
  static GUID first = GUID_NULL;
  GUID now = GUID_NULL;
  if (vltGetServerIdentity(&now) < 0) return false;
  if (vltDceGuidCompare(first, GUID_NULL) == 0) first = now;
  return vltDceGuidCompare(first, now) == 0;
}

// A cookie that the jar does not have yet.
inline Call SetCookie() {
  static int s_old, s_new = 100;
  return {"vltSetServerCookie",
          [] {
            s_old = s_new++;
            return vltSetServerCookie(s_new);
          },
          [](bool succeeded) {
            int cookie = Cookie();
            return cookie == s_new || (!succeeded && cookie == s_old);
          }};
}

// The text object as a caller builds it who has only its declaration: begin, end and end of the space.
struct ForeignText {
  const wchar_t *begin, *end, *capacityEnd;
  explicit ForeignText(const std::wstring& text)
      : begin(text.data()), end(begin + text.size()), capacityEnd(end) {}
  const zt::fnd::String& asString() const {
    return *reinterpret_cast<const zt::fnd::String*>(this);
  }
};

inline HRESULT SetFileSecurity() {
  static const std::wstring tree(g_root.begin(), g_root.end());
  return vltSetFileSecurity(ForeignText(tree).asString(), 0755, true);
}

inline HRESULT StringResource(const char* separator) {
  char* text = nullptr;
  HRESULT result = vltGetStringResource(separator, L"/x/a.vle", L"BINDING_CLASSES", &text, 1024);
  if (result >= 0) vltFree(text);
  return result;
}

inline std::vector<Call> SettingsCalls() {
  return {
      {"vltGetClientSettings", ClientSettings},
      {"vltGetClientCacheSettings", CacheSettings},
      {"vltGetServerSettings", ServerSettings},
      {"vltGetServerIdentity",
       [] {
         GUID guid;
         return vltGetServerIdentity(&guid);
       },
       [](bool) { return HasItsIdentity(); }},
      SetCookie(),
      {"vltAddSvrProcessIDToJar",
       [] {
         static long id = 1;
         return vltAddSvrProcessIDToJar(L"s", ++id);
       }},
      {"vltGetLocalConfigurationURL",
       [] {
         Text url;
         return url.with(vltGetLocalConfigurationURL(url.out()));
       }},
      {"vltIsDefaultStorage", [] { return Done(vltIsDefaultStorage(L"/a/config.vlt")); }},
      {"vltIsOfflineStorage",
       [] {
         unsigned offline;
         Text storage;
         return storage.with(
             vltIsOfflineStorage(L"VLTOFFLINESTORAGE=name", &offline, storage.out()));
       }},
      {"vltGetStringResource of all", [] { return StringResource(":"); }},
      {"vltGetStringResource of the first", [] { return StringResource(nullptr); }},
      {"vltSetFileSecurity", SetFileSecurity},
  };
}

}  // namespace vlt::test::oom

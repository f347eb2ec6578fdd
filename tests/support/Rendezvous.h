#pragma once

// The shared notes of an installation - the jar and the settings file - as tests put them there and find
// them again, and the calls that write them. Only the public surface is used.

#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <map>
#include <new>
#include <string>
#include <system_error>
#include <vector>

#include "source/Utilities/vltutils.h"
#include "tests/support/BuildModule.h"
#include "tests/support/DatabaseText.h"
#include "tests/support/Installation.h"
#include "tests/support/TempDir.h"
#include "tests/support/Tracing.h"
#include "zt/fnd/Exception.h"

namespace vlt::test {

// "Section/item" to value.
using Notes = std::map<std::string, std::string>;

// The items of the file; none if it is missing or empty.
inline Notes NotesIn(const std::string& file) {
  Notes notes;
  if (!Exists(file)) return notes;
  DatabaseText text(file);
  for (const std::string& section : text.sections()) {
    for (const auto& [item, value] : text.items(section)) notes[section + "/" + item] = value;
  }
  return notes;
}

// What is in the data directory before a call.
enum class Before {
  Sealed,      // both files, each with its sidecar
  NoSidecars,  // both files alone
  Stale,       // both files were edited by hand: the digests are those of other bytes
  NoFiles,     // an empty data directory
  NoDirectory,
  ShortJarSidecar  // the jar's sidecar is too short: the jar is given up
};
inline const char* NameOf(Before before) {
  constexpr const char* kNames[] = {"sealed",   "no sidecars",  "stale sidecars",
                                    "no files", "no directory", "short sidecar"};
  return kNames[static_cast<int>(before)];
}

// The jar has notes that are found and kept.
inline bool JarIsThere(Before before) {
  return before == Before::Sealed || before == Before::NoSidecars || before == Before::Stale;
}

class RendezvousPlace {
 public:
  RendezvousPlace() { std::filesystem::create_directory(work()); }

  const std::string& root() const { return m_installation.root(); }
  std::string data() const { return root() + "/Data"; }
  std::string jar() const { return data() + "/vltjar.ini"; }
  std::string jarSidecar() const { return data() + "/vltjar.vl5"; }
  std::string settings() const { return data() + "/kor.ini"; }
  // A working directory, for the settings file of the local address.
  std::string work() const { return root() + "/Work"; }
  std::string workSettings() const { return work() + "/kor.ini"; }
  // Where the file was set aside; empty if it was not.
  std::string bad(const std::string& file) const {
    std::error_code missing;
    std::filesystem::path directory = std::filesystem::path(file).parent_path();
    for (const auto& entry : std::filesystem::directory_iterator(directory, missing)) {
      std::string path = entry.path().string();
      if (path.starts_with(file + "_") && path.ends_with(".bad")) return path;
    }
    return "";
  }

  // Everything again.
  void prepare(Before before) const {
    std::filesystem::remove_all(data());
    std::filesystem::remove_all(work());
    std::filesystem::create_directory(work());
    if (before == Before::NoDirectory) return;
    std::filesystem::create_directory(data());
    open(data());
    if (before == Before::NoFiles) return;
    put(jar(), kJar, before);
    put(settings(), kSettings, before);
    put(workSettings(), kSettings, before);
    if (before == Before::ShortJarSidecar) std::filesystem::resize_file(jarSidecar(), 15);
  }

  // Both files as `prepare` put them there; the jar without some items, so that calls that only write
  // what is missing do it.
  static constexpr const char* kJar =
      "[Server A]\nServerProcessID = 11\nByHand = kept\n\n[CookieSection]\nOther = also kept\n\n"
      "[OfflineStorageSection]\nNextEndpt = 62099\nmine = 7000\n";
  static constexpr const char* kSettings =
      "[STORAGE]\nBootstrapEndpoint3 = b\nClientObjectCacheLimit = 5\n";

 private:
  static void open(const std::string& path) {
    std::filesystem::permissions(path, std::filesystem::perms(0777));
  }
  static void put(const std::string& file, const std::string& bytes, Before before) {
    WriteBytes(file, bytes);
    open(file);
    if (before == Before::NoSidecars) return;
    std::string sidecar = file.substr(0, file.rfind('.')) + ".vl5";
    static std::map<std::string, std::string> digests;
    std::string& digest = digests[bytes];
    if (digest.empty()) digest = Bytes(Md5Sum(file));
    WriteBytes(sidecar, before == Before::Stale ? std::string(16, 'q') : digest);
    open(sidecar);
  }
  static std::string Bytes(const std::string& hex) {
    std::string bytes;
    for (size_t i = 0; i < hex.size(); i += 2) {
      bytes += static_cast<char>(std::stoi(hex.substr(i, 2), nullptr, 16));
    }
    return bytes;
  }

  Installation m_installation;
};

// The narrow text of what a call returned, which is freed.
inline std::string TakeNarrow(wchar_t* text) {
  std::string narrow;
  for (wchar_t* c = text; c && *c; ++c) narrow += static_cast<char>(*c);
  vltFree(text);
  return narrow;
}

// A port from the jar; empty when the call fails, whose result is in *result.
inline std::string AskForEndpoint(HRESULT* result, const wchar_t* storage = nullptr) {
  wchar_t* endpoint = nullptr;
  *result = vltGetClientSettings(3, 0, 1, storage, nullptr, nullptr, &endpoint, nullptr, nullptr);
  return TakeNarrow(endpoint);
}

inline HRESULT AskForCookie(int* cookie) {
  return vltGetServerSettings(3, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr,
                              cookie, nullptr, nullptr, 0, nullptr, nullptr, nullptr, nullptr,
                              nullptr);
}

// A call that writes the jar or begins a settings file.
struct WritingCall {
  const char* name;
  HRESULT (*make)();
  const char* item;          // what it leaves in the jar, if anything
  const char* value;         // ... where the jar was as `prepare` puts it
  const char* valueInEmpty;  // ... and where it was not there
  bool makesDirectory;
  bool tellsOfTheJar = true;  // its result is also that of the save
};

inline constexpr const char* kCreatedIdentity = "{00000007-0000-0000-0000-000000000000}";

inline const std::vector<WritingCall>& WritingCalls() {
  static const std::vector<WritingCall> calls = {
      {"process id", [] { return vltAddSvrProcessIDToJar(L"Server A", 4711); },
       "Server A/ServerProcessID", "4711", "4711", true},
      {"cookie", [] { return vltSetServerCookie(-17); }, "CookieSection/LastServerCookie", "-17",
       "-17", false},
      {"endpoint",
       [] {
         HRESULT result = S_OK;
         AskForEndpoint(&result);
         return result;
       },
       "OfflineStorageSection/NextEndpt", "62100", "61902", false},
      {"identity",
       [] {
         GUID id = {};
         return vltGetServerIdentity(&id);
       },
       "ServerSection/ServerIdentity", kCreatedIdentity, kCreatedIdentity, true},
      {"first cookie",
       [] {
         int cookie = 9;
         return AskForCookie(&cookie);
       },
       "CookieSection/LastServerCookie", "0", "0", true, false},
      {"settings",
       [] {
         unsigned limit = 0;
         return vltGetClientCacheSettings(&limit, nullptr, nullptr, nullptr, nullptr, nullptr, 0,
                                          nullptr);
       },
       nullptr, nullptr, nullptr, false},
      {"local address",
       [] {
         wchar_t* url = nullptr;
         HRESULT result = vltGetLocalConfigurationURL(&url);
         vltFree(url);
         return result;
       },
       nullptr, nullptr, nullptr, false}};
  return calls;
}

// A library that makes identities, the same one each time, where this environment lets the loader
// look.
class IdentityLibrary {
 public:
  IdentityLibrary() {
    BuildModule(m_dir / "libZT-RPC.so",
                "extern \"C\" int UuidCreate(unsigned* id) { id[0] = 7; return 0; }\n");
  }
  std::string directory() const { return m_dir.path(); }

 private:
  TempDir m_dir;
};

// ---- The client: the test program itself, run with two variables set. It makes one call between two
// system calls that mark it in a trace, and ends.

inline constexpr char kClientCall[] = "VLT_E2E_RENDEZVOUS";         // index into WritingCalls
inline constexpr char kClientPlace[] = "VLT_E2E_RENDEZVOUS_PLACE";  // its working directory
inline constexpr char kClientBegins[] = "/vlt-call-begins";
inline constexpr char kClientEnds[] = "/vlt-call-ends";

// How the call ended; the exit code is this, and 10 more for each descriptor it left open.
enum Outcome { kDone = 0, kFailed, kThrew, kThrewAnything, kUnready };

inline Outcome MakeCall(const WritingCall& call) {
  try {
    return call.make() < 0 ? kFailed : kDone;
  } catch (const zt::fnd::exception::Exception&) {
    return kThrew;
  } catch (const std::bad_alloc&) {
    return kThrew;
  } catch (int) {  // of a file that cannot be opened
    return kThrew;
  } catch (...) {
    return kThrewAnything;
  }
}

// To be called while the test program is loaded.
inline void ActAsRendezvousClient() {
  const char* index = getenv(kClientCall);
  if (!index) return;
  const char* place = getenv(kClientPlace);
  if (!place || chdir(place) != 0) _exit(kUnready);
  const WritingCall& call = WritingCalls().at(static_cast<size_t>(atoi(index)));
  int before = OpenDescriptors();
  access(kClientBegins, F_OK);
  Outcome outcome = MakeCall(call);
  access(kClientEnds, F_OK);
  _exit(outcome + 10 * (OpenDescriptors() - before));
}

inline Tracing RendezvousClient(size_t call, const RendezvousPlace& place,
                                const IdentityLibrary& library) {
  return Tracing({std::filesystem::read_symlink("/proc/self/exe")},
                 {{kClientCall, std::to_string(call)},
                  {kClientPlace, place.work()},
                  {"LD_LIBRARY_PATH", library.directory()}});
}

}  // namespace vlt::test

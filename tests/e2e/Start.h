#pragma once

// One start of a client against the shared library: a fresh process that asks for the registrar.

#include <sys/file.h>

#include <functional>
#include <string>

#include "source/Utilities/vltutils.h"
#include "tests/support/DatabaseText.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/RegistrarClient.h"
#include "zt/fnd/osdep/OSException.h"

namespace vlt::test {

// How the call ended: "ok", "hr 0x...", "int N", or the class of the exception with its text.
inline std::string GetRegistrar(IvltRegistrar** registrar) {
  *registrar = nullptr;
  try {
    HRESULT result = vltGetRegistrar(registrar);
    char text[32];
    snprintf(text, sizeof text, "hr 0x%08X", static_cast<unsigned>(result));
    return result == S_OK && *registrar ? "ok" : text;
  } catch (const zt::fnd::exception::InvalidArgument&) {
    return "InvalidArgument";
  } catch (const zt::fnd::exception::ObjectAlreadyExists&) {
    return "ObjectAlreadyExists";
  } catch (const zt::fnd::osdep::PosixError& error) {
    return "PosixError " + std::to_string(error.whatcode());
  } catch (const zt::fnd::exception::Exception& error) {
    return std::string("Exception ") + error.what();
  } catch (int value) {
    return "int " + std::to_string(value);
  }
}

// Starts a client whose call ends as expected; `body` runs only if it has a registrar. A failure
// shows as that of the calling test.
inline void ExpectStart(const std::string& expected,
                        const std::function<void(IvltRegistrar&)>& body = {},
                        int deadlineMs = kDeadlineMs) {
  int code = InChild(
      [&] {
        IvltRegistrar* registrar = nullptr;
        std::string outcome = GetRegistrar(&registrar);
        EXPECT_EQ(outcome, expected);
        if (registrar && body) body(*registrar);
        if (registrar) registrar->Release();
      },
      deadlineMs);
  EXPECT_EQ(code, 0);
}

inline void ExpectStart(const std::function<void(IvltRegistrar&)>& body) {
  ExpectStart("ok", body);
}

// The database is whole: it parses to sections, its sidecar is its digest, nothing was set aside.
inline void ExpectWhole(const Installation& i) {
  EXPECT_EQ(Hex(ReadBytes(i.sidecar())), Md5Sum(i.database()));
  EXPECT_EQ(RunProgram({"sh", "-c", "ls \"$1\" | grep -c '\\.bad$'", "sh", i.root()}).out, "0\n");
}

// Another process that has the registrar of the installation, as a server has it.
class Server {
 public:
  // True once it has the registrar.
  bool isReady() const { return m_held.await(); }
  pid_t pid() const { return m_child.pid(); }
  // Ends it; its exit code is 0 if all went well.
  int end() {
    m_end.notify();
    return m_child.wait();
  }

 private:
  Signal m_held, m_end;
  Child m_child{[this] {
    IvltRegistrar* registrar = nullptr;
    if (GetRegistrar(&registrar) != "ok") return 1;
    m_held.notify();
    return m_end.await() ? 0 : 2;
  }};
};

}  // namespace vlt::test

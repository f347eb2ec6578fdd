#pragma once

// Registrars for tests of the inside: made directly, without the process's one.

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Pharlap/vltPharlapRegistrar.h"
#include "source/Posix/vltLinuxRegistrar.h"
#include "tests/support/DatabaseText.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "tests/support/RegistrarClient.h"

namespace vlt::test {

// Makes accessible to tests what clients do not see.
class AccessibleLinuxRegistrar : public CvltLinuxRegistrar {
 public:
  using CvltLinuxRegistrar::CvltLinuxRegistrar;
  using CvltPharlapRegistrar::AddBindingClasses;
  using CvltPharlapRegistrar::database;
  using CvltPharlapRegistrar::isOpen;
  using CvltPharlapRegistrar::m_bindingClassesByFile;
  using CvltPharlapRegistrar::SaveChanges;
};

// The parent by itself; nothing is opened without `init`.
class AccessiblePharlapRegistrar : public CvltPharlapRegistrar {
 public:
  using CvltPharlapRegistrar::CvltPharlapRegistrar;
  using CvltPharlapRegistrar::database;
  using CvltPharlapRegistrar::SaveChanges;
};

// Holds the first reference.
template <class R>
class Started {
 public:
  template <class... Args>
  explicit Started(Args&&... args) : m_registrar(new R(std::forward<Args>(args)...)) {
    m_registrar->AddRef();
  }
  ~Started() { m_registrar->Release(); }
  Started(const Started&) = delete;
  Started& operator=(const Started&) = delete;
  R* operator->() const { return m_registrar; }
  R& operator*() const { return *m_registrar; }

 private:
  R* m_registrar;
};

inline zt::fnd::String S(const std::string& text) { return zt::fnd::String(text.c_str()); }

struct LinuxStart : Started<AccessibleLinuxRegistrar> {
  explicit LinuxStart(const Installation& i) : Started(S(i.database()), S(i.root())) {}
};

struct PharlapStart : Started<AccessiblePharlapRegistrar> {
  explicit PharlapStart(const Installation& i) : Started(S(i.database()), S(i.root()), true) {}
};

// A start that does nothing further.
inline int StartOnce(const Installation& i) {
  return InChild([&] { LinuxStart registrar(i); });
}

}  // namespace vlt::test

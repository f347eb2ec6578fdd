#include "source/Common/ZtUtils/General/ztSync.h"

namespace Toolyard {
namespace {

zt::fnd::String NameOrDefault(const wchar_t* name) {
  // All mutexes without a name are one, for every process of the machine: the file system knows no
  // file without a name.
  return zt::fnd::String(name && *name ? name : L"UNNAMED_MUTEX");
}

}  // namespace

bool CztCS::Lock(int) {
  m_section.enter();
  return true;
}

bool CztCS::Unlock() {
  m_section.leave();
  return true;
}

CztMutex::CztMutex(const wchar_t* name, bool initiallyOwned) : m_mutex(NameOrDefault(name)) {
  if (initiallyOwned) m_mutex.lock();
}

CztMutex::CztMutex(bool pumpMsgs, const wchar_t* name, bool initiallyOwned)
    : CztMutex(name, initiallyOwned) {
  m_pumpMsgs = pumpMsgs;
}

// The timeout is part of the common shape; flock has no wait with a limit.
bool CztMutex::Lock(int) {
  m_mutex.lock();
  return true;
}

bool CztMutex::Unlock() {
  m_mutex.unlock();
  return true;
}

}  // namespace Toolyard

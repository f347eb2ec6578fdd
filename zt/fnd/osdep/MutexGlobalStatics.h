#pragma once

#include <map>
#include <memory>

#include "zt/fnd/RefCounted.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/CriticalSection.h"
#include "zt/fnd/osdep/ProcessMark.h"
#include "zt/fnd/osdep/SharedObjectName.h"

namespace zt::fnd::osdep {

// What the Mutex objects of one name in this process share.
struct MutexData {
  // Mutex objects of the name; the entry goes with the last one.
  int objects = 0;
  std::unique_ptr<UnixCriticalSection> section = std::make_unique<UnixCriticalSection>();
};

// The named mutexes of this process. Each Mutex holds a reference.
//
// A forked child starts with fresh ones: the inherited ones, which a thread may have been changing
// at the fork, are never touched again.
class MutexGlobalStatics : public RefCountedThreadSafePolicy {
 public:
  using Map = std::map<String, MutexData, SharedObjectNameLess>;

  // The statics of the calling process, made where there are none.
  static RefPtr<MutexGlobalStatics> Get();

  MutexGlobalStatics();

  // Adds an object of the name, or takes one off; the last one takes the section along.
  Map::iterator attach(const String& name) EXCLUDES(section);
  void detach(Map::iterator data) EXCLUDES(section);

  const ProcessMark process;
  MutexGlobalStatics* inherited = nullptr;  // list of those that this process may not use

  // Guards the map and the hold counts of the Mutex objects; never held across a wait.
  CriticalSection section;

  // Keeps two threads of a forked child from renewing one inherited Mutex at once; the other
  // section may be entered inside.
  CriticalSection renewal;

 private:
  Map m_data GUARDED_BY(section);
};

}  // namespace zt::fnd::osdep

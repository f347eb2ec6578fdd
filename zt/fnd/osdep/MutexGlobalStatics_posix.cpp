#include "zt/fnd/osdep/MutexGlobalStatics.h"

#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/ProcessStatics.h"

namespace zt::fnd::osdep {

MutexGlobalStatics::MutexGlobalStatics() : process(ProcessMark::Current()) {}

RefPtr<MutexGlobalStatics> MutexGlobalStatics::Get() {
  return ProcessStatics<MutexGlobalStatics>::Get();
}

MutexGlobalStatics::Map::iterator MutexGlobalStatics::attach(const String& name) {
  Hold hold(section);
  Map::iterator data = m_data.try_emplace(name).first;
  // Counted inside the section that detach() takes as well: an entry goes with the last object of
  // its name, and never between the look-up of a new one and its counting.
  ++data->second.objects;
  return data;
}

void MutexGlobalStatics::detach(Map::iterator data) {
  Hold hold(section);
  if (--data->second.objects == 0) m_data.erase(data);
}

}  // namespace zt::fnd::osdep

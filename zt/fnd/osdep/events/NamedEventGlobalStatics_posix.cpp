#include "zt/fnd/osdep/events/NamedEventGlobalStatics.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/MonotonicClock.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/ProcessStatics.h"
#include "zt/fnd/osdep/Sleep.h"

namespace zt::fnd::osdep {
namespace {

// How long an event that others hold, but that cannot be joined, is tried again.
constexpr unsigned kJoinPatienceMs = 2000;

}  // namespace

NamedEventGlobalStatics::NamedEventGlobalStatics() : process(ProcessMark::Current()) {}

RefPtr<NamedEventGlobalStatics> NamedEventGlobalStatics::Get() {
  return ProcessStatics<NamedEventGlobalStatics>::Get();
}

RefPtr<SemaphoreSet> NamedEventGlobalStatics::getOrCreateSemaphoreSet(unsigned number) {
  // Held across the making of the set, files included: two objects of one number in a process would
  // lock the same state file against each other.
  Hold hold(section);
  auto found = m_sets.find(number);
  if (found != m_sets.end()) return RefPtr<SemaphoreSet>(found->second);
  RefPtr<SemaphoreSet> set(new SemaphoreSet(*this, number));
  m_sets.emplace(number, set.get());
  return set;
}

// An event can be closing while it is joined: then everything is let go, and the event opened
// again. The others must have a chance to do the same, each at its own pace.
RefPtr<EventData> NamedEventGlobalStatics::getOrCreateNamedEvent(const String& name,
                                                                 bool manualReset,
                                                                 bool initialState) {
  const uint64_t end = MonotonicTicks() + MonotonicTicksPerSecond() / 1000 * kJoinPatienceMs;
  for (unsigned attempt = 1;; ++attempt) {
    RefPtr<EventData> event = openOrFind(name, manualReset, initialState);
    if (event) return event;
    if (MonotonicTicks() >= end) ZT_RAISE(PosixError(ENOLCK));
    Sleep(1 + (static_cast<unsigned>(getpid()) + attempt) % 5);
  }
}

// Null if a joined event turned out to be closing.
RefPtr<EventData> NamedEventGlobalStatics::openOrFind(const String& name, bool manualReset,
                                                      bool initialState) {
  Hold hold(section);
  auto found = m_events.find(name);
  if (found != m_events.end()) {
    if (found->second->manualReset() != manualReset) ZT_RAISE(PosixError(EINVAL));
    return RefPtr<EventData>(found->second);
  }
  RefPtr<EventData> event(new EventData(*this, name, manualReset));
  if (!event->open(initialState)) return nullptr;
  m_events.emplace(name, event.get());
  return event;
}

void NamedEventGlobalStatics::removeSemaphoreSet(const SemaphoreSet& set) {
  Hold hold(section);
  auto found = m_sets.find(set.number());
  if (found != m_sets.end() && found->second == &set) m_sets.erase(found);
}

void NamedEventGlobalStatics::removeNamedEvent(const EventData& event) {
  Hold hold(section);
  auto found = m_events.find(event.name());
  // The entry may be a newer object of the name: this one is removed by identity.
  if (found != m_events.end() && found->second == &event) m_events.erase(found);
}

bool NamedEventGlobalStatics::hasSemaphoreSetOfId(int id) const {
  Hold hold(section);
  return std::any_of(m_sets.begin(), m_sets.end(),
                     [id](const auto& entry) { return entry.second->id() == id; });
}

void NamedEventGlobalStatics::Release(EventData& event) {
  if (event.isOfThisProcess()) {
    event.releaseInSection();
    return;
  }
  Hold hold(ProcessStatics<NamedEventGlobalStatics>::Lock());
  event.RefCountedThreadUnsafePolicy::release();
}

}  // namespace zt::fnd::osdep

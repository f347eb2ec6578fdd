// Named events over files of any bytes: the state file of a set that others hold or that this process
// has open already, the event's lock file, and a kernel set that is not what the files say.
//
// Whatever they hold, opening ends within its bounds, with an event or PosixError; the event can be set,
// awaited and closed; and no semaphore set stays behind.
#include <errno.h>
#include <fcntl.h>
#include <sched.h>
#include <sys/file.h>
#include <sys/ipc.h>
#include <sys/sem.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <memory>
#include <optional>
#include <vector>

#include "fuzz/Bytes.h"
#include "fuzz/Place.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/NamedEvent.h"
#include "zt/fnd/osdep/OSException.h"
#include "zt/fnd/osdep/events/EventStateFile.h"

// Time passes without being waited for, and fast: a sleep moves the clock that deadlines go by.
// Otherwise most of the run would be spent in the two seconds that an opening has.
namespace {

constexpr long kHaste = 16;
long g_sleptNs = 0, g_sleptSeconds = 0;

#ifdef SYS_clock_gettime64
constexpr long kGetTime = SYS_clock_gettime64;
#else
constexpr long kGetTime = SYS_clock_gettime;
#endif

}  // namespace

extern "C" __attribute__((visibility("default"))) int nanosleep(const timespec* time, timespec*) {
  for (long n = 0; n < kHaste; ++n) {
    g_sleptNs += static_cast<long>(time->tv_nsec);
    g_sleptSeconds += static_cast<long>(time->tv_sec) + g_sleptNs / 1000000000;
    g_sleptNs %= 1000000000;
  }
  return 0;
}

extern "C" __attribute__((visibility("default"))) int clock_gettime(clockid_t clock,
                                                                    timespec* now) noexcept {
  if (syscall(kGetTime, clock, now) != 0) return -1;
  if (clock != CLOCK_MONOTONIC) return 0;
  long ns = static_cast<long>(now->tv_nsec) + g_sleptNs;
  now->tv_sec += g_sleptSeconds + ns / 1000000000;
  now->tv_nsec = ns % 1000000000;
  return 0;
}

namespace {

using zt::fnd::String;
using namespace zt::fnd::osdep;

constexpr double kBoundSeconds = 9;  // of one input: two openings of two seconds each, and space

// Bits of the first byte.
constexpr uint8_t kManual = 1, kInitial = 2, kFirstOpened = 4, kHeldByOthers = 8,
                  kWithKernelSet = 16, kWithLockFile = 32, kLockFileHeld = 64, kPlantAgain = 128;
// And of the second.
constexpr uint8_t kWithRightKey = 1, kRemoveKernelSet = 2, kOnValidFile = 4, kTimedWait = 8;

// The shared place of the run, and a name space of its own for semaphore sets where that is allowed.
struct EventsPlace : fuzz::Place {
  EventsPlace() : ownIpc(unshare(CLONE_NEWIPC) == 0) {
    setenv("ZTFNDTMPSHAREDFILEDIR", base.c_str(), 1);
    std::filesystem::create_directories(base + "/namedEvent");
  }
  std::string file(const std::string& name) const { return base + "/namedEvent/" + name; }

  std::vector<std::string> stateFiles() const {
    std::vector<std::string> found;
    for (const auto& entry : std::filesystem::directory_iterator(base + "/namedEvent")) {
      if (entry.path().filename().string().starts_with("sem_")) found.push_back(entry.path());
    }
    return found;
  }
  void clear() const {
    for (const auto& entry : std::filesystem::directory_iterator(base + "/namedEvent")) {
      std::filesystem::remove(entry.path());
    }
  }

  const bool ownIpc;
};

// A file that another process has open, and shares.
class Holder {
 public:
  explicit Holder(const std::string& file) : m_fd(open(file.c_str(), O_RDWR | O_CLOEXEC)) {
    fuzz::Demand(m_fd >= 0 && flock(m_fd, LOCK_SH) == 0);
  }
  ~Holder() { close(m_fd); }
  Holder(const Holder&) = delete;
  Holder& operator=(const Holder&) = delete;

 private:
  int m_fd;
};

int SetOfKey(key_t key) { return key == -1 ? -1 : semget(key, 0, 0); }

void RemoveSet(int id) {
  if (id != -1) semctl(id, 0, IPC_RMID);
}

int CountSets() {
  seminfo info = {};
  semctl(0, 0, SEM_INFO, &info);
  return info.semusz;
}

double Now() {
  timespec t;
  clock_gettime(CLOCK_MONOTONIC, &t);
  return static_cast<double>(t.tv_sec) + 1e-9 * static_cast<double>(t.tv_nsec);
}

// What the input asks for.
struct Plan {
  uint8_t what, how, kernelSlots;
  std::string lockFile, stateFile;

  explicit Plan(fuzz::Cursor input)
      : what(input.byte()),
        how(input.byte()),
        kernelSlots(input.byte()),
        lockFile(input.text(EventPlace::kSize)),
        stateFile(input.rest()) {}
  bool has(uint8_t bit) const { return what & bit; }
  bool does(uint8_t bit) const { return how & bit; }
  // An opening that finds nothing to join begins again some hundred times, so not each input may ask for
  // one.
  bool holdsLockFile() const { return has(kLockFileHeld) && kernelSlots % 16 == 15; }
};

// The planted bytes, alone or over the begin of a good file, and with the key that only a writer on
// this very file system can know.
std::string StateBytes(const Plan& plan, const std::string& lockFile) {
  std::string bytes = plan.stateFile;
  if (plan.does(kOnValidFile)) {
    StateFileBytes good = EncodeEmptySet();
    good[SetHeader::kReadyOffset] = 1;
    std::string whole(good.begin(), good.end());
    bytes.resize(std::min(bytes.size(), whole.size()));
    bytes += whole.substr(bytes.size());
  }
  key_t key = ftok(lockFile.c_str(), 1);
  if (plan.does(kWithRightKey) && key != -1 && plan.lockFile.size() == 9) {
    uint32_t slot;
    memcpy(&slot, &plan.lockFile[5], sizeof slot);
    SlotRecord::Bytes record = SlotRecord{true, plan.has(kManual), key}.encode();
    if (slot < kSlotsPerSet && SlotRecord::Offset(slot) + record.size() <= bytes.size()) {
      memcpy(&bytes[static_cast<size_t>(SlotRecord::Offset(slot))], record.data(), record.size());
    }
  }
  return bytes;
}

// Over the file that is there, as any user may write: the inode stays.
void Plant(const std::string& file, const std::string& bytes) { fuzz::WriteFile(file, bytes); }

// Runs what may fail as any system call may.
template <class Step>
bool Tried(Step step) {
  try {
    step();
    return true;
  } catch (const PosixError&) {
    return false;
  }
}

using EventPtr = std::unique_ptr<NamedEvent>;

EventPtr Open(const char* name, bool manual, bool initial) {
  EventPtr event;
  Tried([&] { event = std::make_unique<NamedEvent>(String(name), manual, initial); });
  return event;
}

void Use(NamedEvent& event, bool timedWait) {
  Tried([&] { event.checkOnly(); });
  Tried([&] { event.reset(); });
  if (timedWait) Tried([&] { event.wait(3u); });
  Tried([&] { event.set(); });
  Tried([&] { event.wait(1u); });
  Tried([&] { event.check(); });
}

// One run, up to the close of everything this process has. The holders go first: whoever stays would
// keep the set with right.
void Run(const EventsPlace& place, const Plan& plan) {
  std::string state = place.file("sem_1"), lock = place.file("b");
  EventPtr first;
  if (plan.has(kFirstOpened)) first = Open("a", plan.kernelSlots & 1, true);
  if (plan.has(kWithLockFile)) Plant(lock, plan.lockFile);
  if (plan.has(kHeldByOthers) || first) Plant(state, StateBytes(plan, lock));
  std::optional<Holder> stateHolder, lockHolder;
  if (plan.has(kHeldByOthers)) stateHolder.emplace(state);
  if (plan.holdsLockFile() && std::filesystem::exists(lock)) lockHolder.emplace(lock);
  if (plan.has(kWithKernelSet) && std::filesystem::exists(state)) {
    semget(ftok(state.c_str(), 1), plan.kernelSlots + 1, IPC_CREAT | 0600);
  }
  if (plan.does(kRemoveKernelSet)) RemoveSet(SetOfKey(ftok(state.c_str(), 1)));
  EventPtr event = Open("b", plan.has(kManual), plan.has(kInitial));
  if (!event && !plan.has(kWithLockFile)) fuzz::Demand(!std::filesystem::exists(lock));
  if (first) Use(*first, plan.does(kTimedWait));
  if (event) Use(*event, plan.does(kTimedWait));
  if (plan.has(kPlantAgain) && std::filesystem::exists(state)) {
    Plant(state, StateBytes(plan, lock));
  }
  lockHolder.reset();
  stateHolder.reset();
  bool opened = event != nullptr;
  event.reset();
  first.reset();
  if (opened) fuzz::Demand(!std::filesystem::exists(lock));
}

// Sets that lead nowhere now: the planted one is this program's own, and any other is a finding.
void DemandNoSets(const EventsPlace& place, const std::vector<key_t>& planted) {
  for (key_t key : planted) RemoveSet(SetOfKey(key));
  for (const std::string& file : place.stateFiles()) {
    fuzz::Demand(SetOfKey(ftok(file.c_str(), 1)) == -1);
  }
  if (place.ownIpc) fuzz::Demand(CountSets() == 0);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  static EventsPlace place;
  Plan plan{fuzz::Cursor(data, sizeBytes)};
  double begin = Now();
  std::vector<key_t> planted;
  Run(place, plan);
  if (plan.has(kWithKernelSet) && std::filesystem::exists(place.file("sem_1"))) {
    planted.push_back(ftok(place.file("sem_1").c_str(), 1));
  }
  DemandNoSets(place, planted);
  fuzz::Demand(Now() - begin < kBoundSeconds);
  place.clear();
  return 0;
}

// Opens a guarded file and a sidecar of any bytes: the first byte says how many belong to the sidecar.
// Whatever they hold, the file can be opened, changed, saved, and opened again with what was saved.
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <memory>

#include "fuzz/Place.h"
#include "source/Utilities/vltjar.h"

namespace {

struct GuardedPlace : fuzz::Place {
  GuardedPlace() { setenv("ZTFNDTMPSHAREDFILEDIR", (*this / "shared").c_str(), 1); }

  const std::string file = *this / "x.ini", sidecar = *this / "x.vl5";
  const std::wstring wide = {file.begin(), file.end()};
};

// Damage below a digest that differs is raised once: the digest comes first, and the file is set aside
// by the second check of it. The next opening begins it again.
std::unique_ptr<CvlIniMgr> Open(const GuardedPlace& place) {
  std::unique_ptr<CvlIniMgr> ini;
  try {
    VltjarOpen(place.wide.c_str(), &ini);
  } catch (int raised) {
    fuzz::Demand(raised == 1 && !std::filesystem::exists(place.file));
    VltjarOpen(place.wide.c_str(), &ini);
  }
  fuzz::Demand(static_cast<bool>(ini));
  return ini;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  static GuardedPlace place;
  if (sizeBytes == 0) return 0;
  size_t sidecarSize = std::min<size_t>(data[0] % 20, sizeBytes - 1);
  std::filesystem::remove(place.sidecar);
  if (sidecarSize > 0) fuzz::WriteFile(place.sidecar, fuzz::Text(data + 1, sidecarSize));
  fuzz::WriteFile(place.file, fuzz::Text(data + 1 + sidecarSize, sizeBytes - 1 - sidecarSize));
  {
    std::unique_ptr<CvlIniMgr> ini = Open(place);
    fuzz::Demand(ini->SetItem("fuzz section", "item", "value", true) == S_OK);
    fuzz::Demand(VltjarSaveChanges(place.wide.c_str(), ini.get()) == S_OK);
  }
  std::unique_ptr<CvlIniMgr> ini;
  fuzz::Demand(VltjarOpen(place.wide.c_str(), &ini) == S_OK && ini);
  std::string value;
  fuzz::Demand(ini->GetItem("fuzz section", "item", &value) == S_OK && value == "value");
  return 0;
}

// Opens a guarded file and a sidecar of any bytes: the first byte tells how many belong to the sidecar.
// Whatever they hold, the file can be opened, changed, saved, and opened again with what was saved.
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <memory>

#include "fuzz/Input.h"
#include "source/Utilities/vltjar.h"

namespace {

struct Place {
  Place() {
    char pattern[] = "/tmp/vltfuzz.XXXXXX";
    base = mkdtemp(pattern);
    setenv("ZTFNDTMPSHAREDFILEDIR", (base + "/shared").c_str(), 1);
    file = base + "/x.ini";
    sidecar = base + "/x.vl5";
    wide = std::wstring(file.begin(), file.end());
  }
  ~Place() { std::filesystem::remove_all(base); }
  std::string base, file, sidecar;
  std::wstring wide;
};

void Write(const std::string& file, const std::string& bytes) {
  std::ofstream(file, std::ios::binary | std::ios::trunc) << bytes;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  static Place place;
  if (sizeBytes == 0) return 0;
  size_t sidecarSize = std::min<size_t>(data[0] % 20, sizeBytes - 1);
  std::filesystem::remove(place.sidecar);
  if (sidecarSize > 0) Write(place.sidecar, fuzz::Text(data + 1, sidecarSize));
  Write(place.file, fuzz::Text(data + 1 + sidecarSize, sizeBytes - 1 - sidecarSize));
  {
    std::unique_ptr<CvlIniMgr> ini;
    VltjarOpen(place.wide.c_str(), &ini);
    fuzz::Demand(static_cast<bool>(ini));
    fuzz::Demand(ini->SetItem("fuzz section", "item", "value", true) == S_OK);
    fuzz::Demand(VltjarSaveChanges(place.wide.c_str(), ini.get()) == S_OK);
  }
  std::unique_ptr<CvlIniMgr> ini;
  fuzz::Demand(VltjarOpen(place.wide.c_str(), &ini) == S_OK && ini);
  std::string value;
  fuzz::Demand(ini->GetItem("fuzz section", "item", &value) == S_OK && value == "value");
  return 0;
}

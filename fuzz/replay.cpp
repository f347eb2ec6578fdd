// Runs one fuzz target over the files of a directory: the corpus as a test, in every build. Fails when
// the directory holds none, since that would test nothing.
//
//   fuzz_replay TARGET DIRECTORY
#include <stdio.h>

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <string>

#define VLT_FUZZ_TARGET(topic) extern "C" int Fuzz_##topic(const uint8_t* data, size_t sizeBytes);
#include "fuzz_targets.inc"
#undef VLT_FUZZ_TARGET

namespace {

using Target = int (*)(const uint8_t* data, size_t sizeBytes);

const std::map<std::string, Target> kTargets = {
#define VLT_FUZZ_TARGET(topic) {#topic, Fuzz_##topic},
#include "fuzz_targets.inc"
#undef VLT_FUZZ_TARGET
};

int Replay(Target target, const char* directory) {
  int replayed = 0;
  for (const auto& entry : std::filesystem::directory_iterator(directory)) {
    std::ifstream file(entry.path(), std::ios::binary);
    std::string bytes(std::istreambuf_iterator<char>(file), {});
    target(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size());
    ++replayed;
  }
  return replayed;
}

}  // namespace

int main(int argc, char** argv) {
  auto target = argc == 3 ? kTargets.find(argv[1]) : kTargets.end();
  if (target == kTargets.end()) {
    fprintf(stderr, "usage: fuzz_replay TARGET DIRECTORY\n");
    return 2;
  }
  int replayed = Replay(target->second, argv[2]);
  printf("%d inputs\n", replayed);
  return replayed > 0 ? 0 : 1;
}

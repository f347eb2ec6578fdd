// First and second start of the registrar with 10 to 3,000 bundles, and its answers from memory.
// Beside the starts is the least that any scan does: opendir, and one stat a bundle.
#include <benchmark/benchmark.h>
#include <dirent.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "bench/Installation.h"
#include "source/Utilities/vltutils.h"
#include "vlloader/source/vlloader.h"
#include "ztcom/ztcore/ztcom.h"

namespace {

namespace fs = std::filesystem;
using bench::Id;

// The places of this run, made before anything of the library looks at them. The library reads the
// install directory once a process, so all sizes share one root and fill it again.
struct Places {
  Places() {
    char pattern[] = "/tmp/vltbench.XXXXXX";
    base = mkdtemp(pattern);
    root = base + "/KOR";
    fs::create_directories(base + "/config");
    std::ofstream(base + "/config/com.zentrex.kor.ini") << "[Preferences]\nDir = " << root << "\n";
    setenv("XDG_CONFIG_HOME", (base + "/config").c_str(), 1);
    setenv("HOME", base.c_str(), 1);
    setenv("ZTFNDTMPSHAREDFILEDIR", (base + "/shared").c_str(), 1);
  }
  ~Places() { fs::remove_all(base); }
  std::string base, root;
};

Places& ThePlaces() {
  static Places places;
  return places;
}

void Install(unsigned bundles, unsigned componentsEach = 1) {
  bench::Install(ThePlaces().root, bundles, componentsEach);
}

CztComPtr<IvltRegistrar> Start() { return bench::Start(ThePlaces().root); }

void FirstStart(benchmark::State& state) {
  Install(static_cast<unsigned>(state.range(0)));
  for (auto _ : state) {
    state.PauseTiming();
    fs::remove(ThePlaces().root + "/vlt.vlr");
    fs::remove(ThePlaces().root + "/vlt.vl5");
    state.ResumeTiming();
    benchmark::DoNotOptimize(Start());
  }
}
BENCHMARK(FirstStart)->Arg(10)->Arg(100)->Arg(1000)->Arg(3000)->Unit(benchmark::kMillisecond);

void SecondStart(benchmark::State& state) {
  Install(static_cast<unsigned>(state.range(0)));
  Start();
  for (auto _ : state) benchmark::DoNotOptimize(Start());
}
BENCHMARK(SecondStart)->Arg(10)->Arg(100)->Arg(1000)->Arg(3000)->Unit(benchmark::kMillisecond);

void BareScan(benchmark::State& state) {
  Install(static_cast<unsigned>(state.range(0)));
  std::string experts = ThePlaces().root + "/Experts";
  for (auto _ : state) {
    DIR* directory = opendir(experts.c_str());
    while (dirent* entry = readdir(directory)) {
      struct stat info;
      std::string file = experts + "/" + entry->d_name + "/Resources/Info.vlr";
      benchmark::DoNotOptimize(stat(file.c_str(), &info));
    }
    closedir(directory);
  }
}
BENCHMARK(BareScan)->Arg(10)->Arg(100)->Arg(1000)->Arg(3000)->Unit(benchmark::kMillisecond);

constexpr unsigned kComponentsEach = 100;

void GetComponent(benchmark::State& state) {
  auto components = static_cast<unsigned>(state.range(0));
  Install(components / kComponentsEach, kComponentsEach);
  auto registrar = Start();
  unsigned n = 0;
  for (auto _ : state) {
    _vltComponent2 record;
    if (registrar->GetComponent(Id(n), &record) != S_OK) state.SkipWithError("not found");
    vltutilsFreeComponent2(record);
    n = (n + 7919) % components;
  }
}
BENCHMARK(GetComponent)->Arg(1000)->Arg(10000);

void EnumeratorStep(benchmark::State& state) {
  auto components = static_cast<unsigned>(state.range(0));
  Install(components / kComponentsEach, kComponentsEach);
  auto registrar = Start();
  CztComPtr<IvltEnumComponent> enumerator;
  registrar->EnumComponents(vltComponentObjectExpert, enumerator.out());
  for (auto _ : state) {
    _vltComponent2 record;
    unsigned fetched = 0;
    if (enumerator->Next(1, &record, &fetched) == S_OK) {
      vltutilsFreeComponent2(record);
    } else {
      enumerator->Reset();
    }
  }
}
BENCHMARK(EnumeratorStep)->Arg(1000)->Arg(10000);

void MapLookUp(benchmark::State& state) {
  std::map<GUID, std::wstring> map;
  auto components = static_cast<unsigned>(state.range(0));
  for (unsigned n = 0; n < components; ++n) map[Id(n)] = L"Expert";
  unsigned n = 0;
  for (auto _ : state) {
    std::wstring copy = map.find(Id(n))->second, second = copy;
    benchmark::DoNotOptimize(second);
    n = (n + 7919) % components;
  }
}
BENCHMARK(MapLookUp)->Arg(1000)->Arg(10000);

}  // namespace

int main(int argc, char** argv) {
  ThePlaces();
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  return 0;
}

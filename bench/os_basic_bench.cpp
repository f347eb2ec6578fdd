// The named mutex beside a bare flock on an open descriptor, and the listing of a directory beside
// opendir and readdir, each pair in one run.
#include <benchmark/benchmark.h>
#include <dirent.h>
#include <fcntl.h>
#include <stdlib.h>
#include <sys/file.h>
#include <unistd.h>

#include <filesystem>
#include <mutex>
#include <string>

#include "bench/Place.h"
#include "zt/fnd/AutoBuffer.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/CriticalSection.h"
#include "zt/fnd/osdep/FindFiles.h"
#include "zt/fnd/osdep/Hold.h"
#include "zt/fnd/osdep/Mutex.h"

namespace {

using namespace zt::fnd;
using namespace zt::fnd::osdep;

int OpenOrAbort(const std::string& path) {
  int fd = open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  if (fd < 0) abort();
  return fd;
}

void BareFlock(benchmark::State& state) {
  int fd = OpenOrAbort(ThePlace().path() + "/bare");
  for (auto _ : state) {
    if (flock(fd, LOCK_EX) != 0 || flock(fd, LOCK_UN) != 0) abort();
  }
  close(fd);
}
BENCHMARK(BareFlock);

void MutexLockUnlock(benchmark::State& state) {
  ThePlace();
  Mutex mutex{String(L"bench")};
  for (auto _ : state) {
    mutex.lock();
    mutex.unlock();
  }
}
BENCHMARK(MutexLockUnlock);

void MutexRelockUnlock(benchmark::State& state) {
  ThePlace();
  Mutex mutex{String(L"bench")};
  mutex.lock();
  for (auto _ : state) {
    mutex.lock();
    mutex.unlock();
  }
  mutex.unlock();
}
BENCHMARK(MutexRelockUnlock);

void BareOpenFlockClose(benchmark::State& state) {
  std::string path = ThePlace().path() + "/bare";
  for (auto _ : state) {
    int fd = OpenOrAbort(path);
    if (flock(fd, LOCK_EX) != 0 || flock(fd, LOCK_UN) != 0) abort();
    close(fd);
  }
}
BENCHMARK(BareOpenFlockClose);

void MutexConstructLockUnlockDestroy(benchmark::State& state) {
  ThePlace();
  String name(L"bench");
  for (auto _ : state) {
    Mutex mutex(name);
    mutex.lock();
    mutex.unlock();
  }
}
BENCHMARK(MutexConstructLockUnlockDestroy);

void RecursiveMutexOfTheLibrary(benchmark::State& state) {
  std::recursive_mutex mutex;
  for (auto _ : state) {
    std::lock_guard<std::recursive_mutex> guard(mutex);
    benchmark::ClobberMemory();
  }
}
BENCHMARK(RecursiveMutexOfTheLibrary);

void CriticalSectionEnterLeave(benchmark::State& state) {
  CriticalSection section;
  for (auto _ : state) {
    Hold hold(section);
    benchmark::ClobberMemory();
  }
}
BENCHMARK(CriticalSectionEnterLeave);

// A directory with that many files.
std::string Populated(int64_t files) {
  std::string dir = ThePlace().path() + "/files" + std::to_string(files);
  if (std::filesystem::create_directory(dir)) {
    for (int64_t i = 0; i < files; ++i) close(OpenOrAbort(dir + "/file" + std::to_string(i)));
  }
  return dir;
}

void BareReaddir(benchmark::State& state) {
  std::string path = Populated(state.range(0));
  for (auto _ : state) {
    DIR* dir = opendir(path.c_str());
    int64_t count = 0;
    while (readdir(dir)) ++count;
    closedir(dir);
    benchmark::DoNotOptimize(count);
  }
}
BENCHMARK(BareReaddir)->Arg(100)->Arg(10000);

void FindFilesStar(benchmark::State& state) {
  String mask = String(Populated(state.range(0)).c_str()) + L"/*";
  for (auto _ : state) {
    Vector<String> found = FindFiles().getFilenames(mask);
    if (found.size() != state.range(0)) abort();
  }
}
BENCHMARK(FindFilesStar)->Arg(100)->Arg(10000);

void StringAppend100(benchmark::State& state) {
  const std::string piece(100, 'x');
  for (auto _ : state) {
    std::string text;
    for (int64_t i = 0; i < state.range(0); ++i) text.append(piece);
    benchmark::DoNotOptimize(text.data());
  }
}
BENCHMARK(StringAppend100)->Arg(1000)->Arg(10000);

void AutoBufferAppend100(benchmark::State& state) {
  const std::string piece(100, 'x');
  for (auto _ : state) {
    AutoBuffer buffer;
    for (int64_t i = 0; i < state.range(0); ++i) buffer.Append(piece.data(), 100);
    benchmark::DoNotOptimize(buffer.Data());
  }
}
BENCHMARK(AutoBufferAppend100)->Arg(1000)->Arg(10000);

}  // namespace

BENCHMARK_MAIN();

// How the registrar's times and memory grow with the number of bundles. Arguments: the numbers. Prints a
// line of comma-separated values for each; bench/growth/plot makes the picture and the exponents of them.
//
// Each figure is taken in a process of its own, so that none inherits the heap of another: times are
// medians of some runs, memory is what the kernel says of the process.
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <functional>
#include <vector>

#include "bench/Installation.h"
#include "bench/Place.h"
#include "source/Common/vltcmn.h"

namespace {

constexpr int kRounds = 5;
constexpr unsigned kAnswers = 100000;

[[noreturn]] void Fail(const char* what) {
  perror(what);
  exit(1);
}

double Now() {
  timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<double>(now.tv_sec) * 1e3 + static_cast<double>(now.tv_nsec) / 1e6;
}

// Milliseconds, the median of some rounds.
double Timed(int rounds, const std::function<void()>& job) {
  std::vector<double> times;
  for (int round = 0; round < rounds; ++round) {
    double begin = Now();
    job();
    times.push_back(Now() - begin);
  }
  std::nth_element(times.begin(), times.begin() + rounds / 2, times.end());
  return times[static_cast<size_t>(rounds / 2)];
}

// A figure that a child process finds.
double InChild(const std::function<double()>& figure) {
  int ends[2];
  if (pipe2(ends, O_CLOEXEC) != 0) Fail("pipe2");
  pid_t child = fork();
  if (child < 0) Fail("fork");
  double result = 0;
  if (child == 0) {
    result = figure();
    _exit(write(ends[1], &result, sizeof result) == sizeof result ? 0 : 1);
  }
  close(ends[1]);
  ssize_t count = read(ends[0], &result, sizeof result);
  close(ends[0]);
  int status = -1;
  if (waitpid(child, &status, 0) != child || status != 0 || count != sizeof result)
    Fail("a figure");
  return result;
}

// A line of /proc/self/status, in KiB.
double StatusKib(const std::string& name) {
  std::ifstream status("/proc/self/status");
  for (std::string word; status >> word;) {
    double kib = 0;
    if (word == name + ":" && status >> kib) return kib;
  }
  Fail("/proc/self/status");
}

double OfAnswers(const std::string& root, unsigned components) {
  CztComPtr<IvltRegistrar> registrar = bench::Start(root);
  unsigned n = 0;
  auto ask = [&] {
    for (unsigned k = 0; k < kAnswers; ++k) {
      _vltComponent2 record;
      if (registrar->GetComponent(bench::Id(n), &record) != S_OK) Fail("GetComponent");
      vltFreeComponent2(record);
      n = (n + 7919) % components;
    }
  };
  return Timed(kRounds, ask) / kAnswers;
}

double OfEnumeration(const std::string& root, unsigned components) {
  CztComPtr<IvltRegistrar> registrar = bench::Start(root);
  return Timed(kRounds, [&] {
    CztComPtr<IvltEnumComponent> all;
    registrar->EnumComponents(vltComponentObjectExpert, all.out());
    unsigned count = 0;
    _vltComponent2 record;
    for (unsigned fetched = 0; all->Next(1, &record, &fetched) == S_OK; ++count) {
      vltFreeComponent2(record);
    }
    if (count != components) Fail("EnumComponents");
  });
}

double OfListing(const std::string& root) {
  std::string command =
      (std::filesystem::read_symlink("/proc/self/exe").parent_path() / "vltctl").string();
  command += " list --root '" + root + "' >/dev/null";
  return Timed(kRounds, [&] {
    if (system(command.c_str()) != 0) Fail("vltctl list");
  });
}

void Print(const std::string& root, unsigned bundles) {
  bench::Install(root, bundles);
  auto start = [&] { bench::Start(root); };
  double first = InChild([&] { return Timed(1, start); });
  double second = InChild([&] { return Timed(kRounds, start); });
  double get = InChild([&] { return OfAnswers(root, bundles); });
  double enumeration = InChild([&] { return OfEnumeration(root, bundles); });
  double listing = OfListing(root);
  auto memory = [&](const char* name) {
    double empty = InChild([&] { return StatusKib(name); });
    return InChild([&] {
             CztComPtr<IvltRegistrar> registrar = bench::Start(root);
             return StatusKib(name);
           }) -
           empty;
  };
  double resident = memory("VmRSS"), peak = memory("VmHWM");
  double database = static_cast<double>(std::filesystem::file_size(root + "/vlt.vlr")) / 1024;
  printf("%u,%.3f,%.3f,%.6f,%.3f,%.3f,%.0f,%.0f,%.0f\n", bundles, first, second, get, enumeration,
         listing, resident, peak, database);
  fflush(stdout);
}

}  // namespace

int main(int argc, char** argv) {
  const std::string root = ThePlace().path() + "/KOR", config = ThePlace().path() + "/config";
  std::filesystem::create_directories(config);
  std::ofstream(config + "/com.zentrex.kor.ini") << "[Preferences]\nDir = " << root << "\n";
  setenv("XDG_CONFIG_HOME", config.c_str(), 1);
  puts(
      "bundles,first start,second start,GetComponent,EnumComponents,vltctl list,RSS,peak,database");
  fflush(stdout);
  for (int i = 1; i < argc; ++i) Print(root, static_cast<unsigned>(atoi(argv[i])));
}

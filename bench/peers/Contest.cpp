#include "bench/peers/Contest.h"

#include <stdio.h>
#include <stdlib.h>

#include <algorithm>
#include <chrono>

namespace peers {
namespace {

using Clock = std::chrono::steady_clock;
using Job = std::function<void()>;

constexpr double kShortestRun = 0.004;  // seconds

double TimeOf(const Job& job, int repeats) {
  auto begin = Clock::now();
  for (int i = 0; i < repeats; ++i) job();
  return std::chrono::duration<double>(Clock::now() - begin).count() / repeats;
}

struct Competitor {
  const Job& job;
  int repeats = 1;
  std::vector<double> times = {};
};

int RepeatsFor(const Job& job) {
  double once = TimeOf(job, 1);
  int repeats = 1;
  while (once * repeats < kShortestRun && repeats < 1 << 22) {
    repeats *= 2;
    once = TimeOf(job, repeats);
  }
  return repeats;
}

double Quantile(std::vector<double> values, double q) {
  std::sort(values.begin(), values.end());
  double position = q * static_cast<double>(values.size() - 1);
  auto low = static_cast<size_t>(position);
  size_t high = std::min(low + 1, values.size() - 1);
  return values[low] + (position - static_cast<double>(low)) * (values[high] - values[low]);
}

std::string Seconds(double seconds) {
  const char* units[] = {"s", "ms", "us", "ns"};
  int unit = 0;
  while (seconds < 1 && unit < 3) {
    seconds *= 1000;
    ++unit;
  }
  char text[32];
  snprintf(text, sizeof text, "%.3g %s", seconds, units[unit]);
  return text;
}

void Print(const Contest& contest, const Rival& rival, const std::vector<double>& ours,
           const std::vector<double>& theirs) {
  std::vector<double> ratios;
  for (size_t i = 0; i < ours.size(); ++i) ratios.push_back(ours[i] / theirs[i]);
  double ratio = Quantile(ratios, 0.5);
  const char* verdict = rival.aim == 0 ? "" : ratio <= rival.aim ? "met" : "NOT met";
  char aim[16] = "-";
  if (rival.aim != 0) snprintf(aim, sizeof aim, "%.2f", rival.aim);
  printf("%-4s %-46s %-24s %9s %9s  %5.2f [%4.2f, %4.2f]  %5s  %s\n", contest.row.c_str(),
         contest.job.c_str(), rival.name.c_str(), Seconds(Quantile(ours, 0.5)).c_str(),
         Seconds(Quantile(theirs, 0.5)).c_str(), ratio, Quantile(ratios, 0.25),
         Quantile(ratios, 0.75), aim, verdict);
  fflush(stdout);
}

}  // namespace

void PrintHead() {
  printf("%-4s %-46s %-24s %9s %9s  %-18s  %5s\n", "row", "job", "beside", "ours", "theirs",
         "ratio [quartiles]", "aim");
}

void Run(const Contest& contest) {
  std::vector<Competitor> all;
  all.push_back({contest.ours});
  for (const Rival& rival : contest.rivals) all.push_back({rival.job});
  if (!contest.prepare) {
    for (Competitor& competitor : all) competitor.repeats = RepeatsFor(competitor.job);
  }
  for (int round = 0; round < contest.rounds; ++round) {
    for (Competitor& competitor : all) {
      if (contest.prepare) contest.prepare();
      competitor.times.push_back(TimeOf(competitor.job, competitor.repeats));
    }
  }
  for (size_t i = 0; i < contest.rivals.size(); ++i) {
    Print(contest, contest.rivals[i], all[0].times, all[i + 1].times);
  }
}

void Fail(const char* what) {
  fprintf(stderr, "peers: %s\n", what);
  exit(1);
}

}  // namespace peers

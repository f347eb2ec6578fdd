// vlt_storm: processes that use named events and mutexes while others of them are killed.
#include <cstdio>
#include <exception>

#include <CLI/CLI.hpp>

#include "tools/storm/EventStorm.h"
#include "tools/storm/EventWorker.h"
#include "tools/storm/MutexDeath.h"

int main(int argc, char** argv) {
  CLI::App app("Storms over named events and mutexes. Exit code 0: nothing was lost.");
  app.require_subcommand(1);
  storm::EventStormSize size;
  CLI::App* events = app.add_subcommand("events", "open, set, wait, close under kill -9");
  events->add_option("--processes", size.processes)->check(CLI::Range(1u, storm::kMaxProcesses));
  events->add_option("--rounds", size.rounds);
  events->add_option("--names", size.names)->check(CLI::Range(1u, storm::kMaxNames));
  events->add_option("--kills", size.kills);
  events->add_option("--held", size.held)->check(CLI::Range(1u, 1000u));
  events->add_flag("!--no-ping-pong", size.pingPong);
  events->add_option("--seed", size.seed);
  events->add_flag("--machine-semaphores", size.machineSemaphores);
  unsigned kills = 10000;
  CLI::App* mutex = app.add_subcommand("mutex", "kill holders whose children live on");
  mutex->add_option("--kills", kills);
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    return app.exit(e) == 0 ? 0 : 2;
  }
  try {
    bool good = *events ? storm::RunEventStorm(size) : storm::RunMutexDeath(kills);
    return good ? 0 : 1;
  } catch (const std::exception& e) {
    fprintf(stderr, "%s\n", e.what());
    return 1;
  }
}

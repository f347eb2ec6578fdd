// Prints the table of docs/performance.md. Arguments: ini, foundation, system, registrar; all without one.
#include <locale.h>
#include <stdio.h>
#include <string.h>
#include <sys/wait.h>
#include <unistd.h>

#include "bench/peers/Contest.h"
#include "bench/peers/Parts.h"

namespace {

// In a process of its own: what the rows of one field leave of their heap must not slow down those
// of the next.
void RunApart(void (*run)()) {
  fflush(stdout);
  const pid_t child = fork();
  peers::Require(child >= 0, "fork");
  if (child == 0) {
    run();
    fflush(stdout);
    _exit(0);
  }
  int status = -1;
  peers::Require(waitpid(child, &status, 0) == child && status == 0, "a field did not end well");
}

}  // namespace

int main(int argc, char** argv) {
  setlocale(LC_ALL, "C.UTF-8");
  peers::Place();
  peers::PrintHead();
  struct {
    const char* name;
    void (*run)();
  } fields[] = {{"ini", peers::RunIni},
                {"foundation", peers::RunFoundation},
                {"system", peers::RunSystem},
                {"registrar", peers::RunRegistrar}};
  for (const auto& field : fields) {
    bool wanted = argc == 1;
    for (int i = 1; i < argc; ++i) wanted = wanted || strcmp(argv[i], field.name) == 0;
    if (wanted) RunApart(field.run);
  }
}

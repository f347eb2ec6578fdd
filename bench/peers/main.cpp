// Prints the table of docs/performance.md. Arguments: ini, foundation, system, registrar; all without one.
#include <locale.h>
#include <string.h>

#include "bench/peers/Contest.h"
#include "bench/peers/Parts.h"

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
    if (wanted) field.run();
  }
}

// Lists the components of the installation in a directory by name and GUID, one a line.
#include <exception>
#include <iostream>

#include "vltutils/snapshot.hpp"

int main(int argc, char** argv) {
  if (argc != 2) return 2;
  try {
    for (const auto& component : vlt::snapshot::Read(argv[1]).components) {
      std::cout << component.name << " " << component.guid << "\n";
    }
    return 0;
  } catch (const std::exception& error) {
    std::cerr << error.what() << "\n";
    return 1;
  }
}

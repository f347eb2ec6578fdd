#pragma once

#include <stdio.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "source/Posix/vltLinuxRegistrar.h"
#include "zt/fnd/String.h"
#include "ztcom/ztcore/ztcom.h"

// The installations that starts are timed on: bundles of object experts, numbered from 0.
namespace bench {

inline GUID Id(unsigned n) {
  return {n + 1, 0x1111, 0x4222, {0x83, 0x33, 0x44, 0x44, 0x44, 0x44, 0x44, 0x44}};
}

// Id(n) without braces.
inline std::string IdText(unsigned n) {
  char text[64];
  snprintf(text, sizeof text, "%08X-1111-4222-8333-444444444444", n + 1);
  return text;
}

// A bundle whose registration file brings so many experts.
inline void AddBundle(const std::string& root, unsigned number, unsigned components) {
  std::string name = "Expert" + std::to_string(number);
  std::string directory = root + "/Experts/" + name + ".vle/Resources";
  std::filesystem::create_directories(directory);
  std::ofstream file(directory + "/Info.vlr");
  auto nameOf = [&](unsigned c) { return components == 1 ? name : name + " " + std::to_string(c); };
  file << "[KORComponents]\n";
  for (unsigned c = 0; c < components; ++c) {
    file << nameOf(c) << " = \"" << nameOf(c) << "\"\n";
  }
  for (unsigned c = 0; c < components; ++c) {
    file << "[" << nameOf(c) << "]\nIdentifier = \"{" << IdText(number * components + c)
         << "}\"\nFileName = \"" << name << "\"\n";
  }
}

// In place of what is in the directory.
inline void Install(const std::string& root, unsigned bundles, unsigned componentsEach = 1) {
  std::filesystem::remove_all(root);
  std::filesystem::create_directories(root + "/Data Dictionaries");
  std::filesystem::create_directories(root + "/Experts");
  for (unsigned n = 0; n < bundles; ++n) AddBundle(root, n, componentsEach);
}

// A registrar of the database in that directory, past its start.
inline CztComPtr<IvltRegistrar> Start(const std::string& root) {
  CztComPtr<IvltRegistrar> registrar;
  auto* created = new CvltLinuxRegistrar(zt::fnd::String((root + "/vlt.vlr").c_str()),
                                         zt::fnd::String(root.c_str()));
  if (created->QueryInterface(IID_IvltRegistrar, reinterpret_cast<void**>(registrar.out())) !=
      S_OK) {
    fprintf(stderr, "no registrar of %s\n", root.c_str());
    abort();
  }
  return registrar;
}

}  // namespace bench

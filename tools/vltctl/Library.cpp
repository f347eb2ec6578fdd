#include "tools/vltctl/Library.h"

#include <elf.h>
#include <fcntl.h>
#include <string.h>
#include <unistd.h>

#include <array>
#include <filesystem>
#include <optional>
#include <system_error>

#include "tools/vltctl/Reading.h"
#include "zt/posix/Files.h"

namespace admin {
namespace {

namespace fs = std::filesystem;

constexpr size_t kMachine = 18;                            // e_machine, two bytes
using ElfStart = std::array<unsigned char, kMachine + 2>;  // the same for all word sizes

std::optional<ElfStart> StartOf(const std::string& file) {
  zt::posix::ScopedFd fd = zt::posix::OpenExisting(file.c_str(), O_RDONLY);
  ElfStart start;
  if (!fd || read(fd.get(), start.data(), start.size()) != static_cast<ssize_t>(start.size()) ||
      memcmp(start.data(), ELFMAG, SELFMAG) != 0) {
    return std::nullopt;
  }
  return start;
}

}  // namespace

std::string LibraryIn(const std::string& bundle) {
  const std::string base = fs::path(bundle).stem();
  for (const std::string& name : {"lib" + base + ".so", base + ".so", base}) {
    std::error_code gone;
    std::string library = bundle + "/" + name;
    if (fs::is_regular_file(library, gone)) return library;
  }
  return "";
}

const char* EntryPointOf(vlt::snapshot::Type type) {
  switch (type) {
    case vlt::snapshot::Type::ObjectExpert:
      return "vltCreateObjectExpert";
    case vlt::snapshot::Type::ResourceExpert:
      return "vltCreateResourceExpert";
    case vlt::snapshot::Type::Dictionary:
      break;
  }
  return nullptr;
}

bool MayExport(const std::string& library, const char* name) {
  const std::string end(1, '\0');
  return !name || ReadGuarded(library).bytes.find(end + name + end) != std::string::npos;
}

bool IsLibrary(const std::string& file) { return StartOf(file).has_value(); }

bool IsForeign(const std::string& library) {
  auto mine = StartOf("/proc/self/exe"), its = StartOf(library);
  if (!mine || !its) return false;
  return (*its)[EI_CLASS] != (*mine)[EI_CLASS] ||
         memcmp(its->data() + kMachine, mine->data() + kMachine, 2) != 0;
}

}  // namespace admin
